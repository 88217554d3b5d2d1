// A ticket, judged by the tool's rules, and the checks that follow from it.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <unordered_set>

#include "foundation/bytes.h"
#include "trust/trust.h"
#include "verify/check.h"
#include "verify/executable.h"

namespace pinwell::verify {

using foundation::ByteView;

/// What a ticket says, if it is genuine.
class JudgedTicket {
  public:
    /// Judges `bytes` as the tool does (satchel_get_validated_tm_ticket). `explain` is called for a ticket
    /// that is not genuine, and says why.
    JudgedTicket(ByteView bytes, trust::TrustService& trust, const std::function<std::string()>& explain);

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

/// Adds the checks of one ticket: genuine, not revoking, listing the artefact. `place` names the ticket.
/// Returns whether all passed.
bool checkTicket(const JudgedTicket& ticket, const std::optional<Data>& codeHash, const std::string& place,
                 Section& section);

/// Adds a check for each piece of code: the ticket lists it, or the seal of code that the ticket lists names
/// it. Returns whether somebody vouches for each.
bool checkListing(const VerifiedCode& code, const std::function<bool(ByteView codeHash)>& lists,
                  Section& section);

/// Adds a check that fails unless `codeHash`, which the tool has found, is that of the code that was
/// verified: both were read from one path, one after the other. Returns whether it is.
bool checkOneArtefact(const VerifiedCode& code, const std::optional<Data>& codeHash, Section& section);

}  // namespace pinwell::verify
