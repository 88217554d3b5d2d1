#include "trust/host_name.h"

#include <gtest/gtest.h>

namespace pinwell::trust {
namespace {

using foundation::Data;

struct Row {
    const char* title;
    std::string presented;
    std::string host;
    bool covers;
};

class DnsName : public testing::TestWithParam<Row> {};

TEST_P(DnsName, IsMatchedAsStated) {
    const Row& row = GetParam();
    EXPECT_EQ(coversHost({{row.presented}, {}}, row.host), row.covers)
        << row.presented << " for " << row.host;
}

INSTANTIATE_TEST_SUITE_P(
    HostName, DnsName,
    testing::Values(
        Row{"Same", "api.lumora.example", "api.lumora.example", true},
        Row{"OtherCase", "API.Lumora.example", "api.lumora.EXAMPLE", true},
        Row{"DotAtTheHostsEnd", "api.lumora.example", "api.lumora.example.", true},
        Row{"TwoDotsAtTheHostsEnd", "api.lumora.example", "api.lumora.example..", false},
        Row{"DotAtThePresentedEnd", "api.lumora.example.", "api.lumora.example", false},
        Row{"SingleLabel", "localhost", "localhost", true},
        Row{"OtherName", "www.lumora.example", "api.lumora.example", false},
        Row{"ParentDoesNotCoverChild", "lumora.example", "api.lumora.example", false},
        Row{"ChildDoesNotCoverParent", "api.lumora.example", "lumora.example", false},
        Row{"SuffixOfALabel", "api.lumora.example", "xapi.lumora.example", false},
        Row{"Wildcard", "*.lumora.example", "api.lumora.example", true},
        Row{"WildcardAndTrailingDot", "*.lumora.example", "api.lumora.example.", true},
        Row{"WildcardTwoLabelsDeep", "*.lumora.example", "a.api.lumora.example", false},
        Row{"WildcardNotTheParent", "*.lumora.example", "lumora.example", false},
        Row{"WildcardNotLeftmost", "api.*.example", "api.lumora.example", false},
        Row{"WildcardPartOfALabel", "a*.lumora.example", "api.lumora.example", false},
        Row{"WildcardTwice", "*.*.example", "api.lumora.example", false},
        Row{"WildcardOverATopLevel", "*.example", "lumora.example", false},
        Row{"WildcardAlone", "*", "localhost", false},
        Row{"WildcardForAnAddress", "*.0.0.1", "127.0.0.1", false},
        Row{"AddressWrittenAsDnsName", "127.0.0.1", "127.0.0.1", false},
        Row{"ZeroByteInThePresentedName", std::string("api.lumora.example\0.evil.example", 31),
            "api.lumora.example", false},
        Row{"ZeroByteInTheHost", "api.lumora.example", std::string("api.lumora.example\0", 19), false},
        Row{"EmptyHost", "", "", false}, Row{"DotAlone", ".", ".", false},
        Row{"WildcardAsHost", "*.lumora.example", "*.lumora.example", false},
        Row{"LabelTooLong", std::string(64, 'a') + ".example", std::string(64, 'a') + ".example", false}),
    [](const auto& row) { return row.param.title; });

Data address(std::initializer_list<unsigned> values) {
    Data data;
    for (const unsigned value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

const AlternativeNames kLoopback{
    {}, {address({127, 0, 0, 1}), address({0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1})}};

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
