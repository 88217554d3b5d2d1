#include "chain_builder.h"

#include <algorithm>

#include "base/bytes.h"

namespace pinwell::trust {
namespace {

enum Preference { identifierFits = 2, identifierAbsent = 1, identifierDiffers = 0 };

int identifierPreference(const X509Certificate& issuer, const X509Certificate& issued) {
    const auto& wanted = issued.extensions().authorityKeyIdentifier;
    const auto& present = issuer.extensions().subjectKeyIdentifier;
    if (!wanted || !present) return identifierAbsent;
    return *wanted == *present ? identifierFits : identifierDiffers;
}

std::unordered_set<std::string_view> bytesOf(const CertificateList& list) {
    std::unordered_set<std::string_view> bytes;
    for (const X509CertificateRef& certificate : list) bytes.insert(base::asText(certificate->der()));
    return bytes;
}

bool contains(const std::unordered_set<std::string_view>& bytes, const X509Certificate& certificate) {
    return bytes.contains(base::asText(certificate.der()));
}

/// Whether the chain has the certificate, or another with its subject and key.
bool repeats(const CertificateList& chain, const X509Certificate& candidate) {
    return std::any_of(chain.begin(), chain.end(), [&](const X509CertificateRef& member) {
        return member->der() == candidate.der() || member->hasSameSubjectAndKeyAs(candidate);
    });
}

}  // namespace

std::optional<bool> SignatureChecks::verifies(const X509CertificateRef& issuer,
                                              const X509CertificateRef& issued) {
    const std::pair pair(issuer, issued);
    const auto known = made_.find(pair);
    if (known != made_.end()) return known->second;
    if (made_.size() >= kMaximumSignatureChecks) return std::nullopt;
    return made_.emplace(pair, issuer->verifiesSignatureOf(*issued)).first->second;
}

ChainBuilder::ChainBuilder(const CertificateList& given, const CertificateList& platformAnchors,
                           const Anchors& anchors, SignatureChecks& checks)
    : anchors_(anchors),
      checks_(checks),
      platformAnchors_(bytesOf(platformAnchors)),
      allowed_(bytesOf(anchors.allowed)),
      leaf_(given.front()) {
    addCandidates(platformAnchors);
    addCandidates(anchors.allowed);
    addCandidates(given);
    // A chain has a distrusted root even if the list leaves the root out.
    addCandidates(anchors.denied.certificates());
}

void ChainBuilder::addCandidates(const CertificateList& list) {
    for (const X509CertificateRef& certificate : list) {
        if (known_.insert(base::asText(certificate->der())).second)
            candidates_[base::asText(certificate->subject().canonical)].push_back(certificate);
    }
}

void ChainBuilder::build(const Visit& visit) {
    CertificateList chain{leaf_};
    extend(chain, visit);
}

/// Returns whether the search is over.
bool ChainBuilder::show(const CertificateList& chain, const Visit& visit) {
    if (shown_ == kMaximumChains) {
        exhausted_ = true;
        return true;
    }
    ++shown_;
    return visit(describe(chain));
}

/// Returns whether the search is over. An issuer whose key does not verify the signature is used only if no
/// other certificate's key does, to show the faulty chain. It is not used if its key identifier differs too,
/// because then only the name is the same.
bool ChainBuilder::extend(CertificateList& chain, const Visit& visit) {
    const X509CertificateRef issued = chain.back();
    const bool canEnd = contains(platformAnchors_, *issued) || contains(allowed_, *issued);
    if (canEnd && show(chain, visit)) return true;

    const auto goTo = [&](const X509CertificateRef& issuer) {
        chain.push_back(issuer);
        const bool over = extend(chain, visit);
        chain.pop_back();
        return over;
    };
    const bool isLongest = chain.size() == kMaximumChainLength;
    X509CertificateRef unverified;
    CertificateList repeated;
    bool hasIssuer = false;
    for (const X509CertificateRef& issuer : namedAs(*issued)) {
        if (repeats(chain, *issuer)) {
            repeated.push_back(issuer);
        } else if (verifies(issuer, issued)) {
            hasIssuer = true;
            if (isLongest) break;
            if (goTo(issuer)) return true;
        } else if (!unverified && identifierPreference(*issuer, *issued) != identifierDiffers) {
            unverified = issuer;
        }
    }
    if (hasIssuer && isLongest) exhausted_ = true;
    if (hasIssuer && !isLongest) return false;
    // A self-signed certificate has an issuer: itself.
    const bool wantsNone = hasIssuer || isLongest || !unverified ||
                           std::any_of(repeated.begin(), repeated.end(),
                                       [&](const X509CertificateRef& one) { return verifies(one, issued); });
    if (!wantsNone) return goTo(unverified);
    return !canEnd && show(chain, visit);
}

/// Certificates with the issuer's name; the ones with a matching key identifier come first.
CertificateList ChainBuilder::namedAs(const X509Certificate& issued) const {
    const auto found = candidates_.find(base::asText(issued.issuer().canonical));
    if (found == candidates_.end()) return {};
    CertificateList issuers = found->second;
    std::stable_sort(issuers.begin(), issuers.end(),
                     [&](const X509CertificateRef& a, const X509CertificateRef& b) {
                         return identifierPreference(*a, issued) > identifierPreference(*b, issued);
                     });
    return issuers;
}

/// Returns false if the signature was not checked.
bool ChainBuilder::verifies(const X509CertificateRef& issuer, const X509CertificateRef& issued) {
    const std::optional<bool> result = checks_.verifies(issuer, issued);
    if (!result) exhausted_ = true;
    return result.value_or(false);
}

CandidateChain ChainBuilder::describe(const CertificateList& chain) {
    CandidateChain result{chain, std::nullopt, std::nullopt, Anchoring::none};
    for (std::size_t i = 0; i < chain.size(); ++i) {
        if (!result.badSignature && i + 1 < chain.size() && !verifies(chain[i + 1], chain[i]))
            result.badSignature = i;
        if (!result.denied && anchors_.denied.reaches(*chain[i])) result.denied = i;
        if (contains(allowed_, *chain[i])) result.anchoring = Anchoring::user;
    }
    if (contains(platformAnchors_, *chain.back())) result.anchoring = Anchoring::platform;
    return result;
}

}  // namespace pinwell::trust
