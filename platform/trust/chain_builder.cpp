#include "trust/chain_builder.h"

#include <algorithm>

namespace pinwell::trust {
namespace {

enum Preference { identifierFits = 2, identifierAbsent = 1, identifierDiffers = 0 };

int identifierPreference(const X509Certificate& issuer, const X509Certificate& issued) {
    const auto& wanted = issued.extensions().authorityKeyIdentifier;
    const auto& present = issuer.extensions().subjectKeyIdentifier;
    if (!wanted || !present) return identifierAbsent;
    return *wanted == *present ? identifierFits : identifierDiffers;
}

}  // namespace

ChainBuilder::ChainBuilder(const CertificateList& given, const CertificateList& platformAnchors,
                           const Anchors& anchors)
    : platformAnchors_(platformAnchors), anchors_(anchors), leaf_(given.front()) {
    const auto add = [this](const CertificateList& list) {
        for (const X509CertificateRef& certificate : list) {
            if (!contains(candidates_, *certificate)) candidates_.push_back(certificate);
        }
    };
    add(platformAnchors);
    add(anchors.allowed);
    add(given);
    // A chain whose distrusted root was left out of the list is a chain with a distrusted root all the same.
    add(anchors.denied);
}

void ChainBuilder::build(const std::function<bool(const CandidateChain&)>& visit) {
    CertificateList chain{leaf_};
    extend(chain, visit);
}

/// Answers whether the search is over.
bool ChainBuilder::extend(CertificateList& chain, const std::function<bool(const CandidateChain&)>& visit) {
    const auto show = [&] {
        ++shown_;
        return visit(describe(chain)) || shown_ >= kMaximumChains;
    };
    const bool canEnd =
        contains(platformAnchors_, *chain.back()) || contains(anchors_.allowed, *chain.back());
    if (canEnd && show()) return true;
    const std::vector<Issuer> issuers =
        chain.size() < kMaximumChainLength ? issuersFor(chain) : std::vector<Issuer>{};
    if (issuers.empty()) return !canEnd && show();
    for (const Issuer& issuer : issuers) {
        chain.push_back(issuer.certificate);
        const bool over = extend(chain, visit);
        chain.pop_back();
        if (over) return true;
    }
    return false;
}

/// Certificates that could stand next in the chain, best first. One whose key does not verify the signature
/// is shown only when no certificate's key does, so that the chain can be seen with what is wrong in it; and
/// not when its key identifier differs as well, for then it merely has the same name.
std::vector<ChainBuilder::Issuer> ChainBuilder::issuersFor(const CertificateList& chain) {
    const X509CertificateRef& issued = chain.back();
    std::vector<Issuer> issuers;
    bool hasIssuer = false;
    for (const X509CertificateRef& candidate : candidates_) {
        if (!candidate->isNamedAsIssuerOf(*issued)) continue;
        const Issuer issuer{candidate, verifies(candidate, issued),
                            identifierPreference(*candidate, *issued)};
        hasIssuer = hasIssuer || issuer.verifies;  // a self-signed certificate has one: itself
        if (!issuer.verifies && issuer.preference == identifierDiffers) continue;
        const bool repeats = std::any_of(chain.begin(), chain.end(), [&](const X509CertificateRef& member) {
            return member->der() == candidate->der() || member->hasSameSubjectAndKeyAs(*candidate);
        });
        if (!repeats) issuers.push_back(issuer);
    }
    if (hasIssuer) std::erase_if(issuers, [](const Issuer& issuer) { return !issuer.verifies; });
    std::stable_sort(issuers.begin(), issuers.end(),
                     [](const Issuer& a, const Issuer& b) { return a.preference > b.preference; });
    if (!hasIssuer && issuers.size() > 1) issuers.erase(issuers.begin() + 1, issuers.end());
    return issuers;
}

bool ChainBuilder::verifies(const X509CertificateRef& issuer, const X509CertificateRef& issued) {
    const std::pair pair(issuer.get(), issued.get());
    const auto known = checkedSignatures_.find(pair);
    if (known != checkedSignatures_.end()) return known->second;
    if (checkedSignatures_.size() >= kMaximumSignatureChecks) return false;
    return checkedSignatures_.emplace(pair, issuer->verifiesSignatureOf(*issued)).first->second;
}

CandidateChain ChainBuilder::describe(const CertificateList& chain) {
    CandidateChain result{chain, std::nullopt, std::nullopt, Anchoring::none};
    for (std::size_t i = 0; i < chain.size(); ++i) {
        if (!result.badSignature && i + 1 < chain.size() && !verifies(chain[i + 1], chain[i]))
            result.badSignature = i;
        if (!result.denied && isDistrusted(*chain[i], anchors_.denied)) result.denied = i;
        if (contains(anchors_.allowed, *chain[i])) result.anchoring = Anchoring::user;
    }
    if (contains(platformAnchors_, *chain.back())) result.anchoring = Anchoring::platform;
    return result;
}

}  // namespace pinwell::trust
