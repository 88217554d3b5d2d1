// libpinwell-ticket: reads Pinwell tickets, finds them in disk images and flat packages, and judges them by
// the rules of the tool.
//
//   namespace ticket = pinwell::ticket;
//   const auto roots = ticket::TrustedRoots::fromPlatformDirectory("/etc/pinwell/platform");
//   const auto image = ticket::readDiskImage("Sample.dmg");
//   if (const auto* error = std::get_if<ticket::Error>(&image)) ...   // no disk image: error->message
//   const auto* found = std::get_if<ticket::DiskImage>(&image);
//   if (found->ticket) {
//       const auto verdict = ticket::validate(found->ticket->bytes, roots, time(nullptr), cdhashes);
//       if (verdict.isAcceptable()) ...
//   }
//
// Shapes. Offsets and lengths are in bytes. Offsets into a ticket, a container or a payload count from the
// first byte that was handed in; those of a file count from its start. Integers are in host order.
//
// Ownership. A `ByteView` belongs to the caller: what a function answers as views lies in the bytes that it
// was given, and is good for as long as those are. All else is a value of its own. A descriptor stays the
// caller's: it is not closed, and its position is neither used nor moved.
//
// Errors. Bad input is an answer and never an exception: a `Result` holds an `Error` in place of its value, a
// `Validation` says what is wrong. std::bad_alloc is the one exception that leaves the library; no allocation
// is sized by a number from the input, so it takes an input that is really that large. The longest ticket
// that is handed out has 64 MiB, the longest payload 16 MiB; superblobs and other trailers may have any
// length. Messages are one line, in English, for people; programs go by the codes. Text in them that comes
// from the input, such as the name of a certificate, has its control characters escaped.
//
// Threads. The library keeps no state that can be seen; every function may be called from any number of
// threads at once, and so may the members of one object that are const. It prints nothing, goes by no
// environment variable (libcrypto, which it uses, has its own), and touches no file but those it is given.
// It stays loaded after dlclose(). One exception, which the tool makes as well: validate() asks the dynamic
// loader for libostrelsecurity.so.1, and goes by the ticket-signing policy of that library where there is one
// (its interface is <pinwell/ostrel_security.h>); it is loaded into the process.
//
// Versions. PINWELL_TICKET_VERSION is the version of this interface; it goes with the library's name,
// libpinwell-ticket.so.0. As long as that name stays, what is declared here stays as it is, in meaning and in
// memory; a higher minor version adds functions, types and enumerators, nothing else. Treat an enumerator
// that you do not know as a refusal of a kind you do not know. Change that breaks this has a new name
// (libpinwell-ticket.so.1) and a new inline namespace, so that both can be loaded side by side. The interface
// takes and returns types of the standard library: use the C++ library that this one was built with.
//
// <pinwell/ticket_c.h> is the other interface of the library, for C and whatever calls C. It judges whole
// artefacts and verifies them down to every byte.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <variant>
#include <vector>

#include "pinwell/ticket_version.h"

#define PINWELL_TICKET_API __attribute__((visibility("default")))

