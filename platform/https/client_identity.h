// Who a session says it is: a certificate and its private key, for servers that ask for one in the handshake.
#pragma once

#include <memory>
#include <string>

#include "foundation/error.h"

namespace pinwell::https {

/// Longest files that are read. Real ones have a few KiB.
inline constexpr std::size_t kMaximumIdentityCertificates = std::size_t{256} * 1024;
inline constexpr std::size_t kMaximumIdentityKey = std::size_t{64} * 1024;

/// Immutable, shared. The key's memory is wiped when the last reference goes, if OpenSSL wipes what it frees
/// (trust/openssl_memory.h).
class ClientIdentity {
  public:
    /// Reads two PEM files: the certificate, which may be followed by those of its issuers, and its private
    /// key, which is not encrypted. The error names the file and says what is wrong with it in one sentence.
    static foundation::Result<std::shared_ptr<const ClientIdentity>> read(const std::string& certificatePath,
                                                                          const std::string& keyPath);

    ClientIdentity();
    ~ClientIdentity();
    ClientIdentity(const ClientIdentity&) = delete;
    ClientIdentity& operator=(const ClientIdentity&) = delete;

    /// Has the TLS context (an SSL_CTX) show it to a server that asks. A server is judged before it is shown
    /// anything. Returns false if the TLS library does not take it: a key that is too weak, for one.
    bool install(void* context) const noexcept;

  private:
    struct Parts;
    std::unique_ptr<Parts> parts_;
};

}  // namespace pinwell::https
