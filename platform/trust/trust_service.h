// The trust service over anchors from anywhere: what a platform directory is read into, and what tests bring.
#pragma once

#include "trust/anchors.h"
#include "trust/trust.h"

namespace pinwell::trust {

/// The list of a trust object may not be longer.
inline constexpr std::size_t kMaximumCertificates = 64;

/// Whose policies createNamedPolicy looks up; found by the dynamic loader's ordinary rules.
inline constexpr const char* kSecurityLibrary = "libostrelsecurity.so.1";

/// `loadAnchors` is called once, on first need, whatever the number of threads.
std::unique_ptr<TrustService> makeTrustService(std::function<Anchors()> loadAnchors,
                                               std::function<Date()> now,
                                               std::string securityLibrary = kSecurityLibrary);

}  // namespace pinwell::trust
