// Private keys in files, and the passphrases that open them. No copy of either stays in memory.
//
// A passphrase is the first line of a file. "credential:NAME" means the file NAME in $CREDENTIALS_DIRECTORY,
// where systemd puts the credentials of LoadCredential= and LoadCredentialEncrypted=. Includes OpenSSL's
// headers: for .cpp files of this folder.
#pragma once

#include <array>
#include <cstddef>
#include <string>
#include <string_view>

#include "openssl.h"

namespace pinwell::lumora {

inline constexpr std::size_t kMaximumPassphraseLength = 1024;

/// A text that the destructor wipes.
class Passphrase {
  public:
    Passphrase() = default;
    ~Passphrase();
    Passphrase(const Passphrase&) = delete;
    Passphrase& operator=(const Passphrase&) = delete;

    /// Reads it from `place`, a path or "credential:NAME", and replaces the earlier text. Throws Failure:
    /// EX_NOINPUT if the file cannot be read, EX_CONFIG if its first line is empty or too long.
    void read(const std::string& place);

    std::string_view text() const noexcept { return {text_.data(), length_}; }

  private:
    std::array<char, kMaximumPassphraseLength + 2> text_{};
    std::size_t length_ = 0;
};

bool isCredential(std::string_view place);

/// The path that `place` means. Throws Failure (EX_CONFIG) for a credential if there is no
/// $CREDENTIALS_DIRECTORY, or if its name is not a file name.
std::string pathOfPassphrase(const std::string& place);

/// Reads the PEM file of a private key. The passphrase at `passphraseFile` (above) opens an encrypted
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
