#include "authority.h"

#include "certificates.h"
#include "endpoint.h"
#include "key_file.h"
#include "openssl.h"

namespace pinwell::lumora {
namespace {

using values::Date;

// RFC 5280, appendix A: ub-common-name.
constexpr std::size_t kMaximumCommonNameLength = 64;

Identity toPem(const IssuedCertificate& issued, std::string_view passphrase) {
    return {encodeCertificate(issued.certificate.get()), encodeKey(issued.key.get(), passphrase)};
}

/// Canonical hosts have no character with a meaning in the configuration syntax.
std::string subjectAlternativeName(const std::vector<std::string>& hosts) {
    std::string names;
    for (const std::string& host : hosts) {
        if (!names.empty()) names += ',';
        names += (isAddress(host) ? "IP:" : "DNS:") + host;
    }
    return names;
}

CertificateProfile rootProfile() {
    return {.commonName = "Lumora Local Root",
            .basicConstraints = "critical,CA:TRUE",
            .keyUsage = "critical,keyCertSign,cRLSign"};
}

CertificateProfile intermediateProfile() {
    return {.commonName = "Lumora Local Ticket Authority",
            .basicConstraints = "critical,CA:TRUE,pathlen:0",
            .keyUsage = "critical,keyCertSign,cRLSign",
            .markerOid = kTicketIntermediateMarkerOid};
}

CertificateProfile signerProfile() {
    return {.commonName = "Lumora Local Ticket Signer",
            .basicConstraints = "critical,CA:FALSE",
            .keyUsage = "critical,digitalSignature",
            .markerOid = kTicketSignerMarkerOid};
}

CertificateProfile serverProfile(const std::vector<std::string>& hosts) {
    return {.commonName = hosts.front().substr(0, kMaximumCommonNameLength),
            .basicConstraints = "critical,CA:FALSE",
            .keyUsage = "critical,digitalSignature",
            .extendedKeyUsage = "serverAuth",
            .subjectAlternativeName = subjectAlternativeName(hosts),
            .markerOid = kServerMarkerOid};
}

IssuedCertificate readIssuer(const IssuerFiles& files) {
    IssuedCertificate issuer{readCertificateFile(files.certificate),
                             readKeyFile(files.key, files.passphraseFile)};
    if (X509_check_private_key(issuer.certificate.get(), issuer.key.get()) != 1) {
        ERR_clear_error();
        throw Failure(EX_CONFIG, values::format("the key in %@ is not the one of the certificate in %@",
                                                files.key, files.certificate));
    }
    return issuer;
}

}  // namespace

Identity::~Identity() {
    wipe(privateKey);
}

Authority createAuthority(const std::vector<std::string>& hosts, Date now, std::string_view passphrase) {
    const IssuedCertificate root = issueCertificate(rootProfile(), nullptr, now);
    const IssuedCertificate intermediate = issueCertificate(intermediateProfile(), &root, now);
    const IssuedCertificate signer = issueCertificate(signerProfile(), &intermediate, now);
    const IssuedCertificate server = issueCertificate(serverProfile(hosts), &root, now);
    return {toPem(root, passphrase), toPem(intermediate, passphrase), toPem(signer, passphrase),
            toPem(server, passphrase)};
}

Identity issueSigner(const IssuerFiles& intermediate, Date now, std::string_view passphrase) {
    const IssuedCertificate issuer = readIssuer(intermediate);
    return toPem(issueCertificate(signerProfile(), &issuer, now), passphrase);
}

std::string certifySigner(const IssuerFiles& intermediate, base::ByteView publicKey, Date now) {
    const IssuedCertificate issuer = readIssuer(intermediate);
    const unsigned char* der = unsignedBytes(publicKey);
    const KeyHandle key(d2i_PUBKEY(nullptr, &der, static_cast<long>(publicKey.size())));
    require(key != nullptr, "read a public key");
    return encodeCertificate(certifyKey(signerProfile(), key.get(), issuer, now).get());
}

Identity issueServer(const IssuerFiles& root, const std::vector<std::string>& hosts, Date now,
                     std::string_view passphrase) {
    const IssuedCertificate issuer = readIssuer(root);
    return toPem(issueCertificate(serverProfile(hosts), &issuer, now), passphrase);
}

Identity createClientAuthority(Date now, std::string_view passphrase) {
    const CertificateProfile profile{.commonName = "Lumora Local Clients",
                                     .basicConstraints = "critical,CA:TRUE,pathlen:0",
                                     .keyUsage = "critical,keyCertSign,cRLSign"};
    return toPem(issueCertificate(profile, nullptr, now), passphrase);
}

Identity issueClient(const IssuerFiles& authority, const std::string& commonName, Date now) {
    const IssuedCertificate issuer = readIssuer(authority);
    const CertificateProfile profile{.commonName = commonName,
                                     .basicConstraints = "critical,CA:FALSE",
                                     .keyUsage = "critical,digitalSignature",
                                     .extendedKeyUsage = "clientAuth"};
    return toPem(issueCertificate(profile, &issuer, now), {});
}

Identity requestSigner(std::string_view passphrase) {
    const KeyHandle key = makeKey(KeyKind::ellipticCurveP256);
    return {requestCertificate(signerProfile(), key.get()), encodeKey(key.get(), passphrase)};
}

}  // namespace pinwell::lumora
