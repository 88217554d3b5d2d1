// libpinwell-ticket: reads Pinwell tickets, finds them in disk images and flat packages, and judges them by
// the rules of the tool.
//
//   namespace ticket = pinwell::ticket;
//   const auto roots = ticket::TrustedRoots::fromPlatformDirectory("/etc/pinwell/platform");
//   const auto image = ticket::readDiskImage("Sample.dmg");
//   if (!image) ...   // no disk image: image.error().message
//   if (image->ticket) {
//       const auto validation = ticket::validate(image->ticket->bytes, roots, time(nullptr), cdhashes);
//       if (validation.isAcceptable()) ...
//   }
//
// Shapes. Offsets and lengths are in bytes. Offsets into a ticket, a container or a payload count from the
// first byte of the argument; offsets into a file count from its start. Integers are in host order.
//
// Ownership. A `ByteView` belongs to the caller: views in a result refer to the bytes of the argument, and
// are valid as long as these are. Every other result is a value of its own. A descriptor stays the caller's:
// it is not closed, and its position is neither used nor moved.
//
// Errors. Bad input gives a result, never an exception: a `Result` holds an `Error` instead of its value, a
// `Validation` holds the reason. std::bad_alloc is the only exception that leaves the library;
// Result::value(), which is compiled into the caller, throws BadResultAccess. No number from the input sizes
// an allocation, so only an input that is really that large can cause std::bad_alloc. A returned ticket has
// at most 64 MiB, a payload at most 16 MiB; superblobs and other trailers may have any length. Messages are
// one line, in English, for people; programs use the codes. In a message, text from the input, such as the
// name of a certificate, has its control characters escaped.
//
// Threads. The library has no visible state. Any number of threads may call every function at once, and the
// const members of one object too. It prints nothing, reads no environment variable (libcrypto, which it
// uses, reads its own), and opens no file except the given ones. It stays loaded after dlclose(). There is
// one exception, as in the tool: validate() asks the dynamic loader for libostrelsecurity.so.1. If this
// library exists (its interface is <pinwell/ostrel_security.h>), it is loaded into the process, and its
// ticket-signing policy is used.
//
// Versions. PINWELL_TICKET_VERSION is the version of this interface; it goes with the library's name,
// libpinwell-ticket.so.1. As long as that name stays, these declarations keep their meaning and their layout;
// a higher minor version only adds functions, types and enumerators. Treat an unknown enumerator as a refusal
// of an unknown kind. A breaking change gets a new name (libpinwell-ticket.so.2) and a new inline namespace,
// so that both can be loaded side by side. Version 1.0 gave `Result` the members of std::expected, and
// verdicts and types of trailers their enumerations. The interface takes and returns types of the standard
// library: use the C++ library that this one was built with.
//
// <pinwell/ticket_c.h> is the other interface of the library, for C and languages that call C. It judges
// whole artefacts and verifies them down to every byte.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <stdexcept>
#include <string>
#include <utility>
#include <variant>
#include <vector>

#include "pinwell/ticket_version.h"

#define PINWELL_TICKET_API __attribute__((visibility("default")))

