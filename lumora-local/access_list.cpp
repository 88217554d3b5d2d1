#include "access_list.h"

// The parser is compiled in: Debian's shared library reports errors only by exceptions.
#define TOML_HEADER_ONLY 1
#define TOML_EXCEPTIONS 0
#include <toml++/toml.h>

#include "base/bytes.h"
#include "base/file_io.h"
#include "failure.h"
#include "values/format.h"
#include "values/toml_keys.h"

namespace pinwell::lumora {
namespace {

using values::format;
using Clients = std::map<std::string, Rights, std::less<>>;

constexpr std::size_t kMaximumFileSize = std::size_t{1024} * 1024;
constexpr std::size_t kMaximumClients = 10'000;
constexpr std::size_t kMaximumNameLength = 64;  // RFC 5280, appendix A: ub-common-name
constexpr unsigned kMaximumKeyParts = 4;

std::string describe(const toml::parse_error& error) {
    // The parser garbles a quoted key, as clients' names are, that is there twice.
    if (error.description().find("cannot redefine") != std::string_view::npos)
        return "a client is there twice";
    return std::string(error.description());
}

class AccessReader {
  public:
    explicit AccessReader(const std::string& path) : path_(path) {}

    Clients read(const toml::table& document) {
        for (const auto& [key, value] : document) {
            const toml::table* clients = value.as_table();
            if (key.str() != "clients")
                refuse(key.source(), format("unknown key \"%@\"; there is [clients]", key.str()));
            if (clients == nullptr) refuse(value.source(), "clients is no table");
            for (const auto& [name, rights] : *clients) add(name, rights);
        }
        return std::move(clients_);
    }

    [[noreturn]] void refuse(const toml::source_region& where, const std::string& what) const {
        throw Failure(EX_CONFIG, format("%@:%u: %@", path_, where.begin.line, what));
    }

  private:
    void add(const toml::key& name, const toml::node& value) {
        if (name.str().empty() || name.str().size() > kMaximumNameLength)
            refuse(name.source(), "a client's name has 1 to 64 bytes, as a common name has");
        if (clients_.size() == kMaximumClients)
            refuse(name.source(), format("more than %zu clients", kMaximumClients));
        const toml::array* roles = value.as_array();
        if (roles == nullptr) {
            refuse(value.source(),
                   format("\"%@\" needs a list of roles, such as [\"issue\", \"read\"]; a name with "
                          "dots is in quotes",
                          name.str()));
        }
        Rights rights;
        for (const toml::node& role : *roles) take(rights, role);
        if (!rights.any()) refuse(value.source(), format("\"%@\" has no role", name.str()));
        clients_.emplace(name.str(), rights);
    }

    void take(Rights& rights, const toml::node& node) const {
        const auto role = node.value_exact<std::string>();
        if (role == "issue") {
            rights.issue = true;
        } else if (role == "revoke") {
            rights.revoke = true;
        } else if (role == "read") {
            rights.read = true;
        } else {
            refuse(node.source(), "a role is \"issue\", \"revoke\" or \"read\"");
        }
    }

    const std::string& path_;
    Clients clients_;
};

}  // namespace

Clients readAccessFile(const std::string& path) {
    const base::Result<base::Data> document = base::readSmallFile(path, kMaximumFileSize);
    if (!document) {
        throw Failure(EX_CONFIG, format("%@: %@", path, base::whyUnreadable(document.error())));
    }
    AccessReader reader(path);
    const std::string text = base::toString(*document);
    if (const auto line = values::lineOfLongTomlKey(text, kMaximumKeyParts)) {
        throw Failure(EX_CONFIG, format("%@:%u: a key of more than %u parts", path, *line, kMaximumKeyParts));
    }
    const toml::parse_result parsed = toml::parse(std::string_view(text), path);
    if (!parsed) reader.refuse(parsed.error().source(), describe(parsed.error()));
    return reader.read(parsed.table());
}

AccessList::AccessList(std::string path)
    : path_(std::move(path)), clients_(std::make_shared<const Clients>(readAccessFile(path_))) {}

Rights AccessList::of(std::string_view client) const {
    const std::shared_ptr<const Clients> clients = [this] {
        const std::lock_guard lock(mutex_);
        return clients_;
    }();
    const auto found = clients->find(client);
    return found == clients->end() ? Rights{} : found->second;
}

void AccessList::reload() {
    auto fresh = std::make_shared<const Clients>(readAccessFile(path_));
    const std::lock_guard lock(mutex_);
    clients_ = std::move(fresh);
}

}  // namespace pinwell::lumora
