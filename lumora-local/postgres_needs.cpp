#include "lumora-local/postgres_needs.h"

#include <libpq-fe.h>

#include <cstdlib>
#include <map>
#include <memory>

#include "foundation/format.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

struct Free {
    void operator()(PQconninfoOption* options) const { PQconninfoFree(options); }
    void operator()(char* text) const { PQfreemem(text); }
};
using Options = std::unique_ptr<PQconninfoOption, Free>;

void addTo(std::map<std::string, std::string>& values, const Options& options) {
    for (const PQconninfoOption* option = options.get(); option != nullptr && option->keyword != nullptr;
         ++option) {
        if (option->val != nullptr && option->val[0] != '\0') values.emplace(option->keyword, option->val);
    }
}

/// Whether a list with commas has a name or an address, not only directories of sockets.
bool namesAHost(const std::string& list) {
    for (std::size_t begin = 0; begin <= list.size();) {
        const std::size_t end = std::min(list.find(',', begin), list.size());
        if (end > begin && list[begin] != '/' && list[begin] != '@') return true;
        begin = end + 1;
    }
    return false;
}

}  // namespace

PostgresNeeds postgresNeeds(const std::string& url, const std::string& named) {
    char* error = nullptr;
    const Options given(PQconninfoParse(url.c_str(), &error));
    const std::unique_ptr<char, Free> text(error);
    if (given == nullptr) {
        // The library's text may repeat a part of the URL, with a password in it.
        throw Failure(EX_CONFIG, foundation::format("%@: the URL of the database cannot be read", named));
    }
    std::map<std::string, std::string> values;
    addTo(values, given);
    addTo(values, Options(PQconndefaults()));

    PostgresNeeds needs;
    needs.tcp = namesAHost(values["host"]) || namesAHost(values["hostaddr"]);
    if (values["sslrootcert"] == "system") {
        values.erase("sslrootcert");
        for (const char* path :
             {"/etc/ssl", "/usr/share/ca-certificates", "/usr/local/share/ca-certificates"}) {
            needs.files.emplace_back(path);
        }
    }
    for (const char* key : {"passfile", "sslcert", "sslkey", "sslrootcert", "sslcrl", "sslcrldir"}) {
        if (!values[key].empty()) needs.files.push_back(values[key]);
    }
    if (const char* home = std::getenv("HOME"); home != nullptr && *home != '\0') {
        needs.files.push_back(std::string(home) + "/.pgpass");
        needs.files.push_back(std::string(home) + "/.postgresql");
    }
    return needs;
}

std::string defaultPostgresUser() {
    std::map<std::string, std::string> values;
    addTo(values, Options(PQconndefaults()));
    return values["user"];
}

}  // namespace pinwell::lumora
