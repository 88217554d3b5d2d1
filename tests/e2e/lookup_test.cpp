// The lookup of a ticket's record: the request, and the outcome of each response.
#include <sys/stat.h>

#include <filesystem>

#include "base/text.h"
#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::SizeIs;
using testing::StartsWith;

constexpr const char* kUniqueName = "[0-9A-F]{8}(-[0-9A-F]{4}){3}-[0-9A-F]{12}\\.ticket";

class Lookup : public EndToEndTest {
  protected:
    /// Staples with this body as the service's response.
    ProcessResult stapleWith(const std::string& body) {
        serve(answer(body));
        return staple();
    }
    std::string failedDueTo(const std::string& reason) const {
        return "Lumora query for Sample.app (" + prettyHash() + ") failed due to \"" + reason + "\".";
    }
    std::string unexpectedShape() const {
        return "Lumora query for " + prettyHash() + " did not return expected JSON data.";
    }
    testing::Matcher<const ProcessResult&> FoundNoTicketBecause(const std::string& line) const {
        return Ended(65, ElementsAre(processing(), line, noTicketLine(), stapleFailed(65)));
    }
    void expectUntouched() const {
        EXPECT_EQ(stapled(), std::nullopt);
        EXPECT_THAT(temporaryFiles(), IsEmpty());
    }
};

TEST_F(Lookup, IsOnePostOfTheRecordName) {
    serveTicket(ticket());
    ASSERT_EQ(staple().exitStatus, 0);
    ASSERT_EQ(service().requests().size(), 1U);
    const RecordedRequest request = service().requests()[0];
    EXPECT_EQ(request.method, "POST");
    EXPECT_EQ(request.target, "/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup");
    EXPECT_EQ(request.body, R"({"records":[{"recordName":"2/2/)" + base::toHex(hash) + R"("}]})");
    EXPECT_EQ(request.header("Content-Type"), "application/json");
    EXPECT_EQ(request.header("User-Agent"), "pinwell/34.0");
    EXPECT_EQ(request.header("Host"), "127.0.0.1:" + std::to_string(service().port()));
    for (const char* name : {"Cookie", "Authorization", "Expect"})
        EXPECT_EQ(request.header(name), std::nullopt) << name;
}

TEST_F(Lookup, NamesTheStrongestCodeDirectoryOfTheBundle) {
    const Data sha1 = CodeDirectoryBuilder().digestType(1).covers(2, emptyRequirements()).build();
    const Data sha384 = CodeDirectoryBuilder().digestType(4).covers(2, emptyRequirements()).build();
    const Data area = SuperBlobBuilder::adHoc(sha1).blob(0x1000, sha384).build();
    BundleBuilder().executable(ExecutableImageBuilder().signature(area).build()).write(bundle);
    const Data strongest = codeHashOf(4, sha384);
    ASSERT_EQ(strongest.size(), 48U);
    serveTicket(sealed(TicketPayloadBuilder().hashLength(48).entry(4, strongest)));
    EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
    EXPECT_EQ(service().requests()[0].body,
              R"({"records":[{"recordName":"2/4/)" + base::toHex(strongest) + R"("}]})");
}

TEST_F(Lookup, TakesTheServicesHostByName) {
    trust(serverChain.root);
    startService(identityOf(ServerChain("localhost").issue()), "localhost");
    serveTicket(ticket());
    EXPECT_EQ(staple().exitStatus, 0);
    EXPECT_EQ(service().connections()[0].serverName, "localhost");
}

// The build variant.

TEST_F(Lookup, IgnoresUserDefaultsOnAnOrdinaryBuild) {
    writeFile(directory / "home/config/com.ostrel.tm.pinwell.json",
              std::string_view(R"({"lm-container":"com.example.other","lm-production":false})"));
    serveTicket(ticket());
    staple();
    EXPECT_THAT(service().requests()[0].target,
                StartsWith("/database/1/com.ostrel.tm.ticket-delivery/production/"));
}

TEST_F(Lookup, AsksForTheContainerAndEnvironmentOfUserDefaultsOnAnInternalBuild) {
    writeFile(directory / "platform/internal-security-policies", std::string_view());
    writeFile(directory / "home/config/com.ostrel.tm.pinwell.json",
              std::string_view(R"({"lm-container":"com.example.other","lm-production":false})"));
    serveTicket(ticket());
    staple();
    EXPECT_EQ(service().requests()[0].target,
              "/database/1/com.example.other/development/public/records/lookup");
}

