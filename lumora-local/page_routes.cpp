#include <utility>

#include "admin_routes.h"
#include "admin_service.h"
#include "page.h"
#include "record_name.h"
#include "values/format.h"
#include "values/url.h"

namespace pinwell::lumora {
namespace {

using values::format;

constexpr std::string_view kRecordPath = "/records/";

/// Whatever the contents of a page, a browser only loads the style sheet and sends the form.
constexpr const char* kPolicy =
    "default-src 'none'; style-src 'self'; form-action 'self'; base-uri 'none'; frame-ancestors 'none'";

Answer pageAnswer(int status, std::string document) {
    Answer answer;
    answer.status = status;
    answer.contentType = "text/html; charset=utf-8";
    answer.body = std::move(document);
    answer.headers = {{"Content-Security-Policy", kPolicy},
                      {"Referrer-Policy", "no-referrer"},
                      {"X-Frame-Options", "DENY"},
                      {"Cross-Origin-Opener-Policy", "same-origin"},
                      {"Cross-Origin-Resource-Policy", "same-origin"}};
    return answer;
}

std::string valueIn(const Query& query, std::string_view name) {
    const auto found = query.find(name);
    return found == query.end() ? std::string() : found->second;
}

/// Without the blanks around pasted text.
std::string trimmed(const std::string& text) {
    const std::size_t begin = text.find_first_not_of(" \t\r\n");
    if (begin == std::string::npos) return {};
    return text.substr(begin, text.find_last_not_of(" \t\r\n") - begin + 1);
}

SearchForm formIn(const Query& query) {
    SearchForm form;
    form.text = trimmed(valueIn(query, "text"));
    for (const std::string_view by : {"name", "hash"})
        if (valueIn(query, "by") == by) form.by = by;
    // Digits are pasted from anywhere; names and hashes have them in lower case.
    if (form.by != "label")
        for (char& digit : form.text)
            if (digit >= 'A' && digit <= 'F') digit = static_cast<char>(digit - 'A' + 'a');
    form.environment = parseEnvironment(valueIn(query, "environment")).value_or(Environment::production);
    return form;
}

/// The form's fields as parameters of GET /v1/records and GET /v1/events.
Query parametersOf(const SearchForm& form, const Query& query) {
    Query parameters{{"environment", std::string(toString(form.environment))}};
    if (!form.text.empty()) parameters.emplace(form.by, form.text);
    if (const auto after = query.find("after"); after != query.end()) parameters.insert(*after);
    return parameters;
}

std::string targetOf(const SearchForm& form) {
    return "/records?by=" + form.by + "&text=" + values::percentEncoded(form.text) +
           "&environment=" + std::string(toString(form.environment));
}

Paging pagingOf(const std::string& first, const Query& query, const std::optional<std::string>& next) {
    Paging paging;
    if (query.contains("after")) paging.first = first;
    const char separator = first.find('?') == std::string::npos ? '?' : '&';
    if (next) paging.next = first + separator + "after=" + values::percentEncoded(*next);
    return paging;
}

Answer answerHome(RecordStore& store, const AdminRequest& request) {
    return pageAnswer(200, homePage(store.facts(), request.head.client));
}

Answer answerResults(RecordStore& store, const AdminRequest& request) {
    ResultsView view;
    view.form = formIn(request.query);
    try {
        RecordPage page = store.search(recordSearchOf(parametersOf(view.form, request.query)));
        view.records = std::move(page.records);
        view.paging = pagingOf(targetOf(view.form), request.query,
                               page.next ? std::optional(toString(*page.next)) : std::nullopt);
    } catch (const Refused& refused) {
        return pageAnswer(refused.status(), faultPage("This cannot be searched for",
                                                      format("The search is not made: %s.", refused.what()),
                                                      view.form, request.head.client));
    }
    return pageAnswer(200, resultsPage(view, request.head.client));
}

/// The record of exactly this name.
std::optional<FoundRecord> recordNamed(RecordStore& store, const std::string& name, Environment environment) {
    RecordSearch search;
    search.environment = environment;
    search.name = name;
    search.limit = 1;  // the shortest name is first
    RecordPage page = store.search(search);
    if (page.records.empty() || page.records.front().record.name != name) return std::nullopt;
    return std::move(page.records.front());
}

Answer answerRecord(RecordStore& store, const AdminRequest& request) {
    const auto name = percentDecoded(request.path.substr(kRecordPath.size()));
    SearchForm form = formIn(request.query);
    try {
        if (!name || !parseRecordName(*name)) throw Refused(404, "this is not the name of a record");
        RecordView view;
        view.environment = form.environment;
        Query parameters = parametersOf(form, request.query);
        parameters["record"] = *name;
        const EventSearch search = eventSearchOf(parameters);
        auto found = recordNamed(store, *name, view.environment);
        if (!found) throw Refused(404, format("there is no record %@", *name));
        view.found = *std::move(found);
        EventPage events = store.search(search);
        view.events = std::move(events.events);
        view.paging = pagingOf(recordTarget(*name, view.environment), request.query,
                               events.next ? std::optional(toString(*events.next)) : std::nullopt);
        return pageAnswer(200, recordPage(view, request.head.client));
    } catch (const Refused& refused) {
        form.by = "name";
        form.text = name.value_or("");
        return pageAnswer(refused.status(),
                          faultPage("There is nothing to show", format("The reason: %s.", refused.what()),
                                    form, request.head.client));
    }
}

Answer answerStyle() {
    Answer answer;
    answer.contentType = "text/css; charset=utf-8";
    answer.body = pageStyle();
    return answer;
}

Answer refusePage(int status, std::string_view detail, const RequestHead& head) {
    return pageAnswer(status, faultPage("There is nothing to show", format("The reason: %s.", detail),
                                        SearchForm{}, head.client));
}

}  // namespace

AdminRoutes pageRoutes(RecordStore& store) {
    return {{"GET",
             "/",
             &Rights::read,
             {},
             [&store](const AdminRequest& request) { return answerHome(store, request); },
             refusePage},
            {"GET",
             "/records",
             &Rights::read,
             {"by", "text", "environment", "after"},
             [&store](const AdminRequest& request) { return answerResults(store, request); },
             refusePage},
            {"GET",
             "/records/*",
             &Rights::read,
             {"environment", "after"},
             [&store](const AdminRequest& request) { return answerRecord(store, request); },
             refusePage},
            {"GET", "/style.css", &Rights::read, {}, [](const AdminRequest&) { return answerStyle(); }}};
}

}  // namespace pinwell::lumora
