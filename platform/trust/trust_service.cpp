#include "trust/trust_service.h"

#include <algorithm>
#include <array>
#include <mutex>

#include "chain_builder.h"
#include "policy_checks.h"
#include "trust/public_key.h"
#include "values/format.h"

namespace pinwell::trust {
namespace {

/// Shared by evaluations: the anchors, read on first use, and the clock.
class Environment {
  public:
    Environment(std::function<Anchors()> load, std::function<Date()> now)
        : load_(std::move(load)), now_(std::move(now)) {}

    const Anchors& anchors() {
        std::call_once(loaded_, [this] {
            anchors_ = load_();
            platformAndCompatibility_ = anchors_.roots;
            platformAndCompatibility_.insert(platformAndCompatibility_.end(), anchors_.compatibility.begin(),
                                             anchors_.compatibility.end());
        });
        return anchors_;
    }

    const CertificateList& platformAnchors(AnchorSet set) {
        const CertificateList& roots = anchors().roots;
        return set == AnchorSet::platform ? roots : platformAndCompatibility_;
    }

    Date now() const { return now_(); }

  private:
    std::function<Anchors()> load_;
    std::function<Date()> now_;
    std::once_flag loaded_;
    Anchors anchors_;
    CertificateList platformAndCompatibility_;
};

/// A chain and its faults.
struct Judgement {
    CandidateChain chain;
    std::vector<Failure> failures;

    Verdict verdict() const {
        if (!failures.empty()) return failures.front().verdict;
        return chain.anchoring == Anchoring::platform ? Verdict::unspecified : Verdict::proceed;
    }

    bool isTrusted() const { return failures.empty(); }

    /// The rank of a chain among several for the same leaf. Among bad chains, a distrusted one explains the
    /// refusal best, then one that ends at an anchor.
    int rank() const {
        switch (verdict()) {
            case Verdict::unspecified:
                return 5;
            case Verdict::proceed:
                return 4;
            case Verdict::deny:
                return 3;
            default:
                return chain.anchoring == Anchoring::none ? 1 : 2;
        }
    }
};

/// The result of a search that ended at a bound: only that fact, unless the leaf itself is distrusted.
Judgement exhausted(const CertificateList& given, const Anchors& anchors) {
    Judgement judgement{{{given.front()}, std::nullopt, std::nullopt, Anchoring::none}, {}};
    if (anchors.denied.reaches(*given.front())) {
        judgement.failures.push_back({Verdict::deny, 0, std::string(kDistrusted)});
    } else {
        judgement.failures.push_back({Verdict::recoverableFailure, 0,
                                      "the search for a chain was given up, since the certificates allow too "
                                      "many or too long chains"});
    }
    return judgement;
}

Judgement judge(const CertificateList& given, const Requirements& requirements, Environment& environment,
                SignatureChecks& checks) {
    Judgement best;
    const Date now = environment.now();
    NameConstraintCheck names;
    ChainBuilder builder(given, environment.platformAnchors(requirements.anchors), environment.anchors(),
                         checks);
    builder.build([&](const CandidateChain& chain) {
        Judgement judgement{chain, checkChain(chain, requirements, now, names)};
        if (best.chain.certificates.empty() || judgement.rank() > best.rank()) best = std::move(judgement);
        return best.verdict() == Verdict::unspecified;
    });
    if (builder.isExhausted() && !best.isTrusted()) return exhausted(given, environment.anchors());
    return best;
}

class ChainTrust final : public Trust {
  public:
    ChainTrust(std::shared_ptr<Environment> environment, CertificateList certificates, PolicyRef policy)
        : environment_(std::move(environment)),
          certificates_(std::move(certificates)),
          policy_(std::move(policy)) {}

    Result<void> setPolicy(PolicyRef policy) override {
        if (!policy) return Error::osStatus(kParameterError);
        policy_ = std::move(policy);
        judgement_.reset();
        policyError_.reset();
        return {};
    }

    Result<Verdict> evaluate() override {
        judgement_.reset();
        policyError_.reset();
        const Result<Requirements> requirements = readRequirements(policy_->options);
        if (!requirements) {
            policyError_ = requirements.error().localizedFailureReason();
            return Verdict::otherError;
        }
        judgement_ = judge(certificates_, *requirements, *environment_, checks_);
        return judgement_->verdict();
    }

