#include "codesign/code_directory.h"

#include <algorithm>
#include <utility>

#include "base/byte_io.h"
#include "codesign/code_error.h"

namespace pinwell::codesign {

using base::ByteReader;

namespace {

constexpr std::size_t kScatterRecordSize = 24;

/// Offset 36: digest size and type are at the same place in every version.
constexpr std::size_t kDigestFieldsOffset = 36;

struct Header {
    std::uint32_t version = 0;
    std::uint32_t flags = 0;
    std::uint32_t hashOffset = 0;
    std::uint32_t identifierOffset = 0;
    std::uint32_t specialSlots = 0;
    std::uint32_t codeSlots = 0;
    std::uint8_t digestSize = 0;
    std::uint8_t digestType = 0;
    std::uint32_t scatterOffset = 0;
    std::uint32_t teamOffset = 0;
    std::uint32_t preEncryptionOffset = 0;
    std::size_t size = 0;
};

Header readHeader(ByteReader reader, std::size_t blobLength) {
    Header header;
    if (reader.be32("code directory magic") != kCodeDirectoryMagic) refuse("not a code directory");
    if (reader.be32("code directory length") != blobLength)
        refuse("the code directory's length is not its blob's");
    header.version = reader.be32("code directory version");
    if (header.version < kOldestCodeDirectoryVersion || header.version > kNewestCodeDirectoryVersion) {
        refuse("unsupported code directory version");
    }
    header.size = codeDirectoryHeaderSize(header.version);
    if (header.size > blobLength) refuse("the code directory is shorter than its header");
    header.flags = reader.be32("flags");
    header.hashOffset = reader.be32("hash offset");
    header.identifierOffset = reader.be32("identifier offset");
    header.specialSlots = reader.be32("special slots");
    header.codeSlots = reader.be32("code slots");
    reader.skip(4, "limit");
    header.digestSize = reader.u8("digest size");
    header.digestType = reader.u8("digest type");
    reader.skip(6, "platform, page size and spare");
    if (header.version >= kVersionWithScatter) header.scatterOffset = reader.be32("scatter offset");
    if (header.version >= kVersionWithTeam) header.teamOffset = reader.be32("team offset");
    if (header.version >= kVersionWithRuntime) {
        reader.seek(92, "pre-encryption hash offset");
        header.preEncryptionOffset = reader.be32("pre-encryption hash offset");
    }
    return header;
}

void requireBehindHeader(const Header& header, std::uint64_t offset, const char* what) {
    if (offset < header.size) refuse(std::string(what) + " lies in the code directory's header");
}

std::string readString(const ByteReader& whole, const Header& header, std::uint32_t offset,
                       const char* what) {
    requireBehindHeader(header, offset, what);
    ByteReader reader = whole;
    reader.seek(offset, what);
    const ByteView rest = reader.bytes(reader.remaining(), what);
    const auto end = std::find(rest.begin(), rest.end(), std::byte{0});
    if (end == rest.end()) refuse(std::string(what) + " has no end");
    return base::toString(rest.first(static_cast<std::size_t>(end - rest.begin())));
}

void checkDigests(const ByteReader& whole, const Header& header) {
    const std::uint64_t before = std::uint64_t{header.specialSlots} * header.digestSize;
    const std::uint64_t behind = std::uint64_t{header.codeSlots} * header.digestSize;
    if (before > header.hashOffset) refuse("the special slots begin before the code directory");
    requireBehindHeader(header, header.hashOffset - before, "the digest list");
    whole.sub(header.hashOffset, behind, "code slots");
    if (header.preEncryptionOffset != 0) {
        requireBehindHeader(header, header.preEncryptionOffset, "the pre-encryption digest list");
        whole.sub(header.preEncryptionOffset, behind, "pre-encryption slots");
    }
}

void checkScatter(const ByteReader& whole, const Header& header) {
    if (header.scatterOffset == 0) return;
    requireBehindHeader(header, header.scatterOffset, "the scatter vector");
    ByteReader reader = whole;
    reader.seek(header.scatterOffset, "scatter vector");
    for (;;) {
        const std::uint32_t count = reader.be32("scatter count");
        reader.skip(kScatterRecordSize - 4, "scatter record");
        if (count == 0) return;
    }
}

struct DigestFacts {
    crypto::Digest algorithm;
    std::size_t size;
    std::size_t codeHashSize;
    int strength;
};

DigestFacts factsOf(DigestType type) {
    switch (type) {
        case DigestType::sha1:
            return {crypto::Digest::sha1, 20, 20, 1};
        case DigestType::sha256Truncated:
            return {crypto::Digest::sha256, 20, 20, 2};
        case DigestType::sha256:
            return {crypto::Digest::sha256, 32, 20, 3};
        case DigestType::sha384:
            break;
    }
    return {crypto::Digest::sha384, 48, 48, 4};
}

}  // namespace

std::optional<DigestType> digestTypeNumbered(std::uint8_t number) {
    if (number < 1 || number > 4) return std::nullopt;
    return static_cast<DigestType>(number);
}

crypto::Digest algorithmOf(DigestType type) {
    return factsOf(type).algorithm;
}

std::size_t digestSize(DigestType type) {
    return factsOf(type).size;
}

std::size_t codeHashSize(DigestType type) {
    return factsOf(type).codeHashSize;
}

int digestStrength(DigestType type) {
    return factsOf(type).strength;
}

Data digest(DigestType type, ByteView bytes) {
    return base::toData(crypto::threadHasher(algorithmOf(type)).of(bytes).first(digestSize(type)));
}

std::size_t codeDirectoryHeaderSize(std::uint32_t version) {
    if (version >= kVersionWithRuntime) return 96;
    if (version >= kVersionWithExecutableSegment) return 88;
    if (version >= kVersionWithLimit64) return 64;
    if (version >= kVersionWithTeam) return 52;
    if (version >= kVersionWithScatter) return 48;
    return 44;
}

std::uint8_t CodeDirectory::digestTypeNumberOf(ByteView blob) {
    ByteReader reader(blob);
    if (reader.be32("code directory magic") != kCodeDirectoryMagic) refuse("not a code directory");
    reader.seek(kDigestFieldsOffset + 1, "digest type");
    return reader.u8("digest type");
}

CodeDirectory CodeDirectory::parse(SharedBytes blob) {
    const ByteReader whole(blob);
    const Header header = readHeader(whole, blob.size());
    const std::optional<DigestType> type = digestTypeNumbered(header.digestType);
    if (!type) refuse("unknown digest type");
    if (header.digestSize != digestSize(*type)) refuse("the digest size is not its type's");
    checkDigests(whole, header);
    checkScatter(whole, header);

    CodeDirectory directory;
    directory.identifier_ = readString(whole, header, header.identifierOffset, "the identifier");
    if (header.teamOffset != 0) {
        directory.teamIdentifier_ = readString(whole, header, header.teamOffset, "the team identifier");
    }
    directory.bytes_ = std::move(blob);
    directory.version_ = header.version;
    directory.flags_ = header.flags;
    directory.hashOffset_ = header.hashOffset;
    directory.specialSlots_ = header.specialSlots;
    directory.digestType_ = *type;
    return directory;
}

std::optional<Data> CodeDirectory::specialSlotDigest(std::uint32_t slot) const {
    if (slot == 0 || slot > specialSlots_) return std::nullopt;
    const std::size_t size = digestSize(digestType_);
    // parse() has checked that all special slots are between the header and the hash offset.
    ByteReader reader = ByteReader(bytes_).sub(hashOffset_ - size * slot, size, "special slot");
    const ByteView stated = reader.bytes(size, "special slot");
    const bool zero =
        std::all_of(stated.begin(), stated.end(), [](std::byte b) { return b == std::byte{0}; });
    if (zero) return std::nullopt;
    return base::toData(stated);
}

Data CodeDirectory::codeHash() const {
    Data hash = digest(digestType_, bytes_);
    hash.resize(codeHashSize(digestType_));
    return hash;
}

}  // namespace pinwell::codesign
