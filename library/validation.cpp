// Judges a ticket. satchel_get_validated_tm_ticket decides, as in the tool, and explain_ticket.h says why it
// refuses.
#include <algorithm>
#include <utility>

#include "foundation/date.h"
#include "library/roots.h"
#include "src/explain_ticket.h"
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
    validation.verdict = numberOf(refusal.verdict);
    return validation;
}

}  // namespace

Validation validate(ByteView ticket, const TrustedRoots& roots, std::int64_t evaluationTime,
                    std::span<const ByteView> cdhashes) {
    const auto& contents = TrustedRootsAccess::contentsOf(roots);
    const auto service = trust::makeTrustService([&] { return contents->anchors; },
                                                 [&] { return foundation::Date{evaluationTime}; });
    tm_ticket* decoded = nullptr;
    if (satchel_get_validated_tm_ticket(ticket.data(), ticket.size(), &decoded, *service) != 0)
        return refused(explainRefusedTicket(ticket, *service));

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
