// From a leaf and candidates to chains (RFC 4158 tells the pitfalls).
//
// A chain goes from issuer to issuer, by name; among several candidates those whose key verifies the
// signature come first, then those whose key identifier fits, then the anchors. Not left to X509_verify_cert:
// that one checks dates, purposes, name constraints and more on its own account, and a policy here is its
// options and nothing more.
#pragma once

#include <functional>
#include <map>
#include <optional>

#include "trust/anchors.h"
#include "trust/certificate.h"

namespace pinwell::trust {

inline constexpr std::size_t kMaximumChainLength = 16;
inline constexpr std::size_t kMaximumChains = 64;  // shown for one leaf
inline constexpr std::size_t kMaximumSignatureChecks =
    256;  // made for one leaf; what lies beyond does not verify

enum class Anchoring {
    none,
    user,      // the chain holds a certificate of user-trust/allow, and no platform anchor ends it
    platform,  // it ends at an anchor that the policy admits
};

struct CandidateChain {
    CertificateList certificates;             // leaf first
    std::optional<std::size_t> badSignature;  // the first whose signature the next one's key does not verify
    std::optional<std::size_t> denied;        // the first that the user's distrust reaches
    Anchoring anchoring = Anchoring::none;
};

/// For one evaluation. The lists must outlive it.
class ChainBuilder {
  public:
    /// `given` is leaf first and not empty; `platformAnchors` are those that the policy admits.
    ChainBuilder(const CertificateList& given, const CertificateList& platformAnchors,
                 const Anchors& anchors);

    /// Shows chains, the likeliest first, until `visit` answers true or there is no other.
    void build(const std::function<bool(const CandidateChain&)>& visit);

  private:
    struct Issuer {
        X509CertificateRef certificate;
        bool verifies = false;
        int preference = 0;
    };

    bool extend(CertificateList& chain, const std::function<bool(const CandidateChain&)>& visit);
    std::vector<Issuer> issuersFor(const CertificateList& chain);
    bool verifies(const X509CertificateRef& issuer, const X509CertificateRef& issued);
    CandidateChain describe(const CertificateList& chain);

    const CertificateList& platformAnchors_;
    const Anchors& anchors_;
    CertificateList candidates_;  // each once, anchors first
    X509CertificateRef leaf_;
    std::map<std::pair<const X509Certificate*, const X509Certificate*>, bool> checkedSignatures_;
    std::size_t shown_ = 0;
};

}  // namespace pinwell::trust
