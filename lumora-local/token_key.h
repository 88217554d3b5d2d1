// A signing key in a PKCS #11 token, used in the process that opens it.
//
// The URI (RFC 7512) names the token by `token`, `serial`, `manufacturer` or `model`, and the key by `object`
// (its label) or `id`. `module-path` names the token's library; without it, the libraries in p11-kit's
// configuration are used. `pin-source` is a file with the PIN, or "credential:NAME" (key_file.h). A PIN in
// the URI itself is refused. Exactly one private EC key on P-256 must match; the token must also have its
// public key.
#pragma once

#include <memory>
#include <string>

#include "lumora-local/signing_process.h"

namespace pinwell::lumora {

/// Throws Failure (EX_CONFIG) if the URI names no such key, or if this program was built without PKCS #11;
/// EX_NOINPUT if the PIN cannot be read.
std::unique_ptr<DigestSigner> openTokenKey(const std::string& uri);

}  // namespace pinwell::lumora
