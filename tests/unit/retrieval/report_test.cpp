// Causes and exit statuses, and the report on an artefact.
#include "retrieval/report.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>

#include "values/json.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using retrieval::Cause;
using retrieval::Report;
using testing::HasSubstr;
using testing::Not;

TEST(Cause, HasANameOfItsOwn) {
    std::set<std::string_view> names;
    for (const Cause cause : retrieval::allCauses()) {
        EXPECT_FALSE(nameOf(cause).empty());
        names.insert(nameOf(cause));
    }
    EXPECT_EQ(names.size(), 14U);
}

TEST(Cause, OnlyOneCanBeCured) {
    for (const Cause cause : retrieval::allCauses())
        EXPECT_EQ(isCurable(cause), cause == Cause::unreachable) << nameOf(cause);
}

TEST(ExitStatus, TheWorstOfTwoCounts) {
    const std::vector<int> fromWorst{77, 73, 65, 66, 68, 1, 0};
    for (std::size_t i = 0; i < fromWorst.size(); ++i) {
        for (std::size_t j = i; j < fromWorst.size(); ++j) {
            EXPECT_EQ(retrieval::worseStatus(fromWorst[i], fromWorst[j]), fromWorst[i]);
            EXPECT_EQ(retrieval::worseStatus(fromWorst[j], fromWorst[i]), fromWorst[i]);
        }
    }
}

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
    const auto document = values::parseJSON(base::asBytes(line));
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
