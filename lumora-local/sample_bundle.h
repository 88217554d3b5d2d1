// A small signed application to try the service with. In Sample.app/Contents:
//
//   Info.plist
//   Programs/Sample                 the executable; any one directory in Contents would do
//   Programs/sample-tool            a nested program
//   Frameworks/Greeting.framework   a nested framework of one version, with links, a seal and resources
//   Resources/                      ReadMe.txt; Latest.txt, a link to it; en.lproj/Greeting.txt (optional)
//   _CodeSignature/CodeResources    the seal of all these (resource_seal.h)
//
// The executables are universal images of two slices, each signed ad hoc (ad_hoc_signature.h).
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
    foundation::Data informationPropertyList{};  // empty: it covers none
    foundation::Data resourceSeal{};
};

/// One signed slice: a complete thin image for `cpuType`.
foundation::Data makeSignedImage(std::uint32_t cpuType, const std::string& identifier,
                                 const SealedComponents& components);

/// Slices after a universal header (magic CAFEBABE), each at a multiple of 16 KiB.
foundation::Data makeUniversalImage(const std::vector<std::pair<std::uint32_t, foundation::Data>>& slices);

/// Writes `directory`/Sample.app and returns its path. Overwrites nothing. Throws Failure.
std::string writeSampleApplication(const std::string& directory);

}  // namespace pinwell::lumora
