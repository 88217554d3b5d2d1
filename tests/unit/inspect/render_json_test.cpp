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

TEST_F(JsonObject, NamesKindOutcomeAndPlace) {
    const auto expect = [&](const std::string& path, const std::string& kind, const std::string& outcome,
                            const std::string& place) {
        const Value json = parsed(inspect(path));
        EXPECT_EQ(text(json["kind"]), kind) << path;
        EXPECT_EQ(text(json["outcome"]), outcome) << path;
        const bool hasPlace = json["place"].dictionary() != nullptr;
        EXPECT_EQ(hasPlace ? text(json["place"]["form"]) : "", place) << path;
        EXPECT_EQ(json["exitStatus"].unsignedIntegerValue(), outcome == "good"         ? 0U
                                                             : outcome == "unreadable" ? 66U
                                                                                       : 65U);
    };
    const TicketPayloadBuilder payload = TicketPayloadBuilder().entry(2, bundleHash);
    const Artefact image = signedImage();
    const Artefact package = signedPackage();
    expect(bundle(), "bundle", "noTicket", "file");
    expect(bundle(sealed(TicketPayloadBuilder(payload).revoked())), "bundle", "revoked", "file");
    expect(stapled(image, sealed(payload)), "diskImage", "refused", "superblob");
    expect(stapled(package, ticketFor(package)), "package", "good", "trailers");
    expect(write("a.ticket", base::toString(sealed(payload))), "ticket", "good", "file");
    expect(write("notes.txt", "hello"), "other", "unreadable", "");
    const std::string program = write("tool", base::toString(ExecutableImageBuilder().build()));
    setMode(program, 0755);
    expect(program, "executable", "noTicket", "");
}

TEST_F(JsonObject, HasTheFaultAtBothOffsets) {
    const Artefact image = unsignedImage();
    Data ticket = ticketFor(image);
    ticket[4] = std::byte{9};
    const Value fault = parsed(inspect(stapled(image, ticket)))["fault"];
    EXPECT_EQ(text(fault["rule"]), "the container's version is not 1");
    EXPECT_EQ(fault["offset"].unsignedIntegerValue(), 4U);
    EXPECT_EQ(fault["fileOffset"].unsignedIntegerValue(), 100'000U + 20 + 8 + 4);
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
