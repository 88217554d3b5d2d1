// The amount of memory that belongs to this process alone.
#pragma once

#include <cstddef>
#include <fstream>
#include <string>

namespace pinwell::test {

/// Bytes of resident anonymous pages: reserved address space does not count.
inline std::size_t residentMemory() {
    std::ifstream status("/proc/self/status");
    std::size_t kibibytes = 0;
    for (std::string word; status >> word;)
        if (word == "RssAnon:") status >> kibibytes;
    return kibibytes * 1024;
}

/// The allowance of tests with long and empty inputs: only the usual variation of the heap.
inline constexpr std::size_t kLittleMemory = std::size_t{24} * 1024 * 1024;

}  // namespace pinwell::test
