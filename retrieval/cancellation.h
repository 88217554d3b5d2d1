// // Cancellation of running calls.
#pragma once

#include <memory>

#include "retrieval/retry_policy.h"

namespace pinwell::retrieval {

class Connection;

/// Ends calls before their time. May be shared by several calls, and used from any thread.
class Cancellation {
  public:
    Cancellation();
    ~Cancellation();
    Cancellation(const Cancellation&) = delete;
    Cancellation& operator=(const Cancellation&) = delete;

    /// Running calls end soon, with errors; later calls end at once.
    void cancel();
    bool isCancelled() const;

    /// Sleeps until `end`. Returns true, possibly earlier, if it is cancelled.
    bool sleepUntil(Clock::time_point end) const;

    class Use;

  private:
    struct State;
    std::shared_ptr<State> state_;
};

/// While it lives, cancel() cancels the connection. The connection must outlive it.
class Cancellation::Use {
  public:
    Use(const Cancellation& cancellation, Connection& connection);
    ~Use();
    Use(const Use&) = delete;
    Use& operator=(const Use&) = delete;

  private:
    const std::shared_ptr<State> state_;
    Connection& connection_;
};

}  // namespace pinwell::retrieval
