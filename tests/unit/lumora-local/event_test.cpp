#include "lumora-local/event.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <set>

#include "base/bytes.h"
#include "base/text.h"
#include "crypto/crypto.h"

namespace pinwell::lumora {
namespace {

using values::Date;

Event revocation() {
    Event event;
    event.time = Date{1'795'000'000};
    event.actor = "alice";
    event.action = Action::revoked;
    event.record = "2/2/00";
    event.label = "A.app";
    event.reason = Reason::compromised;
    event.comment = "key lost";
    event.ticket = std::string(64, 'a');
    event.previous = hashBeforeTheFirstEvent();
    event.hash = hashOf(event);
    return event;
}

TEST(EventHash, IsTakenOverEachFieldWithItsLength) {
    const std::string text = "64:" + std::string(64, '0') +
                             ",20:2026-11-18T11:06:40Z,5:alice,7:revoked,10:production,6:2/2/00,5:A.app,"
                             "11:compromised,8:key lost,64:" +
                             std::string(64, 'a') + ",";
    EXPECT_EQ(hashOf(revocation()), base::toHex(crypto::sha256(base::asBytes(text))));
}

TEST(EventHash, ChangesWithEveryField) {
    std::set<std::string> hashes{hashOf(revocation())};
    const auto with = [&](auto&& change) {
        Event event = revocation();
        change(event);
        EXPECT_TRUE(hashes.insert(hashOf(event)).second);
    };
    with([](Event& event) { event.time.seconds += 1; });
    with([](Event& event) { event.actor = "bob"; });
    with([](Event& event) { event.action = Action::issued; });
    with([](Event& event) { event.environment = Environment::development; });
    with([](Event& event) { event.record = "2/2/01"; });
    with([](Event& event) { event.label = "B.app"; });
    with([](Event& event) { event.reason = std::nullopt; });
    with([](Event& event) { event.comment = ""; });
    with([](Event& event) { event.ticket[0] = 'b'; });
    with([](Event& event) { event.previous[0] = '1'; });
    with([](Event& event) {  // a byte that moves from one field to the next
        event.record = "2/2/0";
        event.label = "0A.app";
    });
}

TEST(Event, IsOneLineAsText) {
    EXPECT_EQ(describeEvent(revocation()),
              "2026-11-18T11:06:40Z\trevoked\t2/2/00\talice\tA.app\tcompromised\tkey lost\n");
}

TEST(Event, EscapesControlCharacters) {
    Event event = revocation();
    event.comment = "one\ntwo\x1B[31m";
    EXPECT_EQ(describeEvent(event).find('\x1B'), std::string::npos);
    EXPECT_EQ(describeEvent(event).find('\n'), describeEvent(event).size() - 1);
}

TEST(Event, IsOneObjectAsJson) {
    const auto object = nlohmann::json::parse(eventAsJson(revocation()));
    EXPECT_EQ(object.size(), 10U);
    EXPECT_EQ(object["time"], "2026-11-18T11:06:40Z");
    EXPECT_EQ(object["actor"], "alice");
    EXPECT_EQ(object["action"], "revoked");
    EXPECT_EQ(object["record"], "2/2/00");
    EXPECT_EQ(object["label"], "A.app");
    EXPECT_EQ(object["reason"], "compromised");
    EXPECT_EQ(object["comment"], "key lost");
    EXPECT_EQ(object["ticket"], std::string(64, 'a'));
    EXPECT_EQ(object["previous"], hashBeforeTheFirstEvent());
    EXPECT_EQ(object["hash"], revocation().hash);
}

TEST(Event, HasNoReasonAndNoCommentAsNull) {
    Event event = revocation();
    event.reason = std::nullopt;
    event.comment.clear();
    const auto object = nlohmann::json::parse(eventAsJson(event));
    EXPECT_TRUE(object["reason"].is_null());
    EXPECT_TRUE(object["comment"].is_null());
}

TEST(Event, NamesAnEnvironmentOtherThanProduction) {
    Event event = revocation();
    event.environment = Environment::development;
    EXPECT_EQ(nlohmann::json::parse(eventAsJson(event))["environment"], "development");
}

TEST(Event, HasNamesThatCanBeParsed) {
    for (const std::string& name : reasonNames()) EXPECT_EQ(toString(parseReason(name).value()), name);
    for (const Action action : {Action::issued, Action::reissued, Action::revoked, Action::reinstated}) {
        EXPECT_EQ(parseAction(toString(action)), action);
    }
    EXPECT_EQ(parseReason("bored"), std::nullopt);
    EXPECT_EQ(parseAction("removed"), std::nullopt);
}

}  // namespace
}  // namespace pinwell::lumora
