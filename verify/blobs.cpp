// The checks of a superblob as a whole (signature_parts.h), independent of its blobs' contents.
#include <algorithm>

#include "codesign/static_code.h"
#include "codesign/superblob.h"
#include "formats/superblob.h"
#include "values/format.h"
#include "verify/check.h"
#include "verify/signature_parts.h"

namespace pinwell::verify {

using values::format;

namespace {

constexpr std::uint32_t kRequirementsMagic = 0xFADE0C01;
constexpr std::uint32_t kFirstSlotOfNoComponent = 0x1000;

/// The magic that a blob of this slot has; `nullopt` if any is allowed, because a digest covers it.
std::optional<std::uint32_t> magicOf(std::uint32_t slot) {
    if (slot == kSlotCodeDirectory || isAlternateSlot(slot)) return codesign::kCodeDirectoryMagic;
    if (slot == kSlotRequirements) return kRequirementsMagic;
    if (slot == kSlotCms) return kWrapperMagic;
    if (slot == kTicketSlotType) return kTicketBlobMagic;
    return std::nullopt;
}

/// Why nothing covers a blob; empty if something does.
std::string faultOf(const codesign::Blob& blob, SignatureHost host) {
    const bool isComponent = blob.slot != kSlotTrailer && blob.slot < kFirstSlotOfNoComponent;
    const std::optional<std::uint32_t> magic = magicOf(blob.slot);
    if (!magic && !isComponent) return "a blob that nothing covers";
    if (blob.slot == kTicketSlotType && host != SignatureHost::diskImage)
        return "a ticket, which has no place there";
    if (magic && blob.magic != *magic) return format("a blob with the magic %08X", blob.magic);
    const bool isDirectory = magic == codesign::kCodeDirectoryMagic;
    if (isDirectory && !codesign::digestTypeNumbered(codesign::CodeDirectory::digestTypeNumberOf(blob.bytes)))
        return "a code directory of an unknown digest type";
    return {};
}

struct Range {
    std::size_t begin;
    std::size_t end;
};

std::vector<Range> gapsBetween(const std::vector<codesign::Blob>& blobs, ByteView superblob) {
    std::vector<Range> used{{0, kSuperblobHeaderSize + kBlobIndexEntrySize * blobs.size()}};
    for (const codesign::Blob& blob : blobs) {
        const auto begin = static_cast<std::size_t>(blob.bytes.data() - superblob.data());
        used.push_back({begin, begin + blob.bytes.size()});
    }
    std::sort(used.begin(), used.end(), [](Range a, Range b) { return a.begin < b.begin; });
    std::vector<Range> gaps;
    std::size_t covered = 0;
    for (const Range& range : used) {
        if (range.begin > covered) gaps.push_back({covered, range.begin});
        covered = std::max(covered, range.end);
    }
    if (covered < superblob.size()) gaps.push_back({covered, superblob.size()});
    return gaps;
}

}  // namespace

void checkBlobs(ByteView superblob, SignatureHost host, const std::string& place, Section& section) {
    FailureList failures(section, kSignature);
    const std::vector<codesign::Blob> blobs = codesign::parseSuperBlob(superblob);
    std::size_t tickets = 0;
    for (const codesign::Blob& blob : blobs) {
        std::string fault = faultOf(blob, host);
        if (fault.empty() && blob.slot == kTicketSlotType && ++tickets > 1) fault = "a second ticket";
        if (fault.empty()) continue;
        failures.add(Outcome::failed, format("%@, blob in slot 0x%x", place, blob.slot),
                     "a blob of the signature", std::move(fault));
    }
    for (const Range& gap : gapsBetween(blobs, superblob)) {
        const ByteView bytes = superblob.subspan(gap.begin, gap.end - gap.begin);
        if (std::all_of(bytes.begin(), bytes.end(), [](std::byte byte) { return byte == std::byte{0}; }))
            continue;
        failures.add(Outcome::failed,
                     format("%@, between the blobs of its signature (bytes %zu to %zu of it)", place,
                            gap.begin, gap.end - 1),
                     "zeros", "other bytes");
    }
}

namespace {

constexpr std::size_t kSizeOfLimits = 12;  // special slots, code slots, limit
constexpr std::size_t kLimits = 24;
constexpr std::size_t kPlatform = 38;  // and page size, spare
constexpr std::size_t kSizeOfPlatform = 6;
constexpr std::size_t kAfterTeam = 52;
constexpr std::size_t kPreEncryption = 92;  // an offset, which differs with the digests' size

bool saysTheSame(const Directory& a, const Directory& b) {
    const auto isSame = [&](std::size_t begin, std::size_t length) {
        return std::ranges::equal(a.content.bytes().view().subspan(begin, length),
                                  b.content.bytes().view().subspan(begin, length));
    };
    if (a.content.version() != b.content.version() || a.content.flags() != b.content.flags() ||
        a.content.identifier() != b.content.identifier() ||
        a.content.teamIdentifier() != b.content.teamIdentifier() || a.hasScatter != b.hasScatter)
        return false;
    const std::size_t header = codesign::codeDirectoryHeaderSize(a.content.version());
    const std::size_t end = std::min(header, kPreEncryption);
    if (end > kAfterTeam && !isSame(kAfterTeam, end - kAfterTeam)) return false;
    for (std::uint32_t slot = 1; slot <= a.specialSlots; ++slot)
        if (a.content.specialSlotDigest(slot).has_value() != b.content.specialSlotDigest(slot).has_value())
            return false;
    return isSame(kLimits, kSizeOfLimits) && isSame(kPlatform, kSizeOfPlatform);
}

}  // namespace

void checkAgreement(const SignatureParts& parts, const std::string& place, Section& section) {
    const Directory& chosen = parts.chosen();
    for (const Directory& other : parts.directories())
        if (!saysTheSame(chosen, other))
            section.fail(kSignature, format("%@, %@ code directory", place, other.digestName()),
                         format("what the %@ code directory says", chosen.digestName()), "something else");
}

}  // namespace pinwell::verify
