// Points in time.
#pragma once

#include <chrono>
#include <compare>
#include <cstdint>

namespace pinwell::values {

/// Seconds since 1970-01-01 00:00:00 UTC, leap seconds not counted.
struct Date {
    std::int64_t seconds = 0;

    auto operator<=>(const Date&) const = default;

    static Date now() {
        const auto now = std::chrono::system_clock::now().time_since_epoch();
        return {std::chrono::duration_cast<std::chrono::seconds>(now).count()};
    }
};

}  // namespace pinwell::values
