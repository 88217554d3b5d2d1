// A CMS SignedData message (RFC 5652), DER or BER, parsed without a library.
//
//   ContentInfo  = { 1.2.840.113549.1.7.2, [0] SignedData }
//   SignedData   = { version, SET of digest algorithms, { content type, [0] OCTET STRING, if not detached },
//                    [0] certificates, [1] revocation lists, SET of signers }
//   signer       = { version, issuer and serial number | [0] key identifier, digest algorithm,
//                    [0] signed attributes, signature algorithm, signature, [1] unsigned attributes }
//   attribute    = { type, SET of values }
//
// A library makes an object for every element and a digest for every algorithm, used or not. So the work is
// bounded here, before any library reads a byte of the message. Refused: another shape, trailing bytes,
// versions other than 1, 3, 4 and 5 (of a signer: 1 and 3), more than kMaximumDigestAlgorithms, more or fewer
// than one signer, more than kMaximumCertificates, and a message with more than ber::kMaximumHeaders headers
// to read. There is no limit on its length.
//
// The content of a time-stamp token (RFC 3161, 2.4.2):
//
//   TSTInfo = { version 1, policy, { digest algorithm, imprint }, serial number, time, accuracy, ordering,
//               nonce, [0] authority, [1] extensions }
//
// The time is a GeneralizedTime in UTC: YYYYMMDDHHMMSS, a fraction of a second or none, Z.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "base/bytes.h"
#include "codesign/ber.h"
#include "values/date.h"

namespace pinwell::codesign {

inline constexpr std::size_t kMaximumDigestAlgorithms = 8;
inline constexpr std::size_t kMaximumCertificates = 64;

/// An AlgorithmIdentifier.
struct Algorithm {
    base::ByteView identifier;  // contents of the OBJECT IDENTIFIER
    base::ByteView parameters;  // the whole element; empty if there is none
};

/// The fields of an X.509 certificate for choosing the signer's certificate, and its key. Nothing is
/// verified.
struct MessageCertificate {
    base::ByteView whole;
    base::ByteView issuer;                    // the whole Name
    base::ByteView serialNumber;              // contents of the INTEGER
    base::ByteView publicKey;                 // the whole SubjectPublicKeyInfo
    std::optional<base::Data> keyIdentifier;  // of the extension 2.5.29.14
};

struct MessageSigner {
    int version = 1;
    base::ByteView issuer;                    // and serial number; empty if there is a key identifier
    base::ByteView serialNumber;              // contents of the INTEGER
    std::optional<base::Data> keyIdentifier;  // instead of both
    Algorithm digestAlgorithm;
    std::optional<ber::Element> signedAttributes;
    Algorithm signatureAlgorithm;
    base::Data signature;
    std::optional<ber::Element> unsignedAttributes;
};

/// A message. Its views refer to the parsed bytes.
struct SignedMessage {
    int version = 1;
    std::vector<Algorithm> digestAlgorithms;
    base::ByteView contentType;         // contents of the OBJECT IDENTIFIER
    std::optional<base::Data> content;  // nullopt: detached
    std::vector<MessageCertificate> certificates;
    std::size_t otherCertificates = 0;  // of other forms than X.509
    bool hasRevocationLists = false;
    MessageSigner signer;
};

/// Reads a message that fills `bytes`. Throws CodeError.
SignedMessage parseSignedMessage(base::ByteView bytes);

/// The value of an attribute by its type, the contents of an OBJECT IDENTIFIER; nullopt unless `attributes`
/// has exactly one attribute of the type, with exactly one value. Throws CodeError if any is malformed.
std::optional<ber::Element> soleValueOf(const ber::Element& attributes, base::ByteView type,
                                        const char* what);

/// An AlgorithmIdentifier, the next element of `reader`. Throws CodeError.
Algorithm readAlgorithm(ber::Reader& reader, ber::Work& work, const char* what);

/// Whether `attributes` has an attribute of another type. Throws CodeError if any is
/// malformed.
bool hasAttributeBeside(const ber::Element& attributes, base::ByteView type, const char* what);

/// The views refer to the parsed bytes.
struct TimeStamp {
    Algorithm imprintAlgorithm;
    base::ByteView imprint;
    values::Date time;  // without the fraction
};

/// Reads a TSTInfo that fills `bytes`. Fields after the time are not read. Throws CodeError.
TimeStamp parseTimeStamp(base::ByteView bytes);

}  // namespace pinwell::codesign
