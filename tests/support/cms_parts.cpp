#include "support/cms_parts.h"

#include <stdexcept>

#include "base/byte_io.h"
#include "support/code_directory_builder.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

namespace {

constexpr std::uint8_t kInteger = 0x02;
constexpr std::uint8_t kBitString = 0x03;
constexpr std::uint8_t kOctetString = 0x04;
constexpr std::uint8_t kNull = 0x05;
constexpr std::uint8_t kObjectIdentifier = 0x06;
constexpr std::uint8_t kSequence = 0x30;
constexpr std::uint8_t kSet = 0x31;
constexpr std::uint8_t kContext0 = 0xA0;
constexpr std::uint8_t kContext1 = 0xA1;
constexpr std::uint8_t kContext3 = 0xA3;
constexpr std::string_view kPlainData = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x01";
constexpr std::string_view kKeyIdentifier = "\x55\x1D\x0E";

struct Header {
    std::size_t size = 0;
    std::size_t length = 0;
};

Header headerOf(ByteView der) {
    const auto first = std::to_integer<std::size_t>(der[1]);
    Header header{2, first};
    if (first < 0x80) return header;
    header.length = 0;
    for (std::size_t i = 0; i < (first & 0x7FU); ++i)
        header.length = header.length << 8U | std::to_integer<std::size_t>(der[header.size++]);
    return header;
}

std::uint8_t tagOf(const Data& element) {
    return std::to_integer<std::uint8_t>(element.at(0));
}

Data identifierElement(std::string_view contents) {
    return derElement(kObjectIdentifier, base::asBytes(contents));
}

Data number(std::uint8_t value) {
    const auto digit = static_cast<std::byte>(value);
    return derElement(kInteger, ByteView(&digit, 1));
}

Data sequence(const std::vector<Data>& parts) {
    return derElement(kSequence, joined(parts));
}

Data name() {
    const Data text = derElement(0x0C, base::asBytes("Signer"));
    return sequence({derElement(kSet, sequence({identifierElement("\x55\x04\x03"), text}))});
}

Data bitString(const Data& bytes) {
    return derElement(kBitString, base::ByteWriter().u8(0).bytes(bytes).data());
}

Data modulus(std::size_t bits) {
    Data digits((bits + 7) / 8, std::byte{0x5B});
    digits.front() = static_cast<std::byte>(1U << ((bits - 1) % 8));
    if (digits.front() == std::byte{0x80}) digits.insert(digits.begin(), std::byte{0});
    return derElement(kInteger, digits);
}

}  // namespace

std::vector<Data> derElements(ByteView contents) {
    std::vector<Data> elements;
    while (!contents.empty()) {
        const Header header = headerOf(contents);
        elements.push_back(base::toData(contents.first(header.size + header.length)));
        contents = contents.subspan(elements.back().size());
    }
    return elements;
}

ByteView derContents(ByteView element) {
    return element.subspan(headerOf(element).size);
}

Data joined(const std::vector<Data>& parts) {
    Data all;
    for (const Data& part : parts) base::append(all, part);
    return all;
}

Data algorithmIdentifier(std::string_view identifier) {
    return sequence({identifierElement(identifier), derElement(kNull, {})});
}

Data attributeOf(std::string_view type, const std::vector<Data>& values) {
    return sequence({identifierElement(type), derElement(kSet, joined(values))});
}

Data CmsSignerParts::build() const {
    std::vector<Data> parts = {version, identifier, digestAlgorithm};
    if (signedAttributes) parts.push_back(derElement(kContext0, joined(*signedAttributes)));
    parts.push_back(signatureAlgorithm);
    parts.push_back(signature);
    if (unsignedAttributes) parts.push_back(derElement(kContext1, joined(*unsignedAttributes)));
    return sequence(parts);
}

