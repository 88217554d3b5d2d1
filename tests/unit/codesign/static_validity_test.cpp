// The conditions of a valid signature, tested through the service with whole files.
#include "service_fixture.h"
#include "support/cms_signer.h"
#include "support/disk_image_builder.h"

namespace pinwell::test {
namespace {

using codesign::kInvalidSignature;
using codesign::kSuccess;
using codesign::kUnsigned;

constexpr std::uint32_t kNoFlags = 0;

class StaticValidity : public CodeSigningTest {
  protected:
    Answer askAboutSignature(const SuperBlobBuilder& superblob) {
        return askAbout(ExecutableImageBuilder().signature(superblob.build()).build());
    }
    codesign::Status validityOf(const SuperBlobBuilder& superblob) {
        return askAboutSignature(superblob).validity;
    }

    static Data directoryOf(std::uint8_t type) { return CodeDirectoryBuilder().digestType(type).build(); }
};

TEST_F(StaticValidity, IgnoresThePaddingOfTheSignatureArea) {
    EXPECT_EQ(askAbout(ExecutableImageBuilder().padding(Data(20'000, std::byte{0xFE})).build()).validity,
              kSuccess);
}

TEST_F(StaticValidity, AcceptsAnyOrderAndGaps) {
    const auto superblob = SuperBlobBuilder().gap(64).cms({}).gap(3).blob(0, directoryOf(2)).reverseIndex();
    EXPECT_EQ(validityOf(superblob), kSuccess);
}

TEST_F(StaticValidity, RefusesTwoCodeDirectoriesInOneSlot) {
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).blob(0, directoryOf(1))),
              kInvalidSignature);
}

TEST_F(StaticValidity, RefusesTwoEntriesForASlotThatIsRead) {
    for (const std::uint32_t slot : {2U, 5U, 7U, 0x1000U, 0x10000U}) {
        const auto once = SuperBlobBuilder()
                              .blob(0, directoryOf(2))
                              .blob(slot, slot == 0x10000  ? makeBlob(0xFADE0B01, {})
                                          : slot == 0x1000 ? directoryOf(1)
                                                           : emptyRequirements());
        EXPECT_EQ(validityOf(once), kSuccess) << slot;
        EXPECT_EQ(validityOf(SuperBlobBuilder(once).blob(slot, makeBlob(0xFADE0B01, {}))), kInvalidSignature)
            << slot;
    }
}

TEST_F(StaticValidity, IsNotAMatterOfOtherSlots) {
    auto tickets = SuperBlobBuilder().blob(0, directoryOf(2));
    for (int i = 0; i < 3; ++i) tickets.blob(0x10002, makeBlob(0xFADE0B01, Data(10)));
    EXPECT_EQ(validityOf(tickets), kSuccess);
    EXPECT_EQ(
        validityOf(SuperBlobBuilder(tickets).blob(1, {}).blob(6, makeBlob(0, {})).blob(6, makeBlob(0, {}))),
        kInvalidSignature)
        << "one of them is no blob";
    EXPECT_EQ(validityOf(SuperBlobBuilder(tickets).blob(6, makeBlob(0, {})).blob(6, makeBlob(0, {}))),
              kSuccess);
}

TEST_F(StaticValidity, RefusesBlobsThatOverlapInAnySlot) {
    const auto two =
        SuperBlobBuilder().blob(0, directoryOf(2)).blob(0x10002, makeBlob(0xFADE0B01, makeBlob(0, {})));
    EXPECT_EQ(validityOf(two), kSuccess);
    const auto inner =
        static_cast<std::uint32_t>(SuperBlobBuilder(two).blob(0x10003, makeBlob(0, {})).build().size() - 16);
    EXPECT_EQ(validityOf(SuperBlobBuilder(two).blob(0x10003, makeBlob(0, {})).offsetOf(0x10003, inner)),
              kInvalidSignature);
}

TEST_F(StaticValidity, RefusesAlternatesWithoutAPrimaryDirectory) {
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0x1000, directoryOf(2))), kInvalidSignature);
}

