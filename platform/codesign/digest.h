// The digests of code directories.
//
// | Type | Digest           | Size in a code directory | Size of the cdhash |
// |------|------------------|--------------------------|--------------------|
// | 1    | SHA-1            | 20                       | 20                 |
// | 2    | SHA-256          | 32                       | 20                 |
// | 3    | SHA-256, cut     | 20                       | 20                 |
// | 4    | SHA-384          | 48                       | 48                 |
#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "codesign/code_signing.h"
#include "foundation/bytes.h"

namespace pinwell::codesign {

using foundation::ByteView;

/// The type with this number; `nullopt` for an unknown number.
std::optional<DigestType> digestTypeNumbered(std::uint8_t number);

/// Bytes that a digest of this type takes in a code directory.
std::size_t digestSize(DigestType type);

/// Bytes of the cdhash of a code directory of this type; the ticket payload uses the same sizes.
std::size_t codeHashSize(DigestType type);

/// The rank of a type for choosing the strongest code directory; the highest wins.
int digestStrength(DigestType type);

/// A digest over several pieces of bytes.
class Hasher {
  public:
    explicit Hasher(DigestType type);
    ~Hasher();
    Hasher(const Hasher&) = delete;
    Hasher& operator=(const Hasher&) = delete;

    void update(ByteView bytes);

    /// Returns digestSize() bytes; do not use the hasher afterwards.
    Data finish();

  private:
    struct State;
    std::unique_ptr<State> state_;
};

/// digestSize() bytes.
Data digest(DigestType type, ByteView bytes);

}  // namespace pinwell::codesign
