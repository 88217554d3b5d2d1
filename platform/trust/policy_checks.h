// Judges one chain: each option of a policy, and the rules of every policy.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "trust/chain_builder.h"
#include "trust/requirements.h"

namespace pinwell::trust {

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
