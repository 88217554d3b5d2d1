#include "xar/header.h"

#include <algorithm>
#include <string>

#include "foundation/byte_reader.h"

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

}  // namespace pinwell::xar
