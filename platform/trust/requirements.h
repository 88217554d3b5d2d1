// A policy's options as typed values: the one place that knows which keys and types there are.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "foundation/error.h"
#include "trust/trust.h"

namespace pinwell::trust {

enum class AnchorSet { platform, platformAndCompatibility };

/// What a policy asks. A member that is false, empty or nothing is not checked.
struct Requirements {
    bool criticalExtensions = false;
    bool idLinkage = false;
    bool basicConstraints = false;
    bool nonEmptySubject = false;
    bool validityDates = false;
    bool serverAuthentication = false;
    bool nameConstraints = false;
    AnchorSet anchors = AnchorSet::platform;  // a chain must be anchored somewhere, whatever the list says
    std::optional<std::uint64_t> chainLength;
    std::vector<std::string> intermediateMarkers;
    std::vector<std::string> leafMarkers;
    std::optional<std::map<std::string, std::uint64_t, std::less<>>> keySizes;
    std::optional<std::string> hostName;
};

/// An option that is not known, or whose value is not of its type, is an error that names it: a policy that
/// is not understood in full must not be passed by anything.
foundation::Result<Requirements> readRequirements(const Dictionary& options);

}  // namespace pinwell::trust
