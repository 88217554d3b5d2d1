// Judging one chain: each option of a policy, and what holds under every policy.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "trust/chain_builder.h"
#include "trust/requirements.h"

namespace pinwell::trust {

/// One thing that is wrong, and with which certificate.
struct Failure {
    Verdict verdict = Verdict::otherError;
    std::size_t certificate = 0;  // its place in the chain
    std::string reason;           // without a full stop: "the certificate has expired"
};

inline constexpr std::string_view kDistrusted = "the user has chosen not to trust the certificate";

/// All that is wrong with the chain, the gravest first; empty when it is trusted.
///
/// Under every policy: no distrusted certificate (3), every signature verifies (6), an anchor at its end or a
/// certificate that the user trusts in it (5), no signature over a digest such as SHA-1 or MD5, the last
/// certificate's own aside (5). The rest stands in `requirements`: extensions 6, everything else 5.
std::vector<Failure> checkChain(const CandidateChain& chain, const Requirements& requirements, Date now,
                                NameConstraintCheck& names);

}  // namespace pinwell::trust
