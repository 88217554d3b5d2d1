#include "verify/code.h"

#include <algorithm>

#include "base/bytes.h"
#include "block_table.h"
#include "codesign/code_error.h"
#include "codesign/static_code.h"
#include "codesign/superblob.h"
#include "formats/disk_image.h"
#include "page_hashes.h"
#include "values/format.h"
#include "verify/check.h"

namespace pinwell::verify {

using base::ByteSource;
using codesign::DiskImageTrailer;
using codesign::FileRange;
using values::format;

namespace {

const std::string kImagePlace = "disk image";

/// The place of the signature, which must end at the trailer.
std::optional<FileRange> signatureArea(const DiskImageTrailer& trailer, Section& section) {
    const std::optional<FileRange> area = trailer.signature();
    if (!area) return std::nullopt;
    if (area->offset > trailer.offset() || area->length != trailer.offset() - area->offset) {
        section.fail(kTrailer, format("trailer (from byte %llu on)", trailer.offset()),
                     "a signature that ends at the trailer",
                     format("%llu bytes from byte %llu on", area->length, area->offset));
    }
    return area;
}

void checkSigned(const ByteSource& source, const DiskImageTrailer& trailer, const FileRange& area,
                 const SignatureParts& parts, Workers& workers, Section& section) {
    section.pass(kSignature, kImagePlace, "a well-formed signature");
    const Data canonical = trailer.canonicalBytes();
    const FileRange code{0, area.offset};
    checkSigner(parts, kImagePlace, section);
    checkAgreement(parts, kImagePlace, section);
    checkSpecialSlots(parts, {{kSlotTrailer, {.bytes = &canonical, .mustBeCovered = true}}}, kImagePlace,
                      section);
    checkCodeLimit(parts, code.length, "the signature", kImagePlace, section);
    checkPageHashes(source, code, parts, kImagePlace, workers, section);
}

/// Whether a file without a valid trailer was an image: its trailer is cut, moved, or damaged in its first
/// bytes.
bool wasDiskImage(const ByteSource& source) {
    constexpr std::uint64_t kTailSize = 8192;
    const auto length = static_cast<std::size_t>(std::min(kTailSize, source.size()));
    const Data tail = source.read(source.size() - length, length);
    const ByteView magic = base::asBytes("koly");
    if (std::search(tail.begin(), tail.end(), magic.begin(), magic.end()) != tail.end()) return true;
    if (tail.size() < kUDIFHeaderSize) return false;
    UDIFFileHeader header;
    header.assign(ByteView(tail).last(kUDIFHeaderSize));
    return header.version() == kUDIFVersion && header.headerSize() == kUDIFHeaderSize;
}

VerifiedCode verified(const ByteSource& source, Workers& workers, Section& section) {
    const std::optional<DiskImageTrailer> trailer = DiskImageTrailer::read(source);
    if (!trailer) {
        section.fail(kTrailer, "end of the file", "a disk image's trailer", "none that can be read");
        return {.isSigned = wasDiskImage(source), .identities = {}};
    }
    // An unsigned image still has a hash: the synthetic one over all its data.
    const std::optional<FileRange> area = signatureArea(*trailer, section);
    if (worstOutcome(section) == Outcome::failed) return {.isSigned = true, .identities = {}};
    checkBlockTables(source, *trailer, workers, section);
    if (!area) return {.isSigned = true, .identities = {}};
    const codesign::SharedBytes superblob = codesign::readSuperBlob(source, area->offset, area->length);
    checkBlobs(superblob, SignatureHost::diskImage, kImagePlace, section);
    const std::optional<SignatureParts> parts = SignatureParts::fromSuperBlob(superblob);
    if (!parts) return {.isSigned = true, .identities = {}};  // it has only a ticket
    checkSigned(source, *trailer, *area, *parts, workers, section);
    return {.isSigned = true, .identities = {identityOf(*parts, kImagePlace)}};
}

}  // namespace

VerifiedCode verifyDiskImage(const ByteSource& source, Workers& workers, Section& section) {
    try {
        return verified(source, workers, section);
    } catch (const std::runtime_error& failure) {
        section.failWith(failure, kSignature, kImagePlace, "a well-formed signature");
    }
    return {.isSigned = true, .identities = {}};
}

}  // namespace pinwell::verify
