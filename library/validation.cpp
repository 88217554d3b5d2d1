// Judges a ticket with the caller's roots. genuineTicket decides, as in the tool, and explain_ticket.h says
// why it refuses.
#include <algorithm>
#include <utility>

#include "config/platform_directory.h"
#include "formats/explain_ticket.h"
#include "formats/tm_ticket.h"
#include "roots.h"
#include "trust/certificate.h"
#include "trust/trust_service.h"
#include "values/date.h"

namespace pinwell::ticket {
inline namespace v1 {
namespace {

/// The numbers of the trust service and of the interface are the same.
constexpr Verdict verdictOf(trust::Verdict verdict) {
    return static_cast<Verdict>(verdict);
}
static_assert(verdictOf(trust::Verdict::invalid) == Verdict::none);
static_assert(verdictOf(trust::Verdict::proceed) == Verdict::proceed);
static_assert(verdictOf(trust::Verdict::deny) == Verdict::deny);
static_assert(verdictOf(trust::Verdict::unspecified) == Verdict::unspecified);
static_assert(verdictOf(trust::Verdict::recoverableFailure) == Verdict::recoverableFailure);
static_assert(verdictOf(trust::Verdict::fatalFailure) == Verdict::fatalFailure);
static_assert(verdictOf(trust::Verdict::otherError) == Verdict::otherError);

Step stepOf(RefusalStep step) {
    switch (step) {
        case RefusalStep::container:
            return Step::container;
        case RefusalStep::certificates:
            return Step::certificates;
        case RefusalStep::policy:
            return Step::policy;
        case RefusalStep::chain:
            return Step::chain;
        case RefusalStep::signature:
            return Step::signature;
        case RefusalStep::payload:
            return Step::payload;
        case RefusalStep::memory:
            return Step::memory;
        case RefusalStep::revoked:
        case RefusalStep::listing:
            break;  // of a genuine ticket
    }
    return Step::none;
}

Validation refused(TicketRefusal refusal) {
    Validation validation;
    validation.step = stepOf(refusal.step);
    validation.offset = refusal.offset;
    validation.reason = std::move(refusal.reason);
    validation.verdict = verdictOf(refusal.verdict);
    return validation;
}

}  // namespace

TrustedRoots::TrustedRoots(std::shared_ptr<const Contents> contents) noexcept
    : contents_(std::move(contents)) {}

Result<TrustedRoots> TrustedRoots::fromCertificates(ByteView pemOrDer) {
    Contents contents;
    if (auto certificate = trust::X509Certificate::parse(pemOrDer)) {
        contents.anchors.roots.push_back(std::move(certificate));
    } else if (auto list = trust::readPem(pemOrDer)) {
        contents.anchors.roots = *std::move(list);
    } else {
        return Error{ErrorCode::noCertificates, 0, 0,
                     "these are neither certificates in PEM nor one certificate in DER"};
    }
    return TrustedRoots(std::make_shared<const Contents>(std::move(contents)));
}

TrustedRoots TrustedRoots::fromPlatformDirectory(const std::string& path) {
    auto contents = std::make_shared<Contents>();
    contents->anchors = trust::loadAnchors(config::PlatformDirectory(path), [&](std::string_view line) {
        contents->problems.emplace_back(line);
    });
    return TrustedRoots(std::move(contents));
}

const std::vector<std::string>& TrustedRoots::problems() const noexcept {
    return contents_->problems;
}

std::size_t TrustedRoots::size() const noexcept {
    return contents_->anchors.roots.size();
}

Validation validate(ByteView ticket, const TrustedRoots& roots, std::int64_t evaluationTime,
                    std::span<const ByteView> cdhashes) {
    const auto& contents = TrustedRootsAccess::contentsOf(roots);
    const auto service = trust::makeTrustService([&] { return contents->anchors; },
                                                 [&] { return values::Date{evaluationTime}; });
    const TicketPointer genuine = genuineTicket(ticket, *service);
    if (genuine == nullptr) return refused(explainRefusedTicket(ticket, *service));

    Validation validation;
    validation.isGenuine = true;
    validation.verdict = Verdict::unspecified;
    validation.isRevoked = ticketRevokes(genuine.get());
    validation.isListed = std::ranges::any_of(
        cdhashes, [&](ByteView cdhash) { return ticketListsHash(genuine.get(), cdhash); });
    return validation;
}

}  // namespace v1
}  // namespace pinwell::ticket
