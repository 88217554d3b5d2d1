// The code directory: the statements of a signature about one piece of code, in one digest type. All integers
// are big-endian; offsets count from its start.
//
// | Offset | Size | Field                                   | From version |
// |--------|------|-----------------------------------------|--------------|
// | 0      | 4    | magic FADE0C02                          |              |
// | 4      | 4    | length of the whole                     |              |
// | 8      | 4    | version, 0x20001 to 0x2FFFF             |              |
// | 12     | 4    | flags                                   |              |
// | 16     | 4    | hash offset: the digest of code slot 0  |              |
// | 20     | 4    | identifier offset, a zero-ended string  |              |
// | 24     | 4    | special slots                           |              |
// | 28     | 4    | code slots                              |              |
// | 32     | 4    | limit of the signed code                |              |
// | 36     | 1    | digest size                             |              |
// | 37     | 1    | digest type                             |              |
// | 38     | 1    | platform                                |              |
// | 39     | 1    | page size, as a power of two            |              |
// | 40     | 4    | spare                                   |              |
// | 44     | 4    | scatter offset, 0: none                 | 0x20100      |
// | 48     | 4    | team offset, 0: none                    | 0x20200      |
// | 52     | 4    | spare                                   | 0x20300      |
// | 56     | 8    | limit of the signed code, 0: see 32     | 0x20300      |
// | 64     | 24   | executable segment: base, limit, flags  | 0x20400      |
// | 88     | 4    | runtime                                 | 0x20500      |
// | 92     | 4    | pre-encryption hash offset, 0: none     | 0x20500      |
//
// The digest of special slot n is n digests before the hash offset; the digests of code slots begin at it. A
// scatter vector is a list of 24-byte records, ended by a record whose count (its first four bytes) is zero.
// Refused: an offset or a count that leads into the header or out of the blob, an unterminated string, a
// digest size that does not match its type, another version.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "base/bytes.h"
#include "codesign/code_signing.h"
#include "crypto/crypto.h"

namespace pinwell::codesign {

using base::ByteView;
using base::SharedBytes;

inline constexpr std::uint32_t kCodeDirectoryMagic = 0xFADE0C02;
inline constexpr std::uint32_t kOldestCodeDirectoryVersion = 0x20001;
inline constexpr std::uint32_t kNewestCodeDirectoryVersion = 0x2FFFF;
inline constexpr std::uint32_t kVersionWithScatter = 0x20100;
inline constexpr std::uint32_t kVersionWithTeam = 0x20200;
inline constexpr std::uint32_t kVersionWithLimit64 = 0x20300;
inline constexpr std::uint32_t kVersionWithExecutableSegment = 0x20400;
inline constexpr std::uint32_t kVersionWithRuntime = 0x20500;

// The digests of code directories:
//
// | Type | Digest           | Size in a code directory | Size of the cdhash |
// |------|------------------|--------------------------|--------------------|
// | 1    | SHA-1            | 20                       | 20                 |
// | 2    | SHA-256          | 32                       | 20                 |
// | 3    | SHA-256, cut     | 20                       | 20                 |
// | 4    | SHA-384          | 48                       | 48                 |

/// The type with this number; `nullopt` for an unknown number.
std::optional<DigestType> digestTypeNumbered(std::uint8_t number);

/// The digest that is computed for the type. `sha256Truncated` is the first part of a SHA-256.
crypto::Digest algorithmOf(DigestType type);

/// Bytes that a digest of this type takes in a code directory.
std::size_t digestSize(DigestType type);

/// Bytes of the cdhash of a code directory of this type; the ticket payload uses the same sizes.
std::size_t codeHashSize(DigestType type);

/// The rank of a type for choosing the strongest code directory; the highest wins.
int digestStrength(DigestType type);

/// digestSize() bytes.
Data digest(DigestType type, ByteView bytes);

/// The primary one, and one in each of the five alternate slots.
inline constexpr std::size_t kMaximumCodeDirectories = 6;

/// Bytes of the header of a code directory of this version.
std::size_t codeDirectoryHeaderSize(std::uint32_t version);

/// A well-formed code directory. A value: it shares its bytes.
class CodeDirectory {
  public:
    /// `blob` has its header and no trailing bytes. Throws CodeError or base::ShortRead if it is not
    /// well formed.
    static CodeDirectory parse(SharedBytes blob);

    /// The digest type that a code directory claims, possibly an unknown one. Throws like parse() if `blob`
    /// is too short, or not a code directory.
    static std::uint8_t digestTypeNumberOf(ByteView blob);

    std::uint32_t version() const noexcept { return version_; }
    std::uint32_t flags() const noexcept { return flags_; }
    DigestType digestType() const noexcept { return digestType_; }
    const std::string& identifier() const noexcept { return identifier_; }
    const std::optional<std::string>& teamIdentifier() const noexcept { return teamIdentifier_; }
    const SharedBytes& bytes() const noexcept { return bytes_; }

    /// The required digest of the component of special slot `slot` (from 1 on). `nullopt` if the directory
    /// has no such slot, or its digest is all zero, which requires nothing.
    std::optional<Data> specialSlotDigest(std::uint32_t slot) const;

    /// The cdhash.
    Data codeHash() const;

  private:
    CodeDirectory() = default;

    SharedBytes bytes_;
    std::uint32_t version_ = 0;
    std::uint32_t flags_ = 0;
    std::uint32_t hashOffset_ = 0;
    std::uint32_t specialSlots_ = 0;
    DigestType digestType_ = DigestType::sha256;
    std::string identifier_;
    std::optional<std::string> teamIdentifier_;
};

}  // namespace pinwell::codesign
