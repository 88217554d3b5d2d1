// Chooses the format of a report, and writes it as text.
#include "render.h"

#include "base/text.h"
#include "values/format.h"

namespace pinwell::gate {

using base::escapeForTerminal;
using verify::Check;
using verify::Outcome;

namespace {

std::string describe(const Check& check) {
    std::string line = "  " + check.name;
    if (!check.place.empty()) line += ": " + escapeForTerminal(check.place);
    line += "\n";
    if (check.outcome == Outcome::noted) return line + "    noted: " + escapeForTerminal(check.found) + "\n";
    if (!check.expected.empty()) line += "    expected: " + escapeForTerminal(check.expected) + "\n";
    return line + "    found: " + escapeForTerminal(check.found) + "\n";
}

}  // namespace

std::string renderText(const std::vector<Result>& results) {
    std::string text;
    for (const Result& result : results) {
        text += escapeForTerminal(result.path) + ": " + std::string(verdictName(result.verdict)) + ". " +
                escapeForTerminal(result.conclusion) + "\n";
        for (const Check& check : verify::flattened(result.checks))
            if (check.outcome != Outcome::passed && check.outcome != Outcome::skipped)
                text += describe(check);
    }
    return text;
}

std::string render(Format kind, const std::vector<Result>& results) {
    switch (kind) {
        case Format::text:
            return renderText(results);
        case Format::json:
            return renderJson(results);
        case Format::sarif:
            return renderSarif(results);
        case Format::junit:
            return renderJUnit(results);
        case Format::html:
            break;
    }
    return renderHtml(results);
}

}  // namespace pinwell::gate
