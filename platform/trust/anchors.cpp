#include "trust/anchors.h"

#include <openssl/pem.h>

#include <algorithm>
#include <string_view>

#include "trust/openssl.h"

namespace pinwell::trust {
namespace {

using BioHandle = Handle<BIO, BIO_free_all>;

/// What PEM_read_bio allocates for one block.
struct PemBlock {
    char* name = nullptr;
    char* header = nullptr;
    unsigned char* data = nullptr;
    long length = 0;

    PemBlock() = default;
    PemBlock(const PemBlock&) = delete;
    PemBlock& operator=(const PemBlock&) = delete;
    ~PemBlock() {
        OPENSSL_free(name);
        OPENSSL_free(header);
        OPENSSL_free(data);
    }
};

}  // namespace

bool contains(const CertificateList& list, const X509Certificate& certificate) {
    return std::any_of(list.begin(), list.end(),
                       [&](const X509CertificateRef& entry) { return entry->der() == certificate.der(); });
}

bool isDistrusted(const X509Certificate& certificate, const CertificateList& denied) {
    return std::any_of(denied.begin(), denied.end(), [&](const X509CertificateRef& entry) {
        // A key that cannot be read is like no other; such a certificate is known by what it says.
        return entry->saysTheSameAs(certificate) || entry->hasSameSubjectAndKeyAs(certificate);
    });
}

std::optional<CertificateList> readPem(ByteView text) {
    if (text.size() > kMaximumPemFileSize) return std::nullopt;
    const ErrorQueueGuard guard;
    const BioHandle bio(BIO_new_mem_buf(text.data(), static_cast<int>(text.size())));
    if (!bio) return std::nullopt;
    CertificateList certificates;
    for (;;) {
        PemBlock block;
        if (PEM_read_bio(bio.get(), &block.name, &block.header, &block.data, &block.length) != 1) break;
        if (std::string_view(block.name) != PEM_STRING_X509) continue;
        X509CertificateRef certificate =
            X509Certificate::parse(byteView(block.data, static_cast<int>(block.length)));
        if (!certificate || certificates.size() == kMaximumCertificatesPerFile) return std::nullopt;
        certificates.push_back(std::move(certificate));
    }
    // The end of the text shows as a block that has no first line; anything else is a broken block.
    const bool atEnd = ERR_GET_REASON(ERR_peek_last_error()) == PEM_R_NO_START_LINE;
    if (!atEnd || certificates.empty()) return std::nullopt;
    return certificates;
}

}  // namespace pinwell::trust
