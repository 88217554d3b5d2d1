// Digests of bytes, for every format and service; and the memory of the library that computes them.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>

#include "base/bytes.h"

namespace pinwell::crypto {

using base::ByteView;
using base::Data;

/// Every digest that an artefact may state (FIPS 180-4, RFC 1321).
enum class Digest { md5, sha1, sha224, sha256, sha384, sha512 };

/// In bytes.
std::size_t digestSize(Digest digest);

/// No digest is longer.
inline constexpr std::size_t kLongestDigest = 64;

/// Computes digests, one after another. For one thread at a time. Throws std::bad_alloc if the digest is not
/// available: without memory, or if a local policy forbids it. Neither is a property of the input.
class Hasher {
  public:
    explicit Hasher(Digest digest);
    ~Hasher();
    Hasher(Hasher&&) noexcept;
    Hasher& operator=(Hasher&&) noexcept;

    /// The digest of one piece. The result is valid until the next call.
    ByteView of(ByteView bytes);

    // For a digest of several parts: update() takes each part, and finish() returns the digest. begin()
    // starts the next one, and drops unfinished parts. A new hasher needs no begin().
    void begin();
    void update(ByteView bytes);

    /// The result is valid until the next call.
    ByteView finish();

  private:
    struct State;
    std::unique_ptr<State> state_;
};

/// The thread's own hasher, kept until the thread ends: making one costs as much as hashing 4 KiB. Throws
/// like Hasher.
Hasher& threadHasher(Digest digest);

/// The digest of the bytes. Throws like Hasher.
Data digestOf(Digest digest, ByteView bytes);

inline Data sha1(ByteView bytes) {
    return digestOf(Digest::sha1, bytes);
}
inline Data sha256(ByteView bytes) {
    return digestOf(Digest::sha256, bytes);
}

/// As digestOf(); `nullopt` if the digest is not available.
std::optional<Data> availableDigestOf(Digest digest, ByteView bytes);

/// Makes OpenSSL wipe all memory that it frees; by default it wipes only some copies of a key. For a process
/// that holds a private key. Call it before OpenSSL allocates, first in main; returns false if it is too
/// late.
bool wipeWhatOpenSSLFrees() noexcept;

}  // namespace pinwell::crypto
