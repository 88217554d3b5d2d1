#include "lumora-local/access_log.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace pinwell::lumora {
namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::Not;

RequestEntry entryFor(const std::string& target, const std::string& client) {
    RequestEntry entry;
    entry.peer = "127.0.0.1:4";
    entry.method = "GET";
    entry.target = target;
    entry.client = client;
    entry.status = 200;
    entry.size = 7;
    entry.identifier = "ID";
    return entry;
}

TEST(AccessLog, HasTheRequestAndTheClientInQuotes) {
    EXPECT_THAT(describeRequest(entryFor("/records?name=2", "ci.example"), LogForm::text),
                EndsWith(R"( 127.0.0.1:4 "GET /records?name=2" 200 7 ID "ci.example")"));
}

TEST(AccessLog, EscapesQuotesInTexts) {
    EXPECT_THAT(describeRequest(entryFor(R"(/a" 200 1 X "b\)", R"(me" "you)"), LogForm::text),
                EndsWith(R"("GET /a\" 200 1 X \"b\\" 200 7 ID "me\" \"you")"));
}

TEST(AccessLog, EscapesInvisibleCharacters) {
    const std::string name = "ci\u202egro\x1b[2J";
    for (const LogForm form : {LogForm::text, LogForm::json}) {
        const std::string line = describeRequest(entryFor("/" + name, name), form);
        EXPECT_THAT(line, Not(HasSubstr("\u202e")));
        EXPECT_THAT(line, Not(HasSubstr("\x1b")));
        EXPECT_THAT(line, HasSubstr("u202egro"));
    }
}

}  // namespace
}  // namespace pinwell::lumora
