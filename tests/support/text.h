// Texts for tests that need a lot of one.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace pinwell::test {

/// `count` copies of the text, one after the other.
inline std::string repeated(std::string_view text, std::size_t count) {
    std::string all;
    all.reserve(text.size() * count);
    for (std::size_t i = 0; i < count; ++i) all += text;
    return all;
}

}  // namespace pinwell::test
