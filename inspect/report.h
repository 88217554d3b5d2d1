// The findings about one path: a plain data model, made by gather.h and shown by the two renderings.
//
// Texts from a file are unchanged; a rendering escapes them. A damaged part carries a fault, and all of it
// that could be read. Offsets count bytes.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "base/bytes.h"
#include "codesign/code_description.h"
#include "formats/explain_ticket.h"
#include "trust/certificate_description.h"

namespace pinwell::inspect {

using base::Data;

/// The maximum length of each list; the rest is only counted. A ticket's own limit is some 800,000.
inline constexpr std::size_t kMaximumEntriesKept = 65'536;
inline constexpr std::size_t kMaximumTrailersKept = 1024;
inline constexpr std::size_t kMaximumCertificatesKept = 16;

struct Range {
    std::uint64_t offset = 0;
    std::uint64_t length = 0;

    bool operator==(const Range&) const = default;
};

/// A fault: one line without a full stop.
struct Fault {
    std::string rule;
    std::optional<std::uint64_t> offset;      // in the ticket
    std::optional<std::uint64_t> fileOffset;  // in the file that holds it

    bool operator==(const Fault&) const = default;
};

/// A code hash with the number of its digest type; 0 if unknown.
struct Hash {
    std::uint32_t algorithm = 0;
    Data bytes;

    bool operator==(const Hash&) const = default;
};

enum class Kind { bundle, executable, diskImage, package, ticket, other };

/// The path itself.
struct Item {
    std::string typeIdentifier;
    std::string typeDescription;
    std::optional<std::uint64_t> size;  // of a file
};

// The places of a ticket.

/// Contents/CodeResources of a bundle, or the file itself.
struct FilePlace {
    std::string path;
    std::optional<Fault> fault;  // the path exists, but is not a ticket file
};

struct SuperblobPlace {
    std::uint64_t trailerOffset = 0;
    std::optional<Range> superblob;  // `nullopt` if unsigned
    std::vector<codesign::BlobDescription> blobs;
    std::size_t blobCount = 0;  // as stated
    std::optional<Fault> fault;
};

/// One record after a package's archive; the last one is first in the list.
struct Trailer {
    std::uint64_t recordOffset = 0;
    std::uint16_t version = 0;
    std::uint16_t type = 0;
    Range data;
    std::string problem;
};

struct TrailerPlace {
    std::vector<Trailer> trailers;
    std::size_t trailerCount = 0;
    bool hasTerminator = false;
    std::optional<Fault> fault;
};

using Place = std::variant<std::monostate, FilePlace, SuperblobPlace, TrailerPlace>;

// The ticket.

struct Certificate {
    Range range;  // in the ticket
    trust::CertificateDescription description;
};

/// One certificate of the judged chain, leaf first, with its faults.
struct Link {
    std::string title;
    std::string error;
};

struct Chain {
    bool trusted = false;
    std::string reason;  // why not; names the faulty certificate
    std::vector<Link> links;
};

enum class Signature { verifies, fails, unchecked };

struct Entry {
    std::uint64_t index = 0;
    Hash hash;  // empty if it cannot be copied
    bool isUsable = false;
    bool matches = false;  // it is the artefact's hash
};

struct Payload {
    Range range;             // in the ticket
    bool hasHeader = false;  // false: too short; the next members have no meaning
    std::uint16_t version = 0;
    std::uint16_t hashLength = 0;
    std::uint32_t statedCount = 0;
    std::uint32_t flags = 0;
    std::uint64_t signatureTime = 0;
    bool isRevoked = false;

    std::uint64_t entryCount = 0;
    std::vector<Entry> entries;          // the first kMaximumEntriesKept
    std::optional<Entry> matchingEntry;  // at any position
    std::optional<Fault> fault;
};

/// Why the ticket is refused: for itself, or for the artefact that it is attached to.
struct Refusal {
    RefusalStep step = RefusalStep::container;
    Fault fault;
};

struct Ticket {
    std::uint64_t size = 0;
    std::optional<std::uint64_t> fileOffset;  // in the file that holds it

    std::optional<std::uint16_t> version;
    std::uint32_t statedCertificatesLength = 0;
    std::uint32_t statedPayloadLength = 0;
    std::optional<Range> certificateBlock;
    std::optional<Range> signatureField;
    std::optional<Fault> frameFault;

    std::vector<Certificate> certificates;
    std::vector<Range> unreadable;  // of the certificate block
    std::optional<Fault> certificateFault;

    Chain chain;
    Signature signature = Signature::unchecked;
    std::optional<Payload> payload;  // `nullopt` if the container is too short for it

    std::optional<Refusal> refusal;  // by the first broken rule
};

/// In the order of gravity: the worst of several paths decides the exit status.
enum class Outcome {
    good,        // a genuine ticket that lists the artefact and is not marked revoked
    noTicket,    // none is stapled
    refused,     // the ticket is not acceptable
    revoked,     // genuine, and marked as revoked
    unreadable,  // the path cannot be read, is of a kind without tickets, or has no valid signature
};

struct Report {
    std::string path;
    std::string platformDirectory;  // the source of the trusted roots
    Kind kind = Kind::other;
    std::optional<Item> item;

    std::optional<codesign::CodeDescription> code;  // of bundles, executables and disk images
    std::optional<Hash> codeHash;
    bool isMadeUpHash = false;  // of an unsigned disk image
    std::string recordName;     // the name for a lookup; empty without a hash

    Place place;
    std::optional<Ticket> ticket;

    Outcome outcome = Outcome::unreadable;
    std::string conclusion;      // a plain sentence
    std::optional<Fault> fault;  // the first rule that fails
};

/// 0, 65 or 66.
int exitStatusOf(Outcome outcome);

/// "SHA-256" and so on; "unnamed" for 0, "unknown" for others.
std::string_view algorithmName(std::uint32_t algorithm);
std::string_view kindName(Kind kind);
std::string_view trailerTypeName(std::uint16_t type);
/// "64-bit ARM", or the number in hexadecimal.
std::string cpuTypeName(std::uint32_t cpuType);
/// Seconds since the epoch as a date; `nullopt` if the year has more than four digits.
std::optional<std::string> timeText(std::uint64_t seconds);

}  // namespace pinwell::inspect
