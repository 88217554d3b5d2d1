#include <nlohmann/json.hpp>
#include <set>

#include "gate/render.h"
#include "gate/uri.h"

namespace pinwell::gate {

namespace {

using OrderedJson = nlohmann::ordered_json;
using verify::Check;
using verify::Outcome;

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

}  // namespace

std::string renderSarif(const std::vector<Result>& results) {
    OrderedJson found = OrderedJson::array();
    std::set<std::string> names;
    int status = 0;
    Verdict worst = Verdict::good;
    for (const Result& result : results) {
        if (result.verdict > worst) {
            worst = result.verdict;
            status = exitStatusOf(worst);
        }
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
        {"invocations", OrderedJson::array({{{"executionSuccessful", true}, {"exitCode", status}}})},
        {"columnKind", "utf16CodeUnits"},
        {"results", std::move(found)}};
    const OrderedJson document{{"version", "2.1.0"}, {"runs", OrderedJson::array({run})}};
    return document.dump(2, ' ', false, OrderedJson::error_handler_t::replace) + "\n";
}

}  // namespace pinwell::gate
