#include <fmt/format.h>

#include <vector>

#include "foundation/byte_reader.h"
#include "foundation/property_list.h"
#include "foundation/property_list_guard.h"

namespace pinwell::foundation {
namespace {

constexpr std::size_t kTrailerSize = 32;
constexpr unsigned kLengthFollows = 0xF;

enum class Kind : unsigned {
    simple = 0x0,
    integer = 0x1,
    real = 0x2,
    date = 0x3,
    data = 0x4,
    ascii = 0x5,
    utf16 = 0x6,
    uid = 0x8,
    array = 0xA,
    dictionary = 0xD,
};

// What one object comes to when everything below it is counted at every use.
struct Extent {
    unsigned height = 0;  // 1 for a leaf
    std::uint64_t values = 0;
    std::uint64_t contents = 0;  // bytes
};

struct BinaryRefusal {
    std::int64_t code;
    std::string text;
};

[[noreturn]] void refuse(std::size_t offset, std::string_view what) {
    throw BinaryRefusal{kMalformedDocument,
                        fmt::format("The binary property list is malformed at byte {}: {}.", offset, what)};
}

[[noreturn]] void refuseSize(std::string_view what) {
    throw BinaryRefusal{kExcessiveDocument, fmt::format("The binary property list {}.", what)};
}

class BinaryGuard {
  public:
    explicit BinaryGuard(ByteView document) : document_(document) {}

    void check() {
        readTrailer();
        measure(root_, 1);
    }

  private:
    void readTrailer();
    Extent measure(std::uint64_t object, unsigned depth);
    Extent measureContainer(ByteReader& reader, std::uint64_t count, bool isDictionary, unsigned depth);
    void checkLeaf(ByteReader& reader, Kind kind, unsigned low);
    std::uint64_t readLength(ByteReader& reader, unsigned low);
    void requireKey(std::uint64_t object);
    ByteReader readerAt(std::uint64_t object);

    std::uint64_t sized(ByteReader& reader, unsigned width, std::string_view what) {
        std::uint64_t value = 0;
        for (const std::byte byte : reader.bytes(width, what))
            value = (value << 8U) | std::to_integer<unsigned>(byte);
        return value;
    }