TEST_F(Lookup, FallsBackToTheRegisteredDefaultsOnAnInternalBuild) {
    writeFile(directory / "platform/internal-security-policies", std::string_view());
    serveTicket(ticket());
    for (const std::string_view defaults :
         {"", "{", "[]", R"({"lm-container":7,"lm-production":"perhaps"})"}) {
        writeFile(directory / "home/config/com.ostrel.tm.pinwell.json", defaults);
        EXPECT_EQ(staple().exitStatus, 0) << defaults;
    }
    for (const RecordedRequest& request : service().requests())
        EXPECT_EQ(request.target,
                  "/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup");
}

// The platform's settings.

TEST_F(Lookup, ABrokenPlatformFileFailsTheLookupAndIsNamed) {
    const std::string file = directory / "platform/platform.json";
    for (const std::string_view settings :
         {"", "{", "[]", "null", R"({"lumora":7})", R"({"lumora":{"host":7}})", R"({"lumora":{"host":""}})",
          R"({"lumora":{"host":"a/b"}})", R"({"lumora":{"host":"user@host"}})",
          R"({"lumora":{"host":"host:0"}})"}) {
        writePlatformSettings(settings);
        EXPECT_THAT(
            staple(),
            Ended(68, ElementsAre(
                          processing(), AllOf(StartsWith("error is Error Domain="), testing::HasSubstr(file)),
                          "Lumora's response is inconsistent with expections: (null)", stapleFailed(68))))
            << settings;
    }
    expectUntouched();
}

TEST_F(Lookup, ASyntaxErrorInThePlatformFileIsNamedWithItsPosition) {
    writePlatformSettings(R"({"lumora": ?})");
    EXPECT_THAT(staple().output, testing::HasSubstr("at byte 11"));
}

TEST_F(Lookup, UnknownKeysInThePlatformFileAreIgnored) {
    serveTicket(ticket());
    writePlatformSettings(R"({"more":[1],"lumora":{"colour":"red","host":"127.0.0.1:)" +
                          std::to_string(service().port()) + R"("}})");
    EXPECT_EQ(staple().exitStatus, 0);
}

TEST_F(Lookup, APlatformDirectoryThatIsNotThereTrustsNoTicket) {
    environment["PINWELL_PLATFORM"] = directory / "nowhere";
    stapleByHand(ticket());
    EXPECT_THAT(validate(), Ended(65, ElementsAre(processing())));
}

TEST_F(Lookup, APlatformDirectoryThatIsNotThereMeansTheBuiltInHost) {
    environment["PINWELL_PLATFORM"] = directory / "nowhere";
    // A proxy that refuses every connection keeps the request on this machine.
    environment["https_proxy"] = "http://127.0.0.1:1";
    EXPECT_THAT(staple(),
                Ended(68, ElementsAre(processing(),
                                      AllOf(StartsWith("error is Error Domain=URLErrorDomain Code="),
                                            testing::HasSubstr("api.lumora.example")),
                                      "Lumora's response is inconsistent with expections: (null)",
                                      stapleFailed(68))));
}

// Records without a ticket.

TEST_F(Lookup, PrintsTheServicesReason) {
    EXPECT_THAT(stapleWith(R"({"records":[{"reason":"Record not found","serverErrorCode":"NOT_FOUND"}]})"),
                FoundNoTicketBecause(failedDueTo("Record not found")));
    expectUntouched();
}

TEST_F(Lookup, AMissingReasonPrintsAsNil) {
    EXPECT_THAT(stapleWith(R"({"records":[{}]})"), FoundNoTicketBecause(failedDueTo("(null)")));
    EXPECT_THAT(stapleWith("{}"), FoundNoTicketBecause(failedDueTo("(null)")));
}

TEST_F(Lookup, AReasonCannotDriveTheTerminal) {
    EXPECT_THAT(stapleWith(R"({"records":[{"reason":"a\u001b[2Jb\nc\u009b"}]})"),
                FoundNoTicketBecause(failedDueTo("a\\x1b[2Jb\\nc\\xc2\\x9b")));
}

TEST_F(Lookup, AReasonOfAnotherKindIsPrintedAsItIs) {
    EXPECT_THAT(stapleWith(R"({"records":[{"reason":404}]})"), FoundNoTicketBecause(failedDueTo("404")));
    EXPECT_THAT(stapleWith(R"({"records":[{"reason":null}]})"), FoundNoTicketBecause(failedDueTo("<null>")));
}

TEST_F(Lookup, AnErrorStatusWithAJSONBodyIsReadLikeAnyOther) {
    Response missing = answer(R"({"serverErrorCode":"NOT_FOUND"})");
    missing.status = 404;
    serve(missing);
    EXPECT_THAT(staple(), FoundNoTicketBecause(failedDueTo("(null)")));
}

TEST_F(Lookup, TheStatusOfAResponseWithATicketDoesNotMatter) {
    for (const int status : {404, 500, 203}) {
        Response odd = answer(inlineRecord(ticket()));
        odd.status = status;
        serve(odd);
        EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked))) << status;
    }
}

