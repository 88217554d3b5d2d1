// What connections to a database need beside the network, by its URL and by the environment variables of
// libpq.
#pragma once

#include <string>
#include <vector>

namespace pinwell::lumora {

struct PostgresNeeds {
    bool tcp = false;                // some host is not a socket in the file system
    std::vector<std::string> files;  // passwords, certificates, keys; not all of them need to exist
};

/// Throws Failure (EX_CONFIG) if the URL cannot be read; `named` says where it is from.
PostgresNeeds postgresNeeds(const std::string& url, const std::string& named);

/// Who connects if the URL does not say so: $PGUSER, or the caller's login name. Empty if that is not known.
std::string defaultPostgresUser();

}  // namespace pinwell::lumora
