#include "foundation/hex.h"

#include <gtest/gtest.h>

namespace pinwell::foundation {
namespace {

TEST(Hex, ComesBackAsTheBytesThatItWasMadeOf) {
    Data all;
    for (int value = 0; value < 256; ++value) all.push_back(static_cast<std::byte>(value));
    EXPECT_EQ(parseHex(toHex(all)), all);
    EXPECT_EQ(parseHex(""), Data());
}

TEST(Hex, IsLowerCaseDigitsInPairs) {
    for (const char* text : {"a", "abc", "AB", "aG", "0x12", " 12", "12 ", "1-", "\xC3\xA9"})
        EXPECT_FALSE(parseHex(text)) << text;
}

}  // namespace
}  // namespace pinwell::foundation
