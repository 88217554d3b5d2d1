// A signing key in a PKCS #11 token, used in this very process.
//
// The URI (RFC 7512) names the token by `token`, `serial`, `manufacturer` or `model`, and the key by `object`
// (its label) or `id`. `module-path` names the token's library; without it, those that p11-kit's
// configuration lists are asked. `pin-source` is a file with the PIN, or "credential:NAME" (passphrase.h). A
// PIN in the URI itself is refused. One private EC key on P-256 must fit; its public key must be in the token
// too.
#pragma once

#include <memory>
#include <string>

#include "foundation/bytes.h"

namespace pinwell::lumora {

/// One thread at a time.
class TokenKey {
  public:
    /// Throws Failure (EX_CONFIG) if the URI names no such key; EX_NOINPUT if the PIN cannot be read.
    explicit TokenKey(const std::string& uri);
    ~TokenKey();
    TokenKey(const TokenKey&) = delete;
    TokenKey& operator=(const TokenKey&) = delete;

    /// DER of SubjectPublicKeyInfo.
    foundation::Data publicKey() const;

    /// ECDSA over a digest of 32 bytes, in DER. Throws Failure (EX_IOERR).
    foundation::Data signDigest(foundation::ByteView digest) const;

  private:
    struct Session;
    std::unique_ptr<Session> session_;
};

}  // namespace pinwell::lumora
