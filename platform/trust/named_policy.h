// Policies from a platform security library; such a library implements
// include/pinwell/ostrel_security.h.
#pragma once

#include <optional>
#include <string>

#include "trust/trust.h"

struct ostrel_policy;

namespace pinwell::trust {

/// Opens the library by the dynamic loader's rules, calls the constructor of that name, and closes the
/// library. Results as in TrustService::namedPolicy. Null for an unusable object too: a faulty library must
/// not lead to the built-in policy.
std::optional<PolicyRef> namedPolicy(const std::string& library, const std::string& constructorName);

/// A copy of the object's contents; null if it breaks the interface.
PolicyRef convertPolicy(const ostrel_policy& object);

}  // namespace pinwell::trust
