// A ticket, judged: by the tool's rules whether it counts, and by the inspector's reading why not.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <unordered_set>

#include "foundation/bytes.h"
#include "trust/trust.h"
#include "verify/check.h"

namespace pinwell::gate {

using foundation::ByteView;
using foundation::Data;

/// What a ticket says, if it is genuine.
class JudgedTicket {
  public:
    /// Judges `bytes` as the tool does (satchel_get_validated_tm_ticket).
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

/// Adds the checks of one ticket: genuine, not revoking, listing the artefact. `place` names the ticket.
/// Returns whether all passed.
bool checkTicket(const JudgedTicket& ticket, const std::optional<Data>& codeHash, const std::string& place,
                 verify::Section& section);

}  // namespace pinwell::gate