TEST_F(StaticValidity, IsUnsignedWithoutAnyCodeDirectory) {
    EXPECT_EQ(validityOf(SuperBlobBuilder()), kUnsigned);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0x10002, makeBlob(0xFADE0B01, Data(10)))), kUnsigned);
}

TEST_F(StaticValidity, ChoosesTheStrongestDirectory) {
    const auto all = SuperBlobBuilder()
                         .blob(0, directoryOf(1))
                         .blob(0x1000, directoryOf(2))
                         .blob(0x1001, directoryOf(4))
                         .blob(0x1002, directoryOf(3));
    const Answer answer = askAboutSignature(all);
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.unique, codeHashOf(4, directoryOf(4)));
    EXPECT_EQ(answer.information.digestAlgorithm, 4U);
    EXPECT_EQ(answer.information.digestAlgorithms, (std::vector<std::uint32_t>{4, 1, 2, 3}));
    EXPECT_EQ(answer.information.cdHashes,
              (std::vector<Data>{codeHashOf(4, directoryOf(4)), codeHashOf(1, directoryOf(1)),
                                 codeHashOf(2, directoryOf(2)), codeHashOf(3, directoryOf(3))}));
}

TEST_F(StaticValidity, PrefersSha256ToItsCutFormAndThatToSha1) {
    const auto chosen = [this](std::uint8_t primary, std::uint8_t alternate) {
        return askAboutSignature(
                   SuperBlobBuilder().blob(0, directoryOf(primary)).blob(0x1000, directoryOf(alternate)))
            .information.digestAlgorithm;
    };
    EXPECT_EQ(chosen(3, 2), 2U);
    EXPECT_EQ(chosen(2, 3), 2U);
    EXPECT_EQ(chosen(1, 3), 3U);
    EXPECT_EQ(chosen(3, 1), 3U);
}

TEST_F(StaticValidity, PassesOverAnAlternateOfAnUnknownType) {
    const Data unknown = CodeDirectoryBuilder().digestType(5).digestSize(64).version(0x30000).build();
    const Answer answer = askAboutSignature(SuperBlobBuilder().blob(0, directoryOf(2)).blob(0x1000, unknown));
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.digestAlgorithms, std::vector<std::uint32_t>{2});
}

TEST_F(StaticValidity, RefusesAPrimaryDirectoryOfAnUnknownType) {
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(5)).blob(0x1000, directoryOf(2))),
              kInvalidSignature);
}

TEST_F(StaticValidity, RefusesTwoDirectoriesOfOneType) {
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).blob(0x1000, directoryOf(2))),
              kInvalidSignature);
}

TEST_F(StaticValidity, RefusesAMalformedAlternate) {
    const Data malformed = CodeDirectoryBuilder().digestType(1).identifierOffset(0).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).blob(0x1000, malformed)),
              kInvalidSignature);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).blob(0x1004, emptyRequirements())),
              kInvalidSignature);
}

TEST_F(StaticValidity, RefusesMoreThanSixCodeDirectories) {
    auto six = SuperBlobBuilder().blob(0, directoryOf(2)).blob(0x1000, directoryOf(1));
    for (std::uint8_t i = 1; i < 5; ++i)
        six.blob(0x1000U + i, directoryOf(static_cast<std::uint8_t>(10 + i)));
    EXPECT_EQ(validityOf(six), kSuccess);
    EXPECT_EQ(validityOf(SuperBlobBuilder(six).blob(0x1005, directoryOf(3))), kInvalidSignature);
}

class CoveredComponent : public StaticValidity, public ::testing::WithParamInterface<std::uint32_t> {};

TEST_P(CoveredComponent, MustHaveTheDigestThatIsDemanded) {
    const Data component = makeBlob(0xFADE7171, base::toData("rights"));
    const Data other = makeBlob(0xFADE7171, base::toData("wrongs"));
    const Data directory = CodeDirectoryBuilder().covers(GetParam(), component).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory).blob(GetParam(), component)), kSuccess);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory).blob(GetParam(), other)), kInvalidSignature);
}

