// The object for programs: the same members on every outcome, and always JSON.
#include "inspect/render_json.h"

#include "base/text.h"
#include "inspect_fixture.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using testing::EndsWith;
using testing::HasSubstr;
using values::Value;

class JsonObject : public InspectTest {
  protected:
    static Value parsed(const Report& report) {
        const auto value = values::parseJSON(base::asBytes(inspect::renderJson(report)));
        EXPECT_TRUE(value);
        return value ? *value : Value();
    }
    static std::vector<std::string> membersOf(const Value& object) {
        std::vector<std::string> names;
        for (const auto& [name, value] : *object.dictionary()) names.push_back(name);
        return names;
    }
    static std::string text(const Value& value) { return value.string() == nullptr ? "" : *value.string(); }
};

TEST_F(JsonObject, SaysTheSameAsTheReport) {
    const Artefact image = signedImage();
    const Value json = parsed(inspect(stapled(image, ticketFor(image))));
    EXPECT_EQ(json["version"].unsignedIntegerValue(), 1U);
    EXPECT_EQ(text(json["outcome"]), "good");
    EXPECT_EQ(text(json["codeHash"]["hash"]), base::toHex(image.hash));
    EXPECT_EQ(text(json["place"]["form"]), "superblob");
    EXPECT_EQ(json["place"]["blobs"].array()->size(), 4U);
    EXPECT_EQ(json["ticket"]["certificates"].array()->size(), 3U);
    EXPECT_EQ(json["ticket"]["payload"]["entryCount"].unsignedIntegerValue(), 1U);
    EXPECT_EQ(text(json["ticket"]["payload"]["matchingEntry"]["codeHash"]["hash"]), base::toHex(image.hash));
}

TEST_F(JsonObject, HasTheSameMembersOnEveryOutcome) {
    const Artefact image = unsignedImage();
    const auto members = membersOf(parsed(inspect(stapled(image, ticketFor(image)))));
    EXPECT_EQ(membersOf(parsed(inspect(write(image.name, image.contents)))), members);
    EXPECT_EQ(membersOf(parsed(inspect(write("notes.txt", "hello")))), members);
    EXPECT_EQ(membersOf(parsed(inspect(platform.directory / "missing"))), members);
}

TEST_F(JsonObject, OfADamagedTicketHasTheMembersOfAWholeOne) {
    const auto ticketMembers = [&](const std::string& bytes) {
        return membersOf(parsed(inspect(write("a.ticket", bytes)))["ticket"]);
    };
    const std::string whole = base::toString(sealed(TicketPayloadBuilder()));
    EXPECT_EQ(ticketMembers(whole.substr(0, 5)), ticketMembers(whole));
    EXPECT_EQ(ticketMembers(whole.substr(0, 200)), ticketMembers(whole));
}

TEST_F(JsonObject, IsOneLineOfUTF8WhateverAFileIsCalled) {
    const std::string path = write("a\n\xff\x1b[31m.txt", "hello");
    const std::string json = inspect::renderJson(inspect(path));
    EXPECT_THAT(json, EndsWith("}\n"));
    EXPECT_EQ(json.find('\n'), json.size() - 1);
    EXPECT_EQ(json.find('\x1b'), std::string::npos);
    EXPECT_THAT(json, HasSubstr("a\\n\xef\xbf\xbd\\u001b[31m.txt"));
}

}  // namespace
}  // namespace pinwell::test
