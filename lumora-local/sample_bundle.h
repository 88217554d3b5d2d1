// A small signed application to try the service with.
//
//   Sample.app/Contents/Info.plist
//   Sample.app/Contents/Programs/Sample               the executable; any one directory in Contents would do
//   Sample.app/Contents/_CodeSignature/CodeResources  the seal of its resources, of which there are none
//
// The executable is a universal image of two slices. Each is signed ad hoc: a superblob with a SHA-256 code
// directory (version 0x20400, with page hashes), an empty requirements blob and an empty CMS blob.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::lumora {

inline constexpr std::uint32_t kCpuTypeArm64 = 0x0100000C;
inline constexpr std::uint32_t kCpuTypeX86_64 = 0x01000007;

/// The property list and the resource seal that a code directory covers.
struct SealedComponents {
    foundation::Data informationPropertyList;
    foundation::Data resourceSeal;
};

/// One signed slice: a complete thin image for `cpuType`.
foundation::Data makeSignedImage(std::uint32_t cpuType, const std::string& identifier,
                                 const SealedComponents& components);

/// Slices behind a universal header (magic CAFEBABE), each at a multiple of 16 KiB.
foundation::Data makeUniversalImage(const std::vector<std::pair<std::uint32_t, foundation::Data>>& slices);

/// Writes the samples into `directory`, which is made when it does not exist, and answers their paths.
/// Nothing that exists is overwritten. Throws Failure.
std::vector<std::string> writeSamples(const std::string& directory);

}  // namespace pinwell::lumora