TEST_P(CoveredComponent, MustHaveTheDigestOfEveryDirectory) {
    const Data component = makeBlob(0xFADE7171, base::toData("rights"));
    const Data good = CodeDirectoryBuilder().covers(GetParam(), component).build();
    const Data bad =
        CodeDirectoryBuilder().digestType(1).specialSlot(GetParam(), Data(20, std::byte{1})).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, good).blob(0x1000, bad).blob(GetParam(), component)),
              kInvalidSignature);
}

TEST_P(CoveredComponent, IsNotCoveredByAZeroDigestOrAMissingSlot) {
    const Data component = makeBlob(0xFADE7171, base::toData("rights"));
    const Data zero = CodeDirectoryBuilder().specialSlot(GetParam(), Data(32)).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, zero).blob(GetParam(), component)), kSuccess);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).blob(GetParam(), component)), kSuccess);
}

TEST_P(CoveredComponent, MayBeMissing) {
    const Data directory = CodeDirectoryBuilder().specialSlot(GetParam(), Data(32, std::byte{1})).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory)), kSuccess);
}

INSTANTIATE_TEST_SUITE_P(Slots, CoveredComponent, ::testing::Values(2U, 5U, 7U),
                         [](const auto& slot) { return "InSlot" + std::to_string(slot.param); });

TEST_F(StaticValidity, DoesNotAskForPropertyListsOrResources) {
    const Data directory = CodeDirectoryBuilder()
                               .specialSlot(1, Data(32, std::byte{1}))
                               .specialSlot(3, Data(32, std::byte{3}))
                               .specialSlot(6, Data(32, std::byte{6}))
                               .build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory)), kSuccess);
}

TEST_F(StaticValidity, OfAnAdHocSignatureNeedsNoCms) {
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2))), kSuccess);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).cms({})), kSuccess);
}

TEST_F(StaticValidity, RefusesASignatureWithNeitherSignerNorAdHocFlag) {
    const Data directory = CodeDirectoryBuilder().flags(kNoFlags).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory)), kInvalidSignature);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory).cms({})), kInvalidSignature);
}

TEST_F(StaticValidity, OfASignersSignature) {
    const Data directory = CodeDirectoryBuilder().flags(kNoFlags).team("TEAM123456").build();
    const Data cms = CmsBuilder(directory).timestamp(TimestampBuilder()).build();
    const Answer answer = askAboutSignature(SuperBlobBuilder().blob(0, directory).cms(cms));
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.flags, 0U);
    EXPECT_EQ(answer.information.teamIdentifier, "TEAM123456");
    ASSERT_TRUE(answer.information.secureTimestamp);
    EXPECT_EQ(values::describe(*answer.information.secureTimestamp), "2026-11-20 19:55:00 +0000");
}

TEST_F(StaticValidity, AcceptsACmsMessageInBer) {
    const Data directory = CodeDirectoryBuilder().flags(kNoFlags).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory).cms(CmsBuilder(directory).ber().build())),
              kSuccess);
}

TEST_F(StaticValidity, VerifiesTheCmsOfASignatureThatSaysAdHoc) {
    const Data cms = CmsBuilder(directoryOf(2)).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).cms(cms)), kSuccess);
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directoryOf(2)).cms(Data(10))), kInvalidSignature);
}

TEST_F(StaticValidity, RefusesACmsMessageOverAnotherDirectory) {
    const Data directory = CodeDirectoryBuilder().flags(kNoFlags).build();
    const Data cms = CmsBuilder(directoryOf(2)).build();
    EXPECT_EQ(validityOf(SuperBlobBuilder().blob(0, directory).cms(cms)), kInvalidSignature);
}

TEST_F(StaticValidity, WantsTheCmsMessageOverThePrimaryDirectoryNotTheChosenOne) {
    const Data primary = CodeDirectoryBuilder().digestType(1).flags(kNoFlags).build();
    const Data chosen = CodeDirectoryBuilder().digestType(2).flags(kNoFlags).build();
    const auto both = SuperBlobBuilder().blob(0, primary).blob(0x1000, chosen);
    EXPECT_EQ(validityOf(SuperBlobBuilder(both).cms(CmsBuilder(primary).build())), kSuccess);
    EXPECT_EQ(validityOf(SuperBlobBuilder(both).cms(CmsBuilder(chosen).build())), kInvalidSignature);
}

