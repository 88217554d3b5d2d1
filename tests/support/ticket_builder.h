// Ticket payloads and the signed containers around them, field by field.
//
//   const Data payload = TicketPayloadBuilder().hashLength(32).entry(2, hashOf(7)).build();
//   const IssuedChain chain = TicketChain().issue();
//   const Data container = SatchelBuilder::of(chain, payload).version(2).build();
//
// Everything is valid by default: counts and lengths follow from the added entries, the signature covers the
// finished container. An override changes only its own field, so one wrong field is one visible line.
// Functions throw std::runtime_error on failure.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "support/certificate_builder.h"

namespace pinwell::test {

/// A hash of that many bytes, different for every seed: seed, seed + 1, seed + 2, ...
base::Data hashOf(std::uint8_t seed, std::size_t length = 20);

/// Tag byte, DER length, contents.
base::Data derElement(std::uint8_t tag, base::ByteView contents);

/// An OCTET STRING of zeros of `size` bytes, tag and length included.
base::Data derElementOfSize(std::size_t size);

/// The payload of a ticket.
class TicketPayloadBuilder {
  public:
    TicketPayloadBuilder& magic(std::string_view value);
    TicketPayloadBuilder& version(std::uint16_t value);
    TicketPayloadBuilder& hashLength(std::uint16_t value);
    TicketPayloadBuilder& count(std::uint32_t value);
    TicketPayloadBuilder& flags(std::uint32_t value);
    TicketPayloadBuilder& revoked() { return flags(1); }
    TicketPayloadBuilder& signatureTime(std::uint64_t value);

    /// Algorithm byte (written in version 2 only) and hash.
    TicketPayloadBuilder& entry(std::uint8_t algorithm, base::ByteView hash);

    /// Bytes after the entries, which the count does not include.
    TicketPayloadBuilder& trailing(base::ByteView bytes);

    base::Data build() const;

  private:
    struct Entry {
        std::uint8_t algorithm;
        base::Data hash;
    };

    std::string magic_ = "m8tk";
    std::uint16_t version_ = 2;
    std::uint16_t hashLength_ = 20;
    std::optional<std::uint32_t> count_;
    std::uint32_t flags_ = 0;
    std::uint64_t signatureTime_ = 1'795'000'000;
    std::vector<Entry> entries_;
    base::Data trailing_;
};

/// The container around a payload.
class SatchelBuilder {
  public:
    /// Leaf, intermediate and root of the chain around the payload, signed with the leaf's key.
    static SatchelBuilder of(const IssuedChain& chain, base::ByteView payload);

    SatchelBuilder& magic(std::string_view value);
    SatchelBuilder& version(std::uint16_t value);
    SatchelBuilder& reserved(std::uint16_t value);
    SatchelBuilder& certificateBlockLength(std::uint32_t value);
    SatchelBuilder& payloadLength(std::uint32_t value);

    /// Adds an element to the SEQUENCE: a certificate, or any bytes in its place.
    SatchelBuilder& certificate(base::ByteView der);
    SatchelBuilder& certificates(std::vector<base::Data> list);

    /// The SEQUENCE's own tag and length; the length in its shortest form, or any bytes instead.
    SatchelBuilder& outerTag(std::uint8_t value);
    SatchelBuilder& outerLength(std::size_t value);
    SatchelBuilder& outerLengthBytes(base::ByteView bytes);

    /// Bytes after the SEQUENCE, still in the block.
    SatchelBuilder& afterSequence(base::ByteView bytes);

    /// The whole block, in place of a SEQUENCE.
    SatchelBuilder& certificateBlock(base::ByteView bytes);

    SatchelBuilder& payload(base::ByteView bytes);

    /// Signs with that key (an elliptic-curve one of 256 bits or fewer; others do not fit). Without a key the
    /// signature field is zero.
    SatchelBuilder& signedBy(SigningKey key);

    /// Signs again until the DER signature has that many bytes: 70, 71 and 72 are all common.
    SatchelBuilder& signatureSize(std::size_t value);

    /// These bytes in place of a signature, padded with zeros.
    SatchelBuilder& signature(base::ByteView bytes);

    /// The last byte of the signature field; it is padding only if the signature has fewer than 72 bytes.
    SatchelBuilder& lastSignatureByte(std::uint8_t value);

    base::Data build() const;

  private:
    base::Data block() const;
    base::Data signatureField(base::ByteView message) const;

    std::string magic_ = "s8ch";
    std::uint16_t version_ = 1;
    std::uint16_t reserved_ = 0;
    std::optional<std::uint32_t> certificateBlockLength_;
    std::optional<std::uint32_t> payloadLength_;
    std::vector<base::Data> certificates_;
    std::uint8_t outerTag_ = 0x30;
    std::optional<base::Data> outerLength_;
    base::Data afterSequence_;
    std::optional<base::Data> block_;
    base::Data payload_;
    std::optional<SigningKey> key_;
    std::optional<std::size_t> signatureSize_;
    std::optional<base::Data> signature_;
    std::optional<std::uint8_t> lastSignatureByte_;
};

}  // namespace pinwell::test
