// Clients with a certificate: the conditions for acceptance, and their names.
//
// A client's certificate chains to one of the authorities in a PEM file, is valid now, names the purpose
// clientAuth (RFC 5280, 4.2.1.12), and has one common name: 1 to 64 bytes of UTF-8 without control
// characters. Bounds hold before a signature is checked: 8 certificates, each of at most 16 KiB and without
// indefinite lengths; RSA keys of 2048 to 8192 bits, EC keys on P-256, P-384 and P-521, Ed25519 and Ed448.
// Revocation lists are not read: access.toml takes rights away.
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

/// Whether a common name is a valid name of a client.
bool canNameAClient(std::string_view name);

struct Client {
    std::string name;  // common name
    foundation::Date validUntil;
};

/// Makes the context require from each client a certificate of one of the authorities in the file. Sessions
/// are not resumed: each connection is judged again. Throws Failure: EX_NOINPUT if the file cannot be read,
/// EX_CONFIG if it has no certificate, or one that is not an authority's.
void askForClients(ssl_ctx_st* context, const std::string& authoritiesFile);

/// The client of a connection after its handshake; `nullopt` if the client has sent no
/// certificate.
std::optional<Client> clientOf(ssl_st* connection);

}  // namespace pinwell::lumora
