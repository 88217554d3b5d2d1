// The trust service over anchors from any source: a platform directory, or a test.
#pragma once

#include "trust/anchors.h"
#include "trust/trust.h"

namespace pinwell::trust {

/// Maximum length of a trust object's list.
inline constexpr std::size_t kMaximumCertificates = 64;

/// The library of namedPolicy; found by the dynamic loader's ordinary rules.
inline constexpr const char* kSecurityLibrary = "libostrelsecurity.so.1";

/// `loadAnchors` is called once, on first use, with any number of threads.
std::unique_ptr<TrustService> makeTrustService(std::function<Anchors()> loadAnchors,
                                               std::function<Date()> now,
                                               std::string securityLibrary = kSecurityLibrary);

}  // namespace pinwell::trust
