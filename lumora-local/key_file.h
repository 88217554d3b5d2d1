// Reading private keys so that no copy of them stays in memory.
#pragma once

#include <string>
#include <string_view>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

/// Reads the PEM file of a private key. The passphrase at `passphraseFile` (passphrase.h) opens an encrypted
/// key, and is read only then. All buffers of its text are wiped; the key's own memory is wiped with its last
/// reference. Throws Failure: EX_NOINPUT if a file cannot be read, EX_CONFIG if the key is encrypted and no
/// passphrase opens it.
KeyHandle readKeyFile(const std::string& path, const std::string& passphraseFile = {});

/// PKCS #8 in PEM: unencrypted if the passphrase is empty, otherwise encrypted (PBES2 with scrypt and
/// AES-256). The caller wipes the result.
std::string encodeKey(EVP_PKEY* key, std::string_view passphrase);

/// Overwrites the text, also a short text inside the object itself.
void wipe(std::string& text);

}  // namespace pinwell::lumora
