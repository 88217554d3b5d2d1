// The lookup of the ticket's record: the request, and every possible response of the service.
#include <gtest/gtest.h>

#include <filesystem>

#include "base/bytes.h"
#include "base/text.h"
#include "src/messages.h"
#include "support/controller_run.h"
#include "support/message_capture.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell {
namespace {

using base::Data;
using test::ControllerRun;
using test::MessageCapture;
using test::unsignedTicket;
using values::Value;

class Lookup : public testing::Test {
  protected:
    bool grab(std::uint8_t operation = kOperationStaple) {
        run.controller.setOperation(operation);
        return run.controller.grabTicket();
    }
    std::string url() const { return run.request().url->absoluteString(); }

    const std::string noTicketLine =
        std::string("Could not find base64 encoded ticket in response for ") + ControllerRun::kPrettyHash;
    const std::string badShapeLine =
        std::string("Lumora query for ") + ControllerRun::kPrettyHash + " did not return expected JSON data.";
    const std::string failedStapleLine = "The staple and validate action failed! Error 65.";

    ControllerRun run;
};

TEST_F(Lookup, PostsTheRecordNameAsCompactJSON) {
    ASSERT_TRUE(grab());
    EXPECT_EQ(run.request().method, "POST");
    EXPECT_EQ(base::toString(run.request().body),
              R"({"records":[{"recordName":"2/2/abababababababababababababababababababab"}]})");
    EXPECT_EQ(run.request().headers, (https::Headers{{"Content-Type", "application/json"}}));
    EXPECT_EQ(run.platform.https.sessions[0]->dataTasks[0]->state(), https::TaskState::running);
}

TEST_F(Lookup, UsesThePlatformsHostAndTheDefaultContainerInProduction) {
    test::writeFile(run.platform.directory / "platform/platform.json",
                    std::string_view(R"({"lumora":{"host":"localhost:8443"}})"));
    ASSERT_TRUE(grab());
    EXPECT_EQ(
        url(),
        "https://localhost:8443/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup");
}

TEST_F(Lookup, UsesTheBuiltInHostIfThePlatformNamesNone) {
    ASSERT_TRUE(grab());
    EXPECT_EQ(url(),
              "https://api.lumora.example/database/1/com.ostrel.tm.ticket-delivery/production/public/"
              "records/lookup");
}

TEST_F(Lookup, ListensToUserDefaultsOnAnInternalBuildOnly) {
    run.platform.userDefaults.domains["com.ostrel.tm.pinwell"] = {{"lm-container", "com.example.other"},
                                                                  {"lm-production", false}};
    ASSERT_TRUE(grab());
    EXPECT_NE(url().find("/com.ostrel.tm.ticket-delivery/production/"), std::string::npos);
}

TEST_F(Lookup, TakesContainerAndEnvironmentFromUserDefaultsOnAnInternalBuild) {
    test::writeFile(run.platform.directory / "platform/internal-security-policies", std::string_view());
    run.platform.userDefaults.domains["com.ostrel.tm.pinwell"] = {{"lm-container", "com.example.other"},
                                                                  {"lm-production", false}};
    ASSERT_TRUE(grab());
    EXPECT_NE(url().find("/database/1/com.example.other/development/public/records/lookup"),
              std::string::npos);
}

TEST_F(Lookup, FallsBackToTheRegisteredDefaultsValueByValue) {
    test::writeFile(run.platform.directory / "platform/internal-security-policies", std::string_view());
    run.platform.userDefaults.domains["com.ostrel.tm.pinwell"] = {{"lm-production", false}};
    ASSERT_TRUE(grab());
    EXPECT_NE(url().find("/com.ostrel.tm.ticket-delivery/development/"), std::string::npos);
}

TEST_F(Lookup, AContainerThatIsNoURLTextIsPercentEncoded) {
    test::writeFile(run.platform.directory / "platform/internal-security-policies", std::string_view());
    run.platform.userDefaults.domains["com.ostrel.tm.pinwell"] = {{"lm-container", "two words?"}};
    ASSERT_TRUE(grab());
    EXPECT_NE(url().find("/database/1/two%20words%3F/production/"), std::string::npos);
}

TEST_F(Lookup, ARecordNameOfAlgorithm0HasVersion1AndNoAlgorithm) {
    run.platform.codeSigning.information->digestAlgorithm.reset();
    ASSERT_TRUE(grab());
    EXPECT_EQ(base::toString(run.request().body),
              R"({"records":[{"recordName":"1/abababababababababababababababababababab"}]})");
}

TEST_F(Lookup, ARecordNameOfAFortyEightByteHashHoldsAllOfIt) {
    run.platform.codeSigning.information->unique = Data(48, std::byte{0x0F});
    run.platform.codeSigning.information->digestAlgorithm = 4;
    ASSERT_TRUE(grab());
    const Value body = *values::parseJSON(run.request().body);
    std::string hex;
    for (int i = 0; i < 48; ++i) hex += "0f";
    EXPECT_EQ(body["records"][std::size_t{0}]["recordName"], Value("2/4/" + hex));
}

TEST_F(Lookup, VerboseRunShowsTheBodyObjectAndTheHeaders) {
    const MessageCapture output(kVerbosityVerbose);
    ASSERT_TRUE(grab());
    EXPECT_NE(output.text().find("JSON Data is {\n    records = (\n        {\n            recordName = "
                                 "2/2/abababababababababababababababababababab;\n        }\n    );\n}\n"),
              std::string::npos);
    EXPECT_NE(output.text().find(" Headers: {\n    Content-Type = application/json;\n}\n"),
              std::string::npos);
}

TEST_F(Lookup, WithoutACDHashEndsWith66BeforeTheNetwork) {
    run.platform.codeSigning.validity = codesign::kUnsigned;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(grab());
    EXPECT_TRUE(output.contains("Cannot download ticket. CDHash must be set."));
    EXPECT_EQ(run.file->appropriateExitCode(), 66);
    EXPECT_TRUE(run.platform.https.sessions.empty());
}

TEST_F(Lookup, WithoutAFileURLEndsWith66BeforeTheNetwork) {
    struct Nowhere : PWHashedFile {
        using PWHashedFile::PWHashedFile;
        std::optional<Data> _cdHash() override { return ControllerRun::fileHash(); }
    };
    const auto file = std::make_shared<Nowhere>(std::nullopt, run.platform.services());
    DownloadDelegate controller(file, run.platform.services());
    controller.setOperation(kOperationStaple);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(controller.grabTicket());
    EXPECT_EQ(output.text(), "Cannot download ticket. File Path is required for the given CDHash.\n");
    EXPECT_EQ(file->appropriateExitCode(), 66);
}

TEST_F(Lookup, WithoutEitherReportsBoth) {
    struct Nothing : PWHashedFile {
        using PWHashedFile::PWHashedFile;
        std::optional<Data> _cdHash() override { return std::nullopt; }
    };
    const auto file = std::make_shared<Nothing>(std::nullopt, run.platform.services());
    DownloadDelegate controller(file, run.platform.services());
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(controller.grabTicket());
    EXPECT_EQ(output.lines(), (std::vector<std::string>{
                                  "Cannot download ticket. CDHash must be set.",
                                  "Cannot download ticket. File Path is required for the given CDHash."}));
    EXPECT_EQ(file->appropriateExitCode(), 66);
}

TEST_F(Lookup, ValidateOfAFileWithoutATicketEndsWith65BeforeTheNetwork) {
    const MessageCapture output(kVerbosityNormal);
    EXPECT_FALSE(grab(kOperationValidate));
    EXPECT_EQ(output.text(), "App.app does not have a ticket stapled to it.\n");
    EXPECT_EQ(run.file->appropriateExitCode(), 65);
    EXPECT_TRUE(run.platform.https.sessions.empty());
}

TEST_F(Lookup, AnyOperationButStapleChecksTheStapledTicketFirst) {
    for (const std::uint8_t operation : {std::uint8_t{0}, std::uint8_t{7}}) {
        const MessageCapture output(kVerbosityNormal);
        EXPECT_FALSE(grab(operation));
        EXPECT_EQ(output.text(), "App.app does not have a ticket stapled to it.\n");
    }
    EXPECT_TRUE(run.platform.https.sessions.empty());
}

TEST_F(Lookup, ValidateOfARevokedStapledTicketReportsItWith77) {
    run.staple(unsignedTicket({ControllerRun::fileHash()}, 1));
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.platform.exitStatusOf([&] { grab(kOperationValidate); }), 77);
    EXPECT_EQ(output.text(),
              "The ticket for App.app has been revoked. Tollmark will prevent it from running.\n");
    EXPECT_TRUE(run.platform.https.sessions.empty());
}

