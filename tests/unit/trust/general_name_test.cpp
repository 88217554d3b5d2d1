#include "trust/general_name.h"

#include <gtest/gtest.h>

#include "elements.h"

namespace pinwell::trust {
namespace {

using base::Data;

struct HostRow {
    const char* title;
    std::string presented;
    std::string host;
    bool covers;
};

class DnsName : public testing::TestWithParam<HostRow> {};

TEST_P(DnsName, IsMatchedAsStated) {
    const HostRow& row = GetParam();
    EXPECT_EQ(coversHost({{row.presented}, {}}, row.host), row.covers)
        << row.presented << " for " << row.host;
}

INSTANTIATE_TEST_SUITE_P(
    HostName, DnsName,
    testing::Values(
        HostRow{"Same", "api.lumora.example", "api.lumora.example", true},
        HostRow{"OtherCase", "API.Lumora.example", "api.lumora.EXAMPLE", true},
        HostRow{"DotAtTheHostsEnd", "api.lumora.example", "api.lumora.example.", true},
        HostRow{"TwoDotsAtTheHostsEnd", "api.lumora.example", "api.lumora.example..", false},
        HostRow{"DotAtThePresentedEnd", "api.lumora.example.", "api.lumora.example", false},
        HostRow{"SingleLabel", "localhost", "localhost", true},
        HostRow{"OtherName", "www.lumora.example", "api.lumora.example", false},
        HostRow{"ParentDoesNotCoverChild", "lumora.example", "api.lumora.example", false},
        HostRow{"ChildDoesNotCoverParent", "api.lumora.example", "lumora.example", false},
        HostRow{"SuffixOfALabel", "api.lumora.example", "xapi.lumora.example", false},
        HostRow{"Wildcard", "*.lumora.example", "api.lumora.example", true},
        HostRow{"WildcardAndTrailingDot", "*.lumora.example", "api.lumora.example.", true},
        HostRow{"WildcardTwoLabelsDeep", "*.lumora.example", "a.api.lumora.example", false},
        HostRow{"WildcardNotTheParent", "*.lumora.example", "lumora.example", false},
        HostRow{"WildcardNotLeftmost", "api.*.example", "api.lumora.example", false},
        HostRow{"WildcardPartOfALabel", "a*.lumora.example", "api.lumora.example", false},
        HostRow{"WildcardTwice", "*.*.example", "api.lumora.example", false},
        HostRow{"WildcardOverATopLevel", "*.example", "lumora.example", false},
        HostRow{"WildcardAlone", "*", "localhost", false},
        HostRow{"WildcardForAnAddress", "*.0.0.1", "127.0.0.1", false},
        HostRow{"AddressWrittenAsDnsName", "127.0.0.1", "127.0.0.1", false},
        HostRow{"ZeroByteInThePresentedName", std::string("api.lumora.example\0.evil.example", 31),
                "api.lumora.example", false},
        HostRow{"ZeroByteInTheHost", "api.lumora.example", std::string("api.lumora.example\0", 19), false},
        HostRow{"EmptyHost", "", "", false}, HostRow{"DotAlone", ".", ".", false},
        HostRow{"WildcardAsHost", "*.lumora.example", "*.lumora.example", false},
        HostRow{"LabelTooLong", std::string(64, 'a') + ".example", std::string(64, 'a') + ".example", false}),
    [](const auto& row) { return row.param.title; });

const AlternativeNames kLoopback{
    {}, {bytes({127, 0, 0, 1}), bytes({0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1})}};

TEST(HostAddress, IsMatchedByteForByte) {
    EXPECT_TRUE(coversHost(kLoopback, "127.0.0.1"));
    EXPECT_FALSE(coversHost(kLoopback, "127.0.0.2"));
}

TEST(HostAddress, MayBeSixteenBytesWithOrWithoutBrackets) {
    EXPECT_TRUE(coversHost(kLoopback, "::1"));
    EXPECT_TRUE(coversHost(kLoopback, "[::1]"));
    EXPECT_TRUE(coversHost(kLoopback, "0:0:0:0:0:0:0:1"));
    EXPECT_FALSE(coversHost(kLoopback, "::2"));
    EXPECT_FALSE(coversHost(kLoopback, "[127.0.0.1]"));
}

TEST(HostAddress, OfTheOtherFamilyIsNotTheSame) {
    EXPECT_FALSE(coversHost(kLoopback, "::ffff:127.0.0.1"));
}

TEST(HostAddress, DoesNotCoverANameThatResolvesToIt) {
    EXPECT_FALSE(coversHost(kLoopback, "localhost"));
}

}  // namespace
}  // namespace pinwell::trust
