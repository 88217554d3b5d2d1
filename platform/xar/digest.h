// The digests for the checksum of a table of contents. For this folder only.
#pragma once

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

/// No digest is longer.
inline constexpr std::size_t kLongestDigest = 64;

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

}  // namespace pinwell::xar
