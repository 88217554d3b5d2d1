// A CMS message in parts that a test can change, omit and repeat, without the code under test. The parts come
// from a valid message, or are made around any public key.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "base/bytes.h"

namespace pinwell::test {

using base::ByteView;
using base::Data;

/// The consecutive elements in `contents`, in DER made by the tests.
std::vector<Data> derElements(ByteView contents);

/// The contents of an element, in DER made by the tests.
ByteView derContents(ByteView element);

Data joined(const std::vector<Data>& parts);

/// The AlgorithmIdentifier of an algorithm, by the contents of its OBJECT IDENTIFIER, with a NULL.
Data algorithmIdentifier(std::string_view identifier);

inline constexpr std::string_view kSha256Identifier = "\x60\x86\x48\x01\x65\x03\x04\x02\x01";
inline constexpr std::string_view kRsaIdentifier = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x01";

/// An attribute with these values, by the contents of its type.
Data attributeOf(std::string_view type, const std::vector<Data>& values);

/// Each field is a whole element.
struct CmsSignerParts {
    Data version;
    Data identifier;
    Data digestAlgorithm;
    std::optional<std::vector<Data>> signedAttributes;
    Data signatureAlgorithm;
    Data signature;
    std::optional<std::vector<Data>> unsignedAttributes;

    Data build() const;
};

struct CmsParts {
    std::string_view type = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x02";
    Data version;
    std::vector<Data> digestAlgorithms;
    Data content;  // the whole EncapsulatedContentInfo
    std::optional<std::vector<Data>> certificates;
    std::optional<std::vector<Data>> revocationLists;
    std::vector<CmsSignerParts> signers;

    /// Takes a message in DER apart.
    static CmsParts of(ByteView message);

    Data build() const;
};

/// An unsigned certificate with that public key, issued by "Signer", number 1; with a key identifier or
/// without.
Data certificateAround(const Data& publicKey, std::optional<std::string_view> keyIdentifier = {});

/// A SubjectPublicKeyInfo of an RSA key with a modulus of `bits` bits and exponent 1: each padded message is
/// its own signature.
Data rsaKeyOfExponentOne(std::size_t bits);

/// A message over `content` by that key, without signed attributes.
CmsParts signedByExponentOne(std::size_t bits, ByteView content);

/// The same element with indefinite lengths in its outer `levels` constructed levels.
Data withIndefiniteLengths(ByteView der, int levels);

}  // namespace pinwell::test
