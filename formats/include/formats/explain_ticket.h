// Whether a ticket is good for an artefact, and why it is refused: the one home of the rule and of the
// reasons.
//
// judgeTicket decides for stapling, validating and fetching, and gives no reason. The other functions repeat
// its steps in its order, and return the first broken rule. The companions and the library report this rule,
// and have no rules of their own.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "formats/disk_image.h"
#include "formats/package_trailers.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "trust/trust.h"

namespace pinwell {

enum class TicketVerdict : std::uint8_t {
    acceptable,  // genuine, not revoked, and it lists the hash
    revoked,     // genuine, and marks the software as revoked, with any list of hashes
    refused,     // anything else
};

/// Judges the bytes of a ticket. `hash` is called only for a ticket that is genuine and not revoked; without
/// a hash the ticket is refused. From any thread.
TicketVerdict judgeTicket(const std::optional<base::Data>& ticket,
                          const std::function<std::optional<base::Data>()>& hash, trust::TrustService& trust);

/// The same of a ticket that is to list each of these hashes. Without hashes it is refused.
TicketVerdict judgeTicket(const std::optional<base::Data>& ticket, const std::vector<base::Data>& hashes,
                          trust::TrustService& trust);

// Why a ticket is refused.

/// The step that refuses a ticket, in the order of the steps.
enum class RefusalStep : std::uint8_t {
    container,     // the frame: magic, version, lengths
    certificates,  // the certificate block, or a certificate in it
    policy,        // the platform security library has no policy for tickets
    chain,         // the chain is not trusted, or breaks the policy
    signature,     // it does not verify with the first certificate's key
    payload,       // signed bytes that are not a payload
    memory,        // not enough memory to judge it
    revoked,       // genuine, and marked as revoked
    listing,       // genuine, and without the artefact's hash
};

/// The rules that a genuine ticket breaks for an artefact.
inline constexpr const char* kNotListed = "the ticket does not list this artefact";
inline constexpr const char* kNothingToList = "the artefact has no valid signature, so no ticket can list it";

struct TicketRefusal {
    RefusalStep step = RefusalStep::container;

    /// In the ticket, of the part that breaks the rule.
    std::uint64_t offset = 0;

    /// The broken rule, in one line without a full stop. Control characters are escaped.
    std::string reason;

    /// The result of the chain's evaluation; `invalid` if the chain was not judged.
    trust::Verdict verdict = trust::Verdict::invalid;
};

/// Why a ticket is refused by itself: it is not genuine (satchel_get_validated_tm_ticket refuses it), or it
/// is marked as revoked. `nullopt` if it is neither.
std::optional<TicketRefusal> explainTicket(base::ByteView ticket, trust::TrustService& service);

/// The same for the ticket of an artefact, which must list `cdhash` too. Pass `nullopt` for an artefact
/// without a valid signature: every ticket is refused then.
std::optional<TicketRefusal> explainTicket(base::ByteView ticket, const std::optional<base::Data>& cdhash,
                                           trust::TrustService& service);

/// The reason for a ticket that satchel_get_validated_tm_ticket has just refused. The step is `memory` if no
/// rule is broken.
TicketRefusal explainRefusedTicket(base::ByteView ticket, trust::TrustService& service);

// Two steps by themselves, to show them for a damaged ticket too.

/// The first fault of a certificate block, whose survey is `survey`; `offset` counts from the start of
/// `block`. A certificate that cannot be read comes before a fault of the framing after it. `certificates`,
/// if not null, gets the certificates before the fault.
std::optional<TicketRefusal> explainCertificates(base::ByteView block, const SatchelCertificateBlock& survey,
                                                 trust::TrustService& service,
                                                 std::vector<trust::CertificateRef>* certificates = nullptr);

/// A chain, judged under the ticket-signing policy.
struct JudgedChain {
    /// Null if the chain could not be judged.
    std::shared_ptr<trust::Trust> evaluated;
    trust::Verdict verdict = trust::Verdict::invalid;

    /// Why the chain is not trusted, in one line without a full stop. Names the certificate.
    std::string problem;

    /// `policy` if there is no policy, else `chain`.
    RefusalStep step = RefusalStep::chain;

    bool isTrusted() const noexcept { return evaluated != nullptr && verdict == trust::Verdict::unspecified; }

    /// `problem` as the reason of a refusal.
    std::string reason() const;

    /// The index in `certificates` of the one that `problem` names; `nullopt` if it is none of them.
    std::optional<std::size_t> faultyCertificate(
        const std::vector<trust::CertificateRef>& certificates) const;
};
JudgedChain judgeTicketChain(const std::vector<trust::CertificateRef>& certificates,
                             trust::TrustService& service);

// Why no ticket can be read from an artefact.

/// The fault of a ticket's place: the file Contents/CodeResources of a bundle, a blob of a disk image's
/// superblob, or a trailer of a flat package.
struct TicketPlaceFault {
    /// One line without a full stop.
    std::string rule;

    /// In the file that holds the ticket; `nullopt` if the file as a whole is at fault.
    std::optional<std::uint64_t> offset;

    /// The place cannot hold a ticket, so there is none. Otherwise the place is damaged, and may hold one.
    bool isAbsence = false;

    bool operator==(const TicketPlaceFault&) const = default;
};

/// `fault` as the fault of a place.
std::optional<TicketPlaceFault> placeFault(const std::optional<TicketFault>& fault);

/// The fault of a place that has been read; `nullopt` if it is sound, with a ticket or without.
std::optional<TicketPlaceFault> explainTicketPlace(const DiskImageSignature& image);
std::optional<TicketPlaceFault> explainTicketPlace(const PackageTrailers& package);

}  // namespace pinwell
