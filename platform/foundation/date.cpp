#include "foundation/date.h"

#include <fmt/chrono.h>

#include <chrono>

namespace pinwell::foundation {
namespace {

// The dates with a four-digit year; a date from a file may have any value.
constexpr std::int64_t kFirstShown = -62135596800;  // 0001-01-01
constexpr std::int64_t kLastShown = 253402300799;   // 9999-12-31

}  // namespace

Date Date::now() {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    return {std::chrono::duration_cast<std::chrono::seconds>(now).count()};
}

std::string toString(Date date) {
    if (date.seconds < kFirstShown || date.seconds > kLastShown) return fmt::format("{} s", date.seconds);
    return fmt::format("{:%Y-%m-%d %H:%M:%S} +0000", fmt::gmtime(static_cast<std::time_t>(date.seconds)));
}

}  // namespace pinwell::foundation
