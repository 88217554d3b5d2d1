// Collects the head of a response from its lines, one exchange at a time.
#pragma once

#include "https/session.h"

namespace pinwell::https {

/// Interim responses (1xx, and what a retry leaves behind) are forgotten when the next status line comes;
/// fields behind the body (trailers) are counted and dropped. Fields of one name are joined with ", " in
/// their order (RFC 9110, section 5.3).
class ResponseHead {
  public:
    ResponseHead(std::size_t maximumBytes, std::size_t maximumFields)
        : maximumBytes_(maximumBytes), maximumFields_(maximumFields) {}

    /// One line with its end, the status line and the empty one included. False when a limit is passed.
    bool addLine(std::string_view line);

    /// The empty line of a final response was seen.
    bool isComplete() const noexcept { return complete_; }

    /// Whether it says in one way only where the body ends (RFC 9112, section 6.3): with lengths that are all
    /// the same number, with the chunked coding alone, or not at all.
    bool hasPlainFraming() const;

    int status() const noexcept { return status_; }
    const Headers& headers() const noexcept { return headers_; }

  private:
    void startResponse(std::string_view statusLine);
    void addField(std::string_view line);

    std::size_t maximumBytes_;
    std::size_t maximumFields_;
    std::size_t bytes_ = 0;
    std::size_t fields_ = 0;
    bool complete_ = false;
    int status_ = 0;
    Headers headers_;
    std::string lastName_;
};

}  // namespace pinwell::https
