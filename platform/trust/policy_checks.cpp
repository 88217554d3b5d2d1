#include "policy_checks.h"

#include <algorithm>

#include "trust/general_name.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::trust {
namespace {

using values::format;

/// Collects the faults of one chain.
class Examination {
  public:
    Examination(const CandidateChain& chain, const Requirements& requirements, Date now,
                NameConstraintCheck& names)
        : chain_(chain),
          certificates_(chain.certificates),
          requirements_(requirements),
          now_(now),
          names_(names) {}

    std::vector<Failure> run() && {
        checkTrustAndSignatures();
        for (std::size_t i = 0; i < certificates_.size(); ++i) checkCertificate(i);
        for (std::size_t i = 0; i + 1 < certificates_.size(); ++i) checkStep(i);
        checkLeaf();
        checkChainAsAWhole();
        std::stable_sort(failures_.begin(), failures_.end(), [](const Failure& a, const Failure& b) {
            return gravity(a.verdict) > gravity(b.verdict);
        });
        return std::move(failures_);
    }

  private:
    static int gravity(Verdict verdict) {
        switch (verdict) {
            case Verdict::deny:
                return 3;
            case Verdict::fatalFailure:
                return 2;
            default:
                return 1;
        }
    }

    void fail(Verdict verdict, std::size_t certificate, std::string reason) {
        failures_.push_back({verdict, certificate, std::move(reason)});
    }
    void fail(std::size_t certificate, std::string reason) {
        fail(Verdict::recoverableFailure, certificate, std::move(reason));
    }

    void checkTrustAndSignatures() {
        const std::size_t last = certificates_.size() - 1;
        if (chain_.denied) fail(Verdict::deny, *chain_.denied, std::string(kDistrusted));
        if (chain_.badSignature) {
            fail(Verdict::fatalFailure, *chain_.badSignature,
                 "its issuer's key does not verify the signature");
        }
        for (std::size_t i = 0; i < last; ++i) {
            if (certificates_[i]->hasWeakSignatureDigest()) fail(i, "the signature rests on a weak digest");
        }
        if (chain_.anchoring == Anchoring::none) {
            fail(last, certificates_[last]->isSelfIssued()
                           ? "the root certificate is not trusted for this purpose"
                           : "no trusted issuer was found");
        }
    }

    void checkCertificate(std::size_t i) {
        const X509Certificate& certificate = *certificates_[i];
        if (requirements_.criticalExtensions) checkExtensions(i);
        if (requirements_.nonEmptySubject && certificate.hasEmptySubject())
            fail(i, "the subject name is empty");
        if (requirements_.validityDates) {
            if (now_ < certificate.notBefore()) fail(i, "the certificate is not valid yet");
            if (now_ > certificate.notAfter()) fail(i, "the certificate has expired");
        }
        if (requirements_.keySizes) checkKeySize(i);
    }

    void checkExtensions(std::size_t i) {
        const CertificateExtensions& extensions = certificates_[i]->extensions();
        if (!extensions.malformed.empty()) {
            fail(Verdict::fatalFailure, i,
                 format("the extension %@ is malformed", extensions.malformed.front()));
        }
        for (const auto& entry : extensions.entries) {
            if (!entry.critical || isUnderstoodExtension(entry.oid, requirements_.nameConstraints) ||
                isMarkerOfPolicy(entry.oid))
                continue;
            fail(Verdict::fatalFailure, i, format("the critical extension %@ is not known", entry.oid));
            return;
        }
    }

    bool isMarkerOfPolicy(std::string_view oid) const {
        const auto names = [&](const std::vector<std::string>& markers) {
            return std::find(markers.begin(), markers.end(), oid) != markers.end();
        };
        return names(requirements_.leafMarkers) || names(requirements_.intermediateMarkers);
    }

    /// The policy admits only key types for which it has a minimum.
    void checkKeySize(std::size_t i) {
        const auto& key = certificates_[i]->publicKey();
        if (!key) return fail(i, "the public key cannot be used");
        const auto minimum = requirements_.keySizes->find(key->type());
        if (minimum == requirements_.keySizes->end()) return fail(i, "the policy admits no key of this kind");
        if (key->bits() < minimum->second) {
            fail(i, format("the key has %zu bits; at least %lu are needed", key->bits(), minimum->second));
        }
    }

    /// The step from certificate i to its issuer.
    void checkStep(std::size_t i) {
        const CertificateExtensions& issued = certificates_[i]->extensions();
        const CertificateExtensions& issuer = certificates_[i + 1]->extensions();
        if (requirements_.idLinkage && issued.authorityKeyIdentifier && issuer.subjectKeyIdentifier &&
            *issued.authorityKeyIdentifier != *issuer.subjectKeyIdentifier) {
            fail(i, "the authority key identifier is not the issuer's");
        }
        if (requirements_.basicConstraints) checkAuthority(i + 1);
        if (requirements_.nameConstraints && issuer.nameConstraints) checkNames(i + 1);
        if (requirements_.serverAuthentication && issuer.purposes && !issuer.purposes->any &&
            !issuer.purposes->serverAuthentication) {
            fail(i + 1, "the issuer's purposes do not include server authentication");
        }
    }

