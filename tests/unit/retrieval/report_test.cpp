// The report on an artefact.
#include "retrieval/report.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "foundation/json.h"

namespace pinwell::test {
namespace {

using retrieval::Cause;
using retrieval::Report;
using testing::HasSubstr;
using testing::Not;

Report reportOf(Cause cause, int status) {
    return {.path = "a.dmg",
            .operation = "staple",
            .kind = retrieval::Kind::diskImage,
            .recordName = "2/2/ab",
            .exitStatus = status,
            .cause = cause,
            .attempts = 2,
            .seconds = 0.5,
            .messages = {"Processing: a.dmg", "the last words"},
            .file = std::nullopt};
}

TEST(ReportAsText, IsTheLastMessageOfTheTool) {
    EXPECT_EQ(asText(reportOf(Cause::notIssued, 65), false, false), "a.dmg: the last words (notIssued)");
    EXPECT_EQ(asText(reportOf(Cause::worked, 0), false, false), "a.dmg: the last words");
}

TEST(ReportAsText, HasItsOwnTextIfTheToolWouldPrintNothing) {
    Report report = reportOf(Cause::timedOut, 68);
    report.messages.clear();
    EXPECT_EQ(asText(report, false, false),
              "a.dmg: The staple and validate action failed! Error 68. (timedOut)");
    report.cause = Cause::worked;
    report.exitStatus = 0;
    EXPECT_EQ(asText(report, false, false), "a.dmg: The staple and validate action worked!");
}

TEST(ReportAsText, HoldsNoControlCharactersOfAPath) {
    Report report = reportOf(Cause::worked, 0);
    report.path = "a\n\x1b[31mb";
    EXPECT_THAT(asText(report, false, false), Not(HasSubstr("\x1b")));
    EXPECT_THAT(asText(report, false, false), Not(HasSubstr("\n")));
}

TEST(ReportAsText, IsColouredOnlyOnRequest) {
    EXPECT_THAT(asText(reportOf(Cause::worked, 0), false, true), HasSubstr("\x1b[32m"));
    EXPECT_THAT(asText(reportOf(Cause::revoked, 77), false, true), HasSubstr("\x1b[31m"));
    EXPECT_THAT(asText(reportOf(Cause::revoked, 77), false, false), Not(HasSubstr("\x1b")));
}

TEST(ReportAsText, OfAVerboseRunHasAllMessagesBefore) {
    EXPECT_EQ(asText(reportOf(Cause::worked, 0), true, false),
              "  Processing: a.dmg\n  the last words\na.dmg: the last words");
}

TEST(ReportAsJson, IsOneLineWhateverThePathHolds) {
    Report report = reportOf(Cause::worked, 0);
    report.path = "a\n\"\\\xff\x01";
    const std::string line = asJson(report);
    EXPECT_THAT(line, Not(HasSubstr("\n")));
    const auto document = foundation::parseJSON(foundation::asBytes(line));
    ASSERT_TRUE(document);
    EXPECT_EQ(*(*document)["path"].string(), "a\n\"\\\xef\xbf\xbd\x01");
}

TEST(ReportAsJson, HasNullForUnknownValues) {
    Report report;
    report.operation = "fetch";
    EXPECT_EQ(
        asJson(report),
        R"({"path":null,"operation":"fetch","kind":null,"recordName":null,"exitStatus":0,"cause":"worked",)"
        R"("attempts":0,"seconds":0.0,"messages":[]})");
}

}  // namespace
}  // namespace pinwell::test
