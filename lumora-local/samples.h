// The sample artefacts, one of every kind that can have a ticket, and their parts.
//
// The file of each maker describes its format: sample_bundle.cpp, sample_disk_image.cpp, sample_package.cpp.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "values/date.h"

namespace pinwell::lumora {

/// Writes these into `directory`, which is made if it is missing, and returns their paths in this
/// order:
///
///   Sample.app     an application (sample_bundle.cpp)
///   Sample.dmg     a disk image with a code signature (sample_disk_image.cpp)
///   Unsigned.dmg   the same image without one
///   Sample.pkg     a signed flat package (sample_package.cpp), signed at `now`
///
/// Overwrites nothing. If one of them exists or cannot be written, no new file remains. Throws
/// Failure.
std::vector<std::string> writeSamples(const std::string& directory, values::Date now);

/// The property list and the resource seal that a code directory covers.
struct SealedComponents {
    base::Data informationPropertyList{};  // empty: it covers none
    base::Data resourceSeal{};
};

/// One signed slice: a complete thin image for `cpuType`.
base::Data makeSignedImage(std::uint32_t cpuType, const std::string& identifier,
                           const SealedComponents& components);

/// Slices after a universal header (magic CAFEBABE), each at a multiple of 16 KiB.
base::Data makeUniversalImage(const std::vector<std::pair<std::uint32_t, base::Data>>& slices);

/// Writes `directory`/Sample.app and returns its path. Overwrites nothing. Throws Failure.
std::string writeSampleApplication(const std::string& directory);

enum class ImageSignature { none, adHoc };

/// A whole disk image, always the same.
base::Data makeDiskImage(ImageSignature signature);

/// Writes `directory`/`name` and returns its path. Overwrites nothing. Throws Failure.
std::string writeSampleDiskImage(const std::string& directory, const std::string& name,
                                 ImageSignature signature);

inline constexpr std::size_t kSectorSize = 512;
inline constexpr std::size_t kVolumeSectors = 256;

/// The volume in a disk image, the same for the same text. The text has one sector at most.
base::Data makeSampleVolume(std::string_view text);

/// A whole package, signed at `now`. Throws Failure when the cryptographic library fails.
base::Data makePackage(values::Date now);

/// Writes `directory`/`name` and returns its path. Overwrites nothing. Throws Failure.
std::string writeSamplePackage(const std::string& directory, const std::string& name, values::Date now);

/// A zlib stream (RFC 1950). Throws Failure when the library fails.
base::Data deflated(base::ByteView contents);

/// CRC-32 (ISO 3309).
std::uint32_t crc32(base::ByteView bytes);

}  // namespace pinwell::lumora
