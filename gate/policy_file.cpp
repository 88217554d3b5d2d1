// Reads the policy file: its keys, and the lines of its faults.
//
// The parser is compiled in: Debian's shared library reports errors only by exceptions.
#define TOML_HEADER_ONLY 1
#define TOML_EXCEPTIONS 0
#include <toml++/toml.h>

#include <optional>

#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "foundation/format.h"
#include "foundation/toml_keys.h"
#include "gate/policy.h"

namespace pinwell::gate {

using foundation::format;

namespace {

/// Parts of a dotted key; our keys have only one.
constexpr unsigned kMaximumKeyParts = 4;

/// Nested tables have no meaning here.
class PolicyReader {
  public:
    explicit PolicyReader(const std::string& path) : path_(path) {}

    Policy read(const toml::table& table) {
        for (const auto& [key, value] : table) take(key, value);
        return std::move(policy_);
    }

    [[noreturn]] void refuse(const toml::source_region& where, const std::string& what) const {
        throw PolicyError(format("%@:%u: %@", path_, where.begin.line, what));
    }

  private:
    void take(const toml::key& key, const toml::node& value) {
        const std::string_view name = key.str();
        if (name == "max-ticket-age") {
            const auto text = value.value_exact<std::string>();
            policy_.maximumTicketAge = text ? ageFrom(*text) : std::nullopt;
            if (!policy_.maximumTicketAge)
                refuse(value.source(), "max-ticket-age must be an age in quotes, such as \"90d\" or \"12h\"");
        } else if (name == "require-team") {
            policy_.teams = texts(name, value);
        } else if (name == "require-identifier") {
            policy_.identifiers = texts(name, value);
        } else if (name == "require-secure-timestamp") {
            const auto flag = value.value_exact<bool>();
            if (!flag) refuse(value.source(), "require-secure-timestamp must be true or false");
            policy_.requiresSecureTimestamp = *flag;
        } else {
            refuse(key.source(), format("unknown key \"%@\"", name));
        }
    }

    std::vector<std::string> texts(std::string_view name, const toml::node& value) const {
        std::vector<std::string> all;
        const toml::array* const list = value.as_array();
        if (list == nullptr) {
            all.push_back(text(name, value));
        } else {
            for (const toml::node& one : *list) all.push_back(text(name, one));
        }
        // An empty list would look like a requirement, but require nothing.
        if (all.empty()) refuse(value.source(), format("%@ must not be empty", name));
        return all;
    }

    std::string text(std::string_view name, const toml::node& value) const {
        const auto found = value.value_exact<std::string>();
        if (!found || found->empty())
            refuse(value.source(), format("%@ must be a text, or a list of them", name));
        return *found;
    }

    const std::string& path_;
    Policy policy_;
};

}  // namespace

Policy readPolicyFile(const std::string& path) {
    const foundation::Result<foundation::Data> document = foundation::readSmallFile(path, kMaximumPolicyFile);
    if (!document) throw PolicyError(format("%@: %@", path, foundation::whyUnreadable(document.error())));
    PolicyReader reader(path);
    const std::string text = foundation::toString(*document);
    if (const auto line = foundation::lineOfLongTomlKey(text, kMaximumKeyParts))
        throw PolicyError(format("%@:%u: a key of more than %u parts", path, *line, kMaximumKeyParts));
    const toml::parse_result parsed = toml::parse(std::string_view(text), path);
    if (!parsed) reader.refuse(parsed.error().source(), std::string(parsed.error().description()));
    return reader.read(parsed.table());
}

}  // namespace pinwell::gate
