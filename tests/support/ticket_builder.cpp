#include "support/ticket_builder.h"

#include <stdexcept>
#include <utility>

#include "base/byte_io.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;

constexpr std::size_t kSignatureFieldSize = 72;

// The common sizes occur once in two to four signatures. A size that does not occur in all these attempts is
// impossible.
constexpr int kSigningAttempts = 1000;

// X.690, 8.1.3, in the shortest form.
Data derLength(std::size_t length) {
    ByteWriter writer;
    if (length < 0x80) return std::move(writer.u8(static_cast<std::uint8_t>(length))).take();
    unsigned width = 1;
    while (width < sizeof length && (length >> (8U * width)) != 0) ++width;
    writer.u8(static_cast<std::uint8_t>(0x80U | width));
    for (unsigned i = width; i-- > 0;) writer.u8(static_cast<std::uint8_t>((length >> (8U * i)) & 0xFFU));
    return std::move(writer).take();
}

}  // namespace

Data hashOf(std::uint8_t seed, std::size_t length) {
    Data hash;
    for (std::size_t i = 0; i < length; ++i) hash.push_back(static_cast<std::byte>((seed + i) & 0xFFU));
    return hash;
}

Data derElement(std::uint8_t tag, ByteView contents) {
    return std::move(ByteWriter().u8(tag).bytes(derLength(contents.size())).bytes(contents)).take();
}

Data derElementOfSize(std::size_t size) {
    constexpr std::uint8_t kOctetString = 0x04;
    for (std::size_t header = 2; header <= 10 && header <= size; ++header) {
        Data element = derElement(kOctetString, Data(size - header));
        if (element.size() == size) return element;
    }
    throw std::runtime_error("no DER element has " + std::to_string(size) + " bytes");
}

TicketPayloadBuilder& TicketPayloadBuilder::magic(std::string_view value) {
    magic_ = value;
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::version(std::uint16_t value) {
    version_ = value;
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::hashLength(std::uint16_t value) {
    hashLength_ = value;
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::count(std::uint32_t value) {
    count_ = value;
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::flags(std::uint32_t value) {
    flags_ = value;
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::signatureTime(std::uint64_t value) {
    signatureTime_ = value;
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::entry(std::uint8_t algorithm, ByteView hash) {
    entries_.push_back({algorithm, base::toData(hash)});
    return *this;
}

TicketPayloadBuilder& TicketPayloadBuilder::trailing(ByteView bytes) {
    base::append(trailing_, bytes);
    return *this;
}

Data TicketPayloadBuilder::build() const {
    constexpr std::uint16_t kVersionWithAlgorithms = 2;
    ByteWriter writer;
    writer.text(magic_).le16(version_).le16(hashLength_);
    writer.le32(count_.value_or(static_cast<std::uint32_t>(entries_.size())));
    writer.le32(flags_).le64(signatureTime_);
    for (const Entry& entry : entries_) {
        if (version_ == kVersionWithAlgorithms) writer.u8(entry.algorithm);
        writer.bytes(entry.hash);
    }
    return std::move(writer.bytes(trailing_)).take();
}

SatchelBuilder SatchelBuilder::of(const IssuedChain& chain, ByteView payload) {
    SatchelBuilder builder;
    builder.certificates(chain.list()).payload(payload).signedBy(chain.leaf.key);
    return builder;
}

SatchelBuilder& SatchelBuilder::magic(std::string_view value) {
    magic_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::version(std::uint16_t value) {
    version_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::reserved(std::uint16_t value) {
    reserved_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::certificateBlockLength(std::uint32_t value) {
    certificateBlockLength_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::payloadLength(std::uint32_t value) {
    payloadLength_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::certificate(ByteView der) {
    certificates_.push_back(base::toData(der));
    return *this;
}

SatchelBuilder& SatchelBuilder::certificates(std::vector<Data> list) {
    certificates_ = std::move(list);
    return *this;
}

SatchelBuilder& SatchelBuilder::outerTag(std::uint8_t value) {
    outerTag_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::outerLength(std::size_t value) {
    return outerLengthBytes(derLength(value));
}

SatchelBuilder& SatchelBuilder::outerLengthBytes(ByteView bytes) {
    outerLength_ = base::toData(bytes);
    return *this;
}

SatchelBuilder& SatchelBuilder::afterSequence(ByteView bytes) {
    afterSequence_ = base::toData(bytes);
    return *this;
}

SatchelBuilder& SatchelBuilder::certificateBlock(ByteView bytes) {
    block_ = base::toData(bytes);
    return *this;
}

SatchelBuilder& SatchelBuilder::payload(ByteView bytes) {
    payload_ = base::toData(bytes);
    return *this;
}

SatchelBuilder& SatchelBuilder::signedBy(SigningKey key) {
    key_ = std::move(key);
    return *this;
}

SatchelBuilder& SatchelBuilder::signatureSize(std::size_t value) {
    signatureSize_ = value;
    return *this;
}

SatchelBuilder& SatchelBuilder::signature(ByteView bytes) {
    signature_ = base::toData(bytes);
    return *this;
}

SatchelBuilder& SatchelBuilder::lastSignatureByte(std::uint8_t value) {
    lastSignatureByte_ = value;
    return *this;
}

Data SatchelBuilder::block() const {
    if (block_) return *block_;
    ByteWriter contents;
    for (const Data& certificate : certificates_) contents.bytes(certificate);
    ByteWriter block;
    block.u8(outerTag_).bytes(outerLength_ ? *outerLength_ : derLength(contents.size()));
    return std::move(block.bytes(contents.data()).bytes(afterSequence_)).take();
}

Data SatchelBuilder::signatureField(ByteView message) const {
    Data field;
    if (signature_) {
        field = *signature_;
    } else if (key_) {
        field = key_->sign(message);
        for (int i = 0; signatureSize_ && field.size() != *signatureSize_; ++i) {
            if (i == kSigningAttempts) throw std::runtime_error("no signature of the wanted size came up");
            field = key_->sign(message);
        }
    }
    if (field.size() > kSignatureFieldSize) throw std::runtime_error("the signature does not fit its field");
    field.resize(kSignatureFieldSize);
    if (lastSignatureByte_) field.back() = static_cast<std::byte>(*lastSignatureByte_);
    return field;
}

Data SatchelBuilder::build() const {
    const Data certificateBlock = block();
    ByteWriter writer;
    writer.text(magic_).le16(version_).le16(reserved_);
    writer.le32(certificateBlockLength_.value_or(static_cast<std::uint32_t>(certificateBlock.size())));
    writer.le32(payloadLength_.value_or(static_cast<std::uint32_t>(payload_.size())));
    writer.bytes(certificateBlock).bytes(payload_);
    const Data field = signatureField(writer.data());
    return std::move(writer.bytes(field)).take();
}

}  // namespace pinwell::test
