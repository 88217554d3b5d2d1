// The trust service over anchors from any source: a platform directory, or a test.
#pragma once

#include <optional>
#include <string>

#include "trust/anchors.h"
#include "trust/trust.h"

struct ostrel_policy;

namespace pinwell::trust {

/// Maximum length of a trust object's list.
inline constexpr std::size_t kMaximumCertificates = 64;

/// The library of namedPolicy; found by the dynamic loader's ordinary rules.
inline constexpr const char* kSecurityLibrary = "libostrelsecurity.so.1";

/// `loadAnchors` is called once, on first use, with any number of threads.
std::unique_ptr<TrustService> makeTrustService(std::function<Anchors()> loadAnchors,
                                               std::function<Date()> now,
                                               std::string securityLibrary = kSecurityLibrary);

// Policies from a platform security library; such a library implements
// <pinwell/ostrel_security.h>.

/// Opens the library by the dynamic loader's rules, calls the constructor of that name, and closes the
/// library. Results as in TrustService::namedPolicy. Null for an unusable object too: a faulty library must
/// not lead to the built-in policy.
std::optional<PolicyRef> namedPolicy(const std::string& library, const std::string& constructorName);

/// A copy of the object's contents; null if it breaks the interface.
PolicyRef convertPolicy(const ostrel_policy& object);

}  // namespace pinwell::trust
