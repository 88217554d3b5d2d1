// Points in time.
#pragma once

#include <compare>
#include <cstdint>
#include <string>

namespace pinwell::foundation {

/// Seconds since 1970-01-01 00:00:00 UTC, leap seconds not counted.
struct Date {
    std::int64_t seconds = 0;

    auto operator<=>(const Date&) const = default;

    static Date now();
};

/// "2026-11-20 19:55:00 +0000"
std::string toString(Date date);

}  // namespace pinwell::foundation