namespace pinwell::ticket {
inline namespace v0 {

/// The PINWELL_TICKET_VERSION that the loaded library was built with: never lower than the one compiled with.
PINWELL_TICKET_API std::uint32_t version() noexcept;

using Bytes = std::vector<std::byte>;
using ByteView = std::span<const std::byte>;

enum class ErrorCode : std::uint32_t {
    /// The bytes break a rule of their format; `offset` says where.
    malformed = 1,

    /// The file cannot be opened or read, or is no regular file; `systemError` is the errno when one is
    /// known.
    unreadable = 2,

    /// No certificate could be made of what was given as roots.
    noCertificates = 3,
};

struct Error {
    ErrorCode code = ErrorCode::malformed;
    std::uint64_t offset = 0;
    int systemError = 0;
    std::string message;
};

/// Either what was asked for or why not.
template <class T>
using Result = std::variant<T, Error>;

// A ticket taken apart. None of these asks whether the ticket is genuine.

/// The container, located in the bytes of a ticket. At least one certificate and at most three.
struct Container {
    std::uint16_t version = 0;
    std::uint16_t reserved = 0;          // signed, and without a meaning
    ByteView signedBytes;                // all but the signature
    std::vector<ByteView> certificates;  // DER, the signer's first, then its issuers'; not looked into
    ByteView payload;
    ByteView signature;  // 72 bytes: ECDSA in DER, the rest zero
};
PINWELL_TICKET_API Result<Container> decodeContainer(ByteView ticket);

/// Bit of Payload::flags: the software must not run. The other bits have no meaning.
inline constexpr std::uint32_t kFlagRevoked = 1;

struct Payload {
    std::uint16_t version = 0;
    std::uint16_t hashLength = 0;  // 20 or 48
    std::uint32_t entryCount = 0;
    std::uint32_t flags = 0;
    std::uint64_t signatureTime = 0;  // seconds since 1970-01-01 00:00:00 UTC, by custom: nothing goes by it
    ByteView bytes;                   // of the payload

    bool isMarkedRevoked() const noexcept { return (flags & kFlagRevoked) != 0; }
};
PINWELL_TICKET_API Result<Payload> decodePayload(ByteView payload);

/// One cdhash of a payload.
struct Entry {
    std::uint32_t algorithm = 0;  // 1 SHA-1, 2 and 3 SHA-256 cut to 20 bytes, 4 SHA-384; 0: named nowhere
    Bytes hash;                   // 20 or 48 bytes
};

/// The entry at an index, in constant time. Nothing behind the last one, and for an entry that counts for
/// nothing: its algorithm is unknown, or needs more bytes than the payload's entries have. `payload` is as
/// decodePayload() answered it.
PINWELL_TICKET_API std::optional<Entry> entryAt(const Payload& payload, std::uint64_t index);

// Judging a ticket.

/// Certificates that a ticket's chain may end in. Immutable; copies share them.
class TrustedRoots {
  public:
    /// The certificates of a PEM text (blocks of other kinds are passed over), or one certificate in DER.
    PINWELL_TICKET_API static Result<TrustedRoots> fromCertificates(ByteView pemOrDer);

    /// What the tool trusts when $PINWELL_PLATFORM names this directory: its roots/*.pem, and what the user
    /// distrusts in user-trust/deny/*.pem. Read now, once. A file that cannot be read counts for nothing, as
    /// a directory that is not there counts for an empty one; problems() names it.
    PINWELL_TICKET_API static TrustedRoots fromPlatformDirectory(const std::string& path);

    /// One line a file that had to be left out.
    PINWELL_TICKET_API const std::vector<std::string>& problems() const noexcept;

    /// How many certificates a chain may end in.
    PINWELL_TICKET_API std::size_t size() const noexcept;

  private:
    struct Contents;
    friend struct TrustedRootsAccess;

    explicit TrustedRoots(std::shared_ptr<const Contents> contents) noexcept;

    std::shared_ptr<const Contents> contents_;
};

/// What a ticket is refused by, in the order in which it is asked.
enum class Step : std::uint32_t {
    none = 0,          // not refused
    container = 1,     // the frame: magic, version, lengths
    certificates = 2,  // the certificate block, or a certificate in it
    policy = 3,        // the platform's security library has no ticket-signing policy to give
    chain = 4,         // the chain does not end in a trusted root, or is not as the policy wants it
    signature = 5,     // it is not the first certificate's over these bytes
    payload = 6,       // genuine bytes, and not a payload
    memory = 7,        // there was not enough to judge it
};

/// Numbers of Validation::verdict.
inline constexpr std::uint32_t kVerdictNone = 0;         // the chain was not judged
inline constexpr std::uint32_t kVerdictProceed = 1;      // the user trusts it, which is not enough here
inline constexpr std::uint32_t kVerdictDeny = 3;         // the user distrusts a certificate of it
inline constexpr std::uint32_t kVerdictUnspecified = 4;  // trusted: the one that a genuine ticket has
inline constexpr std::uint32_t kVerdictRecoverableFailure = 5;  // a check of the policy failed
inline constexpr std::uint32_t kVerdictFatalFailure = 6;        // bad signature, unhandled critical extension
inline constexpr std::uint32_t kVerdictOtherError = 7;          // the policy asks what is not known here

struct Validation {
    /// Well formed, of a trusted chain, and signed by it. The rest says nothing unless this is true.
    bool isGenuine = false;

    /// The ticket marks the software as revoked: it must not run, whether or not it is listed.
    bool isRevoked = false;

    /// One of the entries is one of the cdhashes. Compared by their bytes alone, as the tool does.
    bool isListed = false;

    /// Whether the tool would accept the ticket for this artefact.
    bool isAcceptable() const noexcept { return isGenuine && isListed && !isRevoked; }

    /// Why it is not genuine: the rule, and where in the ticket the part begins that breaks it.
    Step step = Step::none;
    std::uint64_t offset = 0;
    std::string reason;

    /// Of the chain's evaluation.
    std::uint32_t verdict = kVerdictNone;
};

/// Judges the bytes of a whole ticket at `evaluationTime`, in seconds since 1970-01-01 00:00:00 UTC. Time
/// matters only where the policy asks for it: the one that goes with the tool does not, so that a ticket
/// outlives its certificates. `cdhashes` are the artefact's, 20 or 48 bytes each; none may be given.
PINWELL_TICKET_API Validation validate(ByteView ticket, const TrustedRoots& roots,
                                       std::int64_t evaluationTime, std::span<const ByteView> cdhashes = {});

// Finding a ticket in a file. A bundle's ticket is the file Contents/CodeResources by itself. By path, only a
// regular file is opened, and no link is followed in the last component; nothing is opened that could block.

struct Range {
    std::uint64_t offset = 0;
    std::uint64_t length = 0;
};

/// The bytes of a ticket and the place that they were read from.
struct FoundTicket {
    Range range;
    Bytes bytes;
};

/// A blob of the superblob.
struct Slot {
    std::uint32_t type = 0;   // 0x10002 for the ticket
    std::string name;         // what it holds, in words; "unknown"
    std::uint32_t magic = 0;  // of the blob
    Range range;              // in the file, the blob's header of 8 bytes included
};

struct DiskImage {
    std::uint64_t fileSize = 0;
    Range trailer;                      // the last 512 bytes
    std::optional<Range> superblob;     // nothing: the image is not signed
    std::vector<Slot> slots;            // in the order of the index
    std::optional<FoundTicket> ticket;  // the last one, should there be several
};

/// Trailer and superblob of a UDIF disk image, refused by the tool's rules for an image that it would write
/// to.
PINWELL_TICKET_API Result<DiskImage> readDiskImage(const std::string& path);
PINWELL_TICKET_API Result<DiskImage> readDiskImage(int descriptor);

inline constexpr std::uint16_t kTrailerTerminator = 1;
inline constexpr std::uint16_t kTrailerTicket = 2;

/// A trailer record and the data in front of it.
struct Trailer {
    std::uint16_t type = 0;
    std::uint64_t recordOffset = 0;  // 16 bytes
    Range data;
};

struct FlatPackage {
    std::uint64_t fileSize = 0;
    std::vector<Trailer>
        trailers;                // as they are met: the last of the file first; nothing is read past a ticket
    bool hasTerminator = false;  // the walk went on to the terminator, having met no ticket
    std::optional<FoundTicket> ticket;
};

/// The trailers of a flat package, from the end of the file to the ticket or to where the chain ends. A file
/// that ends in no trailer, whatever it is, is a package without a ticket: that the archive is one is not
/// asked.
PINWELL_TICKET_API Result<FlatPackage> readFlatPackage(const std::string& path);
PINWELL_TICKET_API Result<FlatPackage> readFlatPackage(int descriptor);

}  // namespace v0
}  // namespace pinwell::ticket
