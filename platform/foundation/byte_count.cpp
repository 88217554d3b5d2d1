#include "foundation/byte_count.h"

#include <fmt/format.h>

#include <array>
#include <string_view>

namespace pinwell::foundation {
namespace {

struct Unit {
    std::string_view name;
    unsigned shift;       // one of it is 2^shift bytes
    std::uint64_t scale;  // 10^fraction digits
};

constexpr std::array kUnits{Unit{"KB", 10, 1},   Unit{"MB", 20, 10},  Unit{"GB", 30, 100},
                            Unit{"TB", 40, 100}, Unit{"PB", 50, 100}, Unit{"EB", 60, 100}};

// The count in the unit's smallest shown fraction, halves rounded up.
std::uint64_t scaled(std::uint64_t bytes, const Unit& unit) {
    const std::uint64_t whole = bytes >> unit.shift;
    std::uint64_t rest = bytes & ((std::uint64_t{1} << unit.shift) - 1);
    unsigned shift = unit.shift;
    if (shift > 50) {  // makes room for the multiplication; no shown digit depends on the lost bits
        rest >>= shift - 50;
        shift = 50;
    }
    const std::uint64_t half = std::uint64_t{1} << (shift - 1);
    return whole * unit.scale + ((rest * unit.scale + half) >> shift);
}

std::string decimal(std::uint64_t count, std::uint64_t scale) {
    std::string text = fmt::format("{}", count / scale);
    std::uint64_t rest = count % scale;
    if (rest != 0) text += '.';
    for (std::uint64_t digit = scale / 10; rest != 0; digit /= 10) {
        text += static_cast<char>('0' + rest / digit);
        rest %= digit;
    }
    return text;
}

}  // namespace

std::string formatByteCount(std::uint64_t bytes) {
    if (bytes == 0) return "Zero KB";
    if (bytes == 1) return "1 byte";
    if (bytes < 1024) return fmt::format("{} bytes", bytes);
    for (const Unit& unit : kUnits) {
        // A count that rounds up to 1024 of a unit is shown as 1 of the next.
        const std::uint64_t count = scaled(bytes, unit);
        if (count < 1024 * unit.scale) return fmt::format("{} {}", decimal(count, unit.scale), unit.name);
    }
    return {};  // not reached: 2^64 bytes are 16 of the last unit
}

}  // namespace pinwell::foundation