TEST_F(Lookup, ValidateOfAnotherRefusedStapledTicketEndsWith65InSilence) {
    run.staple(unsignedTicket({Data(20, std::byte{1})}));
    const MessageCapture output(kVerbosityNormal);
    EXPECT_FALSE(grab(kOperationValidate));
    EXPECT_EQ(output.text(), "");
    EXPECT_EQ(run.file->appropriateExitCode(), 65);
    EXPECT_TRUE(run.platform.https.sessions.empty());
}

TEST_F(Lookup, ValidateWithAGoodStapledTicketStillAsksTheService) {
    run.staple(unsignedTicket({ControllerRun::fileHash()}));
    ASSERT_TRUE(grab(kOperationValidate));
    EXPECT_EQ(run.answer(ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()}))), 0);
}

TEST_F(Lookup, ValidateFailsWhenTheServicesTicketFailsThoughTheStapledOnePassed) {
    run.staple(unsignedTicket({ControllerRun::fileHash()}));
    ASSERT_TRUE(grab(kOperationValidate));
    EXPECT_EQ(run.answer(ControllerRun::inlineAnswer(unsignedTicket({Data(20, std::byte{1})}))), 65);
}

TEST_F(Lookup, ATicketRevokedSinceStaplingIsCaughtOnline) {
    run.staple(unsignedTicket({ControllerRun::fileHash()}));
    ASSERT_TRUE(grab(kOperationValidate));
    EXPECT_EQ(run.answer(ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()}, 1))), 77);
}

