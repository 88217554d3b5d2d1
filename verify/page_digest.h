// Digests of many short pieces, with one context for all of them.
#pragma once

#include <array>
#include <cstddef>
#include <memory>
#include <string_view>

#include "codesign/byte_source.h"
#include "codesign/digest.h"
#include "codesign/executable_image.h"
#include "foundation/bytes.h"

namespace pinwell::verify {

using foundation::ByteView;
using foundation::Data;

/// Every digest that an artefact may state.
enum class Algorithm { md5, sha1, sha224, sha256, sha384, sha512 };

Algorithm algorithmOf(codesign::DigestType type);
std::size_t digestLength(Algorithm algorithm);

/// For one thread at a time. Throws std::bad_alloc if the algorithm is not available (no memory, or local
/// policy).
class PageDigest {
  public:
    explicit PageDigest(Algorithm algorithm);
    ~PageDigest();
    PageDigest(PageDigest&&) noexcept;
    PageDigest& operator=(PageDigest&&) noexcept;

    /// The digest of one piece. The result is valid until the next call.
    ByteView of(ByteView bytes);

    // For a piece in several parts.
    void begin();
    void update(ByteView bytes);
    ByteView finish();

  private:
    struct State;
    std::unique_ptr<State> state_;
};

/// The thread's own digest, kept until the thread ends: making one costs as much as hashing a page.
PageDigest& threadDigest(Algorithm algorithm);

/// The thread's own buffer of `kBufferSize` bytes. A function that uses it must not call another that does.
inline constexpr std::size_t kBufferSize = std::size_t{512} * 1024;
std::span<std::byte> threadBuffer();

/// The digest of a range of a source, with the thread's digest and buffer; valid until that digest is used
/// again. Throws codesign::CodeError.
ByteView digestOf(Algorithm algorithm, const codesign::ByteSource& source, const codesign::FileRange& range);

/// Whether a range of a source is all zero. Uses the thread's buffer. Throws codesign::CodeError.
bool isZero(const codesign::ByteSource& source, const codesign::FileRange& range);

}  // namespace pinwell::verify
