// The names of all checks: a closed list, which docs/gate.schema.json repeats.
#pragma once

#include <string_view>

namespace pinwell::verify {

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
inline constexpr std::string_view kImageData = "image-data";    // of an unsigned image
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

}  // namespace pinwell::verify
