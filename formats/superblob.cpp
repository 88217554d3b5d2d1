#include "formats/superblob.h"

#include <algorithm>
#include <iterator>
#include <limits>
#include <utility>

#include "base/byte_io.h"

namespace pinwell {

using base::ByteReader;
using base::ByteView;
using base::ByteWriter;
using base::Data;
using base::ShortRead;
using base::SparseBuffer;

namespace {

SurveyedBlob surveyBlob(ByteView superblob, const BlobIndexEntry& entry) {
    SurveyedBlob blob{.slot = entry.slot, .offset = entry.offset, .magic = {}, .length = {}, .bytes = {}};
    if (entry.offset >= superblob.size()) return blob;
    blob.bytes = superblob.subspan(entry.offset);
    if (blob.bytes.size() < kBlobHeaderSize) return blob;
    ByteReader reader(blob.bytes);
    const BlobHeader header = readBlobHeader(reader);
    blob.magic = header.magic;
    blob.length = header.length;
    blob.bytes = blob.bytes.first(std::min<std::size_t>(*blob.length, blob.bytes.size()));
    return blob;
}

// Passes the entries of the index to `visit` while it returns true. Returns the stated count, or 0 without a
// header.
template <class Visit>
std::uint32_t surveyIndex(ByteView superblob, Visit visit) {
    std::uint32_t count = 0;
    try {
        ByteReader index(superblob);
        count = readSuperblobHeader(index).count;
        for (std::uint32_t i = 0; i < count; ++i)
            if (!visit(surveyBlob(superblob, readBlobIndexEntry(index)))) break;
    } catch (const ShortRead&) {
        // A truncated entry is ignored.
    }
    return count;
}

// In index order; stops early if the superblob ends.
std::vector<BlobIndexEntry> readIndex(ByteView superblob, std::uint32_t count) {
    std::vector<BlobIndexEntry> entries;
    try {
        ByteReader reader(superblob);
        reader.skip(kSuperblobHeaderSize, "superblob header");
        entries.reserve(std::min<std::size_t>(count, reader.remaining() / kBlobIndexEntrySize));
        for (std::uint32_t i = 0; i < count; ++i) entries.push_back(readBlobIndexEntry(reader));
    } catch (const ShortRead&) {
        // The caller detects missing entries.
    }
    return entries;
}

bool hasEqualEntries(const std::vector<BlobIndexEntry>& index) {
    const auto leadsOn = [](const BlobIndexEntry& a, const BlobIndexEntry& b) { return a.offset < b.offset; };
    const auto goesBack = [&](const BlobIndexEntry& a, const BlobIndexEntry& b) { return !leadsOn(a, b); };
    if (std::adjacent_find(index.begin(), index.end(), goesBack) == index.end()) return false;
    std::vector<BlobIndexEntry> sorted = index;
    std::sort(sorted.begin(), sorted.end());
    return std::adjacent_find(sorted.begin(), sorted.end()) != sorted.end();
}

// The blob from entry.offset to `end`; `nullopt` if its own header disagrees. Throws ShortRead if it is not
// within the superblob.
std::optional<BlobRecord> readBlob(ByteView superblob, const BlobIndexEntry& entry, std::uint64_t end,
                                   const Diagnostics& diagnostics) {
    ByteReader reader(superblob);
    reader.seek(entry.offset, "blob");
    const BlobHeader header = readBlobHeader(reader);
    const std::uint64_t storedLength = header.length;
    const std::uint64_t length = end - entry.offset;  // wraps if the index is out of order
    if (length != storedLength) {
        diagnostics.note("Calculated length (%tu) does not match embedded blob length (%tu)", length,
                         storedLength);
        return std::nullopt;
    }
    const ByteView data = ByteReader(superblob).sub(entry.offset, length, "blob").bytes(length, "blob");
    return BlobRecord{entry.slot, entry.offset, header.magic, data};
}

/// The bytes that a ticket adds to the index and to the blobs, besides its own.
constexpr std::uint64_t kTicketFootprint = kBlobIndexEntrySize + kBlobHeaderSize;

BlobSet withoutTickets(const BlobSet& blobs) {
    BlobSet kept;
    kept.reserve(blobs.size());
    std::copy_if(blobs.begin(), blobs.end(), std::back_inserter(kept),
                 [](const BlobRecord& record) { return record.slotType != kTicketSlotType; });
    return kept;
}

/// The length of the superblob of these blobs, without old tickets, and the ticket.
std::uint64_t lengthWith(const BlobSet& kept, ByteView ticket) {
    std::uint64_t length = kSuperblobHeaderSize;
    for (const BlobRecord& record : kept) length += kBlobIndexEntrySize + record.length();
    return ticket.empty() ? length : length + kTicketFootprint + ticket.size();
}

}  // namespace

SuperblobHeader readSuperblobHeader(ByteReader& reader) {
    SuperblobHeader header;
    header.magic = reader.be32("superblob magic");
    header.length = reader.be32("superblob length");
    header.count = reader.be32("superblob count");
    return header;
}

BlobIndexEntry readBlobIndexEntry(ByteReader& reader) {
    BlobIndexEntry entry;
    entry.slot = reader.be32("index slot");
    entry.offset = reader.be32("index offset");
    return entry;
}

BlobHeader readBlobHeader(ByteReader& reader) {
    BlobHeader header;
    header.magic = reader.be32("blob magic");
    header.length = reader.be32("blob length");
    return header;
}

bool isAlternateSlot(std::uint32_t slot) {
    return slot >= kSlotFirstAlternate && slot <= kSlotLastAlternate;
}

std::string_view slotName(std::uint32_t slot) {
    switch (slot) {
        case kSlotCodeDirectory:
            return "code directory";
        case kSlotRequirements:
            return "requirements";
        case kSlotEntitlements:
            return "entitlements";
        case kSlotDerEntitlements:
            return "entitlements (DER)";
        case kSlotCms:
            return "signer's message";
        case kTicketSlotType:
            return "ticket";
        default:
            break;
    }
    return isAlternateSlot(slot) ? "alternate code directory" : "unknown";
}

std::vector<SurveyedBlob> surveySuperBlob(ByteView superblob, std::size_t maximum, std::uint32_t& count) {
    std::vector<SurveyedBlob> blobs;
    count = surveyIndex(superblob, [&](const SurveyedBlob& blob) {
        blobs.push_back(blob);
        return blobs.size() < maximum;
    });
    return blobs;
}

std::optional<SurveyedBlob> surveyLastBlobOf(std::uint32_t slot, ByteView superblob) {
    std::optional<SurveyedBlob> last;
    surveyIndex(superblob, [&](const SurveyedBlob& blob) {
        if (blob.slot == slot && blob.magic) last = blob;
        return true;
    });
    return last;
}

values::Value BlobRecord::at(std::string_view key) const {
    if (key == kSlotTypeKey) return slotType;
    if (key == kBlobOffsetKey) return offset;
    if (key == kBlobLengthKey) return length();
    if (key == kBlobDataKey) return base::toData(data);
    if (key == kBlobMagicKey) return magic;
    return {};
}

bool operator==(const BlobRecord& a, const BlobRecord& b) {
    return a.slotType == b.slotType && a.offset == b.offset && a.magic == b.magic &&
           std::ranges::equal(a.data, b.data);
}

std::optional<BlobSet> orderedBlobSetForSuperBlob(ByteView superblob, std::uint32_t numberOfBlobs,
                                                  const Diagnostics& diagnostics) {
    const std::vector<BlobIndexEntry> index = readIndex(superblob, numberOfBlobs);
    if (index.size() < numberOfBlobs || hasEqualEntries(index)) {
        diagnostics.note("Did not find %d unique blobs in the code signing data.", numberOfBlobs);
        return std::nullopt;
    }

    BlobSet blobs;
    blobs.reserve(index.size());
    std::uint64_t covered = kSuperblobHeaderSize + std::uint64_t{kBlobIndexEntrySize} * numberOfBlobs;
    try {
        for (std::size_t i = 0; i < index.size(); ++i) {
            const std::uint64_t end = i + 1 < index.size() ? index[i + 1].offset : superblob.size();
            const auto record = readBlob(superblob, index[i], end, diagnostics);
            if (!record) break;
            covered += record->length();
            blobs.push_back(*record);
        }
    } catch (const ShortRead&) {
        // Ends the search like a wrong length; the uncovered bytes then show the fault.
    }

    if (covered != superblob.size()) {
        diagnostics.note("Length of all blobs (%tu) did not match length of code signing data (%tu).",
                         covered, superblob.size());
        return std::nullopt;
    }
    diagnostics.note("Total Length: %tu Found blobs: %tu", covered, blobs.size());
    return blobs;
}

Data emptySuperblob() {
    return ByteWriter().be32(kSuperblobMagic).be32(kSuperblobHeaderSize).be32(0).data();
}

bool hasRoomForTicket(const BlobSet& blobs, ByteView ticket) {
    return lengthWith(withoutTickets(blobs), ticket) <= std::numeric_limits<std::uint32_t>::max();
}

SparseBuffer superblobWithTicket(const BlobSet& blobs, ByteView ticket, std::size_t spare,
                                 const Diagnostics& diagnostics) {
    const BlobSet kept = withoutTickets(blobs);
    const std::size_t count = kept.size() + (ticket.empty() ? 0 : 1);
    diagnostics.note("Adding %lu blobs to superblob. What about Blob?", count);
    const std::uint64_t length = lengthWith(kept, ticket);
    const std::uint64_t area = kSuperblobHeaderSize + std::uint64_t{kBlobIndexEntrySize} * count;
    if (length == area) return {};

    SparseBuffer superblob(length + spare);
    ByteWriter start;
    start.be32(kSuperblobMagic)
        .be32(static_cast<std::uint32_t>(length))
        .be32(static_cast<std::uint32_t>(count));
    auto offset = static_cast<std::uint32_t>(area);
    for (const BlobRecord& record : kept) {
        start.be32(record.slotType).be32(offset);
        diagnostics.note("Adding blob of size %@ to offset %d.", record.at(kBlobLengthKey), offset);
        superblob.put(offset, record.data);
        offset += static_cast<std::uint32_t>(record.length());
    }
    if (!ticket.empty()) {
        start.be32(kTicketSlotType).be32(offset);
        const std::size_t blobLength = ticket.size() + kBlobHeaderSize;
        superblob.put(
            offset, ByteWriter().be32(kTicketBlobMagic).be32(static_cast<std::uint32_t>(blobLength)).data());
        superblob.put(offset + kBlobHeaderSize, ticket);
        diagnostics.note("Length of new ticket blob is %tu", blobLength);
    }
    superblob.put(0, start.data());
    return superblob;
}

}  // namespace pinwell
