// A small FAT12 file system (ECMA-107) with one text file, for the sample disk images.
//
// | Sector  | Holds                                                     |
// |---------|-----------------------------------------------------------|
// | 0       | boot sector: the parameters below, no code                |
// | 1       | the file allocation table, one copy                       |
// | 2       | the root directory: volume label, README.TXT              |
// | from 3  | clusters of one sector each, numbered from 2              |
#pragma once

#include <cstddef>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::lumora {

inline constexpr std::size_t kSectorSize = 512;
inline constexpr std::size_t kVolumeSectors = 256;

/// The whole volume, the same for the same text. The text has one sector at most.
foundation::Data makeSampleVolume(std::string_view text);

}  // namespace pinwell::lumora