TEST_F(StaticValidity, RefusesAMalformedCmsBlob) {
    const Data directory = CodeDirectoryBuilder().flags(kNoFlags).build();
    const Data cms = CmsBuilder(directory).build();
    const auto validity = [&](std::uint32_t magic, const Data& payload) {
        return validityOf(SuperBlobBuilder().blob(0, directory).blob(0x10000, makeBlob(magic, payload)));
    };
    EXPECT_EQ(validity(0xFADE0B01, cms), kSuccess);
    EXPECT_EQ(validity(0xFADE0B02, cms), kInvalidSignature);
    EXPECT_EQ(validity(0xFADE0B01, Data(100, std::byte{0x30})), kInvalidSignature);
    EXPECT_EQ(validity(0xFADE0B01, CmsBuilder(directory).withoutCertificate().build()), kInvalidSignature);
}

class DiskImageValidity : public StaticValidity {
  protected:
    // The validity of an image whose signature requires this trailer.
    codesign::Status validityCovering(const DiskImageBuilder& trailer) {
        const Data directory = CodeDirectoryBuilder().covers(6, trailer.trailer()).build();
        return askAbout(DiskImageBuilder().superblob(SuperBlobBuilder::adHoc(directory)).build()).validity;
    }
};

TEST_F(DiskImageValidity, CoversTheTrailerWithoutItsSignatureFields) {
    EXPECT_EQ(validityCovering(DiskImageBuilder()), kSuccess);
    EXPECT_EQ(validityCovering(DiskImageBuilder().codeSignLength(1)), kInvalidSignature);
}

TEST_F(DiskImageValidity, MayLeaveTheTrailerUncovered) {
    EXPECT_EQ(
        askAbout(DiskImageBuilder().data(Data(100)).superblob(SuperBlobBuilder::adHoc()).build()).validity,
        kSuccess);
}

TEST_F(DiskImageValidity, TakesPrecedenceOverTheBeginningOfTheFile) {
    const Data image = ExecutableImageBuilder().build();
    const Data codeDirectory = CodeDirectoryBuilder().identifier("com.example.disk").build();
    const Data superblob = SuperBlobBuilder::adHoc(codeDirectory).build();
    EXPECT_EQ(askAbout(DiskImageBuilder().data(image).superblob(superblob).build()).information.identifier,
              "com.example.disk");
    EXPECT_EQ(askAbout(DiskImageBuilder().data(image).build()).validity, kUnsigned);
}

TEST_F(DiskImageValidity, IsUnsignedWithOneZeroField) {
    Data file(100);
    base::append(file, DiskImageBuilder().codeSignOffset(50).codeSignLength(0).trailer());
    EXPECT_EQ(askAbout(file).validity, kUnsigned);
    file.resize(100);
    base::append(file, DiskImageBuilder().codeSignOffset(0).codeSignLength(50).trailer());
    EXPECT_EQ(askAbout(file).validity, kUnsigned);
}

TEST_F(DiskImageValidity, RefusesASignatureThatReachesIntoTheTrailer) {
    const auto validity = [this](std::uint64_t offset, std::uint64_t length) {
        Data file(100);
        base::append(file, DiskImageBuilder().codeSignOffset(offset).codeSignLength(length).trailer());
        return askAbout(file).validity;
    };
    EXPECT_EQ(validity(50, 51), kInvalidSignature);
    EXPECT_EQ(validity(101, 1), kInvalidSignature);
    EXPECT_EQ(validity(0xFFFFFFFFFFFFFFFF, 0xFFFFFFFFFFFFFFFF), kInvalidSignature);
}

TEST_F(DiskImageValidity, NeedsATrailerOfItsVersion) {
    Data file = DiskImageBuilder().data(Data(100)).superblob(SuperBlobBuilder::adHoc()).build();
    file[file.size() - 512 + 7] = std::byte{3};
    EXPECT_EQ(askAbout(file).validity, kUnsigned);
}

}  // namespace
}  // namespace pinwell::test
