#include "ticket_maker.h"

#include <openssl/asn1.h>

#include <algorithm>

#include "base/byte_io.h"
#include "certificates.h"
#include "openssl.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;
using values::format;

constexpr std::uint16_t kContainerVersion = 1;
constexpr std::uint32_t kRevokedFlag = 1;
constexpr std::size_t kPayloadHeaderSize = 24;
constexpr std::uint16_t kShortHashLength = 20;
constexpr std::uint16_t kLongHashLength = 48;

void requireEncodable(const CodeHash& hash, bool withAlgorithm) {
    const std::optional<std::size_t> length = hashLength(hash.algorithm);
    if (!length || (withAlgorithm && hash.algorithm == 0)) {
        throw Failure(EX_DATAERR, format("no ticket can list a hash of digest type %u", hash.algorithm));
    }
    if (hash.hash.size() != *length) {
        throw Failure(EX_DATAERR, format("a hash of digest type %u has %zu bytes, not %zu", hash.algorithm,
                                         *length, hash.hash.size()));
    }
    if (!withAlgorithm && *length != kShortHashLength) {
        throw Failure(EX_DATAERR, "a ticket over a hash of unknown digest type cannot list a 48-byte hash");
    }
}

void appendDer(Data& data, X509* certificate) {
    base::append(data, encodeDer<X509>(i2d_X509, certificate, "encode a certificate"));
}

Data derSequence(const Data& contents) {
    const int length = static_cast<int>(contents.size());
    const int total = ASN1_object_size(1, length, V_ASN1_SEQUENCE);
    require(total > length, "encode the certificate block");
    Data sequence(static_cast<std::size_t>(total - length));
    unsigned char* end = unsignedBytes(sequence);
    ASN1_put_object(&end, 1, length, V_ASN1_SEQUENCE, V_ASN1_UNIVERSAL);
    base::append(sequence, contents);
    return sequence;
}

/// Whether the certificate is for the key with this SubjectPublicKeyInfo.
bool isFor(X509* certificate, ByteView publicKey) {
    const unsigned char* der = unsignedBytes(publicKey);
    const KeyHandle key(d2i_PUBKEY(nullptr, &der, static_cast<long>(publicKey.size())));
    EVP_PKEY* certified = X509_get0_pubkey(certificate);
    const bool same = key != nullptr && certified != nullptr && EVP_PKEY_eq(key.get(), certified) == 1;
    ERR_clear_error();
    return same;
}

}  // namespace

Data encodeTicketPayload(const TicketContents& contents) {
    const std::vector<CodeHash>& hashes = contents.hashes;
    if (hashes.empty()) throw Failure(EX_DATAERR, "a ticket lists at least one hash");
    const bool withAlgorithm = hashes.front().algorithm != 0;
    for (const CodeHash& hash : hashes) requireEncodable(hash, withAlgorithm);

    const bool anyLong = std::any_of(hashes.begin(), hashes.end(), [](const CodeHash& hash) {
        return hash.hash.size() == kLongHashLength;
    });
    const std::uint16_t entryHashLength = anyLong ? kLongHashLength : kShortHashLength;
    const std::size_t entrySize = entryHashLength + std::size_t{withAlgorithm ? 1U : 0U};
    if (hashes.size() > (kMaximumPayloadSize - kPayloadHeaderSize) / entrySize) {
        throw Failure(EX_DATAERR, format("%zu hashes are more than one ticket holds", hashes.size()));
    }

    ByteWriter payload;
    payload.text("m8tk")
        .le16(withAlgorithm ? 2 : 1)
        .le16(entryHashLength)
        .le32(static_cast<std::uint32_t>(hashes.size()))
        .le32(contents.revoked ? kRevokedFlag : 0)
        .le64(static_cast<std::uint64_t>(contents.signedAt.seconds));
    for (const CodeHash& hash : hashes) {
        if (withAlgorithm) payload.u8(static_cast<std::uint8_t>(hash.algorithm));
        payload.bytes(hash.hash).zeros(entryHashLength - hash.hash.size());
    }
    return std::move(payload).take();
}

TicketSigner::TicketSigner(std::shared_ptr<const SigningKey> key, const std::vector<std::string>& chainPaths)
    : key_(std::move(key)) {
    Data certificates;
    for (const std::string& path : chainPaths) {
        const CertificateHandle certificate = readCertificateFile(path);
        const bool isSigner = certificates.empty();
        if (isSigner && !isFor(certificate.get(), key_->publicKey())) {
            throw Failure(EX_CONFIG,
                          format("the signer's key is not the one of the certificate in %@", path));
        }
        appendDer(certificates, certificate.get());
    }
    certificateBlock_ = derSequence(certificates);
}

TicketSigner::TicketSigner(const std::string& keyPath, const std::vector<std::string>& chainPaths)
    : TicketSigner(openSigningKey(keyPath, {}), chainPaths) {}

Data TicketSigner::makeTicket(const TicketContents& contents) const {
    const Data payload = encodeTicketPayload(contents);
    ByteWriter container;
    container.text("s8ch")
        .le16(kContainerVersion)
        .le16(0)
        .le32(static_cast<std::uint32_t>(certificateBlock_.size()))
        .le32(static_cast<std::uint32_t>(payload.size()))
        .bytes(certificateBlock_)
        .bytes(payload);
    const Data signature = key_->sign(container.data());
    if (signature.size() > kSignatureFieldSize)
        throw Failure(EX_SOFTWARE, "a signature of impossible length");
    container.bytes(signature).zeros(kSignatureFieldSize - signature.size());
    return std::move(container).take();
}

}  // namespace pinwell::lumora
