#include "trust/anchors.h"

#include <algorithm>

#include "foundation/bytes.h"
#include "foundation/format.h"
#include "trust/pem.h"

namespace pinwell::trust {
namespace {

/// Maximum lines for one file; further damaged blocks are counted.
constexpr std::size_t kMaximumReports = 16;

}  // namespace

bool contains(const CertificateList& list, const X509Certificate& certificate) {
    return std::any_of(list.begin(), list.end(),
                       [&](const X509CertificateRef& entry) { return entry->der() == certificate.der(); });
}

std::optional<CertificateList> readPem(ByteView text) {
    if (text.size() > kMaximumPemFileSize) return std::nullopt;
    CertificateList certificates;
    for (const PemBlock& block : readPemBlocks(foundation::asText(text))) {
        if (!block.data) return std::nullopt;
        if (!isCertificateBlock(block)) continue;
        X509CertificateRef certificate = X509Certificate::parse(*block.data);
        if (!certificate || certificates.size() == kMaximumCertificatesPerFile) return std::nullopt;
        certificates.push_back(std::move(certificate));
    }
    if (certificates.empty()) return std::nullopt;
    return certificates;
}

void readDeniedPem(ByteView text, DenyList& into, const std::function<void(const std::string&)>& report) {
    std::size_t certificates = 0;
    std::size_t damaged = 0;
    for (const PemBlock& block : readPemBlocks(foundation::asText(text))) {
        std::string_view damage = block.damage;
        if (block.data) {
            // OpenSSL's "trusted" form is a certificate with trailing data.
            if (!isCertificateBlock(block) && block.label != "TRUSTED CERTIFICATE") continue;
            if (X509CertificateRef certificate = X509Certificate::parse(*block.data)) {
                into.add(certificate);
                ++certificates;
                continue;
            }
            const bool hasKey = into.addUnreadable(*block.data);
            damage = hasKey ? "it is no proper certificate; its key is distrusted all the same"
                            : "it is no certificate";
        }
        if (++damaged <= kMaximumReports)
            report(foundation::format("the block at line %zu: %@", block.line, std::string(damage)));
    }
    if (damaged > kMaximumReports)
        report(foundation::format("%zu more blocks are damaged", damaged - kMaximumReports));
    if (certificates == 0 && damaged == 0) report("not a PEM file of certificates");
}

}  // namespace pinwell::trust