TEST_F(Lookup, ABodyThatIsNotJSONIsAResponseWithoutRecords) {
    for (const std::string body :
         {"<html>Moved</html>", "{\"records\":", "\"text\"", "7", "null", "\xff\xfe", "{} {}"})
        EXPECT_THAT(stapleWith(body), FoundNoTicketBecause(failedDueTo("(null)"))) << body;
    EXPECT_THAT(stapleWith(std::string(1, '\0')), FoundNoTicketBecause(failedDueTo("(null)")));
}

TEST_F(Lookup, ADocumentNestedBeyondMeasureIsNotJSON) {
    EXPECT_THAT(stapleWith(std::string(1000000, '[')), FoundNoTicketBecause(failedDueTo("(null)")));
    EXPECT_THAT(stapleWith(std::string(100000, '[') + std::string(100000, ']')),
                FoundNoTicketBecause(failedDueTo("(null)")));
}

TEST_F(Lookup, AnUnexpectedShapeIsReported) {
    for (const char* body : {
             "[]",
             R"({"records":[]})",
             R"({"records":{}})",
             R"({"records":"text"})",
             R"({"records":7})",
             R"({"records":null})",
             R"({"records":[7]})",
             R"({"records":["text"]})",
             R"({"records":[null]})",
             R"({"records":[[]]})",
             R"({"records":[{"fields":"text"}]})",
             R"({"records":[{"fields":[]}]})",
             R"({"records":[{"fields":{"signedTicket":"text"}}]})",
             R"({"records":[{"fields":{"signedTicket":{"value":null}}}]})",
             R"({"records":[{"fields":{"signedTicket":{"value":7}}}]})",
             R"({"records":[{"fields":{"signedTicket":{"value":["text"]}}}]})",
             R"({"records":[{"fields":{"signedTicketAsset":"text"}}]})",
             R"({"records":[{"fields":{"signedTicketAsset":{"value":"text"}}}]})",
             R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":7,"size":1}}}}]})",
             R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":null}}}}]})",
         })
        EXPECT_THAT(stapleWith(body), FoundNoTicketBecause(unexpectedShape())) << body;
    expectUntouched();
}

TEST_F(Lookup, OnlyTheFirstRecordIsLookedAt) {
    const std::string second = inlineRecord(ticket()).substr(std::string(R"({"records":[)").size());
    EXPECT_THAT(stapleWith(R"({"records":[{"reason":"first"},)" + second),
                FoundNoTicketBecause(failedDueTo("first")));
}

TEST_F(Lookup, AnEmptyDownloadURLIsNone) {
    EXPECT_THAT(
        stapleWith(
            R"({"records":[{"reason":"why","fields":{"signedTicketAsset":{"value":{"downloadURL":""}}}}]})"),
        FoundNoTicketBecause(failedDueTo("why")));
}

// Inline tickets.

TEST_F(Lookup, ATicketThatIsNotStrictBase64IsNone) {
    std::string wrapped = base::encodeBase64(ticket());
    wrapped.insert(76, R"(\r\n)");  // as JSON writes a line break
    for (const std::string& text : {std::string("?"), std::string("QUJD="), std::string("QUI"),
                                    std::string("QUJ-"), std::string(" QUJD"), std::string(), wrapped}) {
        EXPECT_THAT(stapleWith(R"({"records":[{"fields":{"signedTicket":{"value":")" + text + R"("}}}]})"),
                    Ended(65, ElementsAre(processing(), noTicketLine(), stapleFailed(65))))
            << text;
    }
    expectUntouched();
}

TEST_F(Lookup, AnInlineTicketIsPreferredToAnAsset) {
    const std::string url = service().url("/${f}");
    EXPECT_THAT(
        stapleWith(R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":")" + url +
                   R"(","size":7}},"signedTicket":{"value":")" + base::encodeBase64(ticket()) + R"("}}}]})"),
        Ended(0, ElementsAre(processing(), processing(), kWorked)));
    EXPECT_EQ(service().requests().size(), 1U);
}

// The request identifier, and the file it names.

