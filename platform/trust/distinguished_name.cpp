#include "trust/distinguished_name.h"

#include <algorithm>
#include <array>
#include <optional>
#include <vector>

#include "base/byte_io.h"
#include "base/text.h"
#include "trust/der.h"

namespace pinwell::trust {
namespace {

using base::ByteReader;
using base::ByteView;
using base::ByteWriter;
using base::Data;
using der::Cursor;
using der::Element;
using der::Malformed;

constexpr std::string_view kCommonNameOid = "2.5.4.3";

// Numbers of universal tags (X.680, 8.4).
enum StringType : std::uint32_t {
    kUtf8String = 12,
    kPrintableString = 19,
    kT61String = 20,
    kIa5String = 22,
    kVisibleString = 26,
    kUniversalString = 28,
    kBmpString = 30,
};

constexpr std::uint32_t kLargestCharacter = 0x10FFFF;
constexpr std::uint32_t kFirstSurrogate = 0xD800;
constexpr std::uint32_t kLastSurrogate = 0xDFFF;

void appendUtf8(std::string& text, std::uint32_t character) {
    const auto tail = [&](unsigned shift) {
        text.push_back(static_cast<char>(0x80U | ((character >> shift) & 0x3FU)));
    };
    if (character > kLargestCharacter || (character >= kFirstSurrogate && character <= kLastSurrogate))
        throw Malformed("a name holds a character that there is not");
    if (character < 0x80) {
        text.push_back(static_cast<char>(character));
    } else if (character < 0x800) {
        text.push_back(static_cast<char>(0xC0U | (character >> 6U)));
        tail(0);
    } else if (character < 0x10000) {
        text.push_back(static_cast<char>(0xE0U | (character >> 12U)));
        tail(6);
        tail(0);
    } else {
        text.push_back(static_cast<char>(0xF0U | (character >> 18U)));
        tail(12);
        tail(6);
        tail(0);
    }
}

/// Characters of a fixed width of 1, 2 or 4 bytes, big-endian.
std::string readFixedWidth(ByteView contents, std::size_t width, std::uint32_t largest) {
    if (contents.size() % width != 0) throw Malformed("a name ends inside a character");
    std::string text;
    ByteReader reader(contents);
    while (!reader.atEnd()) {
        const std::uint32_t character = width == 1   ? reader.u8("character")
                                        : width == 2 ? reader.be16("character")
                                                     : reader.be32("character");
        if (character > largest) throw Malformed("a name holds a character that its type does not allow");
        appendUtf8(text, character);
    }
    return text;
}

/// The value in UTF-8; `nullopt` if its type is not a text.
std::optional<std::string> readText(const Element& value) {
    if (value.tag.tagClass != der::TagClass::universal || value.tag.constructed) return std::nullopt;
    switch (value.tag.number) {
        case kUtf8String: {
            std::string text = base::toString(value.contents);
            if (!base::isUTF8(text)) throw Malformed("a name is not in UTF-8");
            return text;
        }
        case kPrintableString:
        case kIa5String:
        case kVisibleString:
            return readFixedWidth(value.contents, 1, 0x7F);
        case kT61String:
            return readFixedWidth(value.contents, 1, 0xFF);
        case kBmpString:
            return readFixedWidth(value.contents, 2, 0xFFFF);
        case kUniversalString:
            return readFixedWidth(value.contents, 4, kLargestCharacter);
        default:
            return std::nullopt;
    }
}

/// Lower-case letters, single spaces, no spaces at the ends.
std::string fold(const std::string& text) {
    std::string folded;
    for (const char c : text) {
        if (base::isSpace(c)) {
            if (!folded.empty() && folded.back() != ' ') folded.push_back(' ');
        } else {
            folded.push_back(c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c);
        }
    }
    if (!folded.empty() && folded.back() == ' ') folded.pop_back();
    return folded;
}

void appendCounted(ByteWriter& writer, ByteView bytes) {
    writer.be32(static_cast<std::uint32_t>(bytes.size())).bytes(bytes);
}

class NameReader {
  public:
    DistinguishedName read(ByteView contents) && {
        ByteWriter canonical;
        for (Cursor parts(contents); !parts.atEnd();) {
            std::vector<Data> attributes;
            for (Cursor part = parts.enter(der::kConstructedSet); attributes.empty() || !part.atEnd();)
                attributes.push_back(readAttribute(part.enter(der::kConstructedSequence)));
            std::sort(attributes.begin(), attributes.end());
            canonical.be32(static_cast<std::uint32_t>(attributes.size()));
            for (const Data& attribute : attributes) appendCounted(canonical, attribute);
        }
        name_.canonical = std::move(canonical).take();
        name_.isEmpty = count_ == 0;
        name_.summary = commonName_ ? std::move(*commonName_) : std::move(last_);
        return std::move(name_);
    }

  private:
    Data readAttribute(Cursor attribute) {
        if (++count_ > kMaximumNameAttributes) throw Malformed("a name has too many parts");
        const std::string oid = attribute.oid();
        const Element value = attribute.any();
        attribute.expectEnd();
        std::optional<std::string> text = readText(value);

        ByteWriter canonical;
        appendCounted(canonical, base::asBytes(oid));
        canonical.u8(text ? 1 : 0);
        if (text) {
            appendCounted(canonical, base::asBytes(fold(*text)));
        } else {
            appendCounted(canonical, value.whole);
        }
        last_ = text.value_or(std::string());
        if (oid == kCommonNameOid) commonName_ = last_;
        return std::move(canonical).take();
    }

    DistinguishedName name_;
    std::optional<std::string> commonName_;
    std::string last_;
    std::size_t count_ = 0;
};

}  // namespace

DistinguishedName readName(ByteView contents) {
    return NameReader().read(contents);
}

}  // namespace pinwell::trust
