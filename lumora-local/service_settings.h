// service.json: the owner's settings of a service. Its JSON schema is docs/service/service.schema.json.
//
//   "hosts"           the names in the server's certificate; required
//   "passphraseFile"  a file whose first line opens encrypted key files, or "credential:NAME", the file NAME
//                     in $CREDENTIALS_DIRECTORY
//   "log"             "text", or "json": one object a line
//   "store"           "postgresql://...", if the records are not in records.sqlite
//   "role"            "lookup", for a service that changes no records
//   "signer"          the key that signs tickets: {"key": K, "chain": [SIGNER, INTERMEDIATE, ROOT]}. K is a
//                     file or a URI "pkcs11:..."; the others are certificates. "requested" is a key that
//                     waits for its certificate.
//   "admin"           {"listen": "ADDRESS:PORT", "clients": FILE}: the listener for clients with
//                     certificates, and the certificates of these clients' authorities
//   "server"          {"key": FILE, "certificate": FILE}, for TLS clients
//
// Files are relative to the folder of service.json. Without "signer" and "server" they have the names
// that `init` gives. An unknown key is refused: it may be mistyped.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "access_log.h"
#include "endpoint.h"
#include "values/value.h"

namespace pinwell::lumora {

/// The beginning of a URI that names a key in a token (RFC 7512).
inline constexpr std::string_view kTokenScheme = "pkcs11:";

bool isTokenKey(std::string_view key);

enum class Role {
    full,    ///< issues, revokes and answers lookups
    lookup,  ///< answers lookups
};

/// Throws Failure (EX_CONFIG) if `url` is not a URL of a database for records. `place` is its source, for the
/// message.
void requireStoreUrl(const std::string& url, const std::string& place);

struct SignerSettings {
    std::string key;  // a path or a pkcs11: URI; empty as long as no certificate exists
    std::vector<std::string>
        chain;              // paths: signer, intermediate, root; empty as long as no certificate exists
    std::string requested;  // as `key`; empty unless a certificate was requested
};

struct ServerSettings {
    std::string key;          // a path
    std::string certificate;  // a path; further certificates of the chain may follow in the file
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
ServiceSettings parseServiceSettings(const values::Value& document, const std::string& path);

}  // namespace pinwell::lumora
