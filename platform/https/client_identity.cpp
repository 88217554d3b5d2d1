// Reads a session's identity from its files, and installs it in a TLS context.
#include <openssl/err.h>
#include <openssl/pem.h>
#include <openssl/ssl.h>
#include <openssl/x509.h>

#include "base/file_io.h"
#include "base/handle.h"
#include "connection.h"
#include "crypto/openssl.h"
#include "values/format.h"

namespace pinwell::https {
namespace {

using crypto::BioHandle;
using crypto::CertificateHandle;
using crypto::CertificateListHandle;
using crypto::KeyHandle;

using ContextHandle = base::Handle<SSL_CTX, SSL_CTX_free>;

Error wrongFile(std::string text) {
    return {base::kDataErrorDomain, base::kMalformedDocument, std::move(text)};
}

// Called only for an encrypted key, before it is decrypted.
int refusePassphrase(char*, int, int, void* asked) {
    *static_cast<bool*>(asked) = true;
    return -1;
}

Result<KeyHandle> readKey(const std::string& path) {
    base::WipedRoom<kMaximumIdentityKey + 1> room;
    const auto length = base::readSecretFile(path, room.bytes());
    if (!length) return length.error();
    const BioHandle pem(BIO_new_mem_buf(room.bytes().data(), static_cast<int>(*length)));
    bool isEncrypted = false;
    KeyHandle key(PEM_read_bio_PrivateKey(pem.get(), nullptr, refusePassphrase, &isEncrypted));
    if (isEncrypted)
        return wrongFile(
            values::format("The key in %@ is encrypted. Keys are taken unencrypted only.", path));
    if (!key) return wrongFile(values::format("There is no private key in %@ that can be read.", path));
    return key;
}

struct Certificates {
    CertificateHandle own;
    CertificateListHandle issuers;
};

// One file may hold the key as well: all of it is wiped, like what OpenSSL makes of it.
Result<Certificates> readCertificates(const std::string& path) {
    const auto room = std::make_unique<base::WipedRoom<kMaximumIdentityCertificates + 1>>();
    const auto length = base::readSecretFile(path, room->bytes());
    if (!length) return length.error();
    const BioHandle pem(BIO_new_mem_buf(room->bytes().data(), static_cast<int>(*length)));
    Certificates certificates{nullptr, CertificateListHandle(sk_X509_new_null())};
    std::size_t count = 0;
    while (CertificateHandle certificate{PEM_read_bio_X509(pem.get(), nullptr, nullptr, nullptr)}) {
        if (++count > kMaximumPeerCertificates)
            return wrongFile(values::format("There are more than %zu certificates in %@.",
                                            kMaximumPeerCertificates, path));
        if (!certificates.own)
            certificates.own = std::move(certificate);
        else if (sk_X509_push(certificates.issuers.get(), certificate.get()) > 0)
            static_cast<void>(certificate.release());  // the list owns it
    }
    if (ERR_GET_REASON(ERR_peek_last_error()) != PEM_R_NO_START_LINE)
        return wrongFile(values::format("Certificate number %zu in %@ cannot be read.", count + 1, path));
    if (!certificates.own) return wrongFile(values::format("There is no certificate in %@.", path));
    return certificates;
}

}  // namespace

struct ClientIdentity::Parts {
    Certificates certificates;
    KeyHandle key;
};

ClientIdentity::ClientIdentity() : parts_(std::make_unique<Parts>()) {}
ClientIdentity::~ClientIdentity() = default;

Result<std::shared_ptr<const ClientIdentity>> ClientIdentity::read(const std::string& certificatePath,
                                                                   const std::string& keyPath) {
    const crypto::ErrorQueueGuard quiet;  // our own words describe the errors
    auto certificates = readCertificates(certificatePath);
    if (!certificates) return certificates.error();
    auto key = readKey(keyPath);
    if (!key) return key.error();
    if (X509_check_private_key(certificates->own.get(), key->get()) != 1)
        return wrongFile(values::format("The key in %@ is not that of the first certificate in %@.", keyPath,
                                        certificatePath));
    auto identity = std::make_shared<ClientIdentity>();
    *identity->parts_ = {*std::move(certificates), *std::move(key)};
    const ContextHandle trial(SSL_CTX_new(TLS_client_method()));
    if (!trial || !identity->install(trial.get()))
        return wrongFile(values::format(
            "TLS does not take the certificate in %@ with the key in %@. They may be too weak.",
            certificatePath, keyPath));
    return std::shared_ptr<const ClientIdentity>(std::move(identity));
}

bool ClientIdentity::install(void* context) const noexcept {
    const crypto::ErrorQueueGuard quiet;  // our own words describe the errors
    return SSL_CTX_use_cert_and_key(static_cast<SSL_CTX*>(context), parts_->certificates.own.get(),
                                    parts_->key.get(), parts_->certificates.issuers.get(), 1) == 1;
}

}  // namespace pinwell::https
