#include "xar/header.h"

#include <algorithm>
#include <array>
#include <string>

#include "base/byte_io.h"

namespace pinwell::xar {
namespace {

using base::ByteReader;
using base::ShortRead;

constexpr std::uint32_t kMagic = 0x78617221;  // "xar!"
constexpr std::size_t kSmallestNamingHeader = 32;
constexpr std::size_t kNamingHeaderUnit = 4;
constexpr std::uint32_t kNoAlgorithm = 0;

struct Name {
    std::string_view name;
    Digest digest;
};

constexpr std::array kNames{
    Name{"md5", Digest::md5},       Name{"sha1", Digest::sha1},     Name{"sha224", Digest::sha224},
    Name{"sha256", Digest::sha256}, Name{"sha384", Digest::sha384}, Name{"sha512", Digest::sha512},
};

std::optional<Digest> namedDigest(ByteReader& reader, std::size_t headerSize) {
    if (headerSize < kSmallestNamingHeader || headerSize % kNamingHeaderUnit != 0) return std::nullopt;
    const std::uint64_t room = std::min(headerSize, kLongestHeaderRead) - kFixedHeaderSize;
    std::string name = base::toString(reader.bytes(room, "checksum algorithm's name"));
    const std::size_t end = name.find('\0');
    if (end == std::string::npos) return std::nullopt;
    name.resize(end);
    return digestNamed(name);
}

std::optional<Digest> digestNumbered(std::uint32_t number, ByteReader& reader, std::size_t headerSize) {
    const bool hasRoomForName = headerSize > kFixedHeaderSize;
    switch (number) {
        case 1:
            return Digest::sha1;
        case 2:
            return Digest::md5;
        case 3:
            return hasRoomForName ? namedDigest(reader, headerSize) : std::optional(Digest::sha256);
        case 4:
            return hasRoomForName ? std::nullopt : std::optional(Digest::sha512);
        default:
            return std::nullopt;
    }
}

}  // namespace

std::optional<Header> parseHeader(base::ByteView bytes) try {
    ByteReader reader(bytes);
    if (reader.be32("magic") != kMagic) return std::nullopt;
    Header header;
    header.size = reader.be16("header size");
    if (header.size < kFixedHeaderSize) return std::nullopt;
    reader.skip(2, "version");
    header.compressedLength = reader.be64("compressed length of the table of contents");
    reader.skip(8, "uncompressed length of the table of contents");
    const std::uint32_t algorithm = reader.be32("checksum algorithm");
    if (algorithm == kNoAlgorithm) return header;
    header.digest = digestNumbered(algorithm, reader, header.size);
    return header.digest ? std::optional(header) : std::nullopt;
} catch (const ShortRead&) {
    return std::nullopt;
}

std::optional<Digest> digestNamed(std::string_view name) {
    const auto* const found =
        std::find_if(kNames.begin(), kNames.end(), [&](const Name& known) { return known.name == name; });
    return found == kNames.end() ? std::nullopt : std::optional(found->digest);
}

}  // namespace pinwell::xar
