#include "lumora-local/key_file.h"

#include <malloc.h>
#include <openssl/crypto.h>
#include <openssl/pkcs12.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <span>

#include "foundation/format.h"
#include "lumora-local/passphrase.h"
#include "lumora-local/secret_file.h"

namespace pinwell::lumora {
namespace {

constexpr std::size_t kMaximumKeyFile = std::size_t{64} * 1024;

// Room that is wiped when it goes.
class WipedBuffer {
  public:
    WipedBuffer() = default;
    ~WipedBuffer() { OPENSSL_cleanse(bytes_.data(), bytes_.size()); }
    WipedBuffer(const WipedBuffer&) = delete;
    WipedBuffer& operator=(const WipedBuffer&) = delete;

    std::byte* data() noexcept { return bytes_.data(); }
    static constexpr std::size_t size() noexcept { return kMaximumKeyFile + 1; }

  private:
    std::array<std::byte, kMaximumKeyFile + 1> bytes_{};
};

// Returns the number of bytes, or throws.
std::size_t readInto(WipedBuffer& buffer, const std::string& path) {
    const std::size_t length =
        readSecret(openSecret(path), path, std::span(buffer.data(), WipedBuffer::size()));
    if (length == WipedBuffer::size()) failToReadSecret(path, EFBIG);
    return length;
}

using PrivateKeyInfoHandle = foundation::Handle<PKCS8_PRIV_KEY_INFO, PKCS8_PRIV_KEY_INFO_free>;
using AlgorithmHandle = foundation::Handle<X509_ALGOR, X509_ALGOR_free>;
using EncryptedKeyHandle = foundation::Handle<X509_SIG, X509_SIG_free>;

// RFC 7914: 16 MiB for each guess, which is as much as the library allows by itself.
constexpr int kSaltSize = 16;
constexpr std::uint64_t kScryptCost = 16384;
constexpr std::uint64_t kScryptBlocks = 8;
constexpr std::uint64_t kScryptLanes = 1;

// What the library's question for a passphrase is answered from. Nothing is thrown through the library.
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

void* allocate(std::size_t size, const char*, int) {
    return std::malloc(size);
}

void release(void* memory, const char*, int) {
    if (memory == nullptr) return;
    OPENSSL_cleanse(memory, malloc_usable_size(memory));
    std::free(memory);
}

// Not by realloc(3), which leaves the old place as it is when it moves.
void* reallocate(void* memory, std::size_t size, const char* file, int line) {
    void* const moved = size == 0 ? nullptr : std::malloc(size);
    if (memory == nullptr) return moved;
    if (size != 0 && moved == nullptr) return nullptr;
    if (moved != nullptr) std::memcpy(moved, memory, std::min(size, malloc_usable_size(memory)));
    release(memory, file, line);
    return moved;
}

}  // namespace

bool wipeWhatOpenSSLFrees() noexcept {
    return CRYPTO_set_mem_functions(allocate, reallocate, release) == 1;
}

KeyHandle readKeyFile(const std::string& path, const std::string& passphraseFile) {
    WipedBuffer buffer;
    const auto length = static_cast<int>(readInto(buffer, path));
    // Reads from the buffer itself, and copies nothing.
    const BioHandle pem(BIO_new_mem_buf(buffer.data(), length));
    require(pem != nullptr, "read a PEM file");
    PassphraseRequest request{passphraseFile, false, nullptr};
    KeyHandle key(PEM_read_bio_PrivateKey(pem.get(), nullptr, givePassphrase, &request));
    if (request.failure) std::rethrow_exception(request.failure);
    if (key == nullptr && request.asked) {
        ERR_clear_error();
        if (passphraseFile.empty()) {
            throw Failure(EX_CONFIG,
                          foundation::format("the key in %@ is encrypted, and service.json names no "
                                             "\"passphraseFile\"",
                                             path));
        }
        throw Failure(EX_CONFIG, foundation::format("the passphrase in %@ does not open the key in %@",
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
        AlgorithmHandle algorithm(PKCS5_pbe2_set_scrypt(EVP_aes_256_cbc(), nullptr, kSaltSize, nullptr,
                                                        kScryptCost, kScryptBlocks, kScryptLanes));
        require(plain != nullptr && algorithm != nullptr, "encrypt a key");
        const EncryptedKeyHandle encrypted(PKCS8_set0_pbe(
            passphrase.data(), static_cast<int>(passphrase.size()), plain.get(), algorithm.get()));
        require(encrypted != nullptr, "encrypt a key");
        static_cast<void>(algorithm.release());  // the encrypted key has it
        require(PEM_write_bio_PKCS8(pem.get(), encrypted.get()) == 1, "encrypt a key");
    }
    return textOf(pem.get());
}

void wipe(std::string& text) {
    OPENSSL_cleanse(text.data(), text.size());
    text.clear();
}

}  // namespace pinwell::lumora
