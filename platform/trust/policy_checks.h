// Judges one chain: each option of a policy, and the rules of every policy.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/error.h"
#include "chain_builder.h"
#include "trust/trust.h"

namespace pinwell::trust {

// A policy's options as typed values: the only place that knows their keys and types.

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
base::Result<Requirements> readRequirements(const Dictionary& options);

/// One fault, and its certificate.
struct Failure {
    Verdict verdict = Verdict::otherError;
    std::size_t certificate = 0;  // its position in the chain
    std::string reason;           // without a full stop: "the certificate has expired"
};

inline constexpr std::string_view kDistrusted = "the user has chosen not to trust the certificate";

/// All faults of the chain, the gravest first; empty if it is trusted.
///
/// Under every policy: no distrusted certificate (3), every signature verifies (6), an anchor at the end or a
/// user-trusted certificate in the chain (5), no signature over a digest such as SHA-1 or MD5, except the
/// last certificate's own (5). `requirements` has the other rules: extensions 6, all others 5.
std::vector<Failure> checkChain(const CandidateChain& chain, const Requirements& requirements, Date now,
                                NameConstraintCheck& names);

}  // namespace pinwell::trust
