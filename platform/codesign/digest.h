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

/// The type with this number; nothing when it is not one of ours.
std::optional<DigestType> digestTypeNumbered(std::uint8_t number);

/// Bytes that a digest of this type takes in a code directory.
std::size_t digestSize(DigestType type);

/// Bytes of the cdhash of a code directory of this type; the same table stands in the ticket payload.
std::size_t codeHashSize(DigestType type);

/// Where a type stands when the strongest code directory is chosen; the higher one wins.
int digestStrength(DigestType type);

/// A digest over bytes that come piece by piece.
class Hasher {
  public:
    explicit Hasher(DigestType type);
    ~Hasher();
    Hasher(const Hasher&) = delete;
    Hasher& operator=(const Hasher&) = delete;

    void update(ByteView bytes);

    /// digestSize() bytes; the hasher is used up.
    Data finish();

  private:
    struct State;
    std::unique_ptr<State> state_;
};

/// digestSize() bytes.
Data digest(DigestType type, ByteView bytes);

}  // namespace pinwell::codesign
