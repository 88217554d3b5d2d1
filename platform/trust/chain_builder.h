// Builds chains from a leaf and candidates (RFC 4158 describes the pitfalls).
//
// A chain goes from issuer to issuer, by name. Among several candidates whose key verifies the signature, a
// fitting key identifier comes first, then an anchor. X509_verify_cert is not used: it checks dates, purposes
// and more on its own, but a policy here is only its options.
//
// The search is bounded, because certificates that share one name would need a check of every pair and a
// chain for every order. A search that ends at a bound has proved nothing about the leaf, and reports
// that.
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
inline constexpr std::size_t kMaximumChains = 64;  // tried for one leaf

/// For one list, under any number of policies. The slowest check, of an RSA key of 8192 bits or a point of
/// 512, takes about 3 ms.
inline constexpr std::size_t kMaximumSignatureChecks = 256;

enum class Anchoring {
    none,
    user,      // it has a certificate of user-trust/allow, and does not end at a platform anchor
    platform,  // it ends at an anchor that the policy admits
};

struct CandidateChain {
    CertificateList certificates;             // leaf first
    std::optional<std::size_t> badSignature;  // the first one not verified by the next one's key
    std::optional<std::size_t> denied;        // the first that the user distrusts
    Anchoring anchoring = Anchoring::none;
};

/// Caches checks of signatures, up to a bound. Keeps the certificates alive.
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
    /// `given` is leaf first and not empty; `platformAnchors` are the ones that the policy admits.
    ChainBuilder(const CertificateList& given, const CertificateList& platformAnchors, const Anchors& anchors,
                 SignatureChecks& checks);

    /// Passes chains to `visit`, the likeliest first, until it returns true or there are no more.
    void build(const std::function<bool(const CandidateChain&)>& visit);

    /// Whether a bound ended the search, so that other chains may exist.
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
