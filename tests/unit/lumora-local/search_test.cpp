// Searching records and events a page at a time, in every store.
#include <gtest/gtest.h>

#include "sample_record.h"
#include "store_kinds.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using test::kProduction;
using test::makeRecord;
using values::Date;

using Names = std::vector<std::string>;

class SearchTest : public test::EveryStoreTest {
  protected:
    void put(const std::string& name, const std::string& label, const std::vector<CodeHash>& hashes = {},
             Environment environment = kProduction) {
        SignedRecord record = makeRecord(name);
        record.record.label = label;
        if (!hashes.empty()) record.record.hashes = hashes;
        store().put(environment, {record}, test::kOccasion);
    }

    void putAt(const std::string& name, std::int64_t time) {
        Occasion occasion = test::kOccasion;
        occasion.time = Date{time};
        store().put(kProduction, {makeRecord(name)}, occasion);
    }

    /// Page after page.
    std::vector<Names> pagesOf(RecordSearch search) {
        std::vector<Names> pages;
        do {
            const RecordPage page = store().search(search);
            Names names;
            for (const FoundRecord& found : page.records) names.push_back(found.record.name);
            pages.push_back(names);
            search.after = page.next;
        } while (search.after && pages.size() < 100);
        return pages;
    }

    std::vector<Names> pagesOf(EventSearch search) {
        std::vector<Names> pages;
        do {
            const EventPage page = store().search(search);
            Names names;
            for (const Event& event : page.events) names.push_back(event.record);
            pages.push_back(names);
            search.after = page.next;
        } while (search.after && pages.size() < 100);
        return pages;
    }

    static RecordSearch everything(std::size_t limit) {
        RecordSearch search;
        search.limit = limit;
        return search;
    }
    static RecordSearch named(const std::string& name, std::size_t limit = 10) {
        RecordSearch search = everything(limit);
        search.name = name;
        return search;
    }
    static RecordSearch labelled(const std::string& label, std::size_t limit = 10) {
        RecordSearch search = everything(limit);
        search.label = label;
        return search;
    }
    static RecordSearch listing(const Data& hash, std::size_t limit = 10) {
        RecordSearch search = everything(limit);
        search.hash = hash;
        return search;
    }
};

INSTANTIATE_TEST_SUITE_P(In, SearchTest, test::everyStore(), test::nameOfStore);

TEST_P(SearchTest, FindsNothingInAnEmptyStore) {
    EXPECT_EQ(pagesOf(everything(3)), std::vector<Names>{Names{}});
    EventSearch events;
    events.limit = 3;
    EXPECT_EQ(pagesOf(events), std::vector<Names>{Names{}});
}

TEST_P(SearchTest, PagesThroughAllRecordsByName) {
    for (const char* name : {"d", "b", "a", "c", "e"}) put(name, "L");
    put("z", "L", {}, Environment::development);
    EXPECT_EQ(pagesOf(everything(2)), (std::vector<Names>{{"a", "b"}, {"c", "d"}, {"e"}}));
    EXPECT_EQ(pagesOf(everything(5)), (std::vector<Names>{{"a", "b", "c", "d", "e"}}));
}

TEST_P(SearchTest, FindsNamesByTheirBeginning) {
    for (const char* name : {"2/2/aa", "2/2/ab", "2/2/ab~", "2/2/ac", "2/4/ab"}) put(name, "L");
    EXPECT_EQ(pagesOf(named("2/2/ab")), (std::vector<Names>{{"2/2/ab", "2/2/ab~"}}));
    EXPECT_EQ(pagesOf(named("2/2/", 3)), (std::vector<Names>{{"2/2/aa", "2/2/ab", "2/2/ab~"}, {"2/2/ac"}}));
    EXPECT_EQ(pagesOf(named("3")), std::vector<Names>{Names{}});
    EXPECT_EQ(pagesOf(named("~")), std::vector<Names>{Names{}});
}

TEST_P(SearchTest, FindsLabelsByTheirBeginning) {
    put("1", "Example.app");
    put("2", "Example");
    put("3", "Examples.dmg");
    put("4", "example");
    put("5", "Examplf");
    put("6", "Example");
    EXPECT_EQ(pagesOf(labelled("Example", 2)), (std::vector<Names>{{"2", "6"}, {"1", "3"}}));
    EXPECT_EQ(pagesOf(labelled("Example.")), (std::vector<Names>{{"1"}}));
    EXPECT_EQ(pagesOf(labelled("%")), std::vector<Names>{Names{}});
}

