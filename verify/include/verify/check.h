// The findings of deep verification: a tree of sections, each with its checks. A plain data model.
//
// Every check has a place (`place`), the value in the signature (`expected`) and the value of the bytes
// (`found`). Texts from a file are unchanged; a rendering escapes them.
#pragma once

#include <cstddef>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::verify {

/// In the order of gravity: the outcome of several is the highest.
enum class Outcome {
    passed,
    skipped,     // not checked; `found` says why
    noted,       // worth knowing, but not a fault: a matter of policy
    unreadable,  // the bytes cannot be read, so their state is unknown
    failed,      // something has changed since signing
};

/// "passed", "skipped", "noted", "unreadable", "failed".
std::string_view outcomeName(Outcome outcome);

// The names of all checks: a closed list, which docs/gate.schema.json repeats.

// The ticket.
inline constexpr std::string_view kTicketStapled = "ticket-stapled";  // a ticket is attached
inline constexpr std::string_view kTicketGenuine = "ticket-genuine";  // well formed, trusted, signed
inline constexpr std::string_view kTicketRevoked = "ticket-revoked";  // it does not revoke
inline constexpr std::string_view kTicketLists = "ticket-lists";      // it lists the artefact
inline constexpr std::string_view kTicketCurrent = "ticket-current";  // from the service, or from --tickets
inline constexpr std::string_view kCodeListed = "code-listed";        // it lists each slice and nested code

// Code of every kind.
inline constexpr std::string_view kSignature = "signature";       // present and well formed
inline constexpr std::string_view kSigner = "signer";             // the signer's message verifies
inline constexpr std::string_view kSpecialSlot = "special-slot";  // a component has its digest
inline constexpr std::string_view kCodeLimit = "code-limit";      // the hashes reach the signature
inline constexpr std::string_view kPageHashes = "page-hashes";
inline constexpr std::string_view kImageStructure = "image-structure";  // headers, slices, gaps
inline constexpr std::string_view kBehindSignature = "behind-signature";

// Bundles.
inline constexpr std::string_view kBundleStructure = "bundle-structure";
inline constexpr std::string_view kSeal = "seal";  // the list of resources
inline constexpr std::string_view kSealedFile = "sealed-file";
inline constexpr std::string_view kSealedLink = "sealed-link";
inline constexpr std::string_view kNestedCode = "nested-code";
inline constexpr std::string_view kUnsealed = "unsealed";  // there, and not sealed
inline constexpr std::string_view kMissing = "missing";    // sealed, and not there

// Disk images.
inline constexpr std::string_view kTrailer = "trailer";
inline constexpr std::string_view kBlockTable = "block-table";  // the second check

// Flat packages.
inline constexpr std::string_view kArchive = "archive";  // header and table of contents
inline constexpr std::string_view kTableChecksum = "table-checksum";
inline constexpr std::string_view kArchiveSignature = "archive-signature";
inline constexpr std::string_view kArchivedFile = "archived-file";
inline constexpr std::string_view kHeap = "heap";          // ranges, and unclaimed bytes
inline constexpr std::string_view kTrailers = "trailers";  // after the archive

// Policy.
inline constexpr std::string_view kPolicyTicketAge = "policy-ticket-age";
inline constexpr std::string_view kPolicyTeam = "policy-team";
inline constexpr std::string_view kPolicyIdentifier = "policy-identifier";
inline constexpr std::string_view kPolicyTimestamp = "policy-secure-timestamp";

// The path itself.
inline constexpr std::string_view kArtefact = "artefact";  // it can be read and is of a supported kind

/// One check and its result.
struct Check {
    std::string name;   // from the closed list above
    std::string place;  // in the artefact: a path below it, a slice, a page, a range of bytes
    Outcome outcome = Outcome::passed;
    std::string expected;
    std::string found;
};

/// The checks of one part of an artefact, and its subsections. A section of a bundle is a piece of code in
/// it.
struct Section {
    std::string place;  // empty for the artefact itself
    std::vector<Check> checks;
    std::vector<Section> sections;

    void add(Check check) { checks.push_back(std::move(check)); }
    void pass(std::string_view name, std::string place, std::string expected, std::string found = {});
    void fail(std::string_view name, std::string place, std::string expected, std::string found);
    void note(std::string_view name, std::string place, std::string expected, std::string found);
    void skip(std::string_view name, std::string place, std::string why);
    void cannotRead(std::string_view name, std::string place, std::string why);

    /// fail(), or cannotRead() if the bytes cannot be read, with the reason of `failure`, which is being
    /// handled (codesign::asCodeError).
    void failWith(const std::runtime_error& failure, std::string_view name, std::string place,
                  std::string expected);
};

/// The gravest outcome in a section and its subsections; passed if there are no checks.
Outcome worstOutcome(const Section& section);

/// All checks of a section and its subsections, parents first.
std::vector<Check> flattened(const Section& section);

/// Maximum number of failures of one kind that are kept. The rest are counted.
inline constexpr std::size_t kMaximumFailuresKept = 256;

/// Adds failures of one kind to a section, the first kMaximumFailuresKept one by one, the rest as a number.
class FailureList {
  public:
    FailureList(Section& section, std::string_view name) : section_(section), name_(name) {}
    ~FailureList();
    FailureList(const FailureList&) = delete;
    FailureList& operator=(const FailureList&) = delete;

    void add(Outcome outcome, std::string place, std::string expected, std::string found);
    std::size_t count() const noexcept { return count_; }

  private:
    Section& section_;
    std::string name_;
    std::size_t count_ = 0;
    Outcome worst_ = Outcome::passed;  // of the failures that are only counted
};

}  // namespace pinwell::verify
