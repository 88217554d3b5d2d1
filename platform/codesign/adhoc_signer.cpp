#include "adhoc_signer.h"

#include <limits>

#include "base/byte_io.h"
#include "codesign/code_directory.h"
#include "codesign/superblob.h"

namespace pinwell::codesign {

using base::ByteWriter;

namespace {

constexpr std::uint32_t kRequirementsMagic = 0xFADE0C01;
constexpr std::uint32_t kNoLimit32 = 0xFFFFFFFF;

std::uint32_t u32(std::size_t value) {
    return static_cast<std::uint32_t>(value);
}

Data emptyRequirements() {
    return ByteWriter().be32(kRequirementsMagic).be32(12).be32(0).data();
}

Data digestOfContent(const ByteSource& source, std::uint64_t limit) {
    crypto::Hasher hasher(crypto::Digest::sha256);
    base::ReadAhead content(source, limit);
    for (ByteView piece = content.next(); !piece.empty(); piece = content.next()) hasher.update(piece);
    return base::toData(hasher.finish());
}

}  // namespace

Data layOutOpaqueCodeDirectory(const OpaqueSignature& signature) {
    const bool wide = signature.limit > std::numeric_limits<std::uint32_t>::max();
    const std::uint32_t version = wide ? kVersionWithLimit64 : kVersionWithScatter;
    const std::size_t headerSize = codeDirectoryHeaderSize(version);
    const std::size_t size = digestSize(DigestType::sha256);
    const std::uint32_t specialSlots = signature.trailerDigest ? kSlotTrailer : kSlotRequirements;
    const std::size_t hashOffset = headerSize + signature.identifier.size() + 1 + size * specialSlots;

    ByteWriter writer;
    writer.be32(kCodeDirectoryMagic).be32(u32(hashOffset + size)).be32(version).be32(kFlagAdHoc);
    writer.be32(u32(hashOffset)).be32(u32(headerSize)).be32(specialSlots).be32(1);
    writer.be32(wide ? kNoLimit32 : static_cast<std::uint32_t>(signature.limit));
    writer.u8(static_cast<std::uint8_t>(size)).u8(static_cast<std::uint8_t>(DigestType::sha256)).u8(0).u8(0);
    writer.be32(0).be32(0);                                  // spare, scatter offset
    if (wide) writer.be32(0).be32(0).be64(signature.limit);  // team offset, spare

    writer.text(signature.identifier).u8(0);
    if (signature.trailerDigest) writer.bytes(*signature.trailerDigest).zeros(3 * size);
    writer.bytes(digest(DigestType::sha256, emptyRequirements())).zeros(size);
    writer.bytes(signature.contentDigest);
    return std::move(writer).take();
}

Data signOpaque(const ByteSource& source, const std::optional<DiskImageTrailer>& trailer,
                std::string_view identifier) {
    OpaqueSignature signature;
    signature.identifier = identifier;
    signature.limit = trailer ? trailer->signedLimit() : source.size();
    if (trailer) signature.trailerDigest = digest(DigestType::sha256, trailer->canonicalBytes());
    signature.contentDigest = digestOfContent(source, signature.limit);
    return buildSuperBlob({{kSlotCodeDirectory, layOutOpaqueCodeDirectory(signature)},
                           {kSlotRequirements, emptyRequirements()},
                           {kSlotCms, ByteWriter().be32(kWrapperMagic).be32(kBlobHeaderSize).data()}});
}

}  // namespace pinwell::codesign
