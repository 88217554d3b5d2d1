#include "inspect/report.h"

#include <gtest/gtest.h>

namespace pinwell::inspect {
namespace {

TEST(AlgorithmName, IsKnownForEveryDigestTypeOfATicket) {
    EXPECT_EQ(algorithmName(0), "unnamed");
    EXPECT_EQ(algorithmName(1), "SHA-1");
    EXPECT_EQ(algorithmName(2), "SHA-256");
    EXPECT_EQ(algorithmName(3), "SHA-256 cut");
    EXPECT_EQ(algorithmName(4), "SHA-384");
    EXPECT_EQ(algorithmName(5), "unknown");
}

TEST(CpuTypeName, IsTheNumberForAnUnknownType) {
    EXPECT_EQ(cpuTypeName(0x0100000C), "64-bit ARM");
    EXPECT_EQ(cpuTypeName(0x01000007), "64-bit x86");
    EXPECT_EQ(cpuTypeName(7), "CPU type 0x00000007");
}

TEST(TrailerTypeName, IsUnknownExceptForTicketAndTerminator) {
    EXPECT_EQ(trailerTypeName(1), "terminator");
    EXPECT_EQ(trailerTypeName(2), "ticket");
    EXPECT_EQ(trailerTypeName(3), "unknown");
}

TEST(TimeText, EndsWithTheYear9999) {
    EXPECT_EQ(timeText(0), "1970-01-01 00:00:00 +0000");
    EXPECT_EQ(timeText(253'402'300'799), "9999-12-31 23:59:59 +0000");
    EXPECT_EQ(timeText(253'402'300'800), std::nullopt);
    EXPECT_EQ(timeText(~0ULL), std::nullopt);
}

}  // namespace
}  // namespace pinwell::inspect
