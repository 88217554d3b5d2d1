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

}  // namespace pinwell::lumora
