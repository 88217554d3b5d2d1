#include "verify/page_digest.h"

#include <openssl/evp.h>

#include <algorithm>
#include <map>
#include <new>

#include "foundation/handle.h"

namespace pinwell::verify {

namespace {

const char* nameOf(Algorithm algorithm) {
    switch (algorithm) {
        case Algorithm::md5:
            return "MD5";
        case Algorithm::sha1:
            return "SHA1";
        case Algorithm::sha224:
            return "SHA2-224";
        case Algorithm::sha256:
            return "SHA2-256";
        case Algorithm::sha384:
            return "SHA2-384";
        case Algorithm::sha512:
            break;
    }
    return "SHA2-512";
}

}  // namespace

struct PageDigest::State {
    foundation::Handle<EVP_MD, EVP_MD_free> algorithm;
    foundation::Handle<EVP_MD_CTX, EVP_MD_CTX_free> context;
    std::array<unsigned char, EVP_MAX_MD_SIZE> value{};
    bool isFresh = false;  // initialised, and nothing hashed yet
};

Algorithm algorithmOf(codesign::DigestType type) {
    switch (type) {
        case codesign::DigestType::sha1:
            return Algorithm::sha1;
        case codesign::DigestType::sha256:
        case codesign::DigestType::sha256Truncated:
            return Algorithm::sha256;
        case codesign::DigestType::sha384:
            break;
    }
    return Algorithm::sha384;
}

std::size_t digestLength(Algorithm algorithm) {
    switch (algorithm) {
        case Algorithm::md5:
            return 16;
        case Algorithm::sha1:
            return 20;
        case Algorithm::sha224:
            return 28;
        case Algorithm::sha256:
            return 32;
        case Algorithm::sha384:
            return 48;
        case Algorithm::sha512:
            break;
    }
    return 64;
}

PageDigest::PageDigest(Algorithm algorithm) : state_(std::make_unique<State>()) {
    // Fetched once: an implicit fetch would search by name for every piece.
    state_->algorithm.reset(EVP_MD_fetch(nullptr, nameOf(algorithm), nullptr));
    state_->context.reset(EVP_MD_CTX_new());
    if (!state_->algorithm || !state_->context ||
        EVP_DigestInit_ex2(state_->context.get(), state_->algorithm.get(), nullptr) != 1)
        throw std::bad_alloc();
    state_->isFresh = true;
}

PageDigest::~PageDigest() = default;
PageDigest::PageDigest(PageDigest&&) noexcept = default;
PageDigest& PageDigest::operator=(PageDigest&&) noexcept = default;

void PageDigest::begin() {
    if (!state_->isFresh && EVP_DigestInit_ex2(state_->context.get(), nullptr, nullptr) != 1)
        throw std::bad_alloc();
    state_->isFresh = false;
}

void PageDigest::update(ByteView bytes) {
    if (EVP_DigestUpdate(state_->context.get(), bytes.data(), bytes.size()) != 1) throw std::bad_alloc();
}

ByteView PageDigest::finish() {
    unsigned length = 0;
    if (EVP_DigestFinal_ex(state_->context.get(), state_->value.data(), &length) != 1) throw std::bad_alloc();
    return std::as_bytes(std::span(state_->value)).first(length);
}

ByteView PageDigest::of(ByteView bytes) {
    begin();
    update(bytes);
    return finish();
}

PageDigest& threadDigest(Algorithm algorithm) {
    thread_local std::map<Algorithm, PageDigest> digests;
    const auto found = digests.find(algorithm);
    return found != digests.end() ? found->second
                                  : digests.emplace(algorithm, PageDigest(algorithm)).first->second;
}

std::span<std::byte> threadBuffer() {
    thread_local const auto buffer = std::make_unique_for_overwrite<std::byte[]>(kBufferSize);
    return {buffer.get(), kBufferSize};
}

ByteView digestOf(Algorithm algorithm, const codesign::ByteSource& source, const codesign::FileRange& range) {
    PageDigest& digest = threadDigest(algorithm);
    digest.begin();
    for (std::uint64_t done = 0; done < range.length;) {
        const auto length =
            static_cast<std::size_t>(std::min<std::uint64_t>(kBufferSize, range.length - done));
        const std::span<std::byte> buffer = threadBuffer().first(length);
        source.read(range.offset + done, buffer);
        digest.update(buffer);
        done += length;
    }
    return digest.finish();
}

bool isZero(const codesign::ByteSource& source, const codesign::FileRange& range) {
    for (std::uint64_t done = 0; done < range.length;) {
        const auto length =
            static_cast<std::size_t>(std::min<std::uint64_t>(kBufferSize, range.length - done));
        const std::span<std::byte> buffer = threadBuffer().first(length);
        source.read(range.offset + done, buffer);
        if (std::any_of(buffer.begin(), buffer.end(), [](std::byte byte) { return byte != std::byte{0}; }))
            return false;
        done += length;
    }
    return true;
}

}  // namespace pinwell::verify
