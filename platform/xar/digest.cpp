#include "xar/digest.h"

#include <openssl/evp.h>

#include <algorithm>
#include <array>
#include <new>

#include "foundation/handle.h"

namespace pinwell::xar {
namespace {

struct Known {
    DigestAlgorithm algorithm;
    std::string_view name;
    std::size_t size;
};

constexpr std::array<Known, 7> kKnown{{
    {DigestAlgorithm::none, "none", 0},
    {DigestAlgorithm::md5, "md5", 16},
    {DigestAlgorithm::sha1, "sha1", 20},
    {DigestAlgorithm::sha224, "sha224", 28},
    {DigestAlgorithm::sha256, "sha256", 32},
    {DigestAlgorithm::sha384, "sha384", 48},
    {DigestAlgorithm::sha512, "sha512", kLongestDigest},
}};

const EVP_MD* implementation(DigestAlgorithm algorithm) {
    switch (algorithm) {
        case DigestAlgorithm::none:
            return nullptr;
        case DigestAlgorithm::md5:
            return EVP_md5();
        case DigestAlgorithm::sha1:
            return EVP_sha1();
        case DigestAlgorithm::sha224:
            return EVP_sha224();
        case DigestAlgorithm::sha256:
            return EVP_sha256();
        case DigestAlgorithm::sha384:
            return EVP_sha384();
        case DigestAlgorithm::sha512:
            return EVP_sha512();
    }
    return nullptr;
}

}  // namespace

std::optional<DigestAlgorithm> digestAlgorithmNamed(std::string_view name) {
    const auto* const found =
        std::find_if(kKnown.begin(), kKnown.end(), [&](const Known& known) { return known.name == name; });
    return found == kKnown.end() ? std::nullopt : std::optional(found->algorithm);
}

std::size_t digestSize(DigestAlgorithm algorithm) {
    const auto* const found = std::find_if(kKnown.begin(), kKnown.end(),
                                           [&](const Known& known) { return known.algorithm == algorithm; });
    return found->size;
}

struct Digest::Context {
    foundation::Handle<EVP_MD_CTX, EVP_MD_CTX_free> handle{EVP_MD_CTX_new()};
    std::size_t size = 0;
};

Digest::Digest(DigestAlgorithm algorithm) {
    if (algorithm == DigestAlgorithm::none) return;
    context_ = std::make_unique<Context>();
    context_->size = digestSize(algorithm);
    EVP_MD_CTX* const handle = context_->handle.get();
    if (handle == nullptr || EVP_DigestInit_ex(handle, implementation(algorithm), nullptr) != 1)
        throw std::bad_alloc();
}

Digest::~Digest() = default;

void Digest::update(foundation::ByteView bytes) {
    if (context_ && EVP_DigestUpdate(context_->handle.get(), bytes.data(), bytes.size()) != 1)
        throw std::bad_alloc();
}

foundation::Data Digest::finish() {
    if (!context_) return {};
    std::array<unsigned char, EVP_MAX_MD_SIZE> value{};
    if (EVP_DigestFinal_ex(context_->handle.get(), value.data(), nullptr) != 1) throw std::bad_alloc();
    return foundation::toData(std::as_bytes(std::span(value)).first(context_->size));
}

}  // namespace pinwell::xar
