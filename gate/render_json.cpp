// The reports in JSON: our own document, SARIF, and the in-toto statement.
#include <algorithm>
#include <nlohmann/json.hpp>
#include <set>

#include "base/text.h"
#include "render.h"
#include "values/date.h"
#include "values/format.h"
#include "values/url.h"

namespace pinwell::gate {

namespace {

using OrderedJson = nlohmann::ordered_json;
using verify::Check;
using verify::Outcome;

/// File names need not be UTF-8.
std::string written(const OrderedJson& document) {
    return document.dump(2, ' ', false, OrderedJson::error_handler_t::replace) + "\n";
}

/// A path as a URI reference (RFC 3986): an absolute path as a file URL, a relative path unchanged, with
/// percent encoding where needed.
std::string uriOf(const std::string& path) {
    return (path.starts_with('/') ? "file://" : "") + values::percentEncoded(path, "/");
}

const char* levelOf(Outcome outcome) {
    switch (outcome) {
        case Outcome::failed:
        case Outcome::unreadable:
            return "error";
        case Outcome::passed:
        case Outcome::skipped:
        case Outcome::noted:
            break;
    }
    return "note";
}

/// Escapes a text for a message (SARIF 2.1.0, 3.11.5 and 3.11.6), so that file names are not read as
/// placeholders or links.
std::string literal(const std::string& text) {
    std::string escaped;
    for (const char c : text) {
        if (c == '{' || c == '}') escaped += c;
        if (c == '[' || c == ']' || c == '\\') escaped += '\\';
        escaped += c;
    }
    return escaped;
}

std::string messageOf(const Check& check) {
    std::string text = literal(check.place.empty() ? check.name : check.place);
    if (!check.expected.empty())
        text += ": expected " + literal(check.expected) + ", found " + literal(check.found);
    else
        text += ": " + literal(check.found);
    return text;
}

OrderedJson resultOf(const Result& result, const Check& check) {
    OrderedJson location{{"physicalLocation", {{"artifactLocation", {{"uri", uriOf(result.path)}}}}}};
    if (!check.place.empty())
        location["logicalLocations"] = OrderedJson::array({{{"fullyQualifiedName", check.place}}});
    return {{"ruleId", check.name},
            {"level", levelOf(check.outcome)},
            {"message", {{"text", messageOf(check)}}},
            {"locations", OrderedJson::array({std::move(location)})}};
}

/// 2026-11-20T19:55:00Z, from "2026-11-20 19:55:00 +0000".
std::string timestampOf(std::int64_t time) {
    constexpr std::size_t kDateLength = 10;
    constexpr std::size_t kLength = 19;
    std::string text = values::describe(values::Date{time});
    text.resize(kLength);
    text[kDateLength] = 'T';
    return text + "Z";
}

/// The field takes only URIs, so a path is made absolute with the working directory.
std::string absoluteUriOf(const std::string& path) {
    return uriOf(values::URL::fileURLWithPath(path).path());
}

/// The identity of the artefact: the digest of a file, and the hash in a ticket.
OrderedJson subjectOf(const Result& result) {
    OrderedJson digests = OrderedJson::object();
    if (!result.fileDigest.empty()) digests["sha256"] = base::toHex(result.fileDigest);
    if (!result.codeHash.empty()) digests["cdhash"] = base::toHex(result.codeHash);
    return {{"name", result.path}, {"digest", std::move(digests)}};
}

OrderedJson policyOf(const Policy& policy) {
    OrderedJson json = OrderedJson::object();
    if (policy.maximumTicketAge) json["max-ticket-age"] = values::format("%llds", *policy.maximumTicketAge);
    if (!policy.teams.empty()) json["require-team"] = policy.teams;
    if (!policy.identifiers.empty()) json["require-identifier"] = policy.identifiers;
    json["require-secure-timestamp"] = policy.requiresSecureTimestamp;
    return json;
}

const char* ticketsOf(Options::Tickets tickets) {
    switch (tickets) {
        case Options::Tickets::online:
            return "online";
        case Options::Tickets::offline:
            return "offline";
        case Options::Tickets::directory:
            break;
    }
    return "directory";
}

}  // namespace

std::string renderJson(const std::vector<Result>& results) {
    OrderedJson list = OrderedJson::array();
    for (const Result& result : results) {
        OrderedJson checks = OrderedJson::array();
        for (const Check& check : verify::flattened(result.checks))
            checks.push_back({{"name", check.name},
                              {"place", check.place},
                              {"outcome", verify::outcomeName(check.outcome)},
                              {"expected", check.expected},
                              {"found", check.found}});
        list.push_back({{"path", result.path},
                        {"verdict", verdictName(result.verdict)},
                        {"exitStatus", exitStatusOf(result.verdict)},
                        {"checks", std::move(checks)}});
    }
    const OrderedJson document{{"version", 1}, {"results", std::move(list)}};
    return written(document);
}

std::string renderSarif(const std::vector<Result>& results) {
    OrderedJson found = OrderedJson::array();
    std::set<std::string> names;
    for (const Result& result : results) {
        for (const Check& check : verify::flattened(result.checks)) {
            if (check.outcome == Outcome::passed || check.outcome == Outcome::skipped) continue;
            names.insert(check.name);
            found.push_back(resultOf(result, check));
        }
    }
    OrderedJson rules = OrderedJson::array();
    for (const std::string& name : names) rules.push_back({{"id", name}});
    const OrderedJson driver{{"name", "pinwell-gate"}, {"rules", std::move(rules)}};
    const OrderedJson run{
        {"tool", {{"driver", driver}}},
        {"invocations",
         OrderedJson::array({{{"executionSuccessful", true}, {"exitCode", exitStatusOf(results)}}})},
        {"columnKind", "utf16CodeUnits"},
        {"results", std::move(found)}};
    const OrderedJson document{{"version", "2.1.0"}, {"runs", OrderedJson::array({run})}};
    return written(document);
}

std::string renderAttestation(const std::vector<Result>& results, const Options& options, std::int64_t time) {
    OrderedJson subjects = OrderedJson::array();
    OrderedJson verdicts = OrderedJson::array();
    for (const Result& result : results) {
        verdicts.push_back({{"name", result.path}, {"verdict", verdictName(result.verdict)}});
        if (!result.codeHash.empty() || !result.fileDigest.empty()) subjects.push_back(subjectOf(result));
    }
    const bool isPassed =
        !results.empty() && std::all_of(results.begin(), results.end(),
                                        [](const Result& one) { return one.verdict == Verdict::good; });
    OrderedJson levels = OrderedJson::array();
    if (isPassed) levels.push_back(options.isShallow ? "PINWELL_TICKET" : "PINWELL_DEEP");
    const std::string resource =
        results.size() == 1 ? absoluteUriOf(results.front().path) : "urn:pinwell-gate:several";
    const OrderedJson predicate{{"verifier", {{"id", "https://pinwell.example/gate"}}},
                                {"timeVerified", timestampOf(time)},
                                {"resourceUri", resource},
                                {"policy", {{"uri", "urn:pinwell-gate:policy"}}},
                                {"inputAttestations", OrderedJson::array()},
                                {"verificationResult", isPassed ? "PASSED" : "FAILED"},
                                {"verifiedLevels", std::move(levels)},
                                {"slsaVersion", "1.0"},
                                // Our own member: readers of summaries skip unknown members.
                                {"pinwell",
                                 {{"tickets", ticketsOf(options.tickets)},
                                  {"policy", policyOf(options.policy)},
                                  {"results", std::move(verdicts)}}}};
    const OrderedJson statement{{"_type", "https://in-toto.io/Statement/v1"},
                                {"subject", std::move(subjects)},
                                {"predicateType", "https://slsa.dev/verification_summary/v1"},
                                {"predicate", predicate}};
    return written(statement);
}

}  // namespace pinwell::gate
