#include "lumora-local/ticket_maker.h"

#include <openssl/asn1.h>

#include <algorithm>

#include "foundation/byte_writer.h"
#include "foundation/file_io.h"
#include "lumora-local/key_file.h"
#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {
namespace {

using foundation::ByteView;
using foundation::ByteWriter;
using foundation::Data;
using foundation::format;

constexpr std::uint16_t kContainerVersion = 1;
constexpr std::uint32_t kRevokedFlag = 1;
constexpr std::size_t kPayloadHeaderSize = 24;
constexpr std::uint16_t kShortHashLength = 20;
constexpr std::uint16_t kLongHashLength = 48;
constexpr std::size_t kMaximumPemSize = 64 * 1024;

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

BioHandle readPem(const std::string& path) {
    const foundation::Result<Data> bytes = foundation::readSmallFile(path, kMaximumPemSize);
    if (!bytes) throw Failure(EX_NOINPUT, bytes.error().localizedDescription());
    const int size = static_cast<int>(bytes->size());
    BioHandle pem(BIO_new(BIO_s_mem()));
    require(pem != nullptr && BIO_write(pem.get(), bytes->data(), size) == size, "read a PEM file");
    return pem;
}

CertificateHandle readCertificate(const std::string& path) {
    const BioHandle pem = readPem(path);
    CertificateHandle certificate(PEM_read_bio_X509(pem.get(), nullptr, nullptr, nullptr));
    require(certificate != nullptr, "read the certificate in " + path);
    return certificate;
}

void appendDer(Data& data, X509* certificate) {
    const int length = i2d_X509(certificate, nullptr);
    require(length > 0, "encode a certificate");
    Data der(static_cast<std::size_t>(length));
    unsigned char* end = octets(der);
    i2d_X509(certificate, &end);
    foundation::append(data, der);
}

Data derSequence(const Data& contents) {
    const int length = static_cast<int>(contents.size());
    const int total = ASN1_object_size(1, length, V_ASN1_SEQUENCE);
    require(total > length, "encode the certificate block");
    Data sequence(static_cast<std::size_t>(total - length));
    unsigned char* end = octets(sequence);
    ASN1_put_object(&end, 1, length, V_ASN1_SEQUENCE, V_ASN1_UNIVERSAL);
    foundation::append(sequence, contents);
    return sequence;
}

Data sign(EVP_PKEY* key, ByteView message) {
    const DigestContextHandle context(EVP_MD_CTX_new());
    Data signature(kSignatureFieldSize);
    std::size_t length = signature.size();
    require(
        context != nullptr && EVP_DigestSignInit(context.get(), nullptr, EVP_sha256(), nullptr, key) == 1 &&
            EVP_DigestSign(context.get(), octets(signature), &length, octets(message), message.size()) == 1,
        "sign a ticket");
    std::fill(signature.begin() + static_cast<std::ptrdiff_t>(length), signature.end(), std::byte{0});
    return signature;
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

TicketSigner::TicketSigner(const std::string& keyPath, const std::vector<std::string>& chainPaths) {
    key_.reset(readKeyFile(keyPath).release(), EVP_PKEY_free);

    Data certificates;
    for (const std::string& path : chainPaths) {
        const CertificateHandle certificate = readCertificate(path);
        const bool isSigner = certificates.empty();
        require(!isSigner || X509_check_private_key(certificate.get(), key_.get()) == 1,
                "use the key in " + keyPath + " with the certificate in " + path);
        appendDer(certificates, certificate.get());
    }
    certificateBlock_ = derSequence(certificates);
}

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
    const Data signature = sign(key_.get(), container.data());
    container.bytes(signature);
    return std::move(container).take();
}

}  // namespace pinwell::lumora
