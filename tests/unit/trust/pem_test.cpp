#include "trust/anchors.h"

#include <gtest/gtest.h>

namespace pinwell::trust {
namespace {

using foundation::toData;

const std::string kOne = "-----BEGIN ONE-----\nAQID\n-----END ONE-----\n";

TEST(PemText, IsBlocksAndTheTextBetweenThem) {
    const std::string text = "a word\n" + kOne + "\n--- not a marker ---\n" + kOne;
    const auto blocks = readPemBlocks(text);
    ASSERT_EQ(blocks.size(), 2U);
    EXPECT_EQ(blocks[0].label, "ONE");
    EXPECT_EQ(blocks[0].line, 2U);
    EXPECT_EQ(blocks[1].line, 7U);
    EXPECT_EQ(blocks[1].data, toData("\1\2\3"));
    EXPECT_TRUE(readPemBlocks("").empty());
    EXPECT_TRUE(readPemBlocks("-----").empty());
    EXPECT_TRUE(readPemBlocks("-----BEGIN ONE").empty());
}

TEST(PemBlock, MayHoldWhiteSpaceAnywhereAndAnyLineEnd) {
    for (const char* text : {"-----BEGIN ONE-----\r\nAQ\r\nID\r\n-----END ONE-----\r\n",
                             "-----BEGIN ONE-----\rAQID\r-----END ONE-----",
                             "  -----BEGIN ONE-----\n\n  AQ ID\t\n\n  -----END ONE-----",
                             "-----BEGIN ONE-----AQID-----END ONE-----",
                             "\xEF\xBB\xBF-----BEGIN ONE-----\nAQID\n-----END ONE-----"}) {
        const auto blocks = readPemBlocks(text);
        ASSERT_EQ(blocks.size(), 1U) << text;
        EXPECT_EQ(blocks[0].data, toData("\1\2\3")) << text;
    }
}

struct Damage {
    const char* name;
    std::string text;
    std::size_t damagedBlocks = 1;
};

class DamagedPem : public testing::TestWithParam<Damage> {};

TEST_P(DamagedPem, LeavesTheBlocksAroundItWhole) {
    const std::string text = kOne + GetParam().text + kOne;
    std::size_t whole = 0;
    std::size_t damaged = 0;
    for (const PemBlock& block : readPemBlocks(text)) {
        EXPECT_EQ(block.data.has_value(), block.damage.empty());
        ++(block.data ? whole : damaged);
    }
    EXPECT_EQ(whole, 2U);
    EXPECT_EQ(damaged, GetParam().damagedBlocks);
}

INSTANTIATE_TEST_SUITE_P(
    By, DamagedPem,
    testing::Values(Damage{"NoBase64", "-----BEGIN ONE-----\nA*ID\n-----END ONE-----\n"},
                    Damage{"ACutLine", "-----BEGIN ONE-----\nAQI\n-----END ONE-----\n"},
                    Damage{"PaddingInside", "-----BEGIN ONE-----\nAQ==AQID\n-----END ONE-----\n"},
                    Damage{"AHeader", "-----BEGIN ONE-----\nKey: value\n\nAQID\n-----END ONE-----\n"},
                    Damage{"NoEnd", "-----BEGIN ONE-----\nAQID\n"},
                    Damage{"AnEndOfAnotherLabel", "-----BEGIN ONE-----\nAQID\n-----END TWO-----\n", 2},
                    Damage{"NoBeginning", "AQID\n-----END ONE-----\n"},
                    Damage{"ABeginningThatIsDamaged", "----BEGIN ONE-----\nAQID\n-----END ONE-----\n"},
                    Damage{"AnEndThatIsDamaged", "-----BEGIN ONE-----\nAQID\n-----END ONE----\n"},
                    Damage{"AZeroByte", std::string("-----BEGIN ONE-----\nAQ\0ID\n-----END ONE-----\n", 44)}),
    [](const auto& tested) { return tested.param.name; });

TEST(PemBlock, IsOfACertificateByItsLabel) {
    const auto isCertificate = [](std::string_view label) { return isCertificateBlock({label, 1, {}, {}}); };
    EXPECT_TRUE(isCertificate("CERTIFICATE"));
    EXPECT_TRUE(isCertificate("X509 CERTIFICATE"));
    EXPECT_TRUE(isCertificate("X.509 CERTIFICATE"));
    EXPECT_FALSE(isCertificate("CERTIFICATE REQUEST"));
    EXPECT_FALSE(isCertificate("TRUSTED CERTIFICATE"));
    EXPECT_FALSE(isCertificate(""));
}

}  // namespace
}  // namespace pinwell::trust
