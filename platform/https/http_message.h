// The parts of HTTP messages: the syntax of fields, the head of a response, and redirects.
#pragma once

#include <cstdint>

#include "https/session.h"

namespace pinwell::https {

/// A method or a field's name (RFC 9110, section 5.6.2).
bool isToken(std::string_view text) noexcept;

/// A field's value as we send it: no control character except the tab.
bool isFieldValue(std::string_view text) noexcept;

/// Whether it is a 3xx response with a Location. Without one it is a response like any other.
bool isRedirect(const HTTPResponse& response);

/// The next request. `target` is the Location, resolved against the URL of `request`. 301, 302 and 303 turn a
/// POST into a GET (303 any method except HEAD) and drop the body with the fields that describe it; 307 and
/// 308 keep all. Fields with secrets are not sent to another host. Any other redirect, and a target that is
/// not https, is an error.
Result<Request> requestAfterRedirect(const Request& request, int status, const std::string& target);

/// Longest line of a head, with its end. The transfer library's own limit is 100 KiB.
inline constexpr std::size_t kMaximumHeaderLine = 64UL * 1024;

/// Collects the head of a response from its lines, one exchange at a time.
///
/// The transfer library reads the same lines, by rules that differ between its releases. So lines that it
/// could read in another way are refused here: a status line of another form, a name that is not a token (a
/// space before the colon), a folded field that defines the body's end, a NUL.
///
/// Interim responses (1xx) are dropped at the next status line. A status line may only be the first line of a
/// head. Fields after the body (trailers) are counted and dropped. Fields of one name are joined with ", " in
/// their order (RFC 9110, section 5.3).
class ResponseHead {
  public:
    enum class Line { taken, tooLarge, malformed };

    ResponseHead(std::size_t maximumBytes, std::size_t maximumFields)
        : maximumBytes_(maximumBytes), maximumFields_(maximumFields) {}

    /// Adds one line with its end, also the status line and the empty line. Returns `tooLarge` if a limit is
    /// exceeded.
    Line addLine(std::string_view line);

    /// Whether the empty line of a final response was read.
    bool isComplete() const noexcept { return complete_; }

    /// Whether the status line is of HTTP/1.0 or HTTP/1.1; otherwise it is of HTTP/2. With HTTP/2 the
    /// transfer library generates the line; a server could send such a line too.
    bool isHTTP1() const noexcept { return isHTTP1_; }

    /// Whether the head defines the body's end in one way (RFC 9112, section 6.3): with lengths that are all
    /// equal, with only the chunked coding (not in HTTP/2), or not at all.
    bool hasPlainFraming() const;

    /// The number of bytes in the body of a response to this method; a number that is too large becomes the
    /// maximum. `nullopt` if the head does not state it. Requires plain framing.
    std::optional<std::uint64_t> bodyLength(std::string_view method) const;

    /// Whether only the end of the connection, or of the HTTP/2 stream, ends the body.
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
    bool isAtStart_ = true;  // of the first head, or of a head after an interim response
    bool isHTTP1_ = false;
    int status_ = 0;
    Headers headers_;
    std::string lastName_;
};

}  // namespace pinwell::https
