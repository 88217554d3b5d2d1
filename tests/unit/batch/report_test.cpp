// The summary of a batch; JUnit reports, and files that they must not take the place of.
#include "batch/report.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>

#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using batch::JUnitReport;
using batch::Report;
using batch::Summary;
using retrieval::Cause;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;

Summary summaryOf(const std::vector<std::pair<Cause, int>>& ends) {
    Summary summary;
    summary.operation = "staple";
    for (const auto& [cause, status] : ends) {
        Report report;
        report.cause = cause;
        report.exitStatus = status;
        summary.count(report);
    }
    return summary;
}

TEST(SummaryOfABatch, CountsCausesAndKeepsTheWorstStatus) {
    Summary summary = summaryOf({{Cause::worked, 0},
                                 {Cause::notIssued, 65},
                                 {Cause::worked, 0},
                                 {Cause::revoked, 77},
                                 {Cause::timedOut, 68}});
    summary.seconds = 1.26;
    EXPECT_EQ(asText(summary), "5 artefacts: 2 worked, 1 notIssued, 1 revoked, 1 timedOut; 1.3 s");
    summary.seconds = 1.5;
    EXPECT_EQ(
        asJson(summary),
        R"({"summary":{"version":1,"operation":"staple","total":5,"worked":2,"failed":3,"resumed":0,)"
        R"("duplicates":0,"causes":{"worked":2,"notIssued":1,"revoked":1,"timedOut":1},"exitStatus":77,)"
        R"("seconds":1.5}})");
}

TEST(SummaryOfABatch, CountsSkippedArtefacts) {
    Summary summary = summaryOf({{Cause::worked, 0}});
    summary.resumed = 3;
    summary.duplicates = 2;
    EXPECT_EQ(asText(summary), "1 artefact: 1 worked; 3 done before; 2 named twice; 0.0 s");
}

TEST(SummaryOfABatch, OfNothingIsEmpty) {
    EXPECT_EQ(asText(summaryOf({})), "0 artefacts; 0.0 s");
}

class JUnit : public testing::Test {
  protected:
    std::string written(const std::vector<Report>& reports) const {
        auto junit = JUnitReport::begin(file);
        EXPECT_TRUE(junit);
        Summary summary;
        summary.operation = "staple";
        for (const Report& report : reports) {
            summary.count(report);
            junit->add(report);
        }
        EXPECT_TRUE(junit->finish(summary));
        return readFile(file);
    }
    static Report reportOf(Cause cause, const std::string& path = "a.dmg",
                           const std::string& message = "why") {
        return {.path = path,
                .operation = "staple",
                .kind = {},
                .recordName = {},
                .exitStatus = cause == Cause::worked ? 0 : 65,
                .cause = cause,
                .attempts = 1,
                .seconds = 1.2345,
                .messages = {message},
                .file = std::nullopt};
    }
    std::size_t filesThere() const {
        return static_cast<std::size_t>(
            std::distance(std::filesystem::directory_iterator(directory.path()), {}));
    }
    TemporaryDirectory directory;
    const std::string file = directory / "report.xml";
};

TEST_F(JUnit, DistinguishesFailuresFromErrors) {
    const std::string text = written({reportOf(Cause::worked), reportOf(Cause::notIssued),
                                      reportOf(Cause::unreachable), reportOf(Cause::timedOut)});
    EXPECT_THAT(text, AllOf(HasSubstr(R"(tests="4" failures="1" errors="2" skipped="0")"),
                            HasSubstr(R"(<failure type="notIssued")"),
                            HasSubstr(R"(<error type="unreachable")"), HasSubstr(R"(time="1.235")")));
}

TEST_F(JUnit, EscapesCharactersWithAMeaningInXml) {
    const std::string text = written({reportOf(Cause::notIssued, "a<b>&\"c\n\x01\xff.dmg", "]]></failure>")});
    EXPECT_THAT(text, AllOf(HasSubstr("a&lt;b&gt;&amp;&quot;c"), HasSubstr("]]&gt;&lt;/failure&gt;"),
                            Not(HasSubstr("\x01")), Not(HasSubstr("\xff"))));
}

TEST_F(JUnit, IsThereAsAWholeOrNotAtAll) {
    const std::string before = "<?xml version=\"1.0\"?><testsuites/>";
    writeFile(file, before);
    {
        auto junit = JUnitReport::begin(file);
        ASSERT_TRUE(junit);
        junit->add(reportOf(Cause::worked));
        EXPECT_EQ(readFile(file), before);
    }
    EXPECT_EQ(readFile(file), before);
    EXPECT_EQ(filesThere(), 1U);
    EXPECT_THAT(written({}), HasSubstr("tests=\"0\""));
    EXPECT_EQ(filesThere(), 1U);
}

TEST_F(JUnit, TakesThePlaceOfNoDeviceAndNoFolder) {
    ASSERT_EQ(::mkfifo((directory / "pipe").c_str(), 0600), 0);
    std::filesystem::create_symlink("nowhere", directory / "link");
    std::filesystem::create_symlink("/dev/null", directory / "device");
    for (const std::string& path : {directory / "pipe", directory / "link", directory / "device",
                                    directory.path(), std::string("/dev/null"), directory / "no/such"})
        EXPECT_FALSE(JUnitReport::begin(path)) << path;
    EXPECT_TRUE(std::filesystem::is_fifo(directory / "pipe"));
    EXPECT_TRUE(std::filesystem::is_symlink(directory / "device"));
    EXPECT_EQ(filesThere(), 3U);
}

// If the argument of an option is forgotten, the option takes the first artefact as its argument.
TEST_F(JUnit, TakesThePlaceOfNoOtherFile) {
    for (const std::string& contents : {std::string("koly"), std::string("<"), std::string("a list\n")}) {
        writeFile(file, contents);
        const auto refused = JUnitReport::begin(file);
        ASSERT_FALSE(refused);
        EXPECT_EQ(refused.error().localizedDescription(), file + " is there already, and is no report.");
        EXPECT_EQ(readFile(file), contents);
    }
    writeFile(file, std::string_view());
    EXPECT_TRUE(JUnitReport::begin(file));
}

TEST_F(JUnit, FollowsALinkToAFile) {
    writeFile(directory / "real.xml", std::string_view());
    std::filesystem::create_symlink("real.xml", file);
    EXPECT_THAT(written({}), HasSubstr("testsuite"));
    EXPECT_TRUE(std::filesystem::is_symlink(file));
    EXPECT_THAT(readFile(directory / "real.xml"), HasSubstr("testsuite"));
}

}  // namespace
}  // namespace pinwell::test
