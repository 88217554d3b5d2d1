// Collects the head of a response from its lines, one exchange at a time.
#pragma once

#include "https/session.h"

namespace pinwell::https {

/// Interim responses (1xx) are forgotten when the next status line comes, which is the first line of a head
/// and no other. Fields behind the body (trailers) are counted and dropped. Fields of one name are joined
/// with
/// ", " in their order (RFC 9110, section 5.3).
class ResponseHead {
  public:
    ResponseHead(std::size_t maximumBytes, std::size_t maximumFields)
        : maximumBytes_(maximumBytes), maximumFields_(maximumFields) {}

    /// One line with its end, the status line and the empty one included. False when a limit is passed.
    bool addLine(std::string_view line);

    /// The empty line of a final response was seen.
    bool isComplete() const noexcept { return complete_; }

    /// Whether the status line is of an HTTP/1 version. Of HTTP/2 is the one that the transfer library makes
    /// up where that is spoken, and any that a server sends of its own accord.
    bool isHTTP1() const noexcept { return isHTTP1_; }

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
    bool isAtStart_ = true;  // of the first head, or of the one behind an interim response
    bool isHTTP1_ = false;
    int status_ = 0;
    Headers headers_;
    std::string lastName_;
};

}  // namespace pinwell::https
