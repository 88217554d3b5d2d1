#include "codesign/digest.h"

#include <openssl/evp.h>

#include <array>
#include <new>

#include "foundation/handle.h"

namespace pinwell::codesign {

namespace {

const EVP_MD* algorithm(DigestType type) {
    switch (type) {
        case DigestType::sha1:
            return EVP_sha1();
        case DigestType::sha256:
        case DigestType::sha256Truncated:
            return EVP_sha256();
        case DigestType::sha384:
            return EVP_sha384();
    }
    return nullptr;
}

}  // namespace

struct Hasher::State {
    DigestType type;
    foundation::Handle<EVP_MD_CTX, EVP_MD_CTX_free> context;
};

std::optional<DigestType> digestTypeNumbered(std::uint8_t number) {
    if (number < 1 || number > 4) return std::nullopt;
    return static_cast<DigestType>(number);
}

std::size_t digestSize(DigestType type) {
    switch (type) {
        case DigestType::sha1:
        case DigestType::sha256Truncated:
            return 20;
        case DigestType::sha256:
            return 32;
        case DigestType::sha384:
            return 48;
    }
    return 0;
}

std::size_t codeHashSize(DigestType type) {
    return type == DigestType::sha384 ? 48 : 20;
}

int digestStrength(DigestType type) {
    switch (type) {
        case DigestType::sha1:
            return 1;
        case DigestType::sha256Truncated:
            return 2;
        case DigestType::sha256:
            return 3;
        case DigestType::sha384:
            return 4;
    }
    return 0;
}

// The library's digests fail only without memory, or if a local policy forbids one of them. Neither is a
// property of the file, so both are handled like a lack of memory.
Hasher::Hasher(DigestType type) : state_(std::make_unique<State>(State{type, nullptr})) {
    state_->context.reset(EVP_MD_CTX_new());
    if (!state_->context || EVP_DigestInit_ex(state_->context.get(), algorithm(type), nullptr) != 1) {
        throw std::bad_alloc();
    }
}

Hasher::~Hasher() = default;

void Hasher::update(ByteView bytes) {
    if (EVP_DigestUpdate(state_->context.get(), bytes.data(), bytes.size()) != 1) throw std::bad_alloc();
}

Data Hasher::finish() {
    std::array<unsigned char, EVP_MAX_MD_SIZE> value = {};
    if (EVP_DigestFinal_ex(state_->context.get(), value.data(), nullptr) != 1) throw std::bad_alloc();
    const ByteView whole = std::as_bytes(std::span(value));
    return foundation::toData(whole.first(digestSize(state_->type)));
}

Data digest(DigestType type, ByteView bytes) {
    Hasher hasher(type);
    hasher.update(bytes);
    return hasher.finish();
}

}  // namespace pinwell::codesign
