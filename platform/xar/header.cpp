#include "xar/header.h"

#include <openssl/evp.h>

#include <algorithm>
#include <array>
#include <new>
#include <string>

#include "foundation/byte_reader.h"
#include "foundation/handle.h"

namespace pinwell::xar {
namespace {

using foundation::ByteReader;
using foundation::ShortRead;

constexpr std::uint32_t kMagic = 0x78617221;  // "xar!"
constexpr std::size_t kSmallestNamingHeader = 32;
constexpr std::size_t kNamingHeaderUnit = 4;

std::optional<DigestAlgorithm> namedAlgorithm(ByteReader& reader, std::size_t headerSize) {
    if (headerSize < kSmallestNamingHeader || headerSize % kNamingHeaderUnit != 0) return std::nullopt;
    const std::uint64_t room = std::min(headerSize, kLongestHeaderRead) - kFixedHeaderSize;
    std::string name = foundation::toString(reader.bytes(room, "checksum algorithm's name"));
    const std::size_t end = name.find('\0');
    if (end == std::string::npos) return std::nullopt;
    name.resize(end);
    const auto algorithm = digestAlgorithmNamed(name);
    if (algorithm == DigestAlgorithm::none) return std::nullopt;
    return algorithm;
}

std::optional<DigestAlgorithm> numberedAlgorithm(std::uint32_t number, ByteReader& reader,
                                                 std::size_t headerSize) {
    const bool hasRoomForName = headerSize > kFixedHeaderSize;
    switch (number) {
        case 0:
            return DigestAlgorithm::none;
        case 1:
            return DigestAlgorithm::sha1;
        case 2:
            return DigestAlgorithm::md5;
        case 3:
            return hasRoomForName ? namedAlgorithm(reader, headerSize)
                                  : std::optional(DigestAlgorithm::sha256);
        case 4:
            return hasRoomForName ? std::nullopt : std::optional(DigestAlgorithm::sha512);
        default:
            return std::nullopt;
    }
}

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
    {DigestAlgorithm::sha512, "sha512", 64},
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

std::optional<Header> parseHeader(foundation::ByteView bytes) try {
    ByteReader reader(bytes);
    if (reader.be32("magic") != kMagic) return std::nullopt;
    Header header;
    header.size = reader.be16("header size");
    if (header.size < kFixedHeaderSize) return std::nullopt;
    reader.skip(2, "version");
    header.compressedLength = reader.be64("compressed length of the table of contents");
    reader.skip(8, "uncompressed length of the table of contents");
    const auto algorithm = numberedAlgorithm(reader.be32("checksum algorithm"), reader, header.size);
    if (!algorithm) return std::nullopt;
    header.algorithm = *algorithm;
    return header;
} catch (const ShortRead&) {
    return std::nullopt;
}

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
