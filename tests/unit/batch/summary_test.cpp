// The summary of all artefacts at the end.
#include <gtest/gtest.h>

#include "batch/report.h"

namespace pinwell::test {
namespace {

using batch::Report;
using batch::Summary;
using retrieval::Cause;

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

}  // namespace
}  // namespace pinwell::test
