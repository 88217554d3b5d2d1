#include "lumora-local/passphrase.h"

#include <fcntl.h>
#include <openssl/crypto.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>

#include "foundation/error.h"
#include "foundation/file_io.h"
#include "foundation/format.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

constexpr std::string_view kCredentialScheme = "credential:";

}  // namespace

Passphrase::~Passphrase() {
    OPENSSL_cleanse(text_.data(), text_.size());
}

void Passphrase::read(const std::string& place) {
    const std::string path = pathOfPassphrase(place);
    const auto fail = [&](int reason) {
        throw Failure(EX_NOINPUT, foundation::Error::posix(reason, path).localizedDescription());
    };
    const foundation::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    if (!file) fail(errno);
    struct stat status {};
    if (::fstat(file.get(), &status) != 0) fail(errno);
    if (!S_ISREG(status.st_mode)) {
        throw Failure(EX_CONFIG, foundation::format("the passphrase file %@ is no regular file", path));
    }
    std::size_t length = 0;
    while (length < text_.size()) {
        const ssize_t count = ::read(file.get(), text_.data() + length, text_.size() - length);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) fail(errno);
        if (count == 0) break;
        length += static_cast<std::size_t>(count);
    }
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
