#include "lumora-local/certificate_file.h"

#include <ctime>

#include "foundation/file_io.h"

namespace pinwell::lumora {
namespace {

constexpr std::size_t kMaximumCertificateFile = std::size_t{64} * 1024;

}  // namespace

CertificateHandle readCertificateFile(const std::string& path) {
    return std::move(readCertificateFiles(path, 1).front());
}

std::vector<CertificateHandle> readCertificateFiles(const std::string& path, std::size_t limit) {
    const foundation::Result<foundation::Data> bytes =
        foundation::readSmallFile(path, kMaximumCertificateFile);
    if (!bytes) throw Failure(EX_NOINPUT, bytes.error().localizedDescription());
    const BioHandle pem(BIO_new_mem_buf(bytes->data(), static_cast<int>(bytes->size())));
    require(pem != nullptr, "read a PEM file");
    std::vector<CertificateHandle> certificates;
    while (certificates.size() < limit) {
        CertificateHandle certificate(PEM_read_bio_X509(pem.get(), nullptr, nullptr, nullptr));
        if (certificate == nullptr) break;
        certificates.push_back(std::move(certificate));
    }
    ERR_clear_error();
    if (certificates.empty()) {
        throw Failure(EX_CONFIG, foundation::format("there is no certificate in %@", path));
    }
    return certificates;
}

std::string encodeCertificate(X509* certificate) {
    const BioHandle pem(BIO_new(BIO_s_mem()));
    require(pem != nullptr && PEM_write_bio_X509(pem.get(), certificate) == 1, "encode a certificate");
    return textOf(pem.get());
}

std::int64_t expiryOf(X509* certificate) {
    std::tm time{};
    if (ASN1_TIME_to_tm(X509_get0_notAfter(certificate), &time) != 1) return 0;
    return std::int64_t{::timegm(&time)};
}

std::string nameOf(X509* certificate) {
    std::array<char, 256> text{};
    const X509_NAME* subject = X509_get_subject_name(certificate);
    if (X509_NAME_get_text_by_NID(const_cast<X509_NAME*>(subject), NID_commonName, text.data(),
                                  static_cast<int>(text.size())) < 0) {
        X509_NAME_oneline(subject, text.data(), static_cast<int>(text.size()));
    }
    return text.data();
}

}  // namespace pinwell::lumora
