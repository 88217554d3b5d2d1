#include "src/PWHashedFile/blob_set.h"

#include <algorithm>
#include <iterator>
#include <set>
#include <utility>

#include "codesign/code_signing.h"
#include "codesign/superblob.h"
#include "foundation/byte_reader.h"
#include "foundation/byte_writer.h"
#include "src/messages.h"

namespace pinwell {

using foundation::ByteReader;
using foundation::ByteView;
using foundation::ByteWriter;
using foundation::Data;
using foundation::ShortRead;

namespace {

struct IndexEntry {
    std::uint32_t slotType;
    std::uint32_t offset;

    auto operator<=>(const IndexEntry&) const = default;
};

// In index order and without repetitions; ends early where the superblob does.
std::vector<IndexEntry> readIndex(ByteView superblob, std::uint32_t count) {
    std::vector<IndexEntry> entries;
    std::set<IndexEntry> known;
    try {
        ByteReader reader(superblob);
        reader.skip(kSuperblobHeaderSize, "superblob header");
        for (std::uint32_t i = 0; i < count; ++i) {
            const std::uint32_t slotType = reader.be32("slot type");
            const IndexEntry entry{slotType, reader.be32("blob offset")};
            if (known.insert(entry).second) entries.push_back(entry);
        }
    } catch (const ShortRead&) {
        // The entries that are missing are missed by the caller.
    }
    return entries;
}

// The blob from entry.offset to `end`; nothing when it is not what its own header says. Throws ShortRead when
// it does not lie within the superblob.
std::optional<BlobRecord> readBlob(ByteView superblob, const IndexEntry& entry, std::uint64_t end) {
    ByteReader reader(superblob);
    reader.seek(entry.offset, "blob");
    const std::uint32_t magic = reader.be32("blob magic");
    const std::uint64_t storedLength = reader.be32("blob length");
    const std::uint64_t length = end - entry.offset;  // wraps when the index is out of order
    if (length != storedLength) {
        NoisyLog("Calculated length (%tu) does not match embedded blob length (%tu)", length, storedLength);
        return std::nullopt;
    }
    const ByteView data = ByteReader(superblob).sub(entry.offset, length, "blob").bytes(length, "blob");

    BlobRecord record;
    record.emplace(kSlotTypeKey, entry.slotType);
    record.emplace(kBlobOffsetKey, entry.offset);
    record.emplace(kBlobLengthKey, length);
    record.emplace(kBlobDataKey, foundation::toData(data));
    record.emplace(kBlobMagicKey, magic);
    return record;
}

const foundation::Value& valueOf(const BlobRecord& record, std::string_view key) {
    return record.find(key)->second;  // a record has all of its keys
}

}  // namespace

std::uint32_t slotTypeOf(const BlobRecord& record) {
    return static_cast<std::uint32_t>(valueOf(record, kSlotTypeKey).unsignedIntegerValue());
}

std::uint32_t blobOffsetOf(const BlobRecord& record) {
    return static_cast<std::uint32_t>(valueOf(record, kBlobOffsetKey).unsignedIntegerValue());
}

std::uint64_t lengthOf(const BlobRecord& record) {
    return valueOf(record, kBlobLengthKey).unsignedIntegerValue();
}

std::uint32_t blobMagicOf(const BlobRecord& record) {
    return static_cast<std::uint32_t>(valueOf(record, kBlobMagicKey).unsignedIntegerValue());
}

ByteView dataOf(const BlobRecord& record) {
    return *valueOf(record, kBlobDataKey).data();
}

std::string_view slotName(std::uint32_t slot) {
    switch (slot) {
        case codesign::kSlotCodeDirectory:
            return "code directory";
        case codesign::kSlotRequirements:
            return "requirements";
        case codesign::kSlotEntitlements:
            return "entitlements";
        case codesign::kSlotDerEntitlements:
            return "entitlements (DER)";
        case codesign::kSlotCms:
            return "signer's message";
        case kTicketSlotType:
            return "ticket";
        default:
            break;
    }
    const bool alternate = slot >= codesign::kSlotFirstAlternate && slot <= codesign::kSlotLastAlternate;
    return alternate ? "alternate code directory" : "unknown";
}

std::optional<BlobSet> orderedBlobSetForSuperBlob(ByteView superblob, std::uint32_t numberOfBlobs) {
    if (numberOfBlobs > codesign::kMaximumBlobCount) return std::nullopt;
    const std::vector<IndexEntry> index = readIndex(superblob, numberOfBlobs);
    if (index.size() < numberOfBlobs) {
        NoisyLog("Did not find %d unique blobs in the code signing data.", numberOfBlobs);
        return std::nullopt;
    }

    BlobSet blobs;
    std::uint64_t covered = kSuperblobHeaderSize + std::uint64_t{kBlobIndexEntrySize} * numberOfBlobs;
    try {
        for (std::size_t i = 0; i < index.size(); ++i) {
            const std::uint64_t end = i + 1 < index.size() ? index[i + 1].offset : superblob.size();
            auto record = readBlob(superblob, index[i], end);
            if (!record) break;
            covered += lengthOf(*record);
            blobs.push_back(std::move(*record));
        }
    } catch (const ShortRead&) {
        // Ends the search as a wrong length does; what is not covered tells.
    }

    if (covered != superblob.size()) {
        NoisyLog("Length of all blobs (%tu) did not match length of code signing data (%tu).", covered,
                 superblob.size());
        return std::nullopt;
    }
    NoisyLog("Total Length: %tu Found blobs: %tu", covered, blobs.size());
    return blobs;
}

Data emptySuperblob() {
    return ByteWriter().be32(kSuperblobMagic).be32(kSuperblobHeaderSize).be32(0).data();
}

Data superblobWithTicket(const BlobSet& blobs, ByteView ticket) {
    BlobSet kept;
    std::copy_if(blobs.begin(), blobs.end(), std::back_inserter(kept),
                 [](const BlobRecord& record) { return slotTypeOf(record) != kTicketSlotType; });
    const std::size_t count = kept.size() + (ticket.empty() ? 0 : 1);
    NoisyLog("Adding %lu blobs to superblob. What about Blob?", count);

    ByteWriter index;
    ByteWriter area;
    auto offset = static_cast<std::uint32_t>(kSuperblobHeaderSize + kBlobIndexEntrySize * count);
    for (const BlobRecord& record : kept) {
        index.be32(slotTypeOf(record)).be32(offset);
        NoisyLog("Adding blob of size %@ to offset %d.", valueOf(record, kBlobLengthKey), offset);
        area.bytes(dataOf(record));
        offset += static_cast<std::uint32_t>(lengthOf(record));
    }
    if (!ticket.empty()) {
        index.be32(kTicketSlotType).be32(offset);
        const auto length = static_cast<std::uint32_t>(ticket.size() + kBlobHeaderSize);
        area.be32(kTicketBlobMagic).be32(length).bytes(ticket);
        NoisyLog("Length of new ticket blob is %tu", ticket.size() + kBlobHeaderSize);
        offset += length;
    }
    if (index.size() == 0 || area.size() == 0) return {};

    ByteWriter superblob;
    superblob.be32(kSuperblobMagic).be32(offset).be32(static_cast<std::uint32_t>(count));
    superblob.bytes(index.data()).bytes(area.data());
    return std::move(superblob).take();
}

bool isReadableSuperblob(ByteView superblob) {
    if (superblob.empty()) return true;
    ByteReader reader(superblob);
    reader.skip(8, "superblob magic and length");
    return reader.be32("superblob count") <= codesign::kMaximumBlobCount &&
           superblob.size() <= codesign::kMaximumSuperBlobLength;
}

}  // namespace pinwell