TEST_F(Lookup, StapleOfAGoodResponseWritesTheTicketAndWorks) {
    ASSERT_TRUE(grab());
    const Data ticket = unsignedTicket({ControllerRun::fileHash()});
    EXPECT_EQ(run.answer(ControllerRun::inlineAnswer(ticket)), 0);
    EXPECT_EQ(test::readFile(run.stapledPath()), base::toString(ticket));
}

TEST_F(Lookup, ABrokenPlatformFileIsATransportErrorThatNamesIt) {
    test::writeFile(run.platform.directory / "platform/platform.json", std::string_view("[1, 2"));
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.platform.exitStatusOf([&] { grab(); }), 68);
    const auto lines = output.lines();
    ASSERT_EQ(lines.size(), 3U);
    EXPECT_EQ(lines[0].find("error is Error Domain="), 0U);
    EXPECT_NE(lines[0].find("platform/platform.json"), std::string::npos);
    EXPECT_EQ(lines[1], "Lumora's response is inconsistent with expections: (null)");
    EXPECT_EQ(lines[2], "The staple and validate action failed! Error 68.");
    EXPECT_TRUE(run.platform.https.sessions.empty());
}

TEST_F(Lookup, ATransportErrorEndsWith68) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.fail(Error("URLErrorDomain", 4, "no connection")), 68);
    EXPECT_EQ(output.lines(),
              (std::vector<std::string>{"error is Error Domain=URLErrorDomain Code=4 \"no connection\"",
                                        "Lumora's response is inconsistent with expections: (null)",
                                        "The staple and validate action failed! Error 68."}));
}

TEST_F(Lookup, AnEmptyBodyEndsWith68) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.answer(""), 68);
    EXPECT_EQ(output.lines()[0].find("Lumora's response is inconsistent with expections: "), 0U);
}

TEST_F(Lookup, AResponseThatIsNotHTTPEndsWith68) {
    ASSERT_TRUE(grab());
    const auto completion = run.platform.https.sessions[0]->completions[0];
    EXPECT_EQ(run.platform.exitStatusOf([&] { completion(base::toData("{}"), std::nullopt, std::nullopt); }),
              68);
}

TEST_F(Lookup, TheStatusCodeIsNeverLookedAt) {
    ASSERT_TRUE(grab());
    EXPECT_EQ(run.answer(ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()})), {}, 500),
              0);
}

TEST_F(Lookup, A404WithAJSONErrorHasNoReasonAndNoTicket) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.answer(R"({"error":"not found"})", {}, 404), 65);
    EXPECT_EQ(output.lines(),
              (std::vector<std::string>{std::string("Lumora query for App.app (") +
                                            ControllerRun::kPrettyHash + ") failed due to \"(null)\".",
                                        noTicketLine, failedStapleLine}));
}

