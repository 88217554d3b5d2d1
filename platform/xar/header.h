// The fixed part of an archive, and the digests that it can name.
//
// | Offset    | Size | Field                                                     |
// |-----------|------|-----------------------------------------------------------|
// | 0         | 4    | "xar!"                                                    |
// | 4         | 2    | size of the header, at least 28; more bytes are skipped   |
// | 6         | 2    | version, ignored                                          |
// | 8         | 8    | compressed length of the table of contents                |
// | 16        | 8    | its uncompressed length, ignored                          |
// | 24        | 4    | checksum algorithm: 0 none, 1 SHA-1, 2 MD5, 3 by name     |
// | 28        |      | the algorithm's name, zero-padded, if the number is 3     |
// | size      |      | the table of contents, a zlib stream                      |
// | after it  |      | the heap; the table's offsets count from its start        |
//
// Big-endian. A header with a name is at least 32 bytes and a multiple of 4. In headers of exactly 28 bytes,
// which have no name, 3 means SHA-256 and 4 means SHA-512.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::xar {

enum class DigestAlgorithm { none, md5, sha1, sha224, sha256, sha384, sha512 };

/// The algorithm by its name in lower case, also "none". Returns `nullopt` for any other spelling: otherwise
/// readers that compare case would differ from readers that do not.
std::optional<DigestAlgorithm> digestAlgorithmNamed(std::string_view name);

/// In bytes; 0 for none.
std::size_t digestSize(DigestAlgorithm algorithm);

/// A digest over several pieces of bytes.
class Digest {
  public:
    /// Throws std::bad_alloc if the algorithm is not available (no memory, or local policy).
    explicit Digest(DigestAlgorithm algorithm);
    ~Digest();
    Digest(const Digest&) = delete;
    Digest& operator=(const Digest&) = delete;

    void update(foundation::ByteView bytes);

    /// Call it once, and last. Empty for `none`.
    foundation::Data finish();

  private:
    struct Context;
    std::unique_ptr<Context> context_;  // null for none
};

/// The length of the fields that every header has.
inline constexpr std::size_t kFixedHeaderSize = 28;

/// Longest part of a header that is read: the fixed fields and a name.
inline constexpr std::size_t kLongestHeaderRead = kFixedHeaderSize + 64;

struct Header {
    std::uint16_t size = 0;
    std::uint64_t compressedLength = 0;
    DigestAlgorithm algorithm = DigestAlgorithm::none;
};

/// The header at the start of `bytes`, which are at most the file's first kLongestHeaderRead bytes. Returns
/// `nullopt` if there is none.
std::optional<Header> parseHeader(foundation::ByteView bytes);

}  // namespace pinwell::xar
