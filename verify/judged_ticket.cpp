#include "verify/judged_ticket.h"

#include <algorithm>

#include "base/text.h"
#include "formats/explain_ticket.h"
#include "formats/tm_ticket.h"
#include "values/format.h"
#include "verify/check.h"

namespace pinwell::verify {

using values::format;

JudgedTicket::JudgedTicket(ByteView bytes, trust::TrustService& trust) {
    const TicketPointer ticket = genuineTicket(bytes, trust);
    if (ticket == nullptr) {
        fault_ = explainRefusedTicket(bytes, trust).reason;
        return;
    }
    isGenuine_ = true;
    isRevoked_ = ticketRevokes(ticket.get());
    signatureTime_ = tm_ticket_get_signature_time(ticket.get());
    for (const Data& hash : hashesInTicket(ticket.get())) entries_.insert(base::toString(hash));
}

bool JudgedTicket::lists(ByteView codeHash) const {
    return entries_.contains(base::toString(codeHash));
}

void checkMissingTicket(const std::optional<TicketPlaceFault>& fault, const std::string& place,
                        Section& section) {
    const bool isDamaged = fault && !fault->isAbsence;
    section.fail(kTicketStapled, place, "a ticket",
                 isDamaged ? fault->rule
                 : fault   ? "none: " + fault->rule
                           : "none");
}

std::string conclusionWithoutTicket(const std::optional<TicketPlaceFault>& fault) {
    if (!fault) return "No ticket is stapled to it.";
    return (fault->isAbsence ? "No ticket is stapled to it: " : "No ticket can be read: ") + fault->rule +
           ".";
}

bool checkTicket(const JudgedTicket& ticket, const std::optional<Data>& codeHash, const std::string& place,
                 Section& section) {
    if (!ticket.isGenuine()) {
        section.fail(kTicketGenuine, place, "a ticket of a trusted signer", ticket.fault());
        return false;
    }
    section.pass(kTicketGenuine, place, "a ticket of a trusted signer");
    if (ticket.isRevoked()) {
        section.fail(kTicketRevoked, place, "a ticket that does not revoke", "it revokes the software");
        return false;
    }
    section.pass(kTicketRevoked, place, "a ticket that does not revoke");
    if (!codeHash) {
        section.fail(kTicketLists, place, "the artefact's hash",
                     "the artefact has no hash that a ticket could list");
        return false;
    }
    const std::string hash = base::toHex(*codeHash);
    if (!ticket.lists(*codeHash)) {
        section.fail(kTicketLists, place, hash, format("%zu other hashes", ticket.entryCount()));
        return false;
    }
    section.pass(kTicketLists, place, hash);
    return true;
}

bool checkListing(const VerifiedCode& code, const std::function<bool(ByteView)>& lists, Section& section) {
    bool isVouchedFor = true;
    for (const CodeIdentity& identity : code.identities) {
        const std::string hash = base::toHex(identity.codeHashes.front());
        if (std::any_of(identity.codeHashes.begin(), identity.codeHashes.end(), lists)) {
            section.pass(kCodeListed, identity.place, hash);
        } else if (identity.isSealed) {
            section.note(kCodeListed, identity.place, hash,
                         "the ticket does not list it; the seal around it names it");
        } else {
            section.fail(kCodeListed, identity.place, hash, "the ticket does not list it");
            isVouchedFor = false;
        }
    }
    return isVouchedFor;
}

bool checkOneArtefact(const VerifiedCode& code, const std::optional<Data>& codeHash, Section& section) {
    if (!codeHash || code.identities.empty()) return true;
    const bool isThere =
        std::any_of(code.identities.begin(), code.identities.end(), [&](const CodeIdentity& identity) {
            return !identity.isNested && identity.codeHashes.front() == *codeHash;
        });
    if (isThere) return true;
    section.fail(kArtefact, {}, base::toHex(*codeHash),
                 base::toHex(code.identities.front().codeHashes.front()));
    return false;
}

}  // namespace pinwell::verify