namespace pinwell::ticket {
inline namespace v1 {

/// The PINWELL_TICKET_VERSION of the loaded library: never lower than the version compiled with.
PINWELL_TICKET_API std::uint32_t version() noexcept;

using Bytes = std::vector<std::byte>;
using ByteView = std::span<const std::byte>;

enum class ErrorCode : std::uint32_t {
    /// The bytes break a rule of their format; `offset` says where.
    malformed = 1,

    /// The file cannot be opened or read, or is no regular file; `systemError` is the errno if one is
    /// known.
    unreadable = 2,

    /// The bytes given as roots contain no certificate.
    noCertificates = 3,
};

struct Error {
    ErrorCode code = ErrorCode::malformed;
    std::uint64_t offset = 0;
    int systemError = 0;
    std::string message;
};

/// Thrown by Result::value(). Its what() is the message of the error.
class PINWELL_TICKET_API BadResultAccess : public std::runtime_error {
  public:
    explicit BadResultAccess(Error error) : std::runtime_error(error.message), error_(std::move(error)) {}

    const Error& error() const noexcept { return error_; }

  private:
    Error error_;
};

/// Either a value or the reason why there is none, with the vocabulary of std::expected. It owns its content,
/// and copies and moves it. After a move it still holds a value or an error, which has been moved from. Any
/// number of threads may read a result; a thread that changes it needs it alone.
template <class T>
class [[nodiscard]] Result {
  public:
    using value_type = T;
    using error_type = Error;

    Result(T value) : content_(std::in_place_index<0>, std::move(value)) {}      // NOLINT: implicit by design
    Result(Error error) : content_(std::in_place_index<1>, std::move(error)) {}  // NOLINT: implicit by design

    bool has_value() const noexcept { return content_.index() == 0; }
    explicit operator bool() const noexcept { return has_value(); }

    // Undefined without a value. References are valid as long as the result.
    T& operator*() & noexcept { return *std::get_if<0>(&content_); }
    const T& operator*() const& noexcept { return *std::get_if<0>(&content_); }
    T&& operator*() && noexcept { return std::move(*std::get_if<0>(&content_)); }
    T* operator->() noexcept { return std::get_if<0>(&content_); }
    const T* operator->() const noexcept { return std::get_if<0>(&content_); }

    // Throw BadResultAccess without a value.
    T& value() & {
        requireValue();
        return **this;
    }
    const T& value() const& {
        requireValue();
        return **this;
    }
    T&& value() && {
        requireValue();
        return *std::move(*this);
    }

    /// The value, or else `otherwise` as a T.
    template <class Otherwise>
    T value_or(Otherwise&& otherwise) const& {
        return has_value() ? **this : static_cast<T>(std::forward<Otherwise>(otherwise));
    }
    template <class Otherwise>
    T value_or(Otherwise&& otherwise) && {
        return has_value() ? *std::move(*this) : static_cast<T>(std::forward<Otherwise>(otherwise));
    }

    // Undefined with a value.
    const Error& error() const& noexcept { return *std::get_if<1>(&content_); }
    Error&& error() && noexcept { return std::move(*std::get_if<1>(&content_)); }

  private:
    void requireValue() const {
        if (!has_value()) throw BadResultAccess(error());
    }

    std::variant<T, Error> content_;
};

// A ticket taken apart. None of these functions checks whether the ticket is genuine.

/// The container, located in the bytes of a ticket. At least one certificate and at most three.
struct Container {
    std::uint16_t version = 0;
    std::uint16_t reserved = 0;          // signed, and without a meaning
    ByteView signedBytes;                // all except the signature
    std::vector<ByteView> certificates;  // DER, the signer's first, then its issuers'; not parsed
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
    std::uint64_t signatureTime = 0;  // seconds since 1970-01-01 00:00:00 UTC, by custom; never used
    ByteView bytes;                   // of the payload

    bool isMarkedRevoked() const noexcept { return (flags & kFlagRevoked) != 0; }
};
PINWELL_TICKET_API Result<Payload> decodePayload(ByteView payload);

/// One cdhash of a payload.
struct Entry {
    std::uint32_t algorithm = 0;  // 1 SHA-1, 2 and 3 SHA-256 cut to 20 bytes, 4 SHA-384; 0: not named
    Bytes hash;                   // 20 or 48 bytes
};

/// The entry at an index, in constant time. Returns `nullopt` after the last one. Returns `nullopt` too if
/// the entry's algorithm is unknown, or needs more bytes than an entry of this payload has. `payload` is a
/// result of decodePayload().
PINWELL_TICKET_API std::optional<Entry> entryAt(const Payload& payload, std::uint64_t index);

// Judging a ticket.

/// Certificates that a ticket's chain may end in. Immutable; copies share them.
class TrustedRoots {
  public:
    /// The certificates of a PEM text (other blocks are skipped), or one certificate in DER.
    PINWELL_TICKET_API static Result<TrustedRoots> fromCertificates(ByteView pemOrDer);

    /// The roots of the tool if $PINWELL_PLATFORM names this directory: its roots/*.pem, without the
    /// distrusted ones in user-trust/deny/*.pem. Read now, once. An unreadable file is left out, and
    /// problems() names it. A directory that does not exist counts as an empty one.
    PINWELL_TICKET_API static TrustedRoots fromPlatformDirectory(const std::string& path);

    /// One line for each file that was left out.
    PINWELL_TICKET_API const std::vector<std::string>& problems() const noexcept;

    /// How many certificates a chain may end in.
    PINWELL_TICKET_API std::size_t size() const noexcept;

  private:
    struct Contents;
    friend struct TrustedRootsAccess;

    explicit TrustedRoots(std::shared_ptr<const Contents> contents) noexcept;

    std::shared_ptr<const Contents> contents_;
};

/// The step that refuses a ticket, in the order of the steps.
enum class Step : std::uint32_t {
    none = 0,          // not refused
    container = 1,     // the frame: magic, version, lengths
    certificates = 2,  // the certificate block, or a certificate in it
    policy = 3,        // the platform's security library has no ticket-signing policy
    chain = 4,         // the chain does not end in a trusted root, or breaks the policy
    signature = 5,     // it does not verify with the first certificate's key
    payload = 6,       // genuine bytes that are not a payload
    memory = 7,        // not enough memory to judge it
};

/// The result of a chain's evaluation.
enum class Verdict : std::uint32_t {
    none = 0,                // the chain was not judged
    proceed = 1,             // only the user trusts it: not enough
    deny = 3,                // the user distrusts a certificate in it
    unspecified = 4,         // trusted: the verdict of a genuine ticket
    recoverableFailure = 5,  // a check of the policy failed
    fatalFailure = 6,        // bad signature, unhandled critical extension
    otherError = 7,          // the policy has an unknown option
};

struct Validation {
    /// Well formed, with a trusted chain, and signed by it. The other members have no meaning if this is
    /// false.
    bool isGenuine = false;

    /// The ticket marks the software as revoked: it must not run, whether or not it is listed.
    bool isRevoked = false;

    /// One of the entries is one of the cdhashes. Only their bytes are compared, as in the tool.
    bool isListed = false;

    /// Whether the tool would accept the ticket for this artefact.
    bool isAcceptable() const noexcept { return isGenuine && isListed && !isRevoked; }

    /// Why it is not genuine: the rule, and the offset in the ticket of the part that breaks it.
    Step step = Step::none;
    std::uint64_t offset = 0;
    std::string reason;

    /// The result of the chain's evaluation, genuine or not.
    Verdict verdict = Verdict::none;
};

/// Judges the bytes of a whole ticket at `evaluationTime`, in seconds since 1970-01-01 00:00:00 UTC. Time
/// matters only if the policy checks it. The tool's own policy does not, so a ticket outlives its
/// certificates. `cdhashes` are the artefact's, 20 or 48 bytes each; the list may be empty.
PINWELL_TICKET_API Validation validate(ByteView ticket, const TrustedRoots& roots,
                                       std::int64_t evaluationTime, std::span<const ByteView> cdhashes = {});

// Finding a ticket in a file. A bundle's ticket is the file Contents/CodeResources by itself. By path, only a
// regular file is opened, and a link in the last component is not followed; opening never blocks.

struct Range {
    std::uint64_t offset = 0;
    std::uint64_t length = 0;
};

/// The bytes of a ticket and their place in the file.
struct FoundTicket {
    Range range;
    Bytes bytes;
};

/// A blob of the superblob.
struct Slot {
    std::uint32_t type = 0;   // 0x10002 for the ticket
    std::string name;         // its contents in words; or "unknown"
    std::uint32_t magic = 0;  // of the blob
    Range range;              // in the file, with the blob's header of 8 bytes
};

struct DiskImage {
    std::uint64_t fileSize = 0;
    Range trailer;                      // the last 512 bytes
    std::optional<Range> superblob;     // `nullopt`: the image is not signed
    std::vector<Slot> slots;            // in the order of the index
    std::optional<FoundTicket> ticket;  // the last one if there are several
};

/// Trailer and superblob of a UDIF disk image. The rules are those of the tool before it writes to an
/// image.
PINWELL_TICKET_API Result<DiskImage> readDiskImage(const std::string& path);
PINWELL_TICKET_API Result<DiskImage> readDiskImage(int descriptor);

/// The type of a trailer. A file may have any other number here too.
enum class TrailerType : std::uint16_t {
    terminator = 1,  // the first trailer, next to the archive
    ticket = 2,
};

/// A trailer record and the data before it.
struct Trailer {
    TrailerType type{};
    std::uint64_t recordOffset = 0;  // 16 bytes
    Range data;
};

struct FlatPackage {
    std::uint64_t fileSize = 0;
    std::vector<Trailer>
        trailers;                // the last trailer of the file is first; the walk stops at the first ticket
    bool hasTerminator = false;  // the walk reached the terminator and found no ticket
    std::optional<FoundTicket> ticket;
};

/// The trailers of a flat package, from the end of the file to the ticket or to the end of the chain. A
/// damaged record before the ticket is found is malformed. A file without a trailer at its end counts as a
/// package without a ticket: the archive itself is not checked.
PINWELL_TICKET_API Result<FlatPackage> readFlatPackage(const std::string& path);
PINWELL_TICKET_API Result<FlatPackage> readFlatPackage(int descriptor);

}  // namespace v1
}  // namespace pinwell::ticket
