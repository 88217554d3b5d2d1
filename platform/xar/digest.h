// The digests that a table of contents can be checked with. For this folder only.
#pragma once

#include <memory>
#include <optional>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::xar {

enum class DigestAlgorithm { none, md5, sha1, sha224, sha256, sha384, sha512 };

/// By its name in lower case, "none" included. Returns `nullopt` for any other spelling: who compares names
/// without regard to case, and who does not, would not read the same archives.
std::optional<DigestAlgorithm> digestAlgorithmNamed(std::string_view name);

/// In bytes; 0 for none.
std::size_t digestSize(DigestAlgorithm algorithm);

/// No digest is longer.
inline constexpr std::size_t kLongestDigest = 64;

/// A digest over bytes that come in pieces.
class Digest {
  public:
    /// Throws std::bad_alloc when the algorithm cannot be had here (for want of memory, or by local policy).
    explicit Digest(DigestAlgorithm algorithm);
    ~Digest();
    Digest(const Digest&) = delete;
    Digest& operator=(const Digest&) = delete;

    void update(foundation::ByteView bytes);

    /// Once, and last. Empty for none.
    foundation::Data finish();

  private:
    struct Context;
    std::unique_ptr<Context> context_;  // null for none
};

}  // namespace pinwell::xar
