// A signed flat package to try the service with, which other readers of xar archives accept too.
//
// | Part              | Holds                                                                         |
// |-------------------|-------------------------------------------------------------------------------|
// | header            | 28 bytes: "xar!", size, version 1, lengths of the table, checksum algorithm 1 |
// | table of contents | XML in a zlib stream: the checksum's place, the signature's place and its     |
// |                   | certificates, the files                                                       |
// | heap              | SHA-1 of the stream; CMS SignedData, detached over that; the files' data      |
//
// The files are PackageInfo, compressed, and ReadMe.txt, uncompressed. The signer's key and certificates (RSA
// 2048; a root and a leaf) are made new and not kept, so no two packages are the same.
#include <openssl/cms.h>

#include <cstdint>
#include <utility>
#include <vector>

#include "base/byte_io.h"
#include "base/text.h"
#include "certificates.h"
#include "crypto/crypto.h"
#include "file_writing.h"
#include "samples.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;
using values::Date;
using values::format;

constexpr std::size_t kHeaderSize = 28;
constexpr std::uint32_t kSha1 = 1;  // the checksum algorithm's number in the header
constexpr std::size_t kChecksumSize = 20;

constexpr std::string_view kPackageInfo =
    "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
    "<pkg-info format-version=\"2\" identifier=\"example.lumora.sample.package\" version=\"1\"\n"
    "          install-location=\"/\" auth=\"none\"/>\n";
constexpr std::string_view kReadMe = "A sample package, to try a record service with.\n";

/// A file in the heap after checksum and signature, according to the table.
struct ArchivedFile {
    std::string_view name;
    std::string_view contents;
    bool isCompressed;

    Data archived() const {
        const ByteView bytes = base::asBytes(contents);
        return isCompressed ? deflated(bytes) : base::toData(bytes);
    }
};

const std::vector<ArchivedFile>& files() {
    static const std::vector<ArchivedFile> all{{"PackageInfo", kPackageInfo, true},
                                               {"ReadMe.txt", kReadMe, false}};
    return all;
}

class Signer {
  public:
    explicit Signer(Date now)
        : root_(issueCertificate({.commonName = "Sample Package Root",
                                  .basicConstraints = "critical,CA:TRUE",
                                  .keyUsage = "critical,keyCertSign,cRLSign",
                                  .keyKind = KeyKind::rsa2048},
                                 nullptr, now)),
          leaf_(issueCertificate({.commonName = "Sample Package Signer",
                                  .basicConstraints = "critical,CA:FALSE",
                                  .keyUsage = "critical,digitalSignature",
                                  .keyKind = KeyKind::rsa2048},
                                 &root_, now)) {}

    /// SignedData (RFC 5652) in DER, detached; its length does not depend on the content.
    Data sign(const Data& content) const {
        const BioHandle input(BIO_new_mem_buf(content.data(), static_cast<int>(content.size())));
        const crypto::CertificateListHandle others(sk_X509_new_null());
        require(input != nullptr && others != nullptr && X509_up_ref(root_.certificate.get()) == 1 &&
                    sk_X509_push(others.get(), root_.certificate.get()) > 0,
                "prepare a signature");
        const crypto::MessageHandle message(CMS_sign(leaf_.certificate.get(), leaf_.key.get(), others.get(),
                                                     input.get(),
                                                     CMS_BINARY | CMS_DETACHED | CMS_NOSMIMECAP));
        require(message != nullptr, "sign a package");
        return encodeDer<CMS_ContentInfo>(i2d_CMS_ContentInfo, message.get(), "encode a signature");
    }

    /// KeyInfo of XML signatures, with the chain in base64 of DER, leaf first.
    std::string keyInfo() const {
        std::string certificates;
        for (const IssuedCertificate* issued : {&leaf_, &root_}) {
            const Data encoded = encodeDer<X509>(i2d_X509, issued->certificate.get(), "encode a certificate");
            certificates += format("<X509Certificate>%@</X509Certificate>", base::encodeBase64(encoded));
        }
        return format(
            "<KeyInfo xmlns=\"http://www.w3.org/2000/09/xmldsig#\"><X509Data>%@</X509Data></KeyInfo>",
            certificates);
    }

  private:
    IssuedCertificate root_;
    IssuedCertificate leaf_;
};

std::string describe(const ArchivedFile& file, std::size_t number, std::size_t offset) {
    const Data archived = file.archived();
    const std::string encoding = file.isCompressed ? "application/x-gzip" : "application/octet-stream";
    return format(
        "  <file id=\"%lu\">\n"
        "   <name>%@</name><type>file</type><mode>0644</mode>\n"
        "   <data>\n"
        "    <length>%lu</length><offset>%lu</offset><size>%lu</size><encoding style=\"%@\"/>\n"
        "    <archived-checksum style=\"sha1\">%@</archived-checksum>\n"
        "    <extracted-checksum style=\"sha1\">%@</extracted-checksum>\n"
        "   </data>\n"
        "  </file>\n",
        number, file.name, archived.size(), offset, file.contents.size(), encoding,
        base::toHex(crypto::sha1(archived)), base::toHex(crypto::sha1(base::asBytes(file.contents))));
}

std::string tableOfContents(const std::string& keyInfo, std::size_t signatureSize) {
    std::string table = format(
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<xar>\n"
        " <toc>\n"
        "  <creation-time>2026-11-20T19:55:00</creation-time>\n"
        "  <checksum style=\"sha1\"><offset>0</offset><size>%lu</size></checksum>\n"
        "  <signature style=\"CMS\"><offset>%lu</offset><size>%lu</size>%@</signature>\n",
        kChecksumSize, kChecksumSize, signatureSize, keyInfo);
    std::size_t offset = kChecksumSize + signatureSize;
    for (std::size_t i = 0; i < files().size(); ++i) {
        table += describe(files()[i], i + 1, offset);
        offset += files()[i].archived().size();
    }
    return table + " </toc>\n</xar>\n";
}

}  // namespace

Data makePackage(Date now) {
    const Signer signer(now);
    // The table gives the signature's length, and the signature is over the table's digest.
    const std::size_t signatureSize = signer.sign(Data(kChecksumSize)).size();
    const std::string table = tableOfContents(signer.keyInfo(), signatureSize);
    const Data stream = deflated(base::asBytes(table));
    const Data checksum = crypto::sha1(stream);
    const Data signature = signer.sign(checksum);
    if (signature.size() != signatureSize) throw Failure(EX_SOFTWARE, "signatures of different lengths");

    ByteWriter package;
    package.text("xar!").be16(kHeaderSize).be16(1).be64(stream.size()).be64(table.size()).be32(kSha1);
    package.bytes(stream).bytes(checksum).bytes(signature);
    for (const ArchivedFile& file : files()) package.bytes(file.archived());
    return std::move(package).take();
}

std::string writeSamplePackage(const std::string& directory, const std::string& name, Date now) {
    std::string path = directory + "/" + name;
    writeNewFile(path, makePackage(now), kPublicFileMode);
    return path;
}

}  // namespace pinwell::lumora
