// Policies from a platform security library; include/pinwell/ostrel_security.h is what such a library
// implements.
#pragma once

#include <string>

#include "trust/trust.h"

struct ostrel_policy;

namespace pinwell::trust {

/// Opens the library by the dynamic loader's rules, calls the constructor of that name, and closes the
/// library. `policy` is null unless the outcome is `created`. An object that cannot be used counts as a
/// refusal: a library that answers nonsense must not lead to the policy that is built in.
NamedPolicyOutcome createNamedPolicy(const std::string& library, const std::string& constructorName,
                                     PolicyRef& policy);

/// A copy of the object's contents; null when it does not keep to the interface.
PolicyRef convertPolicy(const ostrel_policy& object);

}  // namespace pinwell::trust
