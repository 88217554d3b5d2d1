// A trust service with results set by the test, which records its calls.
//
//   FakeTrustService service;
//   service.evaluations = {{.verdict = trust::Verdict::recoverableFailure}, {}};   // refuses once, then
//   accepts
//   ... run what is under test ...
//   EXPECT_EQ(service.policies.size(), 2U);
//
// The service must outlive the trust objects it makes. Not for several threads at once.
#pragma once

#include <algorithm>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "support/status.h"
#include "trust/trust.h"

namespace pinwell::test {

/// A certificate of any bytes.
class FakeCertificate : public trust::Certificate {
  public:
    explicit FakeCertificate(base::ByteView der, std::string summary = "certificate")
        : der_(base::toData(der)), summary_(std::move(summary)) {}

    const base::Data& der() const override { return der_; }
    std::string subjectSummary() const override { return summary_; }

  private:
    base::Data der_;
    std::string summary_;
};

class FakePublicKey : public trust::PublicKey {};

class FakeTrustService : public trust::TrustService {
  public:
    /// The result of one evaluate() call, and the later state of the trust object.
    struct Evaluation {
        trust::Status status = trust::kSuccess;
        trust::Verdict verdict = trust::Verdict::unspecified;
        trust::Array properties = {};
        std::optional<std::string> failureDescription = std::nullopt;
    };
    struct SignatureCheck {
        base::Data message;
        base::Data signature;
    };

    // Results. Each call takes a list's next entry, and the last one stays; an empty list is success.
    std::function<bool(base::ByteView)> parsesCertificate = [](base::ByteView) { return true; };
    std::optional<trust::PolicyRef> libraryPolicy;  // of namedPolicy
    trust::Status makeTrustStatus = trust::kSuccess;
    bool makesTrustObject = true;
    std::vector<trust::Status> setPolicyStatuses;
    std::vector<Evaluation> evaluations;
    trust::PublicKeyRef publicKey = std::make_shared<FakePublicKey>();
    std::optional<trust::Error> signatureError;

    // Records, in the order of the calls.
    mutable std::vector<base::Data> parsedCertificates;
    mutable std::vector<std::string> namedPolicyRequests;
    mutable std::vector<std::vector<base::Data>> certificateLists;  // of makeTrust
    mutable std::vector<trust::PolicyRef> policies;                 // of makeTrust and setPolicy
    mutable std::size_t evaluationCount = 0;
    mutable std::vector<SignatureCheck> signatureChecks;

    trust::CertificateRef parseCertificate(base::ByteView der) const override {
        parsedCertificates.push_back(base::toData(der));
        return parsesCertificate(der) ? std::make_shared<FakeCertificate>(der) : nullptr;
    }

    std::optional<trust::PolicyRef> namedPolicy(const std::string& constructorName) const override {
        namedPolicyRequests.push_back(constructorName);
        return libraryPolicy;
    }

    base::Result<std::shared_ptr<trust::Trust>> makeTrust(std::vector<trust::CertificateRef> certificates,
                                                          trust::PolicyRef policy) const override {
        auto& list = certificateLists.emplace_back();
        for (const auto& certificate : certificates) list.push_back(certificate->der());
        policies.push_back(std::move(policy));
        return withStatus(makeTrustStatus, makesTrustObject ? trustOfChallenge() : nullptr);
    }

    base::Result<void> verifySignature(const trust::PublicKey&, base::ByteView message,
                                       base::ByteView signature) const override {
        signatureChecks.push_back({base::toData(message), base::toData(signature)});
        if (signatureError) return *signatureError;
        return {};
    }

    /// A trust object like one in an HTTPS challenge: not made by makeTrust.
    std::shared_ptr<trust::Trust> trustOfChallenge() const { return std::make_shared<FakeTrust>(*this); }

  private:
    class FakeTrust : public trust::Trust {
      public:
        explicit FakeTrust(const FakeTrustService& service) : service_(service) {}

        base::Result<void> setPolicy(trust::PolicyRef policy) override {
            service_.policies.push_back(std::move(policy));
            last_.reset();
            return withStatus(pick(service_.setPolicyStatuses, service_.setPolicyCount_++));
        }
        base::Result<trust::Verdict> evaluate() override {
            last_ = pick(service_.evaluations, service_.evaluationCount++);
            return withStatus(last_->status, last_->verdict);
        }
        trust::Array properties() const override { return last_ ? last_->properties : trust::Array{}; }
        std::optional<std::string> failureDescription() const override {
            return last_ ? last_->failureDescription : std::nullopt;
        }
        trust::PublicKeyRef publicKey() const override { return last_ ? service_.publicKey : nullptr; }

      private:
        template <class T>
        static T pick(const std::vector<T>& answers, std::size_t index) {
            return answers.empty() ? T{} : answers[std::min(index, answers.size() - 1)];
        }

        const FakeTrustService& service_;
        std::optional<Evaluation> last_;
    };

    mutable std::size_t setPolicyCount_ = 0;
};

}  // namespace pinwell::test
