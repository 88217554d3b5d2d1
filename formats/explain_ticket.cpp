#include "formats/explain_ticket.h"

#include <algorithm>
#include <limits>
#include <utility>

#include "values/format.h"
#include "values/value.h"

namespace pinwell {
namespace {

using base::ByteView;

// Of a payload.
constexpr std::uint64_t kFlagsOffset = 12;

/// Takes the steps of satchel_get_validated_tm_ticket, in the same order.
class Explanation {
  public:
    Explanation(ByteView ticket, trust::TrustService& service) : ticket_(ticket), service_(service) {}

    TicketRefusal run() && {
        // Each returns false if it has found the reason.
        const bool isSound =
            readFrame() && readCertificates() && judgeChain() && checkSignature() && readPayload();
        if (isSound) refuse(RefusalStep::memory, 0, "there is not enough memory to judge the ticket");
        return std::move(found_);
    }

  private:
    bool refuse(RefusalStep step, std::uint64_t offset, std::string reason) {
        found_.step = step;
        found_.offset = offset;
        found_.reason = std::move(reason);
        return false;
    }
    bool refuse(RefusalStep step, std::uint64_t base, const TicketFault& fault) {
        return refuse(step, base + fault.offset, fault.rule);
    }
    std::uint64_t offsetOf(const std::byte* part) const {
        return static_cast<std::uint64_t>(part - ticket_.data());
    }

    bool readFrame() {
        const SatchelSurvey frame = surveySatchelContainer(ticket_);
        view_ = frame.view;
        return !frame.fault || refuse(RefusalStep::container, 0, *frame.fault);
    }

    bool readCertificates() {
        const ByteView block(view_.certificates, view_.certificatesLength);
        block_ = surveySatchelCertificates(block);
        const auto fault = explainCertificates(block, block_, service_, &certificates_);
        return !fault || refuse(fault->step, offsetOf(block.data()) + fault->offset, fault->reason);
    }

    bool judgeChain() {
        const JudgedChain chain = judgeTicketChain(certificates_, service_);
        trust_ = chain.evaluated;
        found_.verdict = chain.verdict;
        if (chain.isTrusted()) return true;
        const auto faulty = chain.faultyCertificate(certificates_);
        return refuse(chain.step, offsetOf(faulty ? block_.elements[*faulty].data() : view_.certificates),
                      chain.reason());
    }

    bool checkSignature() {
        const trust::PublicKeyRef key = trust_->publicKey();
        const bool verifies = key != nullptr && _satchel_validate_signature(
                                                    *key, ByteView(view_.signedData, view_.signedDataLength),
                                                    ByteView(view_.signature, view_.signatureLength),
                                                    service_) == satchel_status::kSuccess;
        return verifies ||
               refuse(RefusalStep::signature, offsetOf(view_.signature), "the signature does not verify");
    }

    bool readPayload() {
        const ByteView payload(view_.payload, view_.payloadLength);
        const TicketSurvey survey = surveyTicketPayload(payload);
        return !survey.fault || refuse(RefusalStep::payload, offsetOf(payload.data()), *survey.fault);
    }

