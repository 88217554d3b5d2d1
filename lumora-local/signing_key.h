// The private key that signs tickets: in a file, or in a PKCS #11 token that never releases it.
//
// Only a separate process uses a token. It starts before this process gives up its rights and reads an
// artefact. So a hostile artefact cannot reach the files, code and connections of a token's library. This
// process never has the key or the token's PIN.
//
// A token's URI (RFC 7512) names the token by `token`, `serial`, `manufacturer` or `model`, and the key by
// `object` (its label) or `id`. `module-path` names the token's library; without it, the libraries in
// p11-kit's configuration are used. `pin-source` is a file with the PIN, or "credential:NAME" (key_file.h). A
// PIN in the URI itself is refused. Exactly one private EC key on P-256 must match; the token must also have
// its public key.
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "base/bytes.h"

namespace pinwell::lumora {

/// An EC key on P-256. For any thread.
class SigningKey {
  public:
    virtual ~SigningKey() = default;

    /// DER of SubjectPublicKeyInfo (RFC 5280, 4.1).
    virtual base::Data publicKey() const = 0;

    /// ECDSA with SHA-256 over `message`, in DER. Throws Failure.
    virtual base::Data sign(base::ByteView message) const = 0;
};

/// `key` is a PEM file, opened with the passphrase at `passphraseFile` if it is encrypted, or a pkcs11: URI.
/// For a URI the calling process must have one thread. Throws Failure: EX_NOINPUT if a file cannot be read,
/// EX_CONFIG if there is no such key, or it is not on P-256.
std::unique_ptr<SigningKey> openSigningKey(const std::string& key, const std::string& passphraseFile);

/// A key on P-256 in the process that uses the token. One thread at a time.
class DigestSigner {
  public:
    virtual ~DigestSigner() = default;

    /// DER of SubjectPublicKeyInfo.
    virtual base::Data publicKey() const = 0;

    /// ECDSA over a digest of 32 bytes, in DER. Throws Failure (EX_IOERR).
    virtual base::Data signDigest(base::ByteView digest) const = 0;
};

/// The time limit of a signature. Opening a token may take its owner longer.
inline constexpr std::chrono::milliseconds kSigningPatience{30'000};

/// Starts a child, which calls `open` and signs until the result is destroyed. Throws an exception of `open`
/// if it is a Failure; its exit status and text come from the child.
///
/// sign() throws Failure (EX_IOERR) if the child has ended or does not respond in time. After that it sends
/// no more questions, and the destructor does not wait for the child.
std::unique_ptr<SigningKey> startSigningProcess(const std::function<std::unique_ptr<DigestSigner>()>& open,
                                                std::chrono::milliseconds patience = kSigningPatience);

/// A key in a token, for the process that uses it. Throws Failure (EX_CONFIG) if the URI names no such key,
/// or if this program was built without PKCS #11; EX_NOINPUT if the PIN cannot be read.
std::unique_ptr<DigestSigner> openTokenKey(const std::string& uri);

}  // namespace pinwell::lumora
