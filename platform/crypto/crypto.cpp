#include "crypto/crypto.h"

#include <malloc.h>
#include <openssl/crypto.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <map>
#include <new>

#include "crypto/openssl.h"

namespace pinwell::crypto {
namespace {

const char* nameOf(Digest digest) {
    switch (digest) {
        case Digest::md5:
            return "MD5";
        case Digest::sha1:
            return "SHA1";
        case Digest::sha224:
            return "SHA2-224";
        case Digest::sha256:
            return "SHA2-256";
        case Digest::sha384:
            return "SHA2-384";
        case Digest::sha512:
            break;
    }
    return "SHA2-512";
}

}  // namespace

std::size_t digestSize(Digest digest) {
    switch (digest) {
        case Digest::md5:
            return 16;
        case Digest::sha1:
            return 20;
        case Digest::sha224:
            return 28;
        case Digest::sha256:
            return 32;
        case Digest::sha384:
            return 48;
        case Digest::sha512:
            break;
    }
    return kLongestDigest;
}

struct Hasher::State {
    Handle<EVP_MD, EVP_MD_free> algorithm;
    Handle<EVP_MD_CTX, EVP_MD_CTX_free> context;
    std::array<unsigned char, EVP_MAX_MD_SIZE> value{};
    bool isFresh = false;  // initialised, and nothing hashed yet
};

Hasher::Hasher(Digest digest) : state_(std::make_unique<State>()) {
    // Fetched once: an implicit fetch would search by name for every piece.
    state_->algorithm.reset(EVP_MD_fetch(nullptr, nameOf(digest), nullptr));
    state_->context.reset(EVP_MD_CTX_new());
    if (!state_->algorithm || !state_->context ||
        EVP_DigestInit_ex2(state_->context.get(), state_->algorithm.get(), nullptr) != 1)
        throw std::bad_alloc();
    state_->isFresh = true;
}

Hasher::~Hasher() = default;
Hasher::Hasher(Hasher&&) noexcept = default;
Hasher& Hasher::operator=(Hasher&&) noexcept = default;

void Hasher::begin() {
    if (!state_->isFresh && EVP_DigestInit_ex2(state_->context.get(), nullptr, nullptr) != 1)
        throw std::bad_alloc();
    state_->isFresh = true;
}

void Hasher::update(ByteView bytes) {
    state_->isFresh = false;
    if (EVP_DigestUpdate(state_->context.get(), bytes.data(), bytes.size()) != 1) throw std::bad_alloc();
}

ByteView Hasher::finish() {
    state_->isFresh = false;
    unsigned length = 0;
    if (EVP_DigestFinal_ex(state_->context.get(), state_->value.data(), &length) != 1) throw std::bad_alloc();
    return std::as_bytes(std::span(state_->value)).first(length);
}

ByteView Hasher::of(ByteView bytes) {
    begin();
    update(bytes);
    return finish();
}

Hasher& threadHasher(Digest digest) {
    thread_local std::map<Digest, Hasher> hashers;
    const auto found = hashers.find(digest);
    return found != hashers.end() ? found->second : hashers.emplace(digest, Hasher(digest)).first->second;
}

Data digestOf(Digest digest, ByteView bytes) {
    return base::toData(threadHasher(digest).of(bytes));
}

std::optional<Data> availableDigestOf(Digest digest, ByteView bytes) {
    const ErrorQueueGuard guard;
    try {
        return digestOf(digest, bytes);
    } catch (const std::bad_alloc&) {
        return std::nullopt;
    }
}

// Wiping OpenSSL's memory.

namespace {

void* allocate(std::size_t size, const char*, int) {
    return std::malloc(size);  // NOLINT(*-no-malloc)
}

void release(void* memory, const char*, int) {
    if (memory == nullptr) return;
    OPENSSL_cleanse(memory, malloc_usable_size(memory));
    std::free(memory);  // NOLINT(*-no-malloc)
}

// Without realloc(3), which does not wipe the old memory when it moves.
void* reallocate(void* memory, std::size_t size, const char* file, int line) {
    void* const moved = size == 0 ? nullptr : std::malloc(size);  // NOLINT(*-no-malloc)
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

}  // namespace pinwell::crypto
