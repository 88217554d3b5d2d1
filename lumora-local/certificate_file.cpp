#include <ctime>

#include "authority.h"
#include "base/file_io.h"
#include "certificates.h"

namespace pinwell::lumora {
namespace {

constexpr std::size_t kMaximumCertificateFile = std::size_t{64} * 1024;

}  // namespace

CertificateHandle readCertificateFile(const std::string& path) {
    return std::move(readCertificateFiles(path, 1).front());
}

std::vector<CertificateHandle> readCertificateFiles(const std::string& path, std::size_t limit) {
    const base::Result<base::Data> bytes = base::readSmallFile(path, kMaximumCertificateFile);
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
        throw Failure(EX_CONFIG, values::format("there is no certificate in %@", path));
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

namespace {

constexpr std::size_t kChainLength = 3;

}  // namespace

bool carriesMarker(X509* certificate, std::string_view oid) {
    const ObjectHandle object(OBJ_txt2obj(std::string(oid).c_str(), 1));
    return object != nullptr && X509_get_ext_by_OBJ(certificate, object.get(), -1) >= 0;
}

std::optional<std::string> faultOfIssue(X509* certificate, X509* issuer) {
    EVP_PKEY* key = X509_get0_pubkey(issuer);
    const bool named = X509_NAME_cmp(X509_get_issuer_name(certificate), X509_get_subject_name(issuer)) == 0;
    const bool signedByIt = named && key != nullptr && X509_verify(certificate, key) == 1;
    ERR_clear_error();
    if (signedByIt) return std::nullopt;
    return values::format("%@ is not issued by %@", nameOf(certificate), nameOf(issuer));
}

std::optional<std::string> faultOfSignerChain(const std::vector<CertificateHandle>& chain) {
    if (chain.size() != kChainLength) {
        return values::format("it holds %zu certificates, not signer, intermediate and root", chain.size());
    }
    X509* signer = chain[0].get();
    X509* intermediate = chain[1].get();
    X509* root = chain[2].get();
    if (auto fault = faultOfIssue(signer, intermediate)) return fault;
    if (auto fault = faultOfIssue(intermediate, root)) return fault;
    if (auto fault = faultOfIssue(root, root)) return fault;
    if (X509_check_ca(intermediate) != 1) return nameOf(intermediate) + " may not issue certificates";
    if (X509_check_ca(root) != 1) return nameOf(root) + " may not issue certificates";
    if (!carriesMarker(signer, kTicketSignerMarkerOid)) {
        return nameOf(signer) + " lacks the extension " + std::string(kTicketSignerMarkerOid);
    }
    if (!carriesMarker(intermediate, kTicketIntermediateMarkerOid)) {
        return nameOf(intermediate) + " lacks the extension " + std::string(kTicketIntermediateMarkerOid);
    }
    return std::nullopt;
}

}  // namespace pinwell::lumora
