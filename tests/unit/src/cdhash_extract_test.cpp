#include "src/cdhash_extract.h"

#include <gtest/gtest.h>

#include "support/fake_code_signing.h"
#include "support/message_capture.h"
#include "support/test_platform.h"

namespace pinwell {
namespace {

using base::Data;
using values::Dictionary;
using values::Value;

class BasicCodeProperties : public testing::Test {
  protected:
    void SetUp() override {
        codesign::SigningInformation information;
        information.unique = Data(20, std::byte{0xAB});
        information.digestAlgorithm = 2;
        information.flags = 0x10002;
        information.identifier = "com.example.app";
        information.teamIdentifier = "TEAM123456";
        information.secureTimestamp = values::Date{1795377300};
        platform.codeSigning.information = information;
    }

    Value properties() {
        return basicCodeProperties(values::URL::fileURLWithPath("/Some.app"), platform.services());
    }

    test::TestPlatform platform;
};

TEST_F(BasicCodeProperties, HoldEverythingThatTheSignatureNames) {
    const Value all = properties();
    EXPECT_EQ(all.dictionary()->size(), 6U);
    EXPECT_EQ(all["cdhash"], Value(Data(20, std::byte{0xAB})));
    EXPECT_EQ(all["digestAlgorithm"], Value(2));
    EXPECT_EQ(all["flags"], Value(0x10002));
    EXPECT_EQ(all["signingId"], Value("com.example.app"));
    EXPECT_EQ(all["teamId"], Value("TEAM123456"));
    EXPECT_EQ(all["secureTimestamp"], Value("2026-11-22 19:55:00 +0000"));
}

TEST_F(BasicCodeProperties, AskForTheSignatureAndItsStructureOnly) {
    properties();
    EXPECT_EQ(platform.codeSigning.validityFlags,
              codesign::kDoNotValidateExecutable | codesign::kDoNotValidateResources);
    EXPECT_EQ(platform.codeSigning.informationSets,
              codesign::kInternalInformation | codesign::kSigningInformation | codesign::kContentInformation);
}

TEST_F(BasicCodeProperties, OfAnAdHocSignatureLackTheTeamAndHaveTheRest) {
    platform.codeSigning.information->teamIdentifier.reset();
    const Value all = properties();
    EXPECT_TRUE(all["teamId"].isNil());
    EXPECT_EQ(all.dictionary()->size(), 5U);
}

TEST_F(BasicCodeProperties, WithoutASecureTimestampLackIt) {
    platform.codeSigning.information->secureTimestamp.reset();
    EXPECT_TRUE(properties()["secureTimestamp"].isNil());
    EXPECT_EQ(properties().dictionary()->size(), 5U);
}

TEST_F(BasicCodeProperties, OfASignatureThatNamesNothingButItsHashAreTheHashAlone) {
    codesign::SigningInformation hashAlone;
    hashAlone.unique = Data(20, std::byte{0xAB});
    platform.codeSigning.information = hashAlone;
    EXPECT_EQ(properties(), Value(Dictionary{{"cdhash", Data(20, std::byte{0xAB})}}));
    EXPECT_TRUE(platform.systemLog.entries().empty());
}

TEST_F(BasicCodeProperties, OfUnsignedOrDamagedCodeAreEmptyAndSilent) {
    platform.codeSigning.validity = codesign::kUnsigned;
    const test::MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(properties(), Value(Dictionary{}));
    EXPECT_TRUE(platform.systemLog.entries().empty());
    EXPECT_EQ(output.text(), "");
}

TEST_F(BasicCodeProperties, AreEmptyAndLoggedWhenThereIsNoCodeAtThePath) {
    platform.codeSigning.createStatus = codesign::kStaticCodeNotFound;
    EXPECT_EQ(properties(), Value(Dictionary{}));
    ASSERT_EQ(platform.systemLog.entries().size(), 1U);
    EXPECT_EQ(platform.systemLog.entries()[0], "Unable to create SecCode (-67070): /Some.app");
}

TEST_F(BasicCodeProperties, AreEmptyAndLoggedWhenSuccessComesWithoutACodeReference) {
    platform.codeSigning.handsOutCode = false;
    EXPECT_EQ(properties(), Value(Dictionary{}));
    ASSERT_EQ(platform.systemLog.entries().size(), 1U);
    EXPECT_EQ(platform.systemLog.entries()[0], "Unable to create SecCode (0): /Some.app");
}

TEST_F(BasicCodeProperties, AreEmptyAndLoggedWhenTheInformationCannotBeCopied) {
    platform.codeSigning.informationStatus = -67030;
    EXPECT_EQ(properties(), Value(Dictionary{}));
    ASSERT_EQ(platform.systemLog.entries().size(), 1U);
    EXPECT_EQ(platform.systemLog.entries()[0], "Unable to copy signing information (-67030)");
}

TEST_F(BasicCodeProperties, AreEmptyAndLoggedWhenNoInformationComesBack) {
    platform.codeSigning.information.reset();
    EXPECT_EQ(properties(), Value(Dictionary{}));
    ASSERT_EQ(platform.systemLog.entries().size(), 1U);
    EXPECT_EQ(platform.systemLog.entries()[0], "Unable to copy signing information from code reference.");
}

TEST_F(BasicCodeProperties, LogTheSameHoweverLoudTheRunIs) {
    platform.codeSigning.informationStatus = -67030;
    for (const std::uint8_t verbosity : {kVerbosityQuiet, kVerbosityNormal, kVerbosityVerbose}) {
        const std::size_t before = platform.systemLog.entries().size();
        const test::MessageCapture output(verbosity);
        properties();
        EXPECT_EQ(platform.systemLog.entries().size(), before + 1);
        EXPECT_EQ(output.text(), "");
    }
}

TEST_F(BasicCodeProperties, AreEmptyAndLoggedWithoutAUniqueHash) {
    platform.codeSigning.information->unique.reset();
    EXPECT_EQ(properties(), Value(Dictionary{}));
    ASSERT_EQ(platform.systemLog.entries().size(), 1U);
    EXPECT_EQ(platform.systemLog.entries()[0], "Unable to extract cdhash from signing information");
}

CodeHash codeHash(std::uint32_t algorithm, int fill) {
    return {algorithm, Data(algorithm == 4 ? 48 : 20, static_cast<std::byte>(fill))};
}

class HashesOfAnArtefact : public testing::Test {
  protected:
    HashesOfAnArtefact() {
        codeSigning.information.emplace();
        codeSigning.information->cdHashes = {codeHash(1, 2).hash, codeHash(2, 1).hash, codeHash(4, 3).hash};
        codeSigning.information->digestAlgorithms = {1, 2};  // the third one has none
    }
    std::vector<CodeHash> hashes() {
        return listableHashes(codeHash(2, 1), values::URL::fileURLWithPath("/artefact"), codeSigning);
    }

    test::FakeCodeSigningService codeSigning;
};

TEST_F(HashesOfAnArtefact, AreThoseOfAllItsCode) {
    EXPECT_EQ(hashes(), (std::vector<CodeHash>{codeHash(2, 1), codeHash(1, 2)}));
}

TEST_F(HashesOfAnArtefact, AreItsOwnAloneIfItsCodeCannotBeWalked) {
    codeSigning.informationStatus = codesign::kUnimplemented;
    EXPECT_EQ(hashes(), (std::vector<CodeHash>{codeHash(2, 1)}));
}

}  // namespace
}  // namespace pinwell
