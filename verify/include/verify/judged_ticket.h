// A ticket judged by the tool's rules, and the checks on it.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <unordered_set>

#include "base/bytes.h"
#include "formats/explain_ticket.h"
#include "trust/trust.h"
#include "verify/check.h"
#include "verify/code.h"

namespace pinwell::verify {

using base::ByteView;

/// The statements of a genuine ticket.
class JudgedTicket {
  public:
    /// Judges `bytes` like the tool (satchel_get_validated_tm_ticket).
    JudgedTicket(ByteView bytes, trust::TrustService& trust);

    bool isGenuine() const noexcept { return isGenuine_; }
    bool isRevoked() const noexcept { return isRevoked_; }

    /// Seconds since 1970-01-01 00:00:00 UTC.
    std::uint64_t signatureTime() const noexcept { return signatureTime_; }

    /// Why it is not genuine.
    const std::string& fault() const noexcept { return fault_; }

    /// In constant time. Only a genuine ticket lists anything.
    bool lists(ByteView codeHash) const;
    std::size_t entryCount() const noexcept { return entries_.size(); }

  private:
    bool isGenuine_ = false;
    bool isRevoked_ = false;
    std::uint64_t signatureTime_ = 0;
    std::string fault_;
    std::unordered_set<std::string> entries_;
};

/// For an artefact whose ticket is missing or cannot be read, with the fault of the ticket's place if there
/// is one: adds the failed check, and gives the conclusion, a sentence.
void checkMissingTicket(const std::optional<TicketPlaceFault>& fault, const std::string& place,
                        Section& section);
std::string conclusionWithoutTicket(const std::optional<TicketPlaceFault>& fault);

/// Adds the checks of one ticket: genuine, not revoking, listing the artefact. `place` names the ticket.
/// Returns whether all passed.
bool checkTicket(const JudgedTicket& ticket, const std::optional<Data>& codeHash, const std::string& place,
                 Section& section);

/// Adds a check for each piece of code: the ticket lists it, or the seal of listed code names it. Returns
/// whether all passed.
bool checkListing(const VerifiedCode& code, const std::function<bool(ByteView codeHash)>& lists,
                  Section& section);

/// Adds a check that `codeHash`, found by the tool, is the hash of the verified code: the two were read from
/// one path, one after the other. Returns whether it is.
bool checkOneArtefact(const VerifiedCode& code, const std::optional<Data>& codeHash, Section& section);

}  // namespace pinwell::verify
