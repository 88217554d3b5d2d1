// The parser of the policy file is compiled in: Debian's shared library reports errors only by exceptions.
#define TOML_HEADER_ONLY 1
#define TOML_EXCEPTIONS 0
#include "policy.h"

#include <toml++/toml.h>

#include <algorithm>
#include <charconv>
#include <functional>
#include <limits>

#include "base/bytes.h"
#include "base/file_io.h"
#include "values/date.h"
#include "values/format.h"
#include "values/toml_keys.h"
#include "verify/check.h"

namespace pinwell::gate {

using values::format;
using verify::CodeIdentity;

namespace {

constexpr std::int64_t kMaximumAge = std::int64_t{10'000} * 366 * 86'400;

/// Allowed difference between the clocks of signer and consumer, in seconds.
constexpr std::int64_t kClockTolerance = 86'400;

std::int64_t secondsIn(char unit) {
    switch (unit) {
        case 's':
            return 1;
        case 'm':
            return 60;
        case 'h':
            return 3600;
        case 'd':
            return 86'400;
        case 'w':
            return 7 * 86'400;
        default:
            return 0;
    }
}

std::string listed(const std::vector<std::string>& texts) {
    std::string all;
    for (const std::string& text : texts) all += (all.empty() ? "" : " or ") + text;
    return all;
}

std::string dateOf(std::int64_t seconds) {
    constexpr std::int64_t kEndOfYear9999 = 253'402'300'799;
    if (seconds < 0 || seconds > kEndOfYear9999) return format("%lld seconds after 1970", seconds);
    return values::describe(values::Date{seconds});
}

bool checkAge(std::int64_t most, const verify::JudgedTicket* ticket, std::int64_t now,
              verify::Section& section) {
    const std::string wanted = format("a ticket that was signed at %@ or later", dateOf(now - most));
    const char* const place = "ticket";
    if (ticket == nullptr) {
        section.fail(verify::kPolicyTicketAge, place, wanted, "no genuine ticket");
        return false;
    }
    const std::uint64_t stated = ticket->signatureTime();
    if (stated > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) {
        section.fail(verify::kPolicyTicketAge, place, wanted, "a time that is none");
        return false;
    }
    const auto time = static_cast<std::int64_t>(stated);
    const bool isYoung = time >= now - most && time <= now + kClockTolerance;
    section.add({std::string(verify::kPolicyTicketAge), place,
                 isYoung ? verify::Outcome::passed : verify::Outcome::failed, wanted,
                 "signed at " + dateOf(time)});
    return isYoung;
}

/// Checks a requirement on every slice of the artefact's own code.
bool checkOwnCode(std::string_view name, const std::string& wanted, const verify::VerifiedCode& code,
                  const std::function<std::optional<std::string>(const CodeIdentity&)>& fault,
                  verify::Section& section) {
    bool isSatisfied = true;
    std::size_t own = 0;
    for (const CodeIdentity& identity : code.identities) {
        if (identity.isNested) continue;
        ++own;
        const std::optional<std::string> found = fault(identity);
        if (found) section.fail(name, identity.place, wanted, *found);
        isSatisfied = isSatisfied && !found;
    }
    if (own == 0) {
        section.fail(name, {}, wanted, "no signature that says");
        return false;
    }
    if (isSatisfied) section.pass(name, {}, wanted);
    return isSatisfied;
}

base::Error malformed(const std::string& fault) {
    return {base::kDataErrorDomain, base::kMalformedDocument, fault};
}

/// Leaves the reader at the first fault.
struct PolicyFault {
    base::Error error;
};

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
        throw PolicyFault{malformed(format("%@:%u: %@", path_, where.begin.line, what))};
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

std::optional<std::int64_t> ageFrom(std::string_view text) {
    std::int64_t number = 0;
    const char* const end = text.data() + text.size();
    const auto result = std::from_chars(text.data(), end, number);
    if (result.ec != std::errc{} || result.ptr + 1 != end || number < 0) return std::nullopt;
    const std::int64_t unit = secondsIn(*result.ptr);
    if (unit == 0 || number > kMaximumAge / unit) return std::nullopt;
    return number * unit;
}

bool matchesGlob(std::string_view glob, std::string_view text) {
    std::size_t at = 0;
    std::size_t in = 0;
    std::size_t star = std::string_view::npos;  // the last one, and the end of its match
    std::size_t taken = 0;
    while (at < text.size()) {
        if (in < glob.size() && glob[in] == '*') {
            star = in++;
            taken = at;
        } else if (in < glob.size() && (glob[in] == '?' || glob[in] == text[at])) {
            ++in;
            ++at;
        } else if (star != std::string_view::npos) {
            in = star + 1;
            at = ++taken;
        } else {
            return false;
        }
    }
    return glob.find_first_not_of('*', in) == std::string_view::npos;
}

base::Result<Policy> readPolicyFile(const std::string& path) {
    const base::Result<base::Data> document = base::readSmallFile(path, kMaximumPolicyFile);
    if (!document) return malformed(format("%@: %@", path, base::whyUnreadable(document.error())));
    PolicyReader reader(path);
    const std::string text = base::toString(*document);
    if (const auto line = values::lineOfLongTomlKey(text, kMaximumKeyParts))
        return malformed(format("%@:%u: a key of more than %u parts", path, *line, kMaximumKeyParts));
    const toml::parse_result parsed = toml::parse(std::string_view(text), path);
    try {
        if (!parsed) reader.refuse(parsed.error().source(), std::string(parsed.error().description()));
        return reader.read(parsed.table());
    } catch (const PolicyFault& fault) {
        return fault.error;
    }
}

bool checkAgainst(const Policy& policy, const verify::JudgedTicket* deciding,
                  const verify::VerifiedCode& code, std::int64_t now, verify::Section& section) {
    bool isSatisfied = true;
    if (policy.maximumTicketAge)
        isSatisfied = checkAge(*policy.maximumTicketAge, deciding, now, section) && isSatisfied;
    if (!policy.teams.empty()) {
        const auto fault = [&](const CodeIdentity& identity) -> std::optional<std::string> {
            if (!identity.team) return "no team";
            const bool isOne =
                std::find(policy.teams.begin(), policy.teams.end(), *identity.team) != policy.teams.end();
            return isOne ? std::nullopt : identity.team;
        };
        isSatisfied =
            checkOwnCode(verify::kPolicyTeam, listed(policy.teams), code, fault, section) && isSatisfied;
    }
    if (!policy.identifiers.empty()) {
        const auto fault = [&](const CodeIdentity& identity) -> std::optional<std::string> {
            const bool matches =
                std::any_of(policy.identifiers.begin(), policy.identifiers.end(),
                            [&](const std::string& glob) { return matchesGlob(glob, identity.identifier); });
            if (matches) return std::nullopt;
            return identity.identifier.empty() ? "no identifier" : identity.identifier;
        };
        isSatisfied =
            checkOwnCode(verify::kPolicyIdentifier, listed(policy.identifiers), code, fault, section) &&
            isSatisfied;
    }
    if (policy.requiresSecureTimestamp) {
        const auto fault = [](const CodeIdentity& identity) -> std::optional<std::string> {
            return identity.hasSecureTimestamp ? std::nullopt : std::optional<std::string>("none");
        };
        isSatisfied =
            checkOwnCode(verify::kPolicyTimestamp, "a secure timestamp", code, fault, section) && isSatisfied;
    }
    return isSatisfied;
}

}  // namespace pinwell::gate
