#include "formats/code_hashes.h"

#include <gtest/gtest.h>

namespace pinwell::test {
namespace {

using base::Data;

CodeHash codeHash(std::uint32_t algorithm, int fill) {
    return {algorithm, Data(algorithm == 4 ? 48 : 20, static_cast<std::byte>(fill))};
}

TEST(ListableHashes, BeginsWithTheOwnHashAndRepeatsNothing) {
    EXPECT_EQ(
        listableHashes(codeHash(2, 1), {codeHash(4, 2), codeHash(2, 1), codeHash(4, 2), codeHash(1, 1)}),
        (std::vector<CodeHash>{codeHash(2, 1), codeHash(4, 2), codeHash(1, 1)}));
}

TEST(ListableHashes, SkipsHashesThatATicketCannotList) {
    EXPECT_EQ(listableHashes(codeHash(2, 1), {{5, Data(20)}, {2, Data(32)}, {7, Data()}, codeHash(0, 1)}),
              (std::vector<CodeHash>{codeHash(2, 1)}));
    EXPECT_EQ(listableHashes(codeHash(0, 1), {codeHash(2, 1), codeHash(4, 1)}),
              (std::vector<CodeHash>{codeHash(0, 1)}));
}

TEST(ListableHashes, CanBeJudgedOneByOne) {
    EXPECT_TRUE(canListWith(codeHash(2, 1), codeHash(4, 2)));
    EXPECT_TRUE(canListWith(codeHash(0, 1), codeHash(0, 2)));
    EXPECT_FALSE(canListWith(codeHash(2, 1), codeHash(0, 2)));
    EXPECT_FALSE(canListWith(codeHash(2, 1), {2, Data(32)}));
}

}  // namespace
}  // namespace pinwell::test
