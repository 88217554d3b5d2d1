#include "page.h"

#include <algorithm>
#include <array>
#include <utility>

#include "base/text.h"
#include "http_service.h"
#include "rfc3339.h"
#include "values/format.h"
#include "values/url.h"

namespace pinwell::lumora {
namespace {

using base::markupText;
using values::Date;
using values::format;

/// Values of a form, and their texts.
using Choices = std::array<std::pair<std::string_view, std::string_view>, 3>;
constexpr Choices kSearches{{{"label", "Label"}, {"name", "Name"}, {"hash", "Hash"}}};

/// Text of the store. Its direction of writing does not change the text around it.
std::string isolated(std::string_view text) {
    return "<bdi>" + markupText(text) + "</bdi>";
}

std::string codeOf(std::string_view text) {
    return "<span class=\"code\">" + markupText(text) + "</span>";
}

std::string documentOf(std::string_view title, const std::string& content, const std::string& client) {
    return "<!DOCTYPE html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\">\n"
           "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">\n<title>" +
           markupText(title) +
           " - Record service</title>\n<link rel=\"stylesheet\" href=\"/style.css\">\n</head>\n<body>\n"
           "<a class=\"skip\" href=\"#content\">Skip to the content</a>\n"
           "<header>\n<p><a href=\"/\">Record service</a></p>\n</header>\n"
           "<main id=\"content\" tabindex=\"-1\">\n" +
           content + "</main>\n<footer>\n<p>You are known as " + isolated(client) +
           " by your certificate. This page changes nothing.</p>\n</footer>\n</body>\n</html>\n";
}

std::string optionOf(std::string_view value, std::string_view shown, std::string_view chosen) {
    return format("<option value=\"%s\"%s>%s</option>", value, value == chosen ? " selected" : "", shown);
}

std::string formOf(const SearchForm& form, bool isAtFault = false) {
    std::string searches;
    for (const auto& [value, shown] : kSearches) searches += optionOf(value, shown, form.by);
    std::string environments;
    for (const Environment one : {Environment::production, Environment::development})
        environments += optionOf(toString(one), toString(one), toString(form.environment));
    return "<form role=\"search\" action=\"/records\" method=\"get\">\n"
           "<div><label for=\"text\">Search for</label><input id=\"text\" name=\"text\" type=\"search\" "
           "maxlength=\"255\" autocomplete=\"off\" spellcheck=\"false\" value=\"" +
           markupText(form.text) + "\"" +
           (isAtFault ? " aria-invalid=\"true\" aria-describedby=\"fault hint\""
                      : " aria-describedby=\"hint\"") +
           "></div>\n<div><label for=\"by\">Among</label><select id=\"by\" name=\"by\">" + searches +
           "</select></div>\n<div><label for=\"environment\">Environment</label><select id=\"environment\" "
           "name=\"environment\">" +
           environments +
           "</select></div>\n<button type=\"submit\">Search</button>\n"
           "<p id=\"hint\">Labels and names are found by how they begin, a ticket by every digit of a hash "
           "that it lists. Labels tell capitals from small letters.</p>\n</form>\n";
}

// On a narrow screen, the line breaks between date and time.
std::string timeOf(Date date) {
    const std::string exact = toRfc3339(date);
    const std::size_t middle = exact.find('T');
    if (middle == std::string::npos || !exact.ends_with('Z')) return markupText(exact);
    return format(
        "<time datetime=\"%s\"><span class=\"unit\">%s</span> <span class=\"unit\">%s UTC</span></time>",
        exact, exact.substr(0, middle), exact.substr(middle + 1, exact.size() - middle - 2));
}

std::string stateOf(const Record& record) {
    return record.revoked ? "<span class=\"state revoked\">Revoked</span>"
                          : "<span class=\"state valid\">Valid</span>";
}

std::string pagesOf(const Paging& paging, std::string_view label) {
    if (!paging.first && !paging.next) return {};
    std::string links;
    if (paging.first) links += "<a href=\"" + markupText(*paging.first) + "\">First page</a>\n";
    if (paging.next) links += "<a rel=\"next\" href=\"" + markupText(*paging.next) + "\">Next page</a>\n";
    return format("<nav class=\"pages\" aria-label=\"%s\">\n%s</nav>\n", label, links);
}

std::string labelOf(const Record& record) {
    return record.label.empty() ? record.name : record.label;
}

std::string rowOf(const Record& record, Environment environment) {
    return "<tr><th scope=\"row\"><a href=\"" + markupText(recordTarget(record.name, environment)) + "\">" +
           isolated(labelOf(record)) + "</a>" + codeOf(record.name) + "</th><td>" + stateOf(record) +
           "</td><td>" + timeOf(record.signedAt) + "</td></tr>\n";
}

std::string captionOf(const SearchForm& form) {
    const std::string among = format(", %s", toString(form.environment));
    if (form.text.empty()) return "All records" + among;
    const std::string text = isolated(form.text);
    if (form.by == "hash") return "Records whose ticket lists " + text + among;
    return (form.by == "name" ? "Records whose name begins with " : "Records whose label begins with ") +
           text + among;
}

std::string termOf(std::string_view name, const std::string& markup) {
    return format("<div><dt>%s</dt><dd>", name) + markup + "</dd></div>\n";
}

std::string hashesOf(const FoundRecord& found) {
    std::string items;
    for (const CodeHash& hash : found.record.hashes) items += "<li>" + codeOf(recordName(hash)) + "</li>";
    if (found.hashesCut) items += "<li>and further ones</li>";
    return "<ul>" + items + "</ul>";
}

std::string inWords(Action action) {
    std::string word(toString(action));
    word.front() = static_cast<char>(word.front() - 'a' + 'A');
    return word;
}

std::string eventOf(const Event& event, const Record& record) {
    std::string terms;
    if (event.reason) terms += termOf("Reason", std::string(toString(*event.reason)));
    if (!event.comment.empty()) terms += termOf("Comment", isolated(event.comment));
    if (event.label != record.label && !event.label.empty()) terms += termOf("Label", isolated(event.label));
    if (!event.ticket.empty()) terms += termOf("SHA-256 of the ticket", codeOf(event.ticket));
    terms += termOf("Event", codeOf(event.hash));
    return "<li>\n<h3>" + inWords(event.action) + "</h3>\n<p>" + timeOf(event.time) + ", by " +
           isolated(event.actor) + "</p>\n<dl>\n" + terms + "</dl>\n</li>\n";
}

}  // namespace

std::string recordTarget(const std::string& name, Environment environment) {
    std::string target = "/records/";
    for (std::size_t begin = 0; begin <= name.size();) {
        const std::size_t end = std::min(name.find('/', begin), name.size());
        target += values::percentEncoded(std::string_view(name).substr(begin, end - begin));
        if (end < name.size()) target += '/';
        begin = end + 1;
    }
    if (environment != Environment::production) target += format("?environment=%s", toString(environment));
    return target;
}

std::string homePage(const StoreFacts& facts, const std::string& client) {
    return documentOf(
        "Search",
        "<h1>Records</h1>\n" + formOf({}) +
            format("<h2>What the service holds</h2>\n<dl>\n<div><dt>Records</dt><dd>%lu</dd></div>\n"
                   "<div><dt>Events in the log</dt><dd>%lu</dd></div>\n</dl>\n",
                   facts.records, facts.events) +
            "<p><a href=\"/records\">All records</a></p>\n",
        client);
}

std::string resultsPage(const ResultsView& view, const std::string& client) {
    std::string content = "<h1>Records</h1>\n" + formOf(view.form);
    if (view.records.empty()) {
        content += "<p>" + captionOf(view.form) + ": there are none.</p>\n";
    } else {
        content += "<table>\n<caption>" + captionOf(view.form) +
                   "</caption>\n<thead><tr><th scope=\"col\">Label and name</th><th scope=\"col\">State</th>"
                   "<th scope=\"col\">Signed</th></tr></thead>\n<tbody>\n";
        for (const FoundRecord& found : view.records) content += rowOf(found.record, view.form.environment);
        content += "</tbody>\n</table>\n";
    }
    const std::string title = view.form.text.empty() ? "All records" : "Search for " + view.form.text;
    return documentOf(title, content + pagesOf(view.paging, "Pages of the records"), client);
}

std::string recordPage(const RecordView& view, const std::string& client) {
    const Record& record = view.found.record;
    std::string content = "<h1>" + isolated(labelOf(record)) + "</h1>\n<dl>\n" +
                          termOf("State", stateOf(record)) + termOf("Record", codeOf(record.name)) +
                          termOf("Environment", std::string(toString(view.environment))) +
                          termOf("Signed", timeOf(record.signedAt)) +
                          termOf("Delivery", record.asAsset ? "by download" : "in the answer") +
                          termOf("Hashes in the ticket", hashesOf(view.found)) + "</dl>\n<h2>History</h2>\n";
    if (view.events.empty()) {
        content += "<p>The log has no events here.</p>\n";
    } else {
        content += "<ol class=\"events\">\n";
        for (const Event& event : view.events) content += eventOf(event, record);
        content += "</ol>\n";
    }
    const std::string state = record.revoked ? "Revoked: " : "Valid: ";
    return documentOf(state + labelOf(record), content + pagesOf(view.paging, "Pages of the history"),
                      client);
}

std::string faultPage(const std::string& title, const std::string& text, const SearchForm& form,
                      const std::string& client) {
    return documentOf(title,
                      "<h1>" + markupText(title) + "</h1>\n<p class=\"fault\" id=\"fault\" role=\"alert\">" +
                          markupText(text) + "</p>\n" + formOf(form, true),
                      client);
}

// Text has a contrast of 4.5 to 1 at least, edges of fields 3 to 1, in both schemes.
std::string_view pageStyle() {
    return R"(:root { color-scheme: light dark; --text: #1b1b1f; --ground: #ffffff; --quiet: #55585f; --link: #0b57d0;
  --line: #c4c7cc; --edge: #70757d; --good: #1a7f37; --bad: #b3261e; --raised: #f4f5f7; }
@media (prefers-color-scheme: dark) { :root { --text: #e8e8ea; --ground: #16181c; --quiet: #a6abb3;
  --link: #8ab4f8; --line: #43474e; --edge: #8b9098; --good: #4ac26b; --bad: #ff8a80; --raised: #212429; } }
* { box-sizing: border-box; }
body { font: 1rem/1.5 system-ui, sans-serif; color: var(--text); background: var(--ground); margin: 0; }
header, main, footer { max-width: 64rem; margin: 0 auto; padding: 0 1rem; }
header { padding-top: 1rem; }
header p { font-weight: 600; margin: 0; }
main { padding-bottom: 2rem; }
footer { border-top: 1px solid var(--line); padding: .8rem 1rem 2rem; color: var(--quiet); font-size: .9rem; }
h1 { font-size: 1.6rem; line-height: 1.25; margin: 1rem 0 .5rem; overflow-wrap: anywhere; }
h2 { font-size: 1.2rem; margin: 1.6rem 0 .4rem; }
h3 { font-size: 1rem; margin: 0; }
a { color: var(--link); overflow-wrap: anywhere; }
:focus-visible { outline: 3px solid var(--link); outline-offset: 2px; }
.skip { position: absolute; left: -999rem; padding: .6rem 1rem; background: var(--raised); }
.skip:focus { left: .5rem; top: .5rem; }
form { display: flex; flex-wrap: wrap; gap: .8rem; align-items: end; background: var(--raised); padding: 1rem;
  border-radius: .4rem; }
form div { display: flex; flex-direction: column; flex: 1 1 10rem; }
form div:first-child { flex: 3 1 16rem; }
form p { flex: 1 1 100%; margin: 0; font-size: .9rem; color: var(--quiet); }
label { font-size: .9rem; font-weight: 600; margin-bottom: .2rem; }
input, select, button { font: inherit; color: inherit; background: var(--ground); border: 1px solid var(--edge);
  border-radius: .3rem; padding: .45rem .6rem; width: 100%; min-height: 2.75rem; }
button { width: auto; padding: .45rem 1.4rem; font-weight: 600; cursor: pointer; }
table { border-collapse: collapse; width: 100%; margin-top: 1rem; }
caption { text-align: left; font-weight: 600; padding-bottom: .4rem; overflow-wrap: anywhere; }
th, td { text-align: left; vertical-align: top; padding: .5rem .8rem .5rem 0; border-top: 1px solid var(--line); }
thead th { border-top: 0; font-size: .9rem; }
tbody th { font-weight: normal; overflow-wrap: anywhere; }
.unit { white-space: nowrap; }
.code { font: .85em/1.6 ui-monospace, monospace; overflow-wrap: anywhere; display: block; color: var(--quiet); }
.state { font-weight: 600; }
.valid { color: var(--good); }
.revoked { color: var(--bad); }
.fault { border-left: .4rem solid var(--bad); padding: .4rem 0 .4rem .8rem; overflow-wrap: anywhere; }
dl { margin: .5rem 0; }
dl div { display: flex; flex-wrap: wrap; gap: 0 1rem; padding: .25rem 0; }
dt { flex: 0 0 9rem; color: var(--quiet); }
dd { margin: 0; flex: 1 1 18rem; min-width: 0; overflow-wrap: anywhere; }
dd ul { margin: 0; padding: 0; list-style: none; }
.events { padding: 0; list-style: none; }
.events p { margin: .2rem 0; }
.events > li { border-top: 1px solid var(--line); padding: .8rem 0; }
.pages { margin: 1rem 0; display: flex; gap: 1.5rem; }
.pages a { display: inline-block; padding: .5rem 0; }
@media print { form, .skip, .pages { display: none; } }
)";
}

}  // namespace pinwell::lumora
