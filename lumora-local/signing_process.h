// The process that uses a token, from the side of the process that makes tickets.
#pragma once

#include <chrono>
#include <functional>
#include <memory>

#include "foundation/bytes.h"
#include "lumora-local/signing_key.h"

namespace pinwell::lumora {

/// A key on P-256 in the child. One thread at a time.
class DigestSigner {
  public:
    virtual ~DigestSigner() = default;

    /// DER of SubjectPublicKeyInfo.
    virtual foundation::Data publicKey() const = 0;

    /// ECDSA over a digest of 32 bytes, in DER. Throws Failure (EX_IOERR).
    virtual foundation::Data signDigest(foundation::ByteView digest) const = 0;
};

/// The time limit of a signature. Opening a token may take its owner longer.
inline constexpr std::chrono::milliseconds kSigningPatience{30'000};

/// Starts a child, which calls `open` and signs until the result is destroyed. Throws an exception of `open`
/// if it is a Failure; its exit status and text come from the child.
///
/// sign() throws Failure (EX_IOERR) if the child has ended or does not respond in time. After that it sends
/// no more questions, and the destructor does not wait for the child.
std::unique_ptr<SigningKey> startSigningProcess(const std::function<std::unique_ptr<DigestSigner>()>& open,
                                                std::chrono::milliseconds patience = kSigningPatience);

}  // namespace pinwell::lumora