TEST_F(Lookup, AnUnknownRecordsReasonIsPrinted) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.answer(R"({"records":[{"recordName":"x","reason":"Record not found"}]})"), 65);
    EXPECT_EQ(output.lines(), (std::vector<std::string>{std::string("Lumora query for App.app (") +
                                                            ControllerRun::kPrettyHash +
                                                            ") failed due to \"Record not found\".",
                                                        noTicketLine, failedStapleLine}));
}

TEST_F(Lookup, ABodyThatIsNoJSONHasNoTicket) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.answer("<html>"), 65);
    EXPECT_EQ(output.lines()[0], std::string("Lumora query for App.app (") + ControllerRun::kPrettyHash +
                                     ") failed due to \"(null)\".");
}

TEST_F(Lookup, AnUnexpectedShapeIsReportedOnceAndEndsWith65) {
    for (const char* body : {
             R"({"records":[]})",
             R"({"records":{}})",
             R"({"records":"text"})",
             R"({"records":null})",
             R"([])",
             R"({"records":[null]})",
             R"({"records":["text"]})",
             R"({"records":[{"fields":"text"}]})",
             R"({"records":[{"fields":null}]})",
             R"({"records":[{"fields":{"signedTicket":{"value":null}}}]})",
             R"({"records":[{"fields":{"signedTicket":{"value":7}}}]})",
             R"({"records":[{"fields":{"signedTicket":[]}}]})",
             R"({"records":[{"fields":{"signedTicketAsset":{"value":null}}}]})",
             R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":7}}}}]})",
         }) {
        ControllerRun another;
        another.controller.setOperation(kOperationStaple);
        ASSERT_TRUE(another.controller.grabTicket());
        const MessageCapture output(kVerbosityNormal);
        EXPECT_EQ(another.answer(body), 65) << body;
        EXPECT_EQ(output.lines(), (std::vector<std::string>{badShapeLine, noTicketLine, failedStapleLine}))
            << body;
    }
}

TEST_F(Lookup, AnInlineTicketThatIsNoBase64IsNoTicketAndNoException) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.answer(R"({"records":[{"fields":{"signedTicket":{"value":"not base64!"}}}]})"), 65);
    EXPECT_EQ(output.lines(), (std::vector<std::string>{noTicketLine, failedStapleLine}));
}

TEST_F(Lookup, AnInlineTicketThatIsNoBase64StartsNoDownload) {
    ASSERT_TRUE(grab());
    EXPECT_EQ(run.answer(R"({"records":[{"fields":{"signedTicket":{"value":"not base64!"},
                            "signedTicketAsset":{"value":{"downloadURL":"https://a.example/","size":7}}}}]})"),
              65);
    EXPECT_EQ(run.platform.https.sessions.size(), 1U);
}

TEST_F(Lookup, AnAssetOfTheWrongShapeSpoilsAnInlineTicketButItsURLIsNotLookedAt) {
    const std::string ticket = base::encodeBase64(unsignedTicket({ControllerRun::fileHash()}));
    const auto withAsset = [&](const std::string& asset) {
        return R"({"records":[{"fields":{"signedTicket":{"value":")" + ticket +
               R"("},"signedTicketAsset":{"value":)" + asset + "}}}]}";
    };
    ASSERT_TRUE(grab());
    EXPECT_EQ(run.answer(withAsset(R"({"downloadURL":7})")), 0);

    ControllerRun another;
    another.controller.setOperation(kOperationStaple);
    ASSERT_TRUE(another.controller.grabTicket());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(another.answer(withAsset(R"("text")")), 65);
    EXPECT_EQ(output.lines(), (std::vector<std::string>{badShapeLine, noTicketLine, failedStapleLine}));
}

TEST_F(Lookup, AnInlineTicketWithLineBreaksIsNoTicket) {
    ASSERT_TRUE(grab());
    std::string encoded = base::encodeBase64(unsignedTicket({ControllerRun::fileHash()}));
    encoded.insert(64, "\\n");
    EXPECT_EQ(run.answer(R"({"records":[{"fields":{"signedTicket":{"value":")" + encoded + R"("}}}]})"), 65);
}

