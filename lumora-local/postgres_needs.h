// The needs of connections to a database beside the network, by its URL and by the environment variables of
// libpq.
#pragma once

#include <string>
#include <vector>

namespace pinwell::lumora {

struct PostgresNeeds {
    bool tcp = false;                // some host is not a socket in the file system
    std::vector<std::string> files;  // passwords, certificates, keys; not all of them need to exist
};

/// Throws Failure (EX_CONFIG) if the URL cannot be parsed; `named` is its source.
PostgresNeeds postgresNeeds(const std::string& url, const std::string& named);

/// The user if the URL names none: $PGUSER, or the caller's login name. Empty if unknown.
std::string defaultPostgresUser();

}  // namespace pinwell::lumora
