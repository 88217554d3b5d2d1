// The value of each extension, byte by byte.
#include "trust/extensions.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "elements.h"
#include "trust/der.h"

namespace pinwell::trust {
namespace {

using base::Data;
using testing::ElementsAre;
using testing::IsEmpty;

void append(Data& all, const Data& more) {
    base::append(all, more);
}

/// Of the last arc of 2.5.29.
Data extension(unsigned arc, const Data& value) {
    Data contents = bytes({6, 3, 0x55, 0x1D, arc});
    append(contents, derElement(4, value));
    return derElement(0x30, contents);
}

constexpr unsigned kKeyIdentifier = 14;
constexpr unsigned kKeyUsage = 15;
constexpr unsigned kNames = 17;
constexpr unsigned kBasicConstraints = 19;
constexpr unsigned kConstraints = 30;
constexpr unsigned kPolicies = 32;
constexpr unsigned kAuthority = 35;
constexpr unsigned kPurposes = 37;

CertificateExtensions read(unsigned arc, const Data& value) {
    return readExtensions(extension(arc, value));
}

struct ValueRow {
    const char* name;
    unsigned arc;
    bool isMalformed;
    Data value;

    friend void PrintTo(const ValueRow& row, std::ostream* out) { *out << row.name; }
};

class ExtensionValue : public testing::TestWithParam<ValueRow> {};

TEST_P(ExtensionValue, IsReadOrMalformed) {
    const CertificateExtensions extensions = read(GetParam().arc, GetParam().value);
    EXPECT_EQ(!extensions.malformed.empty(), GetParam().isMalformed);
    EXPECT_EQ(extensions.entries.size(), 1U);
}

constexpr bool kGood = false;
constexpr bool kMalformed = true;

// clang-format off
INSTANTIATE_TEST_SUITE_P(BasicConstraints, ExtensionValue, testing::Values(
    ValueRow{"Empty", kBasicConstraints, kGood, bytes({0x30, 0})},
    ValueRow{"Authority", kBasicConstraints, kGood, bytes({0x30, 3, 1, 1, 0xFF})},
    ValueRow{"NoAuthorityWrittenOut", kBasicConstraints, kGood, bytes({0x30, 3, 1, 1, 0})},
    ValueRow{"AuthorityAsAOne", kBasicConstraints, kMalformed, bytes({0x30, 3, 1, 1, 1})},
    ValueRow{"PathLength", kBasicConstraints, kGood, bytes({0x30, 6, 1, 1, 0xFF, 2, 1, 5})},
    ValueRow{"PathLengthOfEightBytes", kBasicConstraints, kGood, bytes({0x30, 14, 1, 1, 0xFF, 2, 9, 0, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF})},
    ValueRow{"PathLengthOfNineBytes", kBasicConstraints, kMalformed, bytes({0x30, 14, 1, 1, 0xFF, 2, 9, 1, 0, 0, 0, 0, 0, 0, 0, 0})},
    ValueRow{"PathLengthNegative", kBasicConstraints, kMalformed, bytes({0x30, 6, 1, 1, 0xFF, 2, 1, 0xFF})},
    ValueRow{"PathLengthWithAZeroInFront", kBasicConstraints, kMalformed, bytes({0x30, 7, 1, 1, 0xFF, 2, 2, 0, 5})},
    ValueRow{"PathLengthOfNoByte", kBasicConstraints, kMalformed, bytes({0x30, 5, 1, 1, 0xFF, 2, 0})},
    ValueRow{"PathLengthBeforeTheRest", kBasicConstraints, kMalformed, bytes({0x30, 6, 2, 1, 5, 1, 1, 0xFF})},
    ValueRow{"AnElementBehind", kBasicConstraints, kMalformed, bytes({0x30, 5, 1, 1, 0xFF, 5, 0})},
    ValueRow{"AByteBehind", kBasicConstraints, kMalformed, bytes({0x30, 0, 0})},
    ValueRow{"ASet", kBasicConstraints, kMalformed, bytes({0x31, 0})},
    ValueRow{"CutShort", kBasicConstraints, kMalformed, bytes({0x30, 3, 1, 1})},
    ValueRow{"ALongLength", kBasicConstraints, kMalformed, bytes({0x30, 0x81, 3, 1, 1, 0xFF})},
    ValueRow{"AnIndefiniteLength", kBasicConstraints, kMalformed, bytes({0x30, 0x80, 1, 1, 0xFF, 0, 0})},
    ValueRow{"Nothing", kBasicConstraints, kMalformed, {}}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(KeyUsage, ExtensionValue, testing::Values(
    ValueRow{"Empty", kKeyUsage, kGood, bytes({3, 1, 0})},
    ValueRow{"Bits", kKeyUsage, kGood, bytes({3, 2, 5, 0xA0})},
    ValueRow{"ZerosAtTheEnd", kKeyUsage, kGood, bytes({3, 2, 0, 0x80})},
    ValueRow{"MoreBitsThanThereAre", kKeyUsage, kGood, bytes({3, 4, 0, 0x80, 0xFF, 0xFF})},
    ValueRow{"AnUnusedBitSet", kKeyUsage, kMalformed, bytes({3, 2, 5, 0xB0})},
    ValueRow{"NineUnusedBits", kKeyUsage, kMalformed, bytes({3, 2, 9, 0x80})},
    ValueRow{"UnusedBitsOfNoByte", kKeyUsage, kMalformed, bytes({3, 1, 5})},
    ValueRow{"NoCount", kKeyUsage, kMalformed, bytes({3, 0})},
    ValueRow{"InPieces", kKeyUsage, kMalformed, bytes({0x23, 4, 3, 2, 5, 0xA0})},
    ValueRow{"AByteBehind", kKeyUsage, kMalformed, bytes({3, 2, 5, 0xA0, 0})}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(Names, ExtensionValue, testing::Values(
    ValueRow{"None", kNames, kGood, bytes({0x30, 0})},
    ValueRow{"EveryForm", kNames, kGood, bytes({0x30, 27, 0xA0, 0, 0x81, 1, 'a', 0x82, 1, 'a', 0xA3, 0, 0xA4, 2, 0x30, 0, 0xA5, 0, 0x86, 0, 0x88, 1, 0x2A, 0x87, 4, 127, 0, 0, 1})},
    ValueRow{"AnAddressOfFiveBytes", kNames, kMalformed, bytes({0x30, 7, 0x87, 5, 1, 2, 3, 4, 5})},
    ValueRow{"AnEmptyAddress", kNames, kMalformed, bytes({0x30, 2, 0x87, 0})},
    ValueRow{"ADnsNameOfEightBits", kNames, kMalformed, bytes({0x30, 3, 0x82, 1, 0xE9})},
    ValueRow{"AMailAddressOfEightBits", kNames, kMalformed, bytes({0x30, 3, 0x81, 1, 0xE9})},
    ValueRow{"ADnsNameWithAZeroByte", kNames, kGood, bytes({0x30, 5, 0x82, 3, 'a', 0, 'b'})},
    ValueRow{"ADnsNameInPieces", kNames, kMalformed, bytes({0x30, 5, 0xA2, 3, 0x16, 1, 'a'})},
    ValueRow{"ADirectoryNameWithoutItsBit", kNames, kMalformed, bytes({0x30, 2, 0x84, 0})},
    ValueRow{"AFormThatThereIsNot", kNames, kMalformed, bytes({0x30, 2, 0x89, 0})},
    ValueRow{"AUniversalTag", kNames, kMalformed, bytes({0x30, 3, 0x16, 1, 'a'})},
    ValueRow{"ASet", kNames, kMalformed, bytes({0x31, 3, 0x82, 1, 'a'})},
    ValueRow{"AByteBehind", kNames, kMalformed, bytes({0x30, 3, 0x82, 1, 'a', 0})}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(Purposes, ExtensionValue, testing::Values(
    ValueRow{"None", kPurposes, kGood, bytes({0x30, 0})},
    ValueRow{"One", kPurposes, kGood, bytes({0x30, 4, 6, 2, 0x2A, 3})},
    ValueRow{"AnEmptyIdentifier", kPurposes, kMalformed, bytes({0x30, 2, 6, 0})},
    ValueRow{"AnIdentifierCutShort", kPurposes, kMalformed, bytes({0x30, 4, 6, 2, 0x2A, 0x83})},
    ValueRow{"SomethingElse", kPurposes, kMalformed, bytes({0x30, 2, 5, 0})},
    ValueRow{"AByteBehind", kPurposes, kMalformed, bytes({0x30, 4, 6, 2, 0x2A, 3, 0})}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(Policies, ExtensionValue, testing::Values(
    ValueRow{"One", kPolicies, kGood, bytes({0x30, 6, 0x30, 4, 6, 2, 0x2A, 3})},
    ValueRow{"WithQualifiers", kPolicies, kGood, bytes({0x30, 8, 0x30, 6, 6, 2, 0x2A, 3, 0x30, 0})},
    ValueRow{"None", kPolicies, kMalformed, bytes({0x30, 0})},
    ValueRow{"APolicyOfNothing", kPolicies, kMalformed, bytes({0x30, 2, 0x30, 0})},
    ValueRow{"QualifiersTwice", kPolicies, kMalformed, bytes({0x30, 10, 0x30, 8, 6, 2, 0x2A, 3, 0x30, 0, 0x30, 0})},
    ValueRow{"Null", kPolicies, kMalformed, bytes({5, 0})}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(KeyIdentifiers, ExtensionValue, testing::Values(
    ValueRow{"Subjects", kKeyIdentifier, kGood, bytes({4, 1, 7})},
    ValueRow{"SubjectsOfNothing", kKeyIdentifier, kGood, bytes({4, 0})},
    ValueRow{"SubjectsInPieces", kKeyIdentifier, kMalformed, bytes({0x24, 3, 4, 1, 7})},
    ValueRow{"SubjectsWithAByteBehind", kKeyIdentifier, kMalformed, bytes({4, 1, 7, 0})},
    ValueRow{"Issuers", kAuthority, kGood, bytes({0x30, 3, 0x80, 1, 7})},
    ValueRow{"IssuersOfNothing", kAuthority, kGood, bytes({0x30, 0})},
    ValueRow{"IssuersNameAndNumber", kAuthority, kGood, bytes({0x30, 11, 0x80, 1, 7, 0xA1, 3, 0x82, 1, 'a', 0x82, 1, 5})},
    ValueRow{"IssuersNumberNotInTheFewestBytes", kAuthority, kMalformed, bytes({0x30, 9, 0xA1, 3, 0x82, 1, 'a', 0x82, 2, 0, 5})},
    ValueRow{"IssuersNumberFirst", kAuthority, kMalformed, bytes({0x30, 6, 0x82, 1, 5, 0x80, 1, 7})},
    ValueRow{"IssuersTwice", kAuthority, kMalformed, bytes({0x30, 6, 0x80, 1, 7, 0x80, 1, 7})},
    ValueRow{"IssuersInPieces", kAuthority, kMalformed, bytes({0x30, 5, 0xA0, 3, 4, 1, 7})}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(NameConstraints, ExtensionValue, testing::Values(
    ValueRow{"Permitted", kConstraints, kGood, bytes({0x30, 7, 0xA0, 5, 0x30, 3, 0x82, 1, 'a'})},
    ValueRow{"Excluded", kConstraints, kGood, bytes({0x30, 7, 0xA1, 5, 0x30, 3, 0x82, 1, 'a'})},
    ValueRow{"OfEveryName", kConstraints, kGood, bytes({0x30, 6, 0xA1, 4, 0x30, 2, 0x82, 0})},
    ValueRow{"WithADotInFront", kConstraints, kGood, bytes({0x30, 8, 0xA0, 6, 0x30, 4, 0x82, 2, '.', 'a'})},
    ValueRow{"OfAnUnhandledForm", kConstraints, kGood, bytes({0x30, 7, 0xA0, 5, 0x30, 3, 0x81, 1, 'a'})},
    ValueRow{"Nothing", kConstraints, kMalformed, bytes({0x30, 0})},
    ValueRow{"PermittedNothing", kConstraints, kMalformed, bytes({0x30, 2, 0xA0, 0})},
    ValueRow{"InTheWrongOrder", kConstraints, kMalformed, bytes({0x30, 14, 0xA1, 5, 0x30, 3, 0x82, 1, 'a', 0xA0, 5, 0x30, 3, 0x82, 1, 'a'})},
    ValueRow{"WithAMinimum", kConstraints, kMalformed, bytes({0x30, 10, 0xA0, 8, 0x30, 6, 0x82, 1, 'a', 0x80, 1, 1})},
    ValueRow{"WithAMinimumOfZeroWrittenOut", kConstraints, kMalformed, bytes({0x30, 10, 0xA0, 8, 0x30, 6, 0x82, 1, 'a', 0x80, 1, 0})},
    ValueRow{"ADotAlone", kConstraints, kMalformed, bytes({0x30, 7, 0xA0, 5, 0x30, 3, 0x82, 1, '.'})},
    ValueRow{"AWildcard", kConstraints, kMalformed, bytes({0x30, 9, 0xA0, 7, 0x30, 5, 0x82, 3, '*', '.', 'a'})},
    ValueRow{"ADotAtTheEnd", kConstraints, kMalformed, bytes({0x30, 8, 0xA1, 6, 0x30, 4, 0x82, 2, 'a', '.'})},
    ValueRow{"AZeroByte", kConstraints, kMalformed, bytes({0x30, 9, 0xA1, 7, 0x30, 5, 0x82, 3, 'a', 0, 'b'})},
    ValueRow{"AddressAndMask", kConstraints, kGood, bytes({0x30, 14, 0xA0, 12, 0x30, 10, 0x87, 8, 10, 0, 0, 0, 255, 240, 0, 0})},
    ValueRow{"AddressWithoutAMask", kConstraints, kMalformed, bytes({0x30, 10, 0xA0, 8, 0x30, 6, 0x87, 4, 10, 0, 0, 0})},
    ValueRow{"AMaskWithAHole", kConstraints, kMalformed, bytes({0x30, 14, 0xA0, 12, 0x30, 10, 0x87, 8, 10, 0, 0, 0, 255, 0, 255, 0})},
    ValueRow{"AMaskWithAHoleInAByte", kConstraints, kMalformed, bytes({0x30, 14, 0xA0, 12, 0x30, 10, 0x87, 8, 10, 0, 0, 0, 253, 0, 0, 0})}),
    [](const auto& row) { return std::string(row.param.name); });
// clang-format on

TEST(Extensions, AreReadAsTheySay) {
    EXPECT_EQ(read(kKeyUsage, bytes({3, 2, 5, 0xA0})).keyUsage,
              kKeyUsageDigitalSignature | kKeyUsageKeyEncipherment);
    EXPECT_EQ(read(kKeyUsage, bytes({3, 3, 7, 0, 0x80})).keyUsage, 1U << 8U);
    EXPECT_EQ(read(kBasicConstraints, bytes({0x30, 7, 1, 1, 0xFF, 2, 2, 1, 0})).basicConstraints->pathLength,
              256U);
    EXPECT_FALSE(read(kBasicConstraints, bytes({0x30, 0})).basicConstraints->isCertificateAuthority);
    EXPECT_EQ(read(kAuthority, bytes({0x30, 3, 0x80, 1, 7})).authorityKeyIdentifier, bytes({7}));
    EXPECT_EQ(read(kKeyIdentifier, bytes({4, 1, 7})).subjectKeyIdentifier, bytes({7}));
}

TEST(Extensions, ThatAreMalformedPermitNothing) {
    EXPECT_EQ(read(kKeyUsage, bytes({5, 0})).keyUsage, 0U);
    EXPECT_FALSE(read(kBasicConstraints, bytes({5, 0})).basicConstraints);
    EXPECT_FALSE(read(kNames, bytes({5, 0})).alternativeNames);
    const auto purposes = read(kPurposes, bytes({5, 0})).purposes;
    EXPECT_TRUE(purposes && !purposes->any && !purposes->serverAuthentication);
    const auto constraints = read(kConstraints, bytes({5, 0})).nameConstraints;
    EXPECT_TRUE(constraints && constraints->hasUnhandledForm);
}

TEST(Extensions, AreMalformedWhenTheyOccurTwice) {
    Data twice = extension(kKeyIdentifier, bytes({4, 1, 7}));
    append(twice, extension(kKeyIdentifier, bytes({4, 1, 8})));
    const CertificateExtensions extensions = readExtensions(twice);
    EXPECT_THAT(extensions.malformed, ElementsAre("2.5.29.14"));
    EXPECT_EQ(extensions.subjectKeyIdentifier, bytes({7})) << "the first one";
    EXPECT_EQ(extensions.entries.size(), 2U);
}

TEST(Extensions, ThatAreUnknownMayHaveAnyContents) {
    EXPECT_THAT(read(99, {}).malformed, IsEmpty());
    EXPECT_TRUE(read(99, {}).carries("2.5.29.99"));
    EXPECT_FALSE(read(99, {}).carries("2.5.29.9"));
}

TEST(Extensions, AreUnderstoodByTheirIdentifier) {
    for (const char* oid :
         {"2.5.29.14", "2.5.29.15", "2.5.29.17", "2.5.29.19", "2.5.29.32", "2.5.29.35", "2.5.29.37"})
        EXPECT_TRUE(isUnderstoodExtension(oid, false)) << oid;
    for (const char* oid : {"2.5.29.36", "2.5.29.54", "2.5.29.33", "1.2.3", ""})
        EXPECT_FALSE(isUnderstoodExtension(oid, true)) << oid;
    EXPECT_TRUE(isUnderstoodExtension("2.5.29.30", true));
    EXPECT_FALSE(isUnderstoodExtension("2.5.29.30", false)) << "where they are not applied";
}

}  // namespace
}  // namespace pinwell::trust