TEST_F(Lookup, AnEmptyInlineTicketIsNoTicket) {
    ASSERT_TRUE(grab());
    EXPECT_EQ(run.answer(R"({"records":[{"fields":{"signedTicket":{"value":""}}}]})"), 65);
}

TEST_F(Lookup, AnInlineTicketWinsOverAnAssetWhoseSizeIsStillKept) {
    ASSERT_TRUE(grab());
    const std::string ticket = base::encodeBase64(unsignedTicket({ControllerRun::fileHash()}));
    EXPECT_EQ(
        run.answer(
            R"({"records":[{"fields":{"signedTicket":{"value":")" + ticket +
            R"("},"signedTicketAsset":{"value":{"downloadURL":"https://a.example/${f}","size":77}}}}]})"),
        0);
    EXPECT_EQ(run.controller.largeTicketSize(), Value(77));
    EXPECT_EQ(run.platform.https.sessions.size(), 1U);
}

TEST_F(Lookup, TheTicketFileIsNamedAfterTheRequest) {
    ASSERT_TRUE(grab());
    run.answer(ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()})),
               {{"x-ostrel-request-uuid", "5E0A"}});
    EXPECT_TRUE(std::filesystem::exists(run.platform.directory / "tmp/5E0A.ticket"));
}

TEST_F(Lookup, AMissingOrUnusableRequestIdentifierIsReplacedByAUniqueString) {
    for (const https::Headers& headers : {https::Headers{}, https::Headers{{"X-Ostrel-Request-UUID", ""}},
                                          https::Headers{{"X-Ostrel-Request-UUID", "../../etc/passwd"}},
                                          https::Headers{{"X-Ostrel-Request-UUID", ".."}},
                                          https::Headers{{"X-Ostrel-Request-UUID", std::string(201, 'a')}},
                                          https::Headers{{"X-Ostrel-Request-UUID", "a\tb"}}}) {
        ControllerRun another;
        another.controller.setOperation(kOperationStaple);
        ASSERT_TRUE(another.controller.grabTicket());
        EXPECT_EQ(
            another.answer(ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()})), headers),
            0);
        const std::string name = another.controller.tempFileURL()->lastPathComponent();
        EXPECT_EQ(another.controller.tempFileURL()->deletingLastPathComponent().path(),
                  another.platform.directory / "tmp");
        EXPECT_EQ(name.size(), std::string("00000000-0000-0000-0000-000000000000.ticket").size()) << name;
        EXPECT_TRUE(name.ends_with(".ticket"));
    }
}

TEST_F(Lookup, AResponseWithAnAssetStartsTheDownloadAndEndsNothingYet) {
    ASSERT_TRUE(grab());
    EXPECT_EQ(run.answer(R"({"records":[{"fields":{"signedTicketAsset":{"value":
                            {"downloadURL":"https://assets.example/t/${f}","size":1234}}}}]})"),
              std::nullopt);
    ASSERT_EQ(run.platform.https.sessions.size(), 2U);
    EXPECT_EQ(run.platform.https.sessions[1]->downloadTasks.at(0)->request.url->absoluteString(),
              "https://assets.example/t/lmasset.ticket");
    EXPECT_EQ(run.controller.largeTicketSize(), Value(1234));
}

TEST_F(Lookup, AnAssetURLThatIsNoneEndsWith65) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(
        run.answer(R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":"no url"}}}}]})"),
        65);
    EXPECT_EQ(output.lines(),
              (std::vector<std::string>{"Large ticket was requested from an invalid URL: (null)",
                                        noTicketLine, failedStapleLine}));
}

TEST_F(Lookup, AnEmptyAssetURLCountsAsNone) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.answer(R"({"records":[{"reason":"too large","fields":
                            {"signedTicketAsset":{"value":{"downloadURL":""}}}}]})"),
              65);
    EXPECT_NE(output.lines()[0].find("failed due to \"too large\"."), std::string::npos);
}

TEST_F(Lookup, VerboseRunShowsTheResponseAndItsSize) {
    ASSERT_TRUE(grab());
    const MessageCapture output(kVerbosityVerbose);
    run.answer(R"({"records":[{"reason":"none"}]})");
    EXPECT_EQ(output.lines()[0].find("Response is "), 0U);
    EXPECT_TRUE(output.contains("Size of data is 31"));
    EXPECT_NE(output.text().find("JSON Response is: {\n"), std::string::npos);
}

}  // namespace
}  // namespace pinwell
