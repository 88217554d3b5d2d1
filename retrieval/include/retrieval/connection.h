// Connections to the record service, and how calls that use them are cancelled.
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "https/session.h"
#include "retrieval/retry_policy.h"
#include "src/platform.h"
#include "values/url.h"

namespace pinwell::retrieval {

/// The result of one request.
struct Exchange {
    std::optional<https::HTTPResponse> response = {};
    base::Data body = {};
    std::optional<base::Error> error = {};
    bool serverWasRefused = false;
    std::vector<std::string> messages = {};  // from the server's judgement
};

/// One HTTPS session to the record service. One thread at a time uses it; any thread may end it.
class Connection : public https::SessionDelegate {
  public:
    explicit Connection(const Platform& platform) : platform_(platform) {}

    /// Blocks until the response is complete or has failed; cancels at the deadline. The request must have a
    /// URL.
    Exchange exchange(https::Request request, std::optional<Clock::time_point> deadline);

    /// Ends a running exchange with an error, and all later ones. From any thread except the session's own.
    void cancel();
    bool isCancelled() const;

    void didReceiveChallenge(https::Session& session, const https::AuthenticationChallenge& challenge,
                             const https::ChallengeCompletion& completion) override;
    void didFinishDownloading(https::Session&, https::Task&, const values::URL&) override {}
    void didComplete(https::Session&, https::Task&, const std::optional<base::Error>&) override {}

  private:
    Platform platform_;

    // Written on the session's queue, read when the exchange is over.
    bool serverWasRefused_ = false;
    std::vector<std::string> messages_;

    mutable std::mutex mutex_;
    bool cancelled_ = false;
    std::shared_ptr<https::Session> session_;  // last: it uses all of the above
};

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
