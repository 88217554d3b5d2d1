// The page for people: the records, their states and their histories. Read only.
//
// Every function returns a whole document. It needs no script and loads only /style.css; the policy in its
// headers (page_routes.cpp) allows nothing else. Text from the store is escaped, and has no control
// characters and no marks that change the direction of writing.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "event.h"
#include "record_name.h"
#include "record_store.h"

namespace pinwell::lumora {

/// The contents of the search form.
struct SearchForm {
    std::string by = "label";  // "name", "label" or "hash"
    std::string text;          // empty: every record
    Environment environment = Environment::production;
};

/// Pages of a list. A target is a path with its query; `nullopt` if there is no such page.
struct Paging {
    std::optional<std::string> first;  // `nullopt` on the first page
    std::optional<std::string> next;
};

struct ResultsView {
    SearchForm form;
    std::vector<FoundRecord> records;
    Paging paging;
};

struct RecordView {
    FoundRecord found;
    Environment environment = Environment::production;
    std::vector<Event> events;  // a page of them, oldest first
    Paging paging;
};

/// `client` is the name that the reader's certificate has.
std::string homePage(const StoreFacts& facts, const std::string& client);
std::string resultsPage(const ResultsView& view, const std::string& client);
std::string recordPage(const RecordView& view, const std::string& client);

/// An error message above the form with its input.
std::string faultPage(const std::string& title, const std::string& text, const SearchForm& form,
                      const std::string& client);

/// The path of a record's page, with its query.
std::string recordTarget(const std::string& name, Environment environment);

/// The contents of /style.css.
std::string_view pageStyle();

}  // namespace pinwell::lumora
