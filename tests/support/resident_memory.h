// How much memory this process has of its own.
#pragma once

#include <cstddef>
#include <fstream>
#include <string>

namespace pinwell::test {

/// Bytes of anonymous pages that are resident: what address space alone takes does not count.
inline std::size_t residentMemory() {
    std::ifstream status("/proc/self/status");
    std::size_t kibibytes = 0;
    for (std::string word; status >> word;)
        if (word == "RssAnon:") status >> kibibytes;
    return kibibytes * 1024;
}

/// What tests of long and empty inputs allow: the heap's own ups and downs, and no more.
inline constexpr std::size_t kLittleMemory = std::size_t{24} * 1024 * 1024;

}  // namespace pinwell::test
