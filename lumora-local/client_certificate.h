// Clients that show a certificate: which ones are accepted, and who they are.
//
// A client's certificate chains to one of the authorities in a PEM file, is valid now, names the purpose
// clientAuth (RFC 5280, 4.2.1.12), and has one common name: 1 to 64 bytes of UTF-8 without control
// characters. What a client sends is held to bounds before a signature in it is checked: 8 certificates, each
// of at most 16 KiB and without indefinite lengths; RSA keys of 2048 to 8192 bits, EC keys on P-256, P-384
// and P-521, Ed25519 and Ed448. Revocation lists are not asked: a client loses its rights in access.toml.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "foundation/date.h"

struct ssl_st;
struct ssl_ctx_st;

namespace pinwell::lumora {

/// RFC 5280, appendix A: ub-common-name.
inline constexpr std::size_t kMaximumClientName = 64;

/// Whether a common name can be a client's.
bool canNameAClient(std::string_view name);

struct Client {
    std::string name;  // common name
    foundation::Date validUntil;
};

/// Makes the context ask each client for a certificate of one of the authorities in the file. Sessions are
/// not resumed: each connection is judged anew. Throws Failure: EX_NOINPUT if the file cannot be read,
/// EX_CONFIG if it holds no certificate of an authority, or one that is none.
void askForClients(ssl_ctx_st* context, const std::string& authoritiesFile);

/// Who is on the other side of a connection whose handshake is done; `nullopt` if nobody has shown a
/// certificate.
std::optional<Client> clientOf(ssl_st* connection);

}  // namespace pinwell::lumora
