#include "formats/code_hashes.h"

#include <gtest/gtest.h>

namespace pinwell::test {
namespace {

using foundation::Data;

CodeHash hashOf(std::uint32_t algorithm, int fill) {
    return {algorithm, Data(algorithm == 4 ? 48 : 20, static_cast<std::byte>(fill))};
}

TEST(ListableHashes, BeginsWithTheOwnHashAndRepeatsNothing) {
    EXPECT_EQ(listableHashes(hashOf(2, 1), {hashOf(4, 2), hashOf(2, 1), hashOf(4, 2), hashOf(1, 1)}),
              (std::vector<CodeHash>{hashOf(2, 1), hashOf(4, 2), hashOf(1, 1)}));
}

TEST(ListableHashes, SkipsHashesThatATicketCannotList) {
    EXPECT_EQ(listableHashes(hashOf(2, 1), {{5, Data(20)}, {2, Data(32)}, {7, Data()}, hashOf(0, 1)}),
              (std::vector<CodeHash>{hashOf(2, 1)}));
    EXPECT_EQ(listableHashes(hashOf(0, 1), {hashOf(2, 1), hashOf(4, 1)}),
              (std::vector<CodeHash>{hashOf(0, 1)}));
}

TEST(ListableHashes, CanBeJudgedOneByOne) {
    EXPECT_TRUE(canListWith(hashOf(2, 1), hashOf(4, 2)));
    EXPECT_TRUE(canListWith(hashOf(0, 1), hashOf(0, 2)));
    EXPECT_FALSE(canListWith(hashOf(2, 1), hashOf(0, 2)));
    EXPECT_FALSE(canListWith(hashOf(2, 1), {2, Data(32)}));
}

}  // namespace
}  // namespace pinwell::test
