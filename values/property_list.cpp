#include "values/property_list.h"

#include <fmt/format.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/byte_io.h"

namespace pinwell::values {
namespace {

using base::ByteReader;
using base::ByteView;
using base::Error;
using base::kDataErrorDomain;

constexpr std::string_view kBinaryPropertyListMagic = "bplist00";
constexpr std::size_t kBinaryTrailerSize = 32;
constexpr unsigned kLengthFollows = 0xF;

// Dates count seconds from 2001-01-01. This many seconds in both directions are three million years, and
// exact in a double.
constexpr std::int64_t kDateEpoch = 978307200;
constexpr double kLatestDate = 1e14;

enum class ObjectKind : unsigned {
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

// The extent of an object, with everything below it counted at every reference.
struct ObjectExtent {
    unsigned height = 0;  // 1 for a leaf
    std::uint64_t values = 0;
    std::uint64_t contents = 0;  // bytes
};

[[noreturn]] void refuseBinary(std::size_t offset, std::string_view what) {
    throw property_list_detail::Refusal(
        base::kMalformedDocument,
        fmt::format("The binary property list is malformed at byte {}: {}.", offset, what));
}

[[noreturn]] void refuseBinarySize(std::string_view what) {
    throw property_list_detail::Refusal(base::kExcessiveDocument,
                                        fmt::format("The binary property list {}.", what));
}

std::uint64_t sizedInteger(ByteReader& reader, unsigned width, std::string_view what) {
    std::uint64_t value = 0;
    for (const std::byte byte : reader.bytes(width, what))
        value = (value << 8U) | std::to_integer<unsigned>(byte);
    return value;
}

void appendUTF8(std::string& text, std::uint32_t character) {
    const auto put = [&](std::uint32_t byte) { text += static_cast<char>(byte); };
    const auto putRest = [&](unsigned shift) { put(0x80U | ((character >> shift) & 0x3FU)); };
    if (character < 0x80) {
        put(character);
    } else if (character < 0x800) {
        put(0xC0U | (character >> 6U));
        putRest(0);
    } else if (character < 0x10000) {
        put(0xE0U | (character >> 12U));
        putRest(6);
        putRest(0);
    } else {
        put(0xF0U | (character >> 18U));
        putRest(12);
        putRest(6);
        putRest(0);
    }
}

std::string fromUTF16(ByteReader& reader, std::uint64_t units) {
    constexpr auto isLeading = [](std::uint32_t unit) { return unit >= 0xD800 && unit < 0xDC00; };
    constexpr auto isTrailing = [](std::uint32_t unit) { return unit >= 0xDC00 && unit < 0xE000; };
    const std::size_t at = reader.position();
    std::string text;
    for (std::uint64_t i = 0; i < units; ++i) {
        std::uint32_t character = reader.be16("text");
        if (isTrailing(character)) refuseBinary(at, "text that is not UTF-16");
        if (isLeading(character)) {
            if (++i == units) refuseBinary(at, "text that is not UTF-16");
            const std::uint32_t second = reader.be16("text");
            if (!isTrailing(second)) refuseBinary(at, "text that is not UTF-16");
            character = 0x10000 + ((character - 0xD800) << 10U) + (second - 0xDC00);
        }
        appendUTF8(text, character);
    }
    return text;
}

bool isBinaryList(ByteView document) {
    const std::size_t length = kBinaryPropertyListMagic.size();
    return document.size() >= length && base::toString(document.first(length)) == kBinaryPropertyListMagic;
}

class BinaryListReader {
  public:
    explicit BinaryListReader(ByteView document) : document_(document) {}

    Value read() {
        readTrailer();
        return read(root_, 1).value;
    }

  private:
    struct Object {
        ObjectExtent extent;  // height 0 before it is read
        Value value;
    };

    void readTrailer();
    Object read(std::uint64_t object, unsigned depth);
    Object readContainer(ByteReader& reader, std::uint64_t count, bool isDictionary, unsigned depth);
    Object readContents(ByteReader& reader, ObjectKind kind, unsigned low) const;
    static Value readSimple(ByteReader& reader, ObjectKind kind, unsigned low);
    static std::uint64_t readLength(ByteReader& reader, unsigned low);
    void include(ObjectExtent& total, const ObjectExtent& part) const;
    ByteReader readerAt(std::uint64_t object) const;

