// The rules that both stores share: whether a put is allowed, the events it makes, and the pages of a search.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "failure.h"
#include "record_store.h"
#include "values/format.h"

namespace pinwell::lumora {

/// A revoked record that a valid ticket for another one would get around.
struct RevokedElsewhere {
    Environment environment = Environment::production;
    std::string name;
};

/// The state of the store before a put.
struct Standing {
    std::optional<bool> revoked;                // of the record of that name; `nullopt` if there is none
    std::optional<RevokedElsewhere> elsewhere;  // only for a valid ticket
};

/// The action of putting `record`. Throws RevokedFailure if it would make revoked software valid and the
/// occasion does not reinstate.
Action actionOf(Environment environment, const Record& record, const Standing& before,
                const Occasion& occasion);

/// Adds the hashes of a record's earlier tickets, behind its own. Throws TooManyHashesFailure as put() does.
void keepEarlierHashes(Record& record, const std::vector<CodeHash>& earlier);

/// The event for a put, with its hash.
Event makeEvent(Environment environment, const SignedRecord& entry, Action action, const Occasion& occasion,
                std::string previous);

/// The event for a refused attempt, with its hash.
Event makeEvent(const RefusedAttempt& attempt, const Occasion& occasion, std::string previous);

/// The number of one record's events that a search with `since` reads for one page.
inline constexpr std::size_t kEventsReadForAPage = 1000;

/// The first text, byte by byte, after all texts that begin with `prefix`. Empty if there is none: the prefix
/// is empty, or has only bytes of the value 255.
std::string endOfPrefix(std::string prefix);

/// The range of a page. No name of a record is empty, and each is printable ASCII.
struct SearchRange {
    std::string firstName;   // at it; after it, in a search by label
    std::string endName;     // before it; meaningful only in searches by name
    std::string firstLabel;  // with the first name of this label, in a search by label
    std::string endLabel;    // before it
};

SearchRange rangeOf(const RecordSearch& search);

/// The bytes of a label that a search compares.
std::string searchedBytes(const std::string& label);

/// Turns `limit + 1` records, or fewer, into a page of `limit`. `byLabel`: the search is by label.
RecordPage makePage(std::vector<FoundRecord> records, std::size_t limit, bool byLabel);

/// Leaves out the hashes over the bound; `record` was read with one more at most.
FoundRecord cutHashes(Record record);

/// Collects the events of a page: the matching ones of all that are read, in their order.
class EventPageMaker {
  public:
    explicit EventPageMaker(const EventSearch& search) : search_(search) {}

    /// The highest number of rows to read: one more than the page needs.
    std::size_t rows() const noexcept;

    /// Whether time is a condition that the database has not checked.
    bool filtersTime() const noexcept { return search_.record && search_.since; }

    /// Takes the next row. Returns false if the page is full.
    bool take(Event event, std::int64_t position);

    EventPage finish() { return std::move(page_); }

  private:
    const EventSearch& search_;
    EventPage page_;
    EventCursor last_;
    std::size_t read_ = 0;
};

/// The action, environment or reason that a row names. Throws Failure (EX_CONFIG) if it is not one.
template <class T>
T knownName(const std::optional<T>& value, const char* column, const std::string& text) {
    if (!value) throw Failure(EX_CONFIG, values::format("record store: no %s is called %@", column, text));
    return *value;
}

}  // namespace pinwell::lumora
