#include "lumora-local/passphrase.h"

#include <openssl/crypto.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <span>

#include "foundation/format.h"
#include "foundation/secret_file.h"
#include "lumora-local/failure.h"
#include "lumora-local/secret_file.h"

namespace pinwell::lumora {
namespace {

constexpr std::string_view kCredentialScheme = "credential:";

}  // namespace

Passphrase::~Passphrase() {
    OPENSSL_cleanse(text_.data(), text_.size());
}

void Passphrase::read(const std::string& place) {
    const std::string path = pathOfPassphrase(place);
    const auto file = secretOf(foundation::openSecret(path));
    struct stat status {};
    if (::fstat(file.get(), &status) != 0)
        throw Failure(EX_NOINPUT, foundation::Error::posix(errno, path).localizedDescription());
    if (!S_ISREG(status.st_mode)) {
        throw Failure(EX_CONFIG, foundation::format("the passphrase file %@ is no regular file", path));
    }
    const std::size_t length =
        secretOf(foundation::readSecret(file, path, std::as_writable_bytes(std::span(text_))));
    const auto* const end =
        std::find(text_.begin(), text_.begin() + static_cast<std::ptrdiff_t>(length), '\n');
    length_ = static_cast<std::size_t>(end - text_.begin());
    if (length_ > 0 && text_.at(length_ - 1) == '\r') --length_;
    if (length_ == 0 || length_ > kMaximumPassphraseLength) {
        throw Failure(EX_CONFIG, foundation::format("the passphrase in %@ has %s", path,
                                                    length_ == 0 ? "no characters" : "too many characters"));
    }
}

bool isCredential(std::string_view place) {
    return place.starts_with(kCredentialScheme);
}

std::string pathOfPassphrase(const std::string& place) {
    if (!isCredential(place)) return place;
    const std::string name = place.substr(kCredentialScheme.size());
    if (name.empty() || name == "." || name == ".." || name.find('/') != std::string::npos) {
        throw Failure(EX_CONFIG, foundation::format("%@ is not the name of a credential", place));
    }
    const char* directory = std::getenv("CREDENTIALS_DIRECTORY");
    if (directory == nullptr || *directory == '\0') {
        throw Failure(EX_CONFIG,
                      foundation::format("%@: there is no CREDENTIALS_DIRECTORY, which systemd sets", place));
    }
    return std::string(directory) + "/" + name;
}

}  // namespace pinwell::lumora