    ByteView document_;
    unsigned offsetWidth_ = 0;
    unsigned referenceWidth_ = 0;
    std::uint64_t root_ = 0;
    std::uint64_t tableOffset_ = 0;
    std::uint64_t references_ = 0;  // followed so far
    std::uint64_t keys_ = 0;        // characters looked at so far
    std::vector<Extent> known_;     // by object; height 0 means not measured yet
};

void BinaryGuard::readTrailer() {
    ByteReader whole(document_);
    whole.skip(kBinaryPropertyListMagic.size(), "header");
    if (whole.remaining() < kTrailerSize) refuse(whole.position(), "no room for the trailer");
    const std::size_t trailerOffset = document_.size() - kTrailerSize;
    ByteReader trailer = whole.sub(trailerOffset, kTrailerSize, "trailer");
    trailer.skip(6, "unused");
    offsetWidth_ = trailer.u8("offset width");
    referenceWidth_ = trailer.u8("reference width");
    const std::uint64_t count = trailer.be64("object count");
    root_ = trailer.be64("root object");
    tableOffset_ = trailer.be64("table offset");
    if (offsetWidth_ < 1 || offsetWidth_ > 8 || referenceWidth_ < 1 || referenceWidth_ > 8)
        refuse(trailerOffset, "width out of range");
    if (tableOffset_ < kBinaryPropertyListMagic.size() || tableOffset_ > trailerOffset)
        refuse(trailerOffset, "offset table outside the list");
    if (count > (trailerOffset - tableOffset_) / offsetWidth_)
        refuse(trailerOffset, "more objects than offsets");
    if (count > kMaximumPropertyListValues) refuseSize("holds too many objects");
    if (root_ >= count) refuse(trailerOffset, "no such root object");
    known_.resize(static_cast<std::size_t>(count));
}

ByteReader BinaryGuard::readerAt(std::uint64_t object) {
    ByteReader table(document_);
    table.seek(tableOffset_ + object * offsetWidth_, "offset table");
    const std::uint64_t offset = sized(table, offsetWidth_, "object offset");
    if (offset < kBinaryPropertyListMagic.size() || offset >= tableOffset_)
        refuse(table.position() - offsetWidth_, "object outside the list");
    ByteReader reader(document_.first(static_cast<std::size_t>(tableOffset_)));
    reader.seek(offset, "object");
    return reader;
}

std::uint64_t BinaryGuard::readLength(ByteReader& reader, unsigned low) {
    if (low != kLengthFollows) return low;
    const unsigned marker = reader.u8("length marker");
    if (marker >> 4U != static_cast<unsigned>(Kind::integer) || (marker & 0xFU) > 3)
        refuse(reader.position() - 1, "a length is no integer");
    return sized(reader, 1U << (marker & 0xFU), "length");
}

// The library aborts the process on a key with a zero character in it.
void BinaryGuard::requireKey(std::uint64_t object) {
    if (object >= known_.size()) refuse(0, "reference to no object");
    ByteReader reader = readerAt(object);
    const std::size_t at = reader.position();
    const unsigned marker = reader.u8("marker");
    const auto kind = static_cast<Kind>(marker >> 4U);
    if (kind != Kind::ascii && kind != Kind::utf16) refuse(at, "a key is not text");
    const std::uint64_t length = readLength(reader, marker & 0xFU);
    if (length > kMaximumPropertyListContents - keys_) refuseSize("comes to too many bytes");
    keys_ += length;
    for (std::uint64_t i = 0; i < length; ++i) {
        const unsigned unit = kind == Kind::ascii ? reader.u8("key") : reader.be16("key");
        if (unit == 0) refuse(at, "a key holds a zero character");
    }
}

void BinaryGuard::checkLeaf(ByteReader& reader, Kind kind, unsigned low) {
    const std::size_t at = reader.position() - 1;
    switch (kind) {
        case Kind::simple:
            if (low != 0x8 && low != 0x9) refuse(at, "neither true nor false");
            return;
        case Kind::integer:
            if (low > 3) refuse(at, "integer of more than 64 bits");
            return reader.skip(1U << low, "integer");
        case Kind::real:
            if (low != 2 && low != 3) refuse(at, "real of no known width");
            return reader.skip(1U << low, "real");
        case Kind::date:
            if (low != 3) refuse(at, "date of no known width");
            return reader.skip(8, "date");
        case Kind::uid:
            if (low > 7) refuse(at, "identifier of more than 64 bits");
            return reader.skip(low + 1, "identifier");
        default:
            refuse(at, "unknown kind of object");
    }
}

Extent BinaryGuard::measureContainer(ByteReader& reader, std::uint64_t count, bool isDictionary,
                                     unsigned depth) {
    if (count > reader.remaining() / (isDictionary ? 2U : 1U) / referenceWidth_)
        refuse(reader.position(), "more references than bytes");
    const std::uint64_t references = isDictionary ? 2 * count : count;
    // Objects may overlap, so the references of all of them are bounded together, not by the list's length.
    references_ += references;
    if (references_ > kMaximumPropertyListValues) refuseSize("holds too many values");
    Extent total{1, 1, 0};
    for (std::uint64_t i = 0; i < references; ++i) {
        const std::uint64_t child = sized(reader, referenceWidth_, "object reference");
        if (isDictionary && i < count) requireKey(child);
        const Extent extent = measure(child, depth + 1);
        total.height = std::max(total.height, extent.height + 1);
        total.values += extent.values;
        total.contents += extent.contents;
        if (total.values > kMaximumPropertyListValues) refuseSize("holds too many values");
        if (total.contents > kMaximumPropertyListContents) refuseSize("comes to too many bytes");
    }
    return total;
}

// Recursion is bounded by the depth limit, which a cycle runs into as well.
Extent BinaryGuard::measure(std::uint64_t object, unsigned depth) {
    if (object >= known_.size()) refuse(0, "reference to no object");
    Extent& known = known_[static_cast<std::size_t>(object)];
    if (depth + (known.height == 0 ? 1 : known.height) > kMaximumPropertyListDepth + 2)
        refuseSize("is nested too deeply, or holds itself");
    if (known.height != 0) return known;

    ByteReader reader = readerAt(object);
    const unsigned marker = reader.u8("marker");
    const auto kind = static_cast<Kind>(marker >> 4U);
    Extent extent{1, 1, 0};
    if (kind == Kind::data || kind == Kind::ascii || kind == Kind::utf16) {
        const std::uint64_t length = readLength(reader, marker & 0xFU);
        if (length > reader.remaining()) refuse(reader.position(), "longer than the list");
        extent.contents = kind == Kind::utf16 ? 2 * length : length;
        reader.skip(extent.contents, "contents");
    } else if (kind == Kind::array || kind == Kind::dictionary) {
        const std::uint64_t count = readLength(reader, marker & 0xFU);
        extent = measureContainer(reader, count, kind == Kind::dictionary, depth);
    } else {
        checkLeaf(reader, kind, marker & 0xFU);
    }
    return known_[static_cast<std::size_t>(object)] = extent;
}

}  // namespace

std::optional<Error> refuseBinaryPropertyList(ByteView document) {
    try {
        BinaryGuard(document).check();
        return std::nullopt;
    } catch (const BinaryRefusal& refusal) {
        return Error(kDataErrorDomain, refusal.code, refusal.text);
    } catch (const ShortRead& shortage) {
        return Error(kDataErrorDomain, kMalformedDocument,
                     fmt::format("The binary property list is cut short: {}.", shortage.what()));
    }
}

}  // namespace pinwell::foundation