    Array properties() const override {
        Array all;
        if (!judgement_) return all;
        const CertificateList& chain = judgement_->chain.certificates;
        for (std::size_t i = 0; i < chain.size(); ++i) {
            Dictionary entry;
            entry.emplace(kPropertyTitle, chain[i]->subjectSummary());
            const auto failure = std::find_if(judgement_->failures.begin(), judgement_->failures.end(),
                                              [&](const Failure& one) { return one.certificate == i; });
            if (failure != judgement_->failures.end()) entry.emplace(kPropertyError, failure->reason);
            all.emplace_back(std::move(entry));
        }
        return all;
    }

    std::optional<std::string> failureDescription() const override {
        if (policyError_) return values::format("Policy %@: %@", policy_->oid, *policyError_);
        if (!judgement_ || judgement_->failures.empty()) return std::nullopt;
        const Failure& failure = judgement_->failures.front();
        return values::format("Certificate \"%@\": %@",
                              judgement_->chain.certificates[failure.certificate]->subjectSummary(),
                              failure.reason);
    }

    PublicKeyRef publicKey() const override {
        return judgement_ ? judgement_->chain.certificates.front()->publicKey() : nullptr;
    }

  private:
    std::shared_ptr<Environment> environment_;
    CertificateList certificates_;
    PolicyRef policy_;
    SignatureChecks checks_;  // for all policies together
    std::optional<Judgement> judgement_;
    std::optional<std::string> policyError_;
};

/// The certificates parsed last. A run parses the same few repeatedly (of the stapled and the
/// downloaded ticket, and for both policies of a server), and parsing one costs more than verifying its
/// signature.
class RecentCertificates {
  public:
    X509CertificateRef parse(ByteView der) {
        const std::lock_guard lock(mutex_);
        for (const X509CertificateRef& known : recent_)
            if (known != nullptr && std::ranges::equal(known->der(), der)) return known;
        X509CertificateRef parsed = X509Certificate::parse(der);
        if (parsed != nullptr) recent_[next_++ % recent_.size()] = parsed;
        return parsed;
    }

  private:
    static constexpr std::size_t kKept = 16;

    std::mutex mutex_;
    std::array<X509CertificateRef, kKept> recent_;
    std::size_t next_ = 0;
};

class X509TrustService final : public TrustService {
  public:
    X509TrustService(std::shared_ptr<Environment> environment, std::string securityLibrary)
        : environment_(std::move(environment)), securityLibrary_(std::move(securityLibrary)) {}

    CertificateRef parseCertificate(ByteView der) const override { return certificates_.parse(der); }

    std::optional<PolicyRef> namedPolicy(const std::string& constructorName) const override {
        return trust::namedPolicy(securityLibrary_, constructorName);
    }

    Result<std::shared_ptr<Trust>> makeTrust(std::vector<CertificateRef> certificates,
                                             PolicyRef policy) const override {
        if (certificates.empty() || certificates.size() > kMaximumCertificates || !policy)
            return Error::osStatus(kParameterError);
        CertificateList list;
        for (const CertificateRef& certificate : certificates) {
            X509CertificateRef ours = std::dynamic_pointer_cast<const X509Certificate>(certificate);
            if (!ours) return Error::osStatus(kParameterError);
            list.push_back(std::move(ours));
        }
        return std::shared_ptr<Trust>(
            std::make_shared<ChainTrust>(environment_, std::move(list), std::move(policy)));
    }

    Result<void> verifySignature(const PublicKey& key, ByteView message, ByteView signature) const override {
        const auto* const ours = dynamic_cast<const X509PublicKey*>(&key);
        if (ours == nullptr) return Error::osStatus(kParameterError);
        if (verifyEcdsa(*ours, message, signature)) return {};
        return Error(base::kOSStatusErrorDomain, kSignatureError, "The signature does not verify.");
    }

  private:
    std::shared_ptr<Environment> environment_;
    std::string securityLibrary_;
    mutable RecentCertificates certificates_;
};

}  // namespace

std::unique_ptr<TrustService> makeTrustService(std::function<Anchors()> loadAnchors,
                                               std::function<Date()> now, std::string securityLibrary) {
    return std::make_unique<X509TrustService>(
        std::make_shared<Environment>(std::move(loadAnchors), std::move(now)), std::move(securityLibrary));
}

std::unique_ptr<TrustService> makeTrustService(config::PlatformDirectory directory,
                                               std::function<void(std::string_view)> logError,
                                               std::function<Date()> now) {
    return makeTrustService([directory = std::move(directory),
                             logError = std::move(logError)] { return loadAnchors(directory, logError); },
                            std::move(now));
}

}  // namespace pinwell::trust
