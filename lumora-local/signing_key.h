// The private key that signs tickets: in a file, or in a token that never releases it.
//
// Only a separate process uses a token. It starts before this process gives up its rights and reads an
// artefact. So a hostile artefact cannot reach the files, code and connections of a token's library. This
// process never has the key or the token's PIN.
#pragma once

#include <memory>
#include <string>

#include "foundation/bytes.h"

namespace pinwell::lumora {

/// An EC key on P-256. For any thread.
class SigningKey {
  public:
    virtual ~SigningKey() = default;

    /// DER of SubjectPublicKeyInfo (RFC 5280, 4.1).
    virtual foundation::Data publicKey() const = 0;

    /// ECDSA with SHA-256 over `message`, in DER. Throws Failure.
    virtual foundation::Data sign(foundation::ByteView message) const = 0;
};

/// `key` is a PEM file, opened with the passphrase at `passphraseFile` if it is encrypted, or a pkcs11: URI.
/// For a URI the calling process must have one thread. Throws Failure: EX_NOINPUT if a file cannot be read,
/// EX_CONFIG if there is no such key, or it is none on P-256.
std::unique_ptr<SigningKey> openSigningKey(const std::string& key, const std::string& passphraseFile);

}  // namespace pinwell::lumora
