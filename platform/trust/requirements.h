// A policy's options as typed values: the only place that knows their keys and types.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "foundation/error.h"
#include "trust/trust.h"

namespace pinwell::trust {

enum class AnchorSet { platform, platformAndCompatibility };

/// The requirements of a policy. A member that is false, empty or `nullopt` is not checked.
struct Requirements {
    bool criticalExtensions = false;
    bool idLinkage = false;
    bool basicConstraints = false;
    bool nonEmptySubject = false;
    bool validityDates = false;
    bool serverAuthentication = false;
    bool nameConstraints = false;
    AnchorSet anchors = AnchorSet::platform;  // every chain must be anchored, with any list of options
    std::optional<std::uint64_t> chainLength;
    std::vector<std::string> intermediateMarkers;
    std::vector<std::string> leafMarkers;
    std::optional<std::map<std::string, std::uint64_t, std::less<>>> keySizes;
    std::optional<std::string> hostName;
};

/// An unknown option, or a value of another type, is an error that names it: nothing may pass a policy that
/// is not fully understood.
foundation::Result<Requirements> readRequirements(const Dictionary& options);

}  // namespace pinwell::trust