    ByteView document_;
    unsigned offsetWidth_ = 0;
    unsigned referenceWidth_ = 0;
    std::uint64_t root_ = 0;
    std::uint64_t tableOffset_ = 0;
    std::uint64_t references_ = 0;  // followed so far
    std::vector<Object> known_;     // containers, by object; others are read at every reference
};

void BinaryListReader::readTrailer() {
    ByteReader whole(document_);
    whole.skip(kBinaryPropertyListMagic.size(), "header");
    if (whole.remaining() < kBinaryTrailerSize) refuseBinary(whole.position(), "no room for the trailer");
    const std::size_t trailerOffset = document_.size() - kBinaryTrailerSize;
    ByteReader trailer = whole.sub(trailerOffset, kBinaryTrailerSize, "trailer");
    trailer.skip(6, "unused");
    offsetWidth_ = trailer.u8("offset width");
    referenceWidth_ = trailer.u8("reference width");
    const std::uint64_t count = trailer.be64("object count");
    root_ = trailer.be64("root object");
    tableOffset_ = trailer.be64("table offset");
    if (offsetWidth_ < 1 || offsetWidth_ > 8 || referenceWidth_ < 1 || referenceWidth_ > 8)
        refuseBinary(trailerOffset, "width out of range");
    if (tableOffset_ < kBinaryPropertyListMagic.size() || tableOffset_ > trailerOffset)
        refuseBinary(trailerOffset, "offset table outside the list");
    if (count > (trailerOffset - tableOffset_) / offsetWidth_)
        refuseBinary(trailerOffset, "more objects than offsets");
    if (count > kMaximumPropertyListValues) refuseBinarySize("holds too many objects");
    if (root_ >= count) refuseBinary(trailerOffset, "no such root object");
    known_.resize(static_cast<std::size_t>(count));
}

ByteReader BinaryListReader::readerAt(std::uint64_t object) const {
    ByteReader table(document_);
    table.seek(tableOffset_ + object * offsetWidth_, "offset table");
    const std::uint64_t offset = sizedInteger(table, offsetWidth_, "object offset");
    if (offset < kBinaryPropertyListMagic.size() || offset >= tableOffset_)
        refuseBinary(table.position() - offsetWidth_, "object outside the list");
    ByteReader reader(document_.first(static_cast<std::size_t>(tableOffset_)));
    reader.seek(offset, "object");
    return reader;
}

std::uint64_t BinaryListReader::readLength(ByteReader& reader, unsigned low) {
    if (low != kLengthFollows) return low;
    const unsigned marker = reader.u8("length marker");
    if (marker >> 4U != static_cast<unsigned>(ObjectKind::integer) || (marker & 0xFU) > 3)
        refuseBinary(reader.position() - 1, "a length is no integer");
    return sizedInteger(reader, 1U << (marker & 0xFU), "length");
}

// Integers of 8 bytes are signed, shorter ones unsigned.
Value BinaryListReader::readSimple(ByteReader& reader, ObjectKind kind, unsigned low) {
    const std::size_t at = reader.position() - 1;
    switch (kind) {
        case ObjectKind::simple:
            if (low != 0x8 && low != 0x9) refuseBinary(at, "neither true nor false");
            return low == 0x9;
        case ObjectKind::integer:
            if (low > 3) refuseBinary(at, "integer of more than 64 bits");
            return static_cast<std::int64_t>(sizedInteger(reader, 1U << low, "integer"));
        case ObjectKind::real:
            if (low != 2 && low != 3) refuseBinary(at, "real of no known width");
            if (low == 2) return static_cast<double>(std::bit_cast<float>(reader.be32("real")));
            return std::bit_cast<double>(reader.be64("real"));
        case ObjectKind::date: {
            if (low != 3) refuseBinary(at, "date of no known width");
            const auto seconds = std::bit_cast<double>(reader.be64("date"));
            if (!(std::abs(seconds) <= kLatestDate)) refuseBinary(at, "date that is none");
            return Date{kDateEpoch + static_cast<std::int64_t>(seconds)};
        }
        case ObjectKind::uid:
            if (low > 7) refuseBinary(at, "identifier of more than 64 bits");
            return sizedInteger(reader, low + 1, "identifier");
        default:
            refuseBinary(at, "unknown kind of object");
    }
}

// Text, data and objects without a length. Text of the one-byte form is not converted, and may not be UTF-8.
BinaryListReader::Object BinaryListReader::readContents(ByteReader& reader, ObjectKind kind,
                                                        unsigned low) const {
    if (kind != ObjectKind::data && kind != ObjectKind::ascii && kind != ObjectKind::utf16)
        return {{1, 1, 0}, readSimple(reader, kind, low)};
    const std::uint64_t length = readLength(reader, low);
    if (length > reader.remaining()) refuseBinary(reader.position(), "longer than the list");
    if (kind == ObjectKind::utf16) return {{1, 1, 2 * length}, fromUTF16(reader, length)};
    const ByteView bytes = reader.bytes(length, "contents");
    return {{1, 1, length},
            kind == ObjectKind::data ? Value(base::toData(bytes)) : Value(base::toString(bytes))};
}

void BinaryListReader::include(ObjectExtent& total, const ObjectExtent& part) const {
    total.height = std::max(total.height, part.height + 1);
    total.values += part.values;
    total.contents += part.contents;
    if (total.values > kMaximumPropertyListValues) refuseBinarySize("holds too many values");
    if (total.contents > kMaximumPropertyListContents) refuseBinarySize("comes to too many bytes");
}

BinaryListReader::Object BinaryListReader::readContainer(ByteReader& reader, std::uint64_t count,
                                                         bool isDictionary, unsigned depth) {
    if (count > reader.remaining() / (isDictionary ? 2U : 1U) / referenceWidth_)
        refuseBinary(reader.position(), "more references than bytes");
    // Objects may overlap, so the list's length does not bound their references; this limit bounds them
    // together.
    references_ += isDictionary ? 2 * count : count;
    if (references_ > kMaximumPropertyListValues) refuseBinarySize("holds too many values");
    const std::size_t at = reader.position();
    ObjectExtent total{1, 1, 0};
    Array elements;
    Dictionary members;
    ByteReader values = reader.sub(at, reader.remaining(), "object references");
    if (isDictionary) values.skip(count * referenceWidth_, "keys");
    for (std::uint64_t i = 0; i < count; ++i) {
        std::string key;
        if (isDictionary) {
            Object name = read(sizedInteger(reader, referenceWidth_, "object reference"), depth + 1);
            if (name.value.string() == nullptr) refuseBinary(at, "a key is not text");
            include(total, name.extent);
            key = *name.value.string();
        }
        Object child = read(sizedInteger(values, referenceWidth_, "object reference"), depth + 1);
        include(total, child.extent);
        if (isDictionary)
            members.insert_or_assign(std::move(key), std::move(child.value));
        else
            elements.push_back(std::move(child.value));
    }
    if (isDictionary) return {total, std::move(members)};
    return {total, std::move(elements)};
}

// The depth limit bounds the recursion; a cycle reaches the limit too.
BinaryListReader::Object BinaryListReader::read(std::uint64_t object, unsigned depth) {
    if (object >= known_.size()) refuseBinary(0, "reference to no object");
    const Object& known = known_[static_cast<std::size_t>(object)];
    if (depth + std::max(known.extent.height, 1U) > kMaximumPropertyListDepth + 2)
        refuseBinarySize("is nested too deeply, or holds itself");
    if (known.extent.height != 0) return known;

    ByteReader reader = readerAt(object);
    const unsigned marker = reader.u8("marker");
    const auto kind = static_cast<ObjectKind>(marker >> 4U);
    if (kind != ObjectKind::array && kind != ObjectKind::dictionary)
        return readContents(reader, kind, marker & 0xFU);
    const std::uint64_t count = readLength(reader, marker & 0xFU);
    return known_[static_cast<std::size_t>(object)] =
               readContainer(reader, count, kind == ObjectKind::dictionary, depth);
}

}  // namespace

base::Result<Value> parsePropertyList(ByteView document) {
    if (document.size() > kMaximumPropertyListSize)
        return Error(kDataErrorDomain, base::kExcessiveDocument,
                     fmt::format("The property list is longer than {} bytes.", kMaximumPropertyListSize));
    try {
        return isBinaryList(document) ? BinaryListReader(document).read()
                                      : property_list_detail::readXML(document);
    } catch (const property_list_detail::Refusal& refusal) {
        return Error(kDataErrorDomain, refusal.code(), refusal.what());
    } catch (const base::ShortRead& shortage) {
        return Error(kDataErrorDomain, base::kMalformedDocument,
                     fmt::format("The binary property list is cut short: {}.", shortage.what()));
    }
}

}  // namespace pinwell::values