    ByteView ticket_;
    trust::TrustService& service_;
    TicketRefusal found_;
    satchel_view view_;
    SatchelCertificateBlock block_;
    std::vector<trust::CertificateRef> certificates_;
    std::shared_ptr<trust::Trust> trust_;
};

TicketRefusal genuineButRefused(RefusalStep step, ByteView ticket, std::uint64_t offsetInPayload,
                                const char* reason) {
    const std::byte* const payload = surveySatchelContainer(ticket).view.payload;
    return {step, static_cast<std::uint64_t>(payload - ticket.data()) + offsetInPayload, reason,
            trust::Verdict::unspecified};
}

std::optional<TicketRefusal> explainRevoked(ByteView ticket, const tm_ticket* genuine) {
    if (!ticketRevokes(genuine)) return std::nullopt;
    return genuineButRefused(RefusalStep::revoked, ticket, kFlagsOffset,
                             "the ticket marks the software as revoked");
}

// `isListed` is asked only about a ticket that is genuine and not revoked.
TicketVerdict judgeWith(const std::optional<base::Data>& ticket, trust::TrustService& trust,
                        const std::function<bool(const tm_ticket* genuine)>& isListed) {
    if (!ticket || ticket->empty()) return TicketVerdict::refused;
    if (ticket->size() > std::numeric_limits<std::uint32_t>::max()) return TicketVerdict::refused;

    const TicketPointer genuine = genuineTicket(*ticket, trust);
    if (genuine == nullptr) return TicketVerdict::refused;
    if (ticketRevokes(genuine.get())) return TicketVerdict::revoked;
    return isListed(genuine.get()) ? TicketVerdict::acceptable : TicketVerdict::refused;
}

// Sorted, so that many hashes are found in a long list without comparing each with each.
std::vector<base::Data> sortedHashesIn(const tm_ticket* ticket) {
    std::vector<base::Data> hashes = hashesInTicket(ticket);
    std::sort(hashes.begin(), hashes.end());
    return hashes;
}

}  // namespace

TicketVerdict judgeTicket(const std::optional<base::Data>& ticket,
                          const std::function<std::optional<base::Data>()>& hash,
                          trust::TrustService& trust) {
    return judgeWith(ticket, trust, [&](const tm_ticket* decoded) {
        const auto wanted = hash();
        return wanted && ticketListsHash(decoded, *wanted);
    });
}

TicketVerdict judgeTicket(const std::optional<base::Data>& ticket, const std::vector<base::Data>& hashes,
                          trust::TrustService& trust) {
    return judgeWith(ticket, trust, [&](const tm_ticket* decoded) {
        const std::vector<base::Data> listed = sortedHashesIn(decoded);
        return !hashes.empty() && std::all_of(hashes.begin(), hashes.end(), [&](const base::Data& wanted) {
            return std::binary_search(listed.begin(), listed.end(), wanted);
        });
    });
}

std::optional<TicketRefusal> explainTicket(ByteView ticket, trust::TrustService& service) {
    const TicketPointer genuine = genuineTicket(ticket, service);
    return genuine == nullptr ? explainRefusedTicket(ticket, service) : explainRevoked(ticket, genuine.get());
}

std::optional<TicketRefusal> explainTicket(ByteView ticket, const std::optional<base::Data>& cdhash,
                                           trust::TrustService& service) {
    const TicketPointer genuine = genuineTicket(ticket, service);
    if (genuine == nullptr) return explainRefusedTicket(ticket, service);
    if (auto revoked = explainRevoked(ticket, genuine.get())) return revoked;
    if (!cdhash) return genuineButRefused(RefusalStep::listing, ticket, kTicketHeaderSize, kNothingToList);
    if (!ticketListsHash(genuine.get(), *cdhash))
        return genuineButRefused(RefusalStep::listing, ticket, kTicketHeaderSize, kNotListed);
    return std::nullopt;
}

TicketRefusal explainRefusedTicket(ByteView ticket, trust::TrustService& service) {
    return Explanation(ticket, service).run();
}

std::optional<TicketRefusal> explainCertificates(ByteView block, const SatchelCertificateBlock& survey,
                                                 trust::TrustService& service,
                                                 std::vector<trust::CertificateRef>* certificates) {
    for (std::size_t i = 0; i < survey.count; ++i) {
        trust::CertificateRef certificate = service.parseCertificate(survey.elements[i]);
        if (certificate == nullptr)
            return TicketRefusal{RefusalStep::certificates,
                                 static_cast<std::uint64_t>(survey.elements[i].data() - block.data()),
                                 values::format("certificate %zu cannot be read", i + 1)};
        if (certificates != nullptr) certificates->push_back(std::move(certificate));
    }
    if (!survey.fault) return std::nullopt;
    return TicketRefusal{RefusalStep::certificates, survey.fault->offset, survey.fault->rule};
}

std::string JudgedChain::reason() const {
    if (step == RefusalStep::policy || evaluated == nullptr || verdict == trust::Verdict::proceed)
        return problem;
    return "the chain is not trusted (" + problem + ")";
}

std::optional<std::size_t> JudgedChain::faultyCertificate(
    const std::vector<trust::CertificateRef>& certificates) const {
    if (evaluated == nullptr) return std::nullopt;
    for (const values::Value& link : evaluated->properties()) {
        const std::string* const title = link[trust::kPropertyTitle].string();
        const std::string* const error = link[trust::kPropertyError].string();
        if (title == nullptr || error == nullptr || error->empty() || !problem.ends_with(*error)) continue;
        for (std::size_t i = 0; i < certificates.size(); ++i)
            if (certificates[i]->subjectSummary() == *title) return i;
    }
    return std::nullopt;
}

JudgedChain judgeTicketChain(const std::vector<trust::CertificateRef>& certificates,
                             trust::TrustService& service) {
    JudgedChain chain;
    trust::PolicyRef policy;
    if (_satchel_create_cert_policy(&policy, service) != satchel_status::kSuccess) {
        chain.step = RefusalStep::policy;
        chain.problem = "the platform security library has no policy for tickets";
        return chain;
    }
    const auto object = service.makeTrust(certificates, policy);
    const auto verdict =
        object && *object != nullptr ? (*object)->evaluate() : base::Error::osStatus(trust::kParameterError);
    if (!verdict) {
        chain.problem = "the chain could not be judged";
        return chain;
    }
    chain.verdict = *verdict;
    chain.evaluated = *object;
    if (chain.verdict == trust::Verdict::proceed)
        chain.problem = "only the user's own settings trust the chain, which is not enough for a ticket";
    else if (chain.verdict != trust::Verdict::unspecified)
        chain.problem = chain.evaluated->failureDescription().value_or("no reason is known");
    return chain;
}

std::optional<TicketPlaceFault> placeFault(const std::optional<TicketFault>& fault) {
    if (!fault) return std::nullopt;
    return TicketPlaceFault{fault->rule, fault->offset};
}

std::optional<TicketPlaceFault> explainTicketPlace(const DiskImageSignature& image) {
    if (image.fault) return placeFault(image.fault);
    const BlobRecord* const blob = ticketBlobOf(image.blobs);
    if (blob == nullptr) return std::nullopt;
    const std::uint64_t length = ticketIn(*blob).size();
    return placeFault(faultOfTicketLength(length, image.csStart + blob->offset + blob->length() - length));
}

std::optional<TicketPlaceFault> explainTicketPlace(const PackageTrailers& package) {
    if (package.fault) return placeFault(package.fault);
    return placeFault(faultOfTicketLength(package.ticketLength, package.ticketStart));
}

}  // namespace pinwell
