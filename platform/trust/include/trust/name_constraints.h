// Name constraints: the names that certificates below an issuer may have (RFC 5280, 4.2.1.10).
//
//   NameConstraints  SEQUENCE { [0] permitted, [1] excluded }     at least one of them, each of at least one
//   GeneralSubtree   SEQUENCE { GeneralName }                     minimum and maximum are not allowed
//
//   DNS name         the name and all names below it; ".example" all below "example"; empty: every name
//   IP address       8 or 32 bytes, an address and its mask, a number of ones and then zeros
//
// Other forms are not supported: a certificate below such a constraint is refused.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "trust/general_name.h"

namespace pinwell::trust {

struct NameSubtrees {
    struct AddressRange {
        base::Data address;  // 4 or 16 bytes, the bits outside the mask zero
        base::Data mask;
    };

    std::vector<std::string> dnsNames;
    std::vector<AddressRange> addresses;

    std::size_t size() const noexcept { return dnsNames.size() + addresses.size(); }
};

struct NameConstraints {
    NameSubtrees permitted;
    NameSubtrees excluded;
    bool hasUnhandledForm = false;
};

/// From the value of the extension. Throws der::Malformed.
NameConstraints readNameConstraints(base::ByteView value);

/// Maximum comparisons of a name with a subtree in one evaluation. Real chains need fewer than 1,000; one
/// malicious chain could need 10^9.
inline constexpr std::size_t kMaximumNameComparisons = 1U << 20U;

enum class NameJudgement { permitted, excluded, unhandled, tooMany };

/// Applies constraints to names for one evaluation, within its bound. The arguments must outlive it.
class NameConstraintCheck {
  public:
    /// Judges all names of a certificate. Each must be within a permitted subtree of its form, if there are
    /// any, and not within an excluded one. A wildcard means every name that it covers. A malformed DNS name
    /// is excluded if its form is constrained.
    NameJudgement judge(const NameConstraints& constraints, const AlternativeNames& names);

    /// Judges the contacted host, a DNS name or an address; the same at every call.
    NameJudgement judgeHost(const NameConstraints& constraints, std::string_view host);

  private:
    NameJudgement compare(const NameConstraints& constraints, const AlternativeNames& names);

    std::size_t left_ = kMaximumNameComparisons;
    std::map<std::pair<const NameConstraints*, const AlternativeNames*>, NameJudgement> judged_;
};

}  // namespace pinwell::trust
