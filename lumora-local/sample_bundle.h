// A small signed application to try the service with.
//
//   Sample.app/Contents/Info.plist
//   Sample.app/Contents/Programs/Sample               the executable; any one directory in Contents would do
//   Sample.app/Contents/_CodeSignature/CodeResources  the seal of its resources, of which there are none
//
// The executable is a universal image of two slices, each signed ad hoc (ad_hoc_signature.h).
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

/// Writes `directory`/Sample.app and answers its path. Nothing that exists is overwritten. Throws Failure.
std::string writeSampleApplication(const std::string& directory);

}  // namespace pinwell::lumora
