#include "foundation/base64.h"

#include <gtest/gtest.h>

namespace pinwell::foundation {
namespace {

struct Vector {
    std::string_view plain;
    std::string_view encoded;
};

// RFC 4648, section 10.
constexpr Vector kVectors[] = {{"", ""},
                               {"f", "Zg=="},
                               {"fo", "Zm8="},
                               {"foo", "Zm9v"},
                               {"foob", "Zm9vYg=="},
                               {"fooba", "Zm9vYmE="},
                               {"foobar", "Zm9vYmFy"}};

TEST(Base64, DecodesTheVectorsOfItsStandard) {
    for (const auto& [plain, encoded] : kVectors) EXPECT_EQ(decodeBase64(encoded), toData(plain)) << encoded;
}

TEST(Base64, EncodesTheVectorsOfItsStandard) {
    for (const auto& [plain, encoded] : kVectors) EXPECT_EQ(encodeBase64(asBytes(plain)), encoded);
}

TEST(Base64, BringsEveryByteBack) {
    Data bytes;
    for (unsigned i = 0; i < 256; ++i) bytes.push_back(static_cast<std::byte>(i));
    EXPECT_EQ(decodeBase64(encodeBase64(bytes)), bytes);
}

TEST(Base64, KnowsThePlusAndTheSlash) {
    EXPECT_EQ(decodeBase64("+/+/"), toData("\xFB\xFF\xBF"));
}

TEST(Base64, RefusesTheAlphabetForURLs) {
    EXPECT_FALSE(decodeBase64("-_-_"));
}

TEST(Base64, RefusesMissingPadding) {
    EXPECT_FALSE(decodeBase64("Zg"));
    EXPECT_FALSE(decodeBase64("Zg="));
    EXPECT_FALSE(decodeBase64("Zm9vY"));
}

TEST(Base64, RefusesPaddingWhereItDoesNotBelong) {
    EXPECT_FALSE(decodeBase64("===="));
    EXPECT_FALSE(decodeBase64("Z==="));
    EXPECT_FALSE(decodeBase64("=Zm9"));
    EXPECT_FALSE(decodeBase64("Zg==Zm9v"));
    EXPECT_FALSE(decodeBase64("Zm9v===="));
}

TEST(Base64, RefusesSetBitsThatThePaddingCutsOff) {
    EXPECT_FALSE(decodeBase64("Zh=="));
    EXPECT_FALSE(decodeBase64("Zm9="));
}

TEST(Base64, RefusesWhiteSpaceAndLineBreaks) {
    EXPECT_FALSE(decodeBase64("Zm9v\n"));
    EXPECT_FALSE(decodeBase64("Zm9\n"));
    EXPECT_FALSE(decodeBase64(" Zm9"));
}

TEST(Base64, RefusesAZeroByte) {
    EXPECT_FALSE(decodeBase64(std::string_view("Zm9\0", 4)));
}

}  // namespace
}  // namespace pinwell::foundation
