#include "key_file.h"

#include <fcntl.h>
#include <openssl/crypto.h>
#include <openssl/pkcs12.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <span>
#include <utility>

#include "base/error.h"
#include "base/file_io.h"
#include "failure.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

constexpr std::string_view kCredentialScheme = "credential:";

/// The value, or the Failure (EX_NOINPUT) of a secret that cannot be read.
template <class T>
T secretOf(base::Result<T> result) {
    if (!result) throw Failure(EX_NOINPUT, result.error().localizedDescription());
    return *std::move(result);
}

}  // namespace

Passphrase::~Passphrase() {
    OPENSSL_cleanse(text_.data(), text_.size());
}

void Passphrase::read(const std::string& place) {
    const std::string path = pathOfPassphrase(place);
    auto opened = base::openRegularFile(path, O_RDONLY);
    if (!opened && (opened.error().code() == EISDIR || opened.error().code() == EINVAL))
        throw Failure(EX_CONFIG, values::format("the passphrase file %@ is no regular file", path));
    const auto file = secretOf(std::move(opened));
    const std::size_t length =
        secretOf(base::readSecret(file.descriptor, path, std::as_writable_bytes(std::span(text_))));
    const auto* const end =
        std::find(text_.begin(), text_.begin() + static_cast<std::ptrdiff_t>(length), '\n');
    length_ = static_cast<std::size_t>(end - text_.begin());
    if (length_ > 0 && text_.at(length_ - 1) == '\r') --length_;
    if (length_ == 0 || length_ > kMaximumPassphraseLength) {
        throw Failure(EX_CONFIG, values::format("the passphrase in %@ has %s", path,
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
        throw Failure(EX_CONFIG, values::format("%@ is not the name of a credential", place));
    }
    const char* directory = std::getenv("CREDENTIALS_DIRECTORY");
    if (directory == nullptr || *directory == '\0') {
        throw Failure(EX_CONFIG,
                      values::format("%@: there is no CREDENTIALS_DIRECTORY, which systemd sets", place));
    }
    return std::string(directory) + "/" + name;
}

namespace {

constexpr std::size_t kMaximumKeyFile = std::size_t{64} * 1024;

using PrivateKeyInfoHandle = base::Handle<PKCS8_PRIV_KEY_INFO, PKCS8_PRIV_KEY_INFO_free>;
using EncryptedKeyHandle = base::Handle<X509_SIG, X509_SIG_free>;

// RFC 7914: 16 MiB for each guess, the library's default maximum.
constexpr int kSaltSize = 16;
constexpr std::uint64_t kScryptCost = 16384;
constexpr std::uint64_t kScryptBlocks = 8;
constexpr std::uint64_t kScryptLanes = 1;

// The passphrase for the library's callback. No exception may pass through the library.
struct PassphraseRequest {
    const std::string& file;
    bool asked;
    std::exception_ptr failure;
};

int givePassphrase(char* buffer, int size, int, void* context) {
    auto& request = *static_cast<PassphraseRequest*>(context);
    request.asked = true;
    if (request.file.empty()) return -1;
    try {
        Passphrase passphrase;
        passphrase.read(request.file);
        const std::string_view text = passphrase.text();
        if (text.size() > static_cast<std::size_t>(size)) return -1;
        std::memcpy(buffer, text.data(), text.size());
        return static_cast<int>(text.size());
    } catch (...) {
        request.failure = std::current_exception();
        return -1;
    }
}

}  // namespace

KeyHandle readKeyFile(const std::string& path, const std::string& passphraseFile) {
    base::WipedRoom<kMaximumKeyFile + 1> room;
    const auto length = static_cast<int>(secretOf(base::readSecretFile(path, room.bytes())));
    // Reads from the buffer itself, without a copy.
    const BioHandle pem(BIO_new_mem_buf(room.bytes().data(), length));
    require(pem != nullptr, "read a PEM file");
    PassphraseRequest request{passphraseFile, false, nullptr};
    KeyHandle key(PEM_read_bio_PrivateKey(pem.get(), nullptr, givePassphrase, &request));
    if (request.failure) std::rethrow_exception(request.failure);
    if (key == nullptr && request.asked) {
        ERR_clear_error();
        if (passphraseFile.empty()) {
            throw Failure(EX_CONFIG, values::format("the key in %@ is encrypted, and service.json names no "
                                                    "\"passphraseFile\"",
                                                    path));
        }
        throw Failure(EX_CONFIG, values::format("the passphrase in %@ does not open the key in %@",
                                                passphraseFile, path));
    }
    require(key != nullptr, "read the key in " + path);
    return key;
}

std::string encodeKey(EVP_PKEY* key, std::string_view passphrase) {
    const BioHandle pem(BIO_new(BIO_s_secmem()));
    require(pem != nullptr, "encode a key");
    if (passphrase.empty()) {
        require(PEM_write_bio_PKCS8PrivateKey(pem.get(), key, nullptr, nullptr, 0, nullptr, nullptr) == 1,
                "encode a key");
    } else {
        const PrivateKeyInfoHandle plain(EVP_PKEY2PKCS8(key));
        crypto::AlgorithmHandle algorithm(PKCS5_pbe2_set_scrypt(
            EVP_aes_256_cbc(), nullptr, kSaltSize, nullptr, kScryptCost, kScryptBlocks, kScryptLanes));
        require(plain != nullptr && algorithm != nullptr, "encrypt a key");
        const EncryptedKeyHandle encrypted(PKCS8_set0_pbe(
            passphrase.data(), static_cast<int>(passphrase.size()), plain.get(), algorithm.get()));
        require(encrypted != nullptr, "encrypt a key");
        static_cast<void>(algorithm.release());  // the encrypted key owns it
        require(PEM_write_bio_PKCS8(pem.get(), encrypted.get()) == 1, "encrypt a key");
    }
    return textOf(pem.get());
}

void wipe(std::string& text) {
    OPENSSL_cleanse(text.data(), text.size());
    text.clear();
}

}  // namespace pinwell::lumora
