// From a leaf and candidates to chains (RFC 4158 tells the pitfalls).
//
// A chain goes from issuer to issuer, by name; among several candidates whose key verifies the signature,
// those whose key identifier fits come first, then the anchors. Not left to X509_verify_cert: that one checks
// dates, purposes and more on its own account, and a policy here is its options and nothing more.
//
// The search is bounded. Certificates that share one name ask for a check of every pair, and for a chain for
// every order that they can be put in. A search that ends at a bound has shown nothing about the leaf, and
// says that of itself.
#pragma once

#include <functional>
#include <map>
#include <optional>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

#include "trust/anchors.h"
#include "trust/certificate.h"

namespace pinwell::trust {

/// Chains in use have 2 to 4 certificates.
inline constexpr std::size_t kMaximumChainLength = 16;
inline constexpr std::size_t kMaximumChains = 64;  // shown for one leaf

/// Made for one list, under however many policies. The slowest check, of an RSA key of 8192 bits or a point
/// of 512, takes about 3 ms.
inline constexpr std::size_t kMaximumSignatureChecks = 256;

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

/// Checks of signatures, each made once, up to a bound. Keeps the certificates alive.
class SignatureChecks {
  public:
    /// `nullopt` if the bound is reached.
    std::optional<bool> verifies(const X509CertificateRef& issuer, const X509CertificateRef& issued);

  private:
    std::map<std::pair<X509CertificateRef, X509CertificateRef>, bool> made_;
};

/// For one evaluation. The lists and `checks` must outlive it.
class ChainBuilder {
  public:
    /// `given` is leaf first and not empty; `platformAnchors` are those that the policy admits.
    ChainBuilder(const CertificateList& given, const CertificateList& platformAnchors, const Anchors& anchors,
                 SignatureChecks& checks);

    /// Shows chains, the likeliest first, until `visit` returns true or there is no other.
    void build(const std::function<bool(const CandidateChain&)>& visit);

    /// Whether a bound ended the search, so that there may be chains that were not shown.
    bool isExhausted() const noexcept { return exhausted_; }

  private:
    using Visit = std::function<bool(const CandidateChain&)>;

    void addCandidates(const CertificateList& list);
    bool show(const CertificateList& chain, const Visit& visit);
    bool extend(CertificateList& chain, const Visit& visit);
    CertificateList namedAs(const X509Certificate& issued) const;
    bool verifies(const X509CertificateRef& issuer, const X509CertificateRef& issued);
    CandidateChain describe(const CertificateList& chain);

    const Anchors& anchors_;
    SignatureChecks& checks_;
    std::unordered_map<std::string_view, CertificateList>
        candidates_;                                        // by subject, each once, anchors first
    std::unordered_set<std::string_view> known_;            // the bytes of all candidates
    std::unordered_set<std::string_view> platformAnchors_;  // the bytes
    std::unordered_set<std::string_view> allowed_;
    X509CertificateRef leaf_;
    std::size_t shown_ = 0;
    bool exhausted_ = false;
};

}  // namespace pinwell::trust