CmsParts CmsParts::of(ByteView message) {
    const Data wrapper = derElements(derContents(message)).at(1);
    std::vector<Data> fields = derElements(derContents(derContents(wrapper)));
    CmsParts parts;
    parts.version = fields.at(0);
    parts.digestAlgorithms = derElements(derContents(fields.at(1)));
    parts.content = fields.at(2);
    for (std::size_t i = 3; i < fields.size(); ++i) {
        std::vector<Data> elements = derElements(derContents(fields[i]));
        if (tagOf(fields[i]) == kContext0) parts.certificates = elements;
        if (tagOf(fields[i]) == kContext1) parts.revocationLists = elements;
        if (tagOf(fields[i]) != kSet) continue;
        for (const Data& element : elements) {
            const std::vector<Data> of = derElements(derContents(element));
            CmsSignerParts& signer = parts.signers.emplace_back();
            std::size_t next = 0;
            signer.version = of.at(next++);
            signer.identifier = of.at(next++);
            signer.digestAlgorithm = of.at(next++);
            if (tagOf(of.at(next)) == kContext0)
                signer.signedAttributes = derElements(derContents(of.at(next++)));
            signer.signatureAlgorithm = of.at(next++);
            signer.signature = of.at(next++);
            if (next < of.size()) signer.unsignedAttributes = derElements(derContents(of.at(next)));
        }
    }
    return parts;
}

Data CmsParts::build() const {
    std::vector<Data> parts = {version, derElement(kSet, joined(digestAlgorithms)), content};
    if (certificates) parts.push_back(derElement(kContext0, joined(*certificates)));
    if (revocationLists) parts.push_back(derElement(kContext1, joined(*revocationLists)));
    std::vector<Data> signerElements;
    for (const CmsSignerParts& signer : signers) signerElements.push_back(signer.build());
    parts.push_back(derElement(kSet, joined(signerElements)));
    return sequence({identifierElement(type), derElement(kContext0, sequence(parts))});
}

Data certificateAround(const Data& publicKey, std::optional<std::string_view> keyIdentifier) {
    const Data day = derElement(0x17, base::asBytes("260101000000Z"));
    const Data algorithm = algorithmIdentifier(kRsaIdentifier);
    std::vector<Data> fields = {derElement(kContext0, number(2)),
                                number(1),
                                algorithm,
                                name(),
                                sequence({day, day}),
                                name(),
                                publicKey};
    if (keyIdentifier) {
        const Data value = derElement(kOctetString, base::asBytes(*keyIdentifier));
        const Data extension = sequence({identifierElement(kKeyIdentifier), derElement(kOctetString, value)});
        fields.push_back(derElement(kContext3, sequence({extension})));
    }
    return sequence({sequence(fields), algorithm, bitString(Data(16))});
}

Data rsaKeyOfExponentOne(std::size_t bits) {
    return sequence({algorithmIdentifier(kRsaIdentifier), bitString(sequence({modulus(bits), number(1)}))});
}

// RFC 8017, 9.2: 00 01 FF ... FF 00 and the digest with its algorithm.
CmsParts signedByExponentOne(std::size_t bits, ByteView content) {
    const Data digest =
        sequence({algorithmIdentifier(kSha256Identifier), derElement(kOctetString, codeDigest(2, content))});
    const std::size_t size = (bits + 7) / 8;
    Data padded(size - 3 - digest.size(), std::byte{0xFF});
    padded.insert(padded.begin(), {std::byte{0}, std::byte{1}});
    padded.push_back(std::byte{0});
    base::append(padded, digest);

    CmsSignerParts signer;
    signer.version = number(1);
    signer.identifier = sequence({name(), number(1)});
    signer.digestAlgorithm = algorithmIdentifier(kSha256Identifier);
    signer.signatureAlgorithm = algorithmIdentifier(kRsaIdentifier);
    signer.signature = derElement(kOctetString, padded);
    CmsParts parts;
    parts.version = number(1);
    parts.digestAlgorithms = {signer.digestAlgorithm};
    parts.content = sequence({identifierElement(kPlainData)});
    parts.certificates = {certificateAround(rsaKeyOfExponentOne(bits))};
    parts.signers = {signer};
    return parts;
}

Data withIndefiniteLengths(ByteView der, int levels) {
    base::ByteWriter writer;
    for (const Data& element : derElements(der)) {
        if ((tagOf(element) & 0x20U) == 0 || levels == 0) {
            writer.bytes(element);
            continue;
        }
        writer.u8(tagOf(element)).u8(0x80);
        writer.bytes(withIndefiniteLengths(derContents(element), levels - 1)).be16(0);
    }
    return writer.data();
}

}  // namespace pinwell::test