    /// The constraints of certificate i apply to the host and to every certificate below. A self-issued one
    /// in between is exempt (RFC 5280, 6.1.3 (b)).
    void checkNames(std::size_t i) {
        const NameConstraints& constraints = *certificates_[i]->extensions().nameConstraints;
        if (requirements_.hostName && !isPermitted(i, names_.judgeHost(constraints, *requirements_.hostName)))
            return;
        for (std::size_t below = 0; below < i; ++below) {
            const auto& names = certificates_[below]->extensions().alternativeNames;
            if (!names || (below != 0 && certificates_[below]->isSelfIssued())) continue;
            if (!isPermitted(i, names_.judge(constraints, *names))) return;
        }
    }

    bool isPermitted(std::size_t i, NameJudgement judgement) {
        switch (judgement) {
            case NameJudgement::permitted:
                return true;
            case NameJudgement::excluded:
                fail(i, "the name constraints exclude the host or a name of a certificate below");
                break;
            case NameJudgement::unhandled:
                fail(i, "the name constraints have a form that is not handled");
                break;
            case NameJudgement::tooMany:
                fail(i, "there are too many names and name constraints to compare");
                break;
        }
        return false;
    }

    /// In a CA, the basic constraints say so, and the key usage, if present, permits it (RFC 5280,
    /// 6.1.4).
    void checkAuthority(std::size_t i) {
        const CertificateExtensions& extensions = certificates_[i]->extensions();
        if (!extensions.basicConstraints || !extensions.basicConstraints->isCertificateAuthority) {
            return fail(i, "the certificate is not a certificate authority's");
        }
        if (extensions.keyUsage && (*extensions.keyUsage & kKeyUsageCertificateSigning) == 0) {
            return fail(i, "the key usage does not permit signing certificates");
        }
        // Intermediates below it count; self-issued ones do not (RFC 5280, 4.2.1.9).
        const auto below =
            std::count_if(certificates_.begin() + 1, certificates_.begin() + static_cast<std::ptrdiff_t>(i),
                          [](const X509CertificateRef& certificate) { return !certificate->isSelfIssued(); });
        const auto& limit = extensions.basicConstraints->pathLength;
        if (limit && static_cast<std::uint64_t>(below) > *limit)
            fail(i, "the chain is longer than its path length");
    }

    void checkLeaf() {
        const CertificateExtensions& leaf = certificates_.front()->extensions();
        for (const std::string& marker : requirements_.leafMarkers) {
            if (!leaf.carries(marker)) fail(0, format("the leaf marker %@ is missing", marker));
        }
        if (requirements_.hostName &&
            (!leaf.alternativeNames || !coversHost(*leaf.alternativeNames, *requirements_.hostName))) {
            fail(0, format("the certificate is not for the host %@", *requirements_.hostName));
        }
        if (requirements_.serverAuthentication) checkLeafPurpose(leaf);
    }

    /// The purpose must be named: a policy may require that (RFC 5280, 4.2.1.12). "Any purpose" is not
    /// sufficient.
    void checkLeafPurpose(const CertificateExtensions& leaf) {
        if (!leaf.purposes || !leaf.purposes->serverAuthentication)
            fail(0, "the certificate is not for server authentication");
        if (leaf.keyUsage && (*leaf.keyUsage & usesOfTls()) == 0)
            fail(0, "the key usage does not permit TLS");
    }

    /// Servers sign in TLS (RFC 8446, 4.4.2.2), and with the RSA key exchange of TLS 1.2 they decrypt instead
    /// (RFC 5246, 7.4.2). Key agreement with the certificate's own key is not offered.
    std::uint32_t usesOfTls() const {
        const auto& key = certificates_.front()->publicKey();
        const bool isRsa = key && key->type() == kKeyTypeRSA;
        return kKeyUsageDigitalSignature | (isRsa ? kKeyUsageKeyEncipherment : 0U);
    }

    void checkChainAsAWhole() {
        const std::size_t length = certificates_.size();
        if (requirements_.chainLength && *requirements_.chainLength != length) {
            fail(length - 1,
                 format("the chain has %zu certificates instead of %lu", length, *requirements_.chainLength));
        }
        if (requirements_.intermediateMarkers.empty()) return;
        if (length < 3) fail(length - 1, "the chain has no intermediate certificate");
        for (std::size_t i = 1; i + 1 < length; ++i) {
            for (const std::string& marker : requirements_.intermediateMarkers) {
                if (certificates_[i]->extensions().carries(marker)) continue;
                fail(i, format("the intermediate marker %@ is missing", marker));
            }
        }
    }

    const CandidateChain& chain_;
    const CertificateList& certificates_;
    const Requirements& requirements_;
    Date now_;
    NameConstraintCheck& names_;
    std::vector<Failure> failures_;
};

}  // namespace

std::vector<Failure> checkChain(const CandidateChain& chain, const Requirements& requirements, Date now,
                                NameConstraintCheck& names) {
    return Examination(chain, requirements, now, names).run();
}

}  // namespace pinwell::trust
