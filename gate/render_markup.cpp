// The reports in markup: JUnit XML and HTML.
#include "base/text.h"
#include "render.h"
#include "values/format.h"

namespace pinwell::gate {

namespace {

using verify::Check;
using verify::Outcome;

constexpr std::string_view kStyle = R"(
:root { color-scheme: light dark; --good: #1a7f37; --bad: #b3261e; --mild: #8a6100; --line: #8884; }
@media (prefers-color-scheme: dark) { :root { --good: #4ac26b; --bad: #ff8a80; --mild: #e3b341; } }
body { font: 16px/1.5 system-ui, sans-serif; max-width: 72rem; margin: 2rem auto; padding: 0 1rem; }
h1 { font-size: 1.5rem; margin-bottom: .25rem; }
h2 { font-size: 1.1rem; margin: 0; overflow-wrap: anywhere; }
section { border: 1px solid var(--line); border-left: .4rem solid var(--bad); border-radius: .4rem;
  padding: .8rem 1rem; margin: 1rem 0; }
section.good { border-left-color: var(--good); }
section.unreachable, section.unreadable { border-left-color: var(--mild); }
.verdict { font-weight: 600; }
.good .verdict, td.passed { color: var(--good); }
.bad .verdict, td.failed { color: var(--bad); }
.unreachable .verdict, .unreadable .verdict, td.unreadable, td.noted { color: var(--mild); }
table { border-collapse: collapse; table-layout: fixed; width: 100%; margin-top: .6rem; font-size: .9rem; }
th:nth-child(1) { width: 6rem; } th:nth-child(2) { width: 10rem; }
th, td { text-align: left; vertical-align: top; padding: .3rem .6rem .3rem 0; border-top: 1px solid var(--line);
  overflow-wrap: anywhere; }
td.value { font-family: ui-monospace, monospace; font-size: .85em; }
summary { cursor: pointer; margin-top: .6rem; }
@media (max-width: 48rem) {
  thead { display: none; }
  table, tbody, tr, td { display: block; }
  tr { border-top: 1px solid var(--line); padding: .4rem 0; }
  td { border: 0; padding: 0; }
  td:nth-child(n+3):not(:empty)::before { font: .9rem system-ui, sans-serif; opacity: .7; }
  td:nth-child(3)::before { content: "Place: "; }
  td:nth-child(4)::before { content: "Expected: "; }
  td:nth-child(5)::before { content: "Found: "; }
  td:empty { display: none; }
}
@media print { details > * { display: revert; } }
)";

/// The page loads nothing and runs nothing, with any names in it.
constexpr std::string_view kHead =
    "<!DOCTYPE html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\">\n"
    "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">\n"
    "<meta http-equiv=\"Content-Security-Policy\" content=\"default-src 'none'; style-src "
    "'unsafe-inline'\">\n"
    "<title>pinwell-gate</title>\n<style>";

bool isWorthShowing(const Check& check) {
    return check.outcome != Outcome::passed && check.outcome != Outcome::skipped;
}

std::string tableOf(const std::vector<Check>& checks, bool worthShowing) {
    std::string rows;
    for (const Check& check : checks) {
        if (isWorthShowing(check) != worthShowing) continue;
        const std::string outcome(verify::outcomeName(check.outcome));
        rows += "<tr><td class=\"" + outcome + "\">" + outcome + "</td><td>" + base::markupText(check.name) +
                "</td><td>" + base::markupText(check.place) + "</td><td class=\"value\">" +
                base::markupText(check.expected) + "</td><td class=\"value\">" +
                base::markupText(check.found) + "</td></tr>\n";
    }
    if (rows.empty()) return {};
    return "<table>\n<thead><tr><th scope=\"col\">Outcome</th><th scope=\"col\">Check</th><th "
           "scope=\"col\">Place</th><th scope=\"col\">Expected</th><th "
           "scope=\"col\">Found</th></tr></thead>\n<tbody>\n" +
           rows + "</tbody>\n</table>\n";
}

std::string classOf(Verdict verdict) {
    switch (verdict) {
        case Verdict::good:
        case Verdict::unreachable:
        case Verdict::unreadable:
            return std::string(verdictName(verdict));
        case Verdict::noTicket:
        case Verdict::refused:
        case Verdict::altered:
        case Verdict::revoked:
            break;
    }
    return "bad";
}

std::string sectionOf(const Result& result) {
    const std::vector<Check> checks = verify::flattened(result.checks);
    std::string html = "<section class=\"" + classOf(result.verdict) + "\">\n<h2>" +
                       base::markupText(result.path) + "</h2>\n<div><span class=\"verdict\">" +
                       base::markupText(verdictName(result.verdict)) +
                       "</span>: " + base::markupText(result.conclusion) + "</div>\n" + tableOf(checks, true);
    const std::string rest = tableOf(checks, false);
    if (!rest.empty())
        html += "<details><summary>All that was as it should be</summary>\n" + rest + "</details>\n";
    return html + "</section>\n";
}

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
    return values::format(" tests=\"%zu\" failures=\"%zu\" errors=\"%zu\" skipped=\"%zu\"", counts.tests,
                          counts.failures, counts.errors, counts.skipped);
}

std::string bodyOf(const Check& check) {
    const std::string found = base::markupText(check.found);
    const std::string both = "expected: " + base::markupText(check.expected) + "\nfound: " + found;
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
    std::string line = "    <testcase classname=\"" + base::markupText(result.path) + "\" name=\"" +
                       base::markupText(name) + "\"";
    const std::string body = bodyOf(check);
    return line + (body.empty() ? "/>\n" : ">" + body + "</testcase>\n");
}

}  // namespace

std::string renderHtml(const std::vector<Result>& results) {
    std::size_t good = 0;
    std::string sections;
    for (const Result& result : results) {
        good += result.verdict == Verdict::good ? 1 : 0;
        sections += sectionOf(result);
    }
    const std::string summary = good == results.size()
                                    ? values::format("All %zu may be let in.", good)
                                    : values::format("%zu of %zu may be let in.", good, results.size());
    return std::string(kHead) + std::string(kStyle) + "</style>\n</head>\n<body>\n<h1>" + summary +
           "</h1>\n" + sections + "</body>\n</html>\n";
}

std::string renderJUnit(const std::vector<Result>& results) {
    Counts all;
    std::string suites;
    for (const Result& result : results) {
        const std::vector<Check> checks = verify::flattened(result.checks);
        const Counts counts = countsOf(checks);
        all = {all.tests + counts.tests, all.failures + counts.failures, all.errors + counts.errors,
               all.skipped + counts.skipped};
        suites +=
            "  <testsuite name=\"" + base::markupText(result.path) + "\"" + attributesOf(counts) + ">\n";
        for (const Check& check : checks) suites += caseOf(result, check);
        suites += "    <system-out>" + base::markupText(verdictName(result.verdict)) + ": " +
                  base::markupText(result.conclusion) + "</system-out>\n  </testsuite>\n";
    }
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuites name=\"pinwell-gate\"" +
           attributesOf(all) + ">\n" + suites + "</testsuites>\n";
}

}  // namespace pinwell::gate
