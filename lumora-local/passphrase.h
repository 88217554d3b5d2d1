// The passphrase for encrypted key files.
//
// A passphrase is the first line of a file. "credential:NAME" means the file NAME in $CREDENTIALS_DIRECTORY,
// where systemd puts the credentials of LoadCredential= and LoadCredentialEncrypted=.
#pragma once

#include <array>
#include <cstddef>
#include <string>
#include <string_view>

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

}  // namespace pinwell::lumora
