// The two message functions, and the setting that gates them.
//
// Each call is one line on standard output, in one write, without a prefix. A format that ends in a newline
// gives an empty line after it. A standard output that is closed or full loses the line and nothing else.
#pragma once

#include <cstdint>
#include <string>

#include "foundation/format.h"

namespace pinwell {

inline constexpr std::uint8_t kVerbosityNormal = 0;
inline constexpr std::uint8_t kVerbosityVerbose = 1;
inline constexpr std::uint8_t kVerbosityQuiet = 255;

/// Written during the option scan, before any other thread exists; only read afterwards.
extern std::uint8_t verboseLevel;

/// Writes `line` and a newline to standard output.
void writeMessageLine(std::string line);

/// A diagnostic line, shown in verbose mode only.
template <class... Args>
void NoisyLog(foundation::FormatString<std::type_identity_t<Args>...> format, const Args&... args) {
    if (verboseLevel == kVerbosityVerbose) writeMessageLine(foundation::format(format, args...));
}

/// A line for the user, shown unless quiet.
template <class... Args>
void MessageLog(foundation::FormatString<std::type_identity_t<Args>...> format, const Args&... args) {
    if (verboseLevel != kVerbosityQuiet) writeMessageLine(foundation::format(format, args...));
}

}  // namespace pinwell
