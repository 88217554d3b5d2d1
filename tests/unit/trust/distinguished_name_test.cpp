#include "trust/distinguished_name.h"

#include <gtest/gtest.h>

#include "elements.h"

namespace pinwell::trust {
namespace {

using base::asBytes;
using base::Data;

constexpr std::uint8_t kUtf8 = 12;
constexpr std::uint8_t kPrintable = 19;
constexpr std::uint8_t kT61 = 20;
constexpr std::uint8_t kUniversal = 28;
constexpr std::uint8_t kBmp = 30;
constexpr std::uint8_t kOctets = 4;

constexpr std::string_view kCommonName("\x06\x03\x55\x04\x03", 5);
constexpr std::string_view kOrganization("\x06\x03\x55\x04\x0A", 5);

Data attribute(std::string_view type, std::uint8_t tag, std::string_view text) {
    return derElement(0x30, joined({base::toData(type), derElement(tag, asBytes(text))}));
}

Data part(const std::vector<Data>& attributes) {
    return derElement(0x31, joined(attributes));
}

/// A name of one common name.
Data common(std::uint8_t tag, std::string_view text) {
    return part({attribute(kCommonName, tag, text)});
}

bool areEqual(const Data& a, const Data& b) {
    return readName(a).canonical == readName(b).canonical;
}

TEST(DistinguishedName, ComparesTextWithoutRegardToItsTypeCaseAndSpaces) {
    const Data name = common(kUtf8, "Ticket Root");
    EXPECT_TRUE(areEqual(name, common(kPrintable, "Ticket Root")));
    EXPECT_TRUE(areEqual(name, common(kT61, "Ticket Root")));
    EXPECT_TRUE(areEqual(name, common(kBmp, std::string_view("\0T\0i\0c\0k\0e\0t\0 \0R\0o\0o\0t", 22))));
    EXPECT_TRUE(areEqual(name, common(kUtf8, "TICKET root")));
    EXPECT_TRUE(areEqual(name, common(kUtf8, "  Ticket \t\n Root ")));
    EXPECT_FALSE(areEqual(name, common(kUtf8, "TicketRoot")));
    EXPECT_FALSE(areEqual(name, common(kUtf8, "Ticket Roots")));
    EXPECT_FALSE(areEqual(name, common(kUtf8, std::string_view("Ticket Root\0", 12))));
}

TEST(DistinguishedName, ComparesLettersBeyondAsciiAsTheyAre) {
    EXPECT_TRUE(areEqual(common(kUtf8, "Caf\xC3\xA9"), common(kT61, "Caf\xE9")));
    EXPECT_TRUE(
        areEqual(common(kUtf8, "\xF0\x9F\x98\x80"), common(kUniversal, std::string_view("\0\1\xF6\0", 4))));
    EXPECT_FALSE(areEqual(common(kUtf8, "caf\xC3\xA9"), common(kUtf8, "caf\xC3\x89")));
}

TEST(DistinguishedName, ComparesOtherValuesByteForByte) {
    EXPECT_TRUE(areEqual(common(kOctets, "a"), common(kOctets, "a")));
    EXPECT_FALSE(areEqual(common(kOctets, "a"), common(kOctets, "A")));
    EXPECT_FALSE(areEqual(common(kOctets, "a"), common(kUtf8, "a")));
}

TEST(DistinguishedName, HasPartsInOrderAndSetsInNone) {
    const Data a = attribute(kCommonName, kUtf8, "a");
    const Data b = attribute(kOrganization, kUtf8, "b");
    EXPECT_FALSE(areEqual(joined({part({a}), part({b})}), joined({part({b}), part({a})})));
    EXPECT_TRUE(areEqual(part({a, b}), part({b, a})));
    EXPECT_FALSE(areEqual(part({a, b}), joined({part({a}), part({b})})));
    EXPECT_FALSE(areEqual(part({a}), part({a, a})));
}

TEST(DistinguishedName, DiffersByTheTypeOfAnAttribute) {
    EXPECT_FALSE(
        areEqual(part({attribute(kCommonName, kUtf8, "a")}), part({attribute(kOrganization, kUtf8, "a")})));
}

TEST(DistinguishedName, IsNotBlurredByWhereItsPartsEnd) {
    const auto two = [](std::string_view first, std::string_view second) {
        return joined({common(kUtf8, first), common(kUtf8, second)});
    };
    EXPECT_FALSE(areEqual(two("ab", "c"), two("a", "bc")));
    EXPECT_FALSE(areEqual(two("a", ""), two("", "a")));
}

TEST(DistinguishedName, MayBeEmpty) {
    EXPECT_TRUE(readName({}).isEmpty);
    EXPECT_EQ(readName({}).summary, "");
    EXPECT_FALSE(readName(common(kUtf8, "")).isEmpty);
    EXPECT_FALSE(areEqual({}, common(kUtf8, "")));
}

TEST(DistinguishedName, IsSummarizedInUtf8) {
    EXPECT_EQ(readName(common(kT61, "Caf\xE9")).summary, "Caf\xC3\xA9");
    EXPECT_EQ(readName(common(kBmp, std::string_view("\x20\xAC", 2))).summary, "\xE2\x82\xAC");
    EXPECT_EQ(readName(common(kUniversal, std::string_view("\0\1\xF6\0", 4))).summary, "\xF0\x9F\x98\x80");
    EXPECT_EQ(readName(common(kOctets, "a")).summary, "");
}

}  // namespace
}  // namespace pinwell::trust
