#include "lumora-local/authority.h"

#include "lumora-local/certificate_maker.h"
#include "lumora-local/endpoint.h"
#include "lumora-local/key_file.h"
#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {
namespace {

using foundation::Date;

// RFC 5280, appendix A: ub-common-name.
constexpr std::size_t kMaximumCommonNameLength = 64;

std::string contentsOf(BIO* bio) {
    char* text = nullptr;
    const long length = BIO_get_mem_data(bio, &text);
    return {text, static_cast<std::size_t>(length)};
}

Identity toPem(const IssuedCertificate& issued) {
    const BioHandle certificate(BIO_new(BIO_s_mem()));
    const BioHandle key(BIO_new(BIO_s_secmem()));
    require(certificate != nullptr && key != nullptr &&
                PEM_write_bio_X509(certificate.get(), issued.certificate.get()) == 1 &&
                PEM_write_bio_PKCS8PrivateKey(key.get(), issued.key.get(), nullptr, nullptr, 0, nullptr,
                                              nullptr) == 1,
            "encode a certificate");
    return {contentsOf(certificate.get()), contentsOf(key.get())};
}

/// Canonical hosts hold no character that the configuration syntax gives a meaning.
std::string subjectAlternativeName(const std::vector<std::string>& hosts) {
    std::string names;
    for (const std::string& host : hosts) {
        if (!names.empty()) names += ',';
        names += (isAddress(host) ? "IP:" : "DNS:") + host;
    }
    return names;
}

}  // namespace

Identity::~Identity() {
    wipe(privateKey);
}

Authority createAuthority(const std::vector<std::string>& hosts, Date now) {
    const CertificateProfile rootProfile{.commonName = "Lumora Local Root",
                                         .basicConstraints = "critical,CA:TRUE",
                                         .keyUsage = "critical,keyCertSign,cRLSign"};
    const CertificateProfile intermediateProfile{.commonName = "Lumora Local Ticket Authority",
                                                 .basicConstraints = "critical,CA:TRUE,pathlen:0",
                                                 .keyUsage = "critical,keyCertSign,cRLSign",
                                                 .markerOid = kTicketIntermediateMarkerOid};
    const CertificateProfile signerProfile{.commonName = "Lumora Local Ticket Signer",
                                           .basicConstraints = "critical,CA:FALSE",
                                           .keyUsage = "critical,digitalSignature",
                                           .markerOid = kTicketSignerMarkerOid};
    const CertificateProfile serverProfile{.commonName = hosts.front().substr(0, kMaximumCommonNameLength),
                                           .basicConstraints = "critical,CA:FALSE",
                                           .keyUsage = "critical,digitalSignature",
                                           .extendedKeyUsage = "serverAuth",
                                           .subjectAlternativeName = subjectAlternativeName(hosts),
                                           .markerOid = kServerMarkerOid};

    const IssuedCertificate root = issueCertificate(rootProfile, nullptr, now);
    const IssuedCertificate intermediate = issueCertificate(intermediateProfile, &root, now);
    const IssuedCertificate signer = issueCertificate(signerProfile, &intermediate, now);
    const IssuedCertificate server = issueCertificate(serverProfile, &root, now);
    return {toPem(root), toPem(intermediate), toPem(signer), toPem(server)};
}

}  // namespace pinwell::lumora
