// Reading private keys so that no copy of them stays in memory.
#pragma once

#include <string>
#include <string_view>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

/// Reads the PEM file of a private key; an encrypted one is opened with the passphrase at `passphraseFile`
/// (passphrase.h), which is read only then. Whatever buffers its text went through are wiped; the key's own
/// memory is wiped when its last reference goes. Throws Failure: EX_NOINPUT if a file cannot be read,
/// EX_CONFIG if the key is encrypted and no passphrase opens it.
KeyHandle readKeyFile(const std::string& path, const std::string& passphraseFile = {});

/// PKCS #8 in PEM: in the clear if the passphrase is empty, otherwise encrypted (PBES2 with scrypt and
/// AES-256). The caller wipes what is returned.
std::string encodeKey(EVP_PKEY* key, std::string_view passphrase);

/// Overwrites the text, also where a copy of it was short enough to be in the object itself.
void wipe(std::string& text);

}  // namespace pinwell::lumora
