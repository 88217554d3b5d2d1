// Judges a ticket. satchel_get_validated_tm_ticket decides, as in the tool. A refused ticket is checked
// again, step by step, to find the reason.
#include <algorithm>
#include <utility>

#include "foundation/date.h"
#include "foundation/format.h"
#include "foundation/value.h"
#include "library/conversion.h"
#include "library/roots.h"
#include "src/satchel.h"
#include "src/satchel_internal.h"
#include "src/tm_ticket.h"
#include "trust/trust_service.h"

namespace pinwell::ticket {
inline namespace v0 {
namespace {

constexpr auto numberOf = [](trust::Verdict verdict) { return static_cast<std::uint32_t>(verdict); };
static_assert(kVerdictNone == numberOf(trust::Verdict::invalid));
static_assert(kVerdictProceed == numberOf(trust::Verdict::proceed));
static_assert(kVerdictDeny == numberOf(trust::Verdict::deny));
static_assert(kVerdictUnspecified == numberOf(trust::Verdict::unspecified));
static_assert(kVerdictRecoverableFailure == numberOf(trust::Verdict::recoverableFailure));
static_assert(kVerdictFatalFailure == numberOf(trust::Verdict::fatalFailure));
static_assert(kVerdictOtherError == numberOf(trust::Verdict::otherError));

/// Finds the reason for a refusal. Takes the steps of satchel_verify_signature, in the same order.
class Explanation {
  public:
    Explanation(ByteView ticket, trust::TrustService& service) : ticket_(ticket), service_(service) {}

    Validation run() && {
        // Each returns false if it has found the reason.
        const bool isSound =
            readFrame() && readCertificates() && judgeChain() && checkSignature() && readPayload();
        if (isSound) refuse(Step::memory, 0, "there is not enough memory to judge the ticket");
        return std::move(found_);
    }

  private:
    bool refuse(Step step, std::uint64_t offset, std::string reason) {
        found_.step = step;
        found_.offset = offset;
        found_.reason = std::move(reason);
        return false;
    }
    bool refuse(Step step, std::uint64_t base, const ticket_fault& fault) {
        return refuse(step, base + fault.offset, fault.rule);
    }
    std::uint64_t offsetOf(const std::byte* part) const { return offsetIn(ticket_, part); }

    bool readFrame() {
        const satchel_survey frame = satchel_survey_container(ticket_);
        view_ = frame.view;
        return !frame.fault || refuse(Step::container, 0, *frame.fault);
    }

    bool readCertificates() {
        const ByteView block(view_.certificates, view_.certificates_length);
        block_ = satchel_survey_certificates(block);
        for (std::size_t i = 0; i < block_.count; ++i) {
            certificates_.push_back(service_.createCertificate(block_.elements[i]));
            if (certificates_.back() == nullptr)
                return refuse(Step::certificates, offsetOf(block_.elements[i].data()),
                              foundation::format("certificate %zu cannot be read", i + 1));
        }
        return !block_.fault || refuse(Step::certificates, offsetOf(block.data()), *block_.fault);
    }

    bool judgeChain() {
        const std::uint64_t block = offsetOf(view_.certificates);
        trust::PolicyRef policy;
        if (_satchel_create_cert_policy(&policy, service_) != satchel_status::kSuccess)
            return refuse(Step::policy, block, "the platform security library has no policy for tickets");
        auto verdict = trust::Verdict::invalid;
        const bool isJudged = service_.createTrust(certificates_, policy, trust_) == trust::kSuccess &&
                              trust_ != nullptr && trust_->evaluate(verdict) == trust::kSuccess;
        found_.verdict = numberOf(verdict);
        if (!isJudged) return refuse(Step::chain, block, "the chain could not be judged");
        if (verdict == trust::Verdict::unspecified) return true;
        if (verdict == trust::Verdict::proceed)
            return refuse(Step::chain, block, "only the user's own settings trust the chain");
        const std::string reason = trust_->copyFailureDescription().value_or("the chain is not trusted");
        return refuse(Step::chain, offsetAtFault(reason).value_or(block), reason);
    }

    // The offset of the certificate in the description; `nullopt` if it is not one of the ticket's.
    std::optional<std::uint64_t> offsetAtFault(const std::string& description) const {
        for (const foundation::Value& link : trust_->copyProperties()) {
            const std::string* const title = link[trust::kPropertyTitle].string();
            const std::string* const error = link[trust::kPropertyError].string();
            if (title == nullptr || error == nullptr || !description.ends_with(*error)) continue;
            for (std::size_t i = 0; i < certificates_.size(); ++i)
                if (certificates_[i]->subjectSummary() == *title) return offsetOf(block_.elements[i].data());
        }
        return std::nullopt;
    }

    bool checkSignature() {
        const trust::PublicKeyRef key = trust_->copyPublicKey();
        const bool verifies =
            key != nullptr &&
            _satchel_validate_signature(*key, ByteView(view_.signed_data, view_.signed_data_length),
                                        ByteView(view_.signature, view_.signature_length),
                                        service_) == satchel_status::kSuccess;
        return verifies ||
               refuse(Step::signature, offsetOf(view_.signature), "the signature does not verify");
    }

    bool readPayload() {
        const ByteView payload(view_.payload, view_.payload_length);
        const tm_ticket_survey survey = tm_ticket_survey_payload(payload);
        return !survey.fault || refuse(Step::payload, offsetOf(payload.data()), *survey.fault);
    }

    ByteView ticket_;
    trust::TrustService& service_;
    Validation found_;
    satchel_view view_;
    satchel_certificate_block block_;
    std::vector<trust::CertificateRef> certificates_;
    std::shared_ptr<trust::Trust> trust_;
};

}  // namespace

Validation validate(ByteView ticket, const TrustedRoots& roots, std::int64_t evaluationTime,
                    std::span<const ByteView> cdhashes) {
    const auto& contents = TrustedRootsAccess::contentsOf(roots);
    const auto service = trust::makeTrustService([&] { return contents->anchors; },
                                                 [&] { return foundation::Date{evaluationTime}; });
    tm_ticket* decoded = nullptr;
    if (satchel_get_validated_tm_ticket(ticket.data(), ticket.size(), &decoded, *service) != 0)
        return Explanation(ticket, *service).run();

    const tm_ticket_ptr genuine(decoded);
    Validation validation;
    validation.isGenuine = true;
    validation.verdict = kVerdictUnspecified;
    validation.isRevoked = (tm_ticket_get_flags(genuine.get()) & kTicketRevoked) != 0;
    validation.isListed = std::ranges::any_of(
        cdhashes, [&](ByteView cdhash) { return tm_ticket_lists_cdhash(genuine.get(), cdhash); });
    return validation;
}

}  // namespace v0
}  // namespace pinwell::ticket
