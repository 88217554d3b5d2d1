#include "src/code_hashes.h"

#include <gtest/gtest.h>

#include "support/fake_code_signing.h"

namespace pinwell::test {
namespace {

using foundation::Data;
using foundation::URL;

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

class HashesOfAnArtefact : public testing::Test {
  protected:
    HashesOfAnArtefact() {
        codeSigning.information.emplace();
        codeSigning.information->cdHashes = {hashOf(1, 2).hash, hashOf(2, 1).hash, hashOf(4, 3).hash};
        codeSigning.information->digestAlgorithms = {1, 2};  // the third one has none
    }
    std::vector<CodeHash> hashes() {
        return listableHashes(hashOf(2, 1), URL::fileURLWithPath("/artefact"), codeSigning);
    }

    FakeCodeSigningService codeSigning;
};

TEST_F(HashesOfAnArtefact, AreThoseOfAllItsCode) {
    EXPECT_EQ(hashes(), (std::vector<CodeHash>{hashOf(2, 1), hashOf(1, 2)}));
}

TEST_F(HashesOfAnArtefact, AreItsOwnAloneIfItsCodeCannotBeWalked) {
    codeSigning.informationStatus = codesign::kUnimplemented;
    EXPECT_EQ(hashes(), (std::vector<CodeHash>{hashOf(2, 1)}));
}

}  // namespace
}  // namespace pinwell::test