TEST_P(SearchTest, ComparesTheFirstBytesOfLongLabels) {
    const std::string start(kSearchedLabelBytes, 'x');
    put("1", start + "b");
    put("2", start + "a");
    put("3", start);
    EXPECT_EQ(pagesOf(labelled(start, 1)), (std::vector<Names>{{"1"}, {"2"}, {"3"}}));
}

TEST_P(SearchTest, FindsLabelsInAnyEncoding) {
    put("1", "caf\xC3\xA9");
    put("2", "caf\xE9");
    EXPECT_EQ(pagesOf(labelled("caf\xC3\xA9")), (std::vector<Names>{{"1"}}));
    EXPECT_EQ(pagesOf(labelled("caf\xE9")), (std::vector<Names>{{"2"}}));
    EXPECT_EQ(pagesOf(labelled("\xFF")), std::vector<Names>{Names{}});
}

TEST_P(SearchTest, FindsRecordsByAHashOfAnyDigestType) {
    const Data nested(20, std::byte{7});
    put("a", "L", {{2, Data(20, std::byte{1})}, {2, nested}, {3, nested}});
    put("b", "L", {{1, nested}});
    put("c", "L", {{2, Data(20, std::byte{8})}});
    put("d", "L", {{2, nested}});
    EXPECT_EQ(pagesOf(listing(nested, 2)), (std::vector<Names>{{"a", "b"}, {"d"}}));
    EXPECT_EQ(pagesOf(listing(Data(20, std::byte{9}))), std::vector<Names>{Names{}});
}

TEST_P(SearchTest, ShowsARecordWithItsFirstHashes) {
    std::vector<CodeHash> hashes;
    for (unsigned i = 0; i <= kHashesInSearch; ++i) {
        Data hash(20);
        hash[0] = static_cast<std::byte>(i);
        hashes.push_back({2, hash});
    }
    put("a", "L", hashes);
    hashes.pop_back();
    put("b", "M", hashes);
    const RecordPage page = store().search(everything(2));
    ASSERT_EQ(page.records.size(), 2U);
    EXPECT_TRUE(page.records[0].hashesCut);
    EXPECT_EQ(page.records[0].record.hashes, hashes);
    EXPECT_FALSE(page.records[1].hashesCut);
    EXPECT_EQ(page.records[1].record.hashes, hashes);
    EXPECT_EQ(page.records[1].record.label, "M");
    EXPECT_EQ(page.records[1].record.signedAt, Date{77});
    EXPECT_FALSE(page.records[1].record.revoked);
}

TEST_P(SearchTest, PagesThroughAllEventsInTheOrderOfTheChain) {
    for (const auto& [name, time] : {std::pair("a", 3), std::pair("b", 1), std::pair("c", 2)})
        putAt(name, time);
    EventSearch search;
    search.limit = 2;
    EXPECT_EQ(pagesOf(search), (std::vector<Names>{{"a", "b"}, {"c"}}));
}

TEST_P(SearchTest, PagesThroughEventsSinceATimeInOrderOfTime) {
    for (const auto& [name, time] :
         {std::pair("a", 3), std::pair("b", 1), std::pair("c", 2), std::pair("d", 2), std::pair("e", 4)})
        putAt(name, time);
    EventSearch search;
    search.limit = 2;
    search.since = Date{2};
    EXPECT_EQ(pagesOf(search), (std::vector<Names>{{"c", "d"}, {"a", "e"}}));
}

TEST_P(SearchTest, PagesThroughTheEventsOfOneRecord) {
    for (int time = 1; time <= 5; ++time) {
        putAt("a", time);
        putAt("b", time);
    }
    EventSearch search;
    search.limit = 2;
    search.record = "a";
    EXPECT_EQ(pagesOf(search), (std::vector<Names>{{"a", "a"}, {"a", "a"}, {"a"}}));
    search.since = Date{4};
    EXPECT_EQ(pagesOf(search), (std::vector<Names>{{"a", "a"}}));
    search.environment = Environment::development;
    EXPECT_EQ(pagesOf(search), std::vector<Names>{Names{}});
}

}  // namespace
}  // namespace pinwell::lumora
