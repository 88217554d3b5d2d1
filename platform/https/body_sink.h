// Receives the body of a response.
#pragma once

#include "foundation/bytes.h"
#include "https/session.h"

namespace pinwell::https {

class BodySink {
  public:
    virtual ~BodySink() = default;

    /// The next piece. An error ends the transfer.
    virtual std::optional<Error> write(foundation::ByteView bytes) = 0;
};

/// Keeps the body in memory.
class MemorySink : public BodySink {
  public:
    std::optional<Error> write(foundation::ByteView bytes) override {
        foundation::append(data_, bytes);
        return std::nullopt;
    }
    Data take() { return std::move(data_); }

  private:
    Data data_;
};

}  // namespace pinwell::https