TEST_F(Lookup, TheRequestIdentifierNamesTheTicketFile) {
    serveTicket(ticket());
    ASSERT_EQ(staple().exitStatus, 0);
    EXPECT_THAT(temporaryFiles(), ElementsAre("REQUEST.ticket"));
    EXPECT_EQ(readFile(temporaryPath("REQUEST.ticket")), base::toString(*stapled()));
    struct stat status {};
    ASSERT_EQ(stat(temporaryPath("REQUEST.ticket").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0600U);
}

TEST_F(Lookup, TheIdentifiersHeaderIsFoundInAnySpelling) {
    Response response = answer(inlineRecord(ticket()));
    response.headers = {{"x-OSTREL-request-uuid", "ODD"}};
    serve(response);
    ASSERT_EQ(staple().exitStatus, 0);
    EXPECT_THAT(temporaryFiles(), ElementsAre("ODD.ticket"));
}

TEST_F(Lookup, WithoutAnIdentifierTheTicketFileHasAUniqueName) {
    serve({.body = inlineRecord(ticket())});
    ASSERT_EQ(staple().exitStatus, 0);
    ASSERT_EQ(staple().exitStatus, 0);
    EXPECT_THAT(temporaryFiles(), AllOf(SizeIs(2), Each(MatchesRegex(kUniqueName))));
}

TEST_F(Lookup, AnIdentifierThatCannotBeAFileNameCountsAsAbsent) {
    const std::vector<std::string> hostile{"",
                                           ".",
                                           "..",
                                           "../escape",
                                           "/absolute",
                                           "a/b",
                                           "a\tb",
                                           "a\x7f"
                                           "b",
                                           std::string(201, 'a')};
    for (const std::string& identifier : hostile) {
        Response response = answer(inlineRecord(ticket()));
        response.headers = {{"X-Ostrel-Request-UUID", identifier}};
        serve(response);
        EXPECT_EQ(staple().exitStatus, 0) << identifier;
    }
    EXPECT_THAT(temporaryFiles(), AllOf(SizeIs(hostile.size()), Each(MatchesRegex(kUniqueName))));
    EXPECT_FALSE(std::filesystem::exists(directory / "escape.ticket"));
}

TEST_F(Lookup, ALongIdentifierThatFitsIsTaken) {
    Response response = answer(inlineRecord(ticket()));
    response.headers = {{"X-Ostrel-Request-UUID", std::string(200, 'a')}};
    serve(response);
    EXPECT_EQ(staple().exitStatus, 0);
    EXPECT_THAT(temporaryFiles(), ElementsAre(std::string(200, 'a') + ".ticket"));
}

TEST_F(Lookup, NothingIsWrittenThroughALinkInTheTicketFilesPlace) {
    const std::string victim = directory / "victim";
    writeFile(victim, std::string_view("precious"));
    std::filesystem::create_symlink(victim, temporaryPath("REQUEST.ticket"));
    serveTicket(ticket());
    EXPECT_EQ(staple().exitStatus, 0);
    EXPECT_EQ(readFile(victim), "precious");
    EXPECT_TRUE(
        std::filesystem::is_regular_file(std::filesystem::symlink_status(temporaryPath("REQUEST.ticket"))));
}

// Before the network.

TEST_F(Lookup, AFileWithoutATicketIsNotLookedUpToValidateIt) {
    service();
    EXPECT_THAT(validate(),
                Ended(65, ElementsAre(processing(), "Sample.app does not have a ticket stapled to it.")));
    EXPECT_THAT(service().connections(), IsEmpty());
}

TEST_F(Lookup, AnEmptyTicketFileIsNone) {
    stapleByHand({});
    service();
    EXPECT_THAT(validate(),
                Ended(65, ElementsAre(processing(), "Sample.app does not have a ticket stapled to it.")));
    EXPECT_THAT(service().connections(), IsEmpty());
}

TEST_F(Lookup, AStapledTicketThatIsRevokedEndsTheRun) {
    stapleByHand(revokedTicket());
    service();
    EXPECT_THAT(
        validate(),
        Ended(77, ElementsAre(
                      processing(),
                      "The ticket for Sample.app has been revoked. Tollmark will prevent it from running.")));
    EXPECT_THAT(service().connections(), IsEmpty());
}

TEST_F(Lookup, AStapledTicketThatIsRefusedEndsTheRunInSilence) {
    service();
    for (const Data& stapledTicket : {ticketForOthers(), base::toData("garbage"), Data(1)}) {
        stapleByHand(stapledTicket);
        EXPECT_THAT(validate(), Ended(65, ElementsAre(processing())));
    }
    EXPECT_THAT(service().connections(), IsEmpty());
}

}  // namespace
}  // namespace pinwell::test
