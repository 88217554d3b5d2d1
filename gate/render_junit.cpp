#include "foundation/format.h"
#include "foundation/markup.h"
#include "gate/render.h"

namespace pinwell::gate {

namespace {

using verify::Check;
using verify::Outcome;

struct Counts {
    std::size_t tests = 0;
    std::size_t failures = 0;
    std::size_t errors = 0;
    std::size_t skipped = 0;
};

Counts countsOf(const std::vector<Check>& checks) {
    Counts counts{.tests = checks.size()};
    for (const Check& check : checks) {
        counts.failures += check.outcome == Outcome::failed ? 1 : 0;
        counts.errors += check.outcome == Outcome::unreadable ? 1 : 0;
        counts.skipped += check.outcome == Outcome::skipped ? 1 : 0;
    }
    return counts;
}

std::string attributesOf(const Counts& counts) {
    return foundation::format(" tests=\"%zu\" failures=\"%zu\" errors=\"%zu\" skipped=\"%zu\"", counts.tests,
                              counts.failures, counts.errors, counts.skipped);
}

std::string bodyOf(const Check& check) {
    const std::string found = foundation::markupText(check.found);
    const std::string both = "expected: " + foundation::markupText(check.expected) + "\nfound: " + found;
    switch (check.outcome) {
        case Outcome::passed:
            return {};
        case Outcome::skipped:
            return "<skipped message=\"" + found + "\"/>";
        case Outcome::noted:
            return "<system-out>" + found + "</system-out>";
        case Outcome::unreadable:
            return "<error message=\"" + found + "\">" + both + "</error>";
        case Outcome::failed:
            break;
    }
    return "<failure message=\"" + found + "\">" + both + "</failure>";
}

std::string caseOf(const Result& result, const Check& check) {
    const std::string name = check.place.empty() ? check.name : check.name + ": " + check.place;
    std::string line = "    <testcase classname=\"" + foundation::markupText(result.path) + "\" name=\"" +
                       foundation::markupText(name) + "\"";
    const std::string body = bodyOf(check);
    return line + (body.empty() ? "/>\n" : ">" + body + "</testcase>\n");
}

}  // namespace

std::string renderJUnit(const std::vector<Result>& results) {
    Counts all;
    std::string suites;
    for (const Result& result : results) {
        const std::vector<Check> checks = verify::flattened(result.checks);
        const Counts counts = countsOf(checks);
        all = {all.tests + counts.tests, all.failures + counts.failures, all.errors + counts.errors,
               all.skipped + counts.skipped};
        suites += "  <testsuite name=\"" + foundation::markupText(result.path) + "\"" + attributesOf(counts) +
                  ">\n";
        for (const Check& check : checks) suites += caseOf(result, check);
        suites += "    <system-out>" + foundation::markupText(verdictName(result.verdict)) + ": " +
                  foundation::markupText(result.conclusion) + "</system-out>\n  </testsuite>\n";
    }
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuites name=\"pinwell-gate\"" +
           attributesOf(all) + ">\n" + suites + "</testsuites>\n";
}

}  // namespace pinwell::gate
