// service.json: what a service's owner decides. docs/service/service.schema.json describes it for programs.
//
//   "hosts"           the names that the server's certificate speaks for; required
//   "passphraseFile"  a file whose first line opens encrypted key files, or "credential:NAME", the file NAME
//                     in $CREDENTIALS_DIRECTORY
//   "log"             "text", or "json": one object a line
//   "store"           "postgresql://...", if the records are not in records.sqlite
//   "role"            "lookup", for a service that changes no records
//   "signer"          whose signature tickets bear: {"key": K, "chain": [SIGNER, INTERMEDIATE, ROOT]}. K is a
//                     file or a URI "pkcs11:..."; the others are certificates. "requested" is a key that
//                     waits for its certificate.
//   "admin"           {"listen": "ADDRESS:PORT", "clients": FILE}: where clients with certificates issue and
//                     revoke, and the certificates of the authorities that they have theirs from
//   "server"          {"key": FILE, "certificate": FILE}, what TLS clients see
//
// Files are relative to the folder of service.json. Without "signer" and "server" they have the names that
// `init` gives. A key that is not known is refused: it may be a mistyped one.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "foundation/value.h"
#include "lumora-local/access_log.h"
#include "lumora-local/endpoint.h"

namespace pinwell::lumora {

/// How a URI begins that names a key in a token (RFC 7512).
inline constexpr std::string_view kTokenScheme = "pkcs11:";

bool isTokenKey(std::string_view key);

enum class Role {
    full,    ///< issues, revokes and answers lookups
    lookup,  ///< answers lookups
};

/// Throws Failure (EX_CONFIG) if `url` is not one of a database that can hold records. `place` is where it is
/// from, for the message.
void requireStoreUrl(const std::string& url, const std::string& place);

struct SignerSettings {
    std::string key;  // a path or a pkcs11: URI; empty as long as nothing is certified
    std::vector<std::string>
        chain;              // paths: signer, intermediate, root; empty as long as nothing is certified
    std::string requested;  // as `key`; empty unless a certificate was requested
};

struct ServerSettings {
    std::string key;          // a path
    std::string certificate;  // a path; the file may hold further certificates of the chain
};

struct AdminSettings {
    Endpoint listen;
    std::string clientAuthorities;  // a path
};

struct ServiceSettings {
    std::vector<std::string> hosts;       // canonical; never empty
    std::string passphraseFile;           // a path or "credential:NAME"; empty if there is none
    std::optional<std::string> storeUrl;  // of a database; `nullopt`: the records are in a file
    Role role = Role::full;
    LogForm log = LogForm::text;
    SignerSettings signer;
    ServerSettings server;
    std::optional<AdminSettings> admin;
};

/// Reads the document of the file at `path`; the paths in the result are absolute, or relative as `path` is.
/// Throws Failure (EX_CONFIG), which names the file and the key.
ServiceSettings parseServiceSettings(const foundation::Value& document, const std::string& path);

}  // namespace pinwell::lumora
