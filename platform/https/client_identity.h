// The identity of a session: a certificate and its private key, for servers that ask for one in the
// handshake.
#pragma once

#include <memory>
#include <string>

#include "foundation/error.h"

namespace pinwell::https {

/// Longest files that are read. Real files have a few KiB.
inline constexpr std::size_t kMaximumIdentityCertificates = std::size_t{256} * 1024;
inline constexpr std::size_t kMaximumIdentityKey = std::size_t{64} * 1024;

/// Immutable, shared. The key's memory is wiped with the last reference, if OpenSSL wipes freed memory
/// (crypto/crypto.h).
class ClientIdentity {
  public:
    /// Reads two PEM files: the certificate, optionally followed by its issuers', and its unencrypted private
    /// key. The error names the file and its fault in one sentence.
    static foundation::Result<std::shared_ptr<const ClientIdentity>> read(const std::string& certificatePath,
                                                                          const std::string& keyPath);

    ClientIdentity();
    ~ClientIdentity();
    ClientIdentity(const ClientIdentity&) = delete;
    ClientIdentity& operator=(const ClientIdentity&) = delete;

    /// Makes the TLS context (an SSL_CTX) send it to a server that asks. A server is judged before it gets
    /// anything. Returns false if the TLS library refuses it, for example because the key is too weak.
    bool install(void* context) const noexcept;

  private:
    struct Parts;
    std::unique_ptr<Parts> parts_;
};

}  // namespace pinwell::https
