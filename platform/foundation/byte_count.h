// Sizes for people.
#pragma once

#include <cstdint>
#include <string>

namespace pinwell::foundation {

/// The memory count style, 1024 bytes to the kilobyte: "Zero KB", "1 byte", "512 bytes", "1 KB", "1.5 MB",
/// "64 MB", "2.25 GB". No fraction for KB, at most one digit for MB, two from GB on; trailing zeros are
/// dropped.
std::string formatByteCount(std::uint64_t bytes);

}  // namespace pinwell::foundation
