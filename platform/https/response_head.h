// Collects the head of a response from its lines, one exchange at a time.
//
// The transfer library reads the same lines, by rules that differ between its releases. What it could read
// another way is refused here: a status line of another form, a name that is no token (a space before the
// colon), a folded field that says where the body ends, a NUL.
#pragma once

#include <cstdint>

#include "https/session.h"

namespace pinwell::https {

/// Longest line of a head, its end included. The transfer library's own limit is 100 KiB.
inline constexpr std::size_t kMaximumHeaderLine = 64UL * 1024;

/// Interim responses (1xx) are forgotten when the next status line comes, which is the first line of a head
/// and no other. Fields behind the body (trailers) are counted and dropped. Fields of one name are joined
/// with ", " in their order (RFC 9110, section 5.3).
class ResponseHead {
  public:
    enum class Line { taken, tooLarge, malformed };

    ResponseHead(std::size_t maximumBytes, std::size_t maximumFields)
        : maximumBytes_(maximumBytes), maximumFields_(maximumFields) {}

    /// One line with its end, the status line and the empty one included. `tooLarge` when a limit is passed.
    Line addLine(std::string_view line);

    /// The empty line of a final response was seen.
    bool isComplete() const noexcept { return complete_; }

    /// Whether the status line is of HTTP/1.0 or HTTP/1.1; else it is of HTTP/2. Of HTTP/2 is the one that
    /// the transfer library makes up where that is spoken, and any that a server sends of its own accord.
    bool isHTTP1() const noexcept { return isHTTP1_; }

    /// Whether it says in one way only where the body ends (RFC 9112, section 6.3): with lengths that are all
    /// the same number, with the chunked coding alone (which HTTP/2 does not have), or not at all.
    bool hasPlainFraming() const;

    /// The number of bytes that the body of a response to this method has; one that is too large to be told
    /// apart is the largest there is. Nothing when the head does not say. Asked of plain framing only.
    std::optional<std::uint64_t> bodyLength(std::string_view method) const;

    /// Nothing but the end of the connection, or of the HTTP/2 stream, tells where the body ends.
    bool hasOpenEnd(std::string_view method) const;

    int status() const noexcept { return status_; }
    const Headers& headers() const noexcept { return headers_; }

  private:
    bool startResponse(std::string_view statusLine);
    bool addField(std::string_view line);
    bool continueField(std::string_view line);
    bool isChunked() const;

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
