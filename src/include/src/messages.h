// The two message functions, and the setting that gates them.
//
// Each call is one line on standard output, in one write, without a prefix. A format that ends in a newline
// gives an empty line after it. If standard output is closed or full, only the line is lost.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "formats/findings.h"
#include "values/format.h"

namespace pinwell {

inline constexpr std::uint8_t kVerbosityNormal = 0;
inline constexpr std::uint8_t kVerbosityVerbose = 1;
inline constexpr std::uint8_t kVerbosityQuiet = 255;

/// Written during the option scan, before any other thread exists; only read afterwards.
extern std::uint8_t verboseLevel;

/// Takes a line, without its newline.
using MessageReceiver = std::function<void(std::string line)>;

/// While it lives, the lines of the calling thread go to `receiver` and not to standard output. The receiver
/// gets the user's lines even in quiet mode. An inner redirection replaces the outer one until it ends.
class MessageRedirection {
  public:
    explicit MessageRedirection(MessageReceiver receiver);
    ~MessageRedirection();
    MessageRedirection(const MessageRedirection&) = delete;
    MessageRedirection& operator=(const MessageRedirection&) = delete;

  private:
    const MessageReceiver receiver_;
    const MessageReceiver* const before_;
};

/// Whether the calling thread's lines are redirected.
bool messagesAreRedirected() noexcept;

/// Writes `line` and a newline to standard output, or passes it to the calling thread's receiver.
void writeMessageLine(std::string line);

/// A diagnostic line, shown in verbose mode only.
template <class... Args>
void NoisyLog(values::FormatString<std::type_identity_t<Args>...> format, const Args&... args) {
    if (verboseLevel == kVerbosityVerbose) writeMessageLine(values::format(format, args...));
}

/// A line for the user, shown unless quiet.
template <class... Args>
void MessageLog(values::FormatString<std::type_identity_t<Args>...> format, const Args&... args) {
    if (verboseLevel != kVerbosityQuiet || messagesAreRedirected())
        writeMessageLine(values::format(format, args...));
}

/// For a parser: its lines are diagnostic lines of this program, as by NoisyLog.
Diagnostics noisyDiagnostics();

}  // namespace pinwell
