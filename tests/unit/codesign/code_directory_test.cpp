#include "codesign/code_directory.h"

#include <gtest/gtest.h>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "codesign/code_error.h"
#include "support/code_directory_builder.h"
#include "values/format.h"

namespace pinwell::test {
namespace {

using base::ShortRead;
using codesign::CodeDirectory;
using codesign::CodeError;

void expectRefused(const CodeDirectoryBuilder& builder) {
    const Data blob = builder.build();
    try {
        CodeDirectory::parse(blob);
        ADD_FAILURE() << "accepted";
    } catch (const CodeError& error) {
        EXPECT_EQ(error.status(), codesign::kInvalidSignature) << error.what();
    } catch (const ShortRead&) {
        SUCCEED();
    }
}

std::uint32_t sizeOf(const CodeDirectoryBuilder& builder) {
    return static_cast<std::uint32_t>(builder.build().size());
}

TEST(CodeDirectory, HasTheValuesOfItsFields) {
    const Data blob =
        CodeDirectoryBuilder().identifier("com.example.tool").team("TEAM123456").flags(0x10002).build();
    const CodeDirectory directory = CodeDirectory::parse(blob);
    EXPECT_EQ(directory.identifier(), "com.example.tool");
    EXPECT_EQ(directory.teamIdentifier(), "TEAM123456");
    EXPECT_EQ(directory.flags(), 0x10002U);
    EXPECT_EQ(directory.version(), 0x20400U);
    EXPECT_EQ(directory.digestType(), codesign::DigestType::sha256);
    EXPECT_EQ(base::toData(directory.bytes()), blob);
}

struct Kind {
    std::uint8_t type;
    std::size_t codeHashSize;
};

class CodeHash : public ::testing::TestWithParam<Kind> {};

TEST_P(CodeHash, IsTheDigestCutToTheSizeThatTicketsList) {
    const Data blob = CodeDirectoryBuilder().digestType(GetParam().type).build();
    const Data hash = CodeDirectory::parse(blob).codeHash();
    EXPECT_EQ(hash.size(), GetParam().codeHashSize);
    EXPECT_EQ(hash, codeHashOf(GetParam().type, blob));
}

INSTANTIATE_TEST_SUITE_P(DigestTypes, CodeHash,
                         ::testing::Values(Kind{1, 20}, Kind{2, 20}, Kind{3, 20}, Kind{4, 48}),
                         [](const auto& kind) { return "OfType" + std::to_string(kind.param.type); });

class CodeDirectoryVersion : public ::testing::TestWithParam<std::uint32_t> {};

TEST_P(CodeDirectoryVersion, IsReadWithItsOwnHeader) {
    const Data requirements = emptyRequirements();
    const Data blob = CodeDirectoryBuilder().version(GetParam()).covers(2, requirements).build();
    const CodeDirectory directory = CodeDirectory::parse(blob);
    EXPECT_EQ(directory.identifier(), "com.example.sample");
    EXPECT_EQ(directory.specialSlotDigest(2), codeDigest(2, requirements));
}

INSTANTIATE_TEST_SUITE_P(Accepted, CodeDirectoryVersion,
                         ::testing::Values(0x20001U, 0x200FFU, 0x20100U, 0x20200U, 0x20300U, 0x20400U,
                                           0x20500U, 0x20600U, 0x2FFFFU),
                         [](const auto& version) { return values::format("Version%X", version.param); });

TEST(CodeDirectory, RefusesVersionsOutsideItsRange) {
    expectRefused(CodeDirectoryBuilder().version(0x20000));
    expectRefused(CodeDirectoryBuilder().version(0x30000));
    expectRefused(CodeDirectoryBuilder().version(0));
}

TEST(CodeDirectory, HasNoTeamBeforeVersion20200) {
    const Data blob = CodeDirectoryBuilder().version(0x20100).build();
    EXPECT_EQ(CodeDirectory::parse(blob).teamIdentifier(), std::nullopt);
}

TEST(CodeDirectory, RefusesAnotherMagic) {
    expectRefused(CodeDirectoryBuilder().magic(0xFADE0C01));
}

TEST(CodeDirectory, RefusesALengthThatIsNotItsBlobs) {
    const std::uint32_t size = sizeOf(CodeDirectoryBuilder());
    expectRefused(CodeDirectoryBuilder().length(size - 1));
    expectRefused(CodeDirectoryBuilder().length(size + 1));
}

TEST(CodeDirectory, RefusesAnUnknownDigestType) {
    expectRefused(CodeDirectoryBuilder().digestType(0));
    expectRefused(CodeDirectoryBuilder().digestType(5));
}

TEST(CodeDirectory, RefusesADigestSizeThatIsNotItsTypes) {
    expectRefused(CodeDirectoryBuilder().digestType(2).digestSize(20));
    expectRefused(CodeDirectoryBuilder().digestType(1).digestSize(32));
    expectRefused(CodeDirectoryBuilder().digestType(3).digestSize(32));
    expectRefused(CodeDirectoryBuilder().digestType(4).digestSize(47));
    expectRefused(CodeDirectoryBuilder().digestSize(0));
}

TEST(CodeDirectory, RefusesAnIdentifierOutsideOfIt) {
    expectRefused(CodeDirectoryBuilder().identifierOffset(sizeOf(CodeDirectoryBuilder())));
    expectRefused(CodeDirectoryBuilder().identifierOffset(0xFFFFFFFF));
}

TEST(CodeDirectory, RefusesAnIdentifierInItsHeader) {
    expectRefused(CodeDirectoryBuilder().identifierOffset(0));
    expectRefused(CodeDirectoryBuilder().identifierOffset(87));
}

TEST(CodeDirectory, RefusesAnIdentifierWithoutEnd) {
    // The code slots at the end contain no zero byte.
    expectRefused(CodeDirectoryBuilder().identifierOffset(sizeOf(CodeDirectoryBuilder()) - 3));
}

TEST(CodeDirectory, MayHaveAnEmptyIdentifier) {
    EXPECT_EQ(CodeDirectory::parse(CodeDirectoryBuilder().identifier("").build()).identifier(), "");
}

TEST(CodeDirectory, RefusesATeamOutsideOfItOrWithoutAnEnd) {
    const std::uint32_t size = sizeOf(CodeDirectoryBuilder());
    expectRefused(CodeDirectoryBuilder().teamOffset(size));
    expectRefused(CodeDirectoryBuilder().teamOffset(size - 1));
    expectRefused(CodeDirectoryBuilder().teamOffset(40));
}

TEST(CodeDirectory, RefusesMoreCodeSlotsThanItHolds) {
    expectRefused(CodeDirectoryBuilder().codeSlots(2).codeSlotCount(3));
    expectRefused(CodeDirectoryBuilder().codeSlotCount(0xFFFFFFFF));
}

TEST(CodeDirectory, RefusesMoreSpecialSlotsThanItHolds) {
    const auto builder = CodeDirectoryBuilder().specialSlot(1, Data(32, std::byte{1}));
    expectRefused(CodeDirectoryBuilder(builder).specialSlotCount(0xFFFFFFFF));
    // Header (88) and strings (19) leave space for one digest, not for two after the header.
    expectRefused(CodeDirectoryBuilder(builder).specialSlotCount(2));
}

TEST(CodeDirectory, RefusesAHashOffsetOutsideOfIt) {
    const std::uint32_t size = sizeOf(CodeDirectoryBuilder());
    expectRefused(CodeDirectoryBuilder().hashOffset(size - 63));
    expectRefused(CodeDirectoryBuilder().hashOffset(0xFFFFFFFF));
    expectRefused(CodeDirectoryBuilder().hashOffset(0));
}

TEST(CodeDirectory, RefusesAPreEncryptionListOutsideOfIt) {
    const auto builder = CodeDirectoryBuilder().version(0x20500);
    expectRefused(CodeDirectoryBuilder(builder).preEncryptionOffset(sizeOf(builder) - 63));
    expectRefused(CodeDirectoryBuilder(builder).preEncryptionOffset(95));
    const Data good = CodeDirectoryBuilder(builder).preEncryptionOffset(sizeOf(builder) - 64).build();
    EXPECT_NO_THROW(CodeDirectory::parse(good));
}

TEST(CodeDirectory, WalksItsScatterVectorToTheClosingRecord) {
    const Data record = base::ByteWriter().be32(1).zeros(20).data();
    Data closed = record;
    closed.resize(48);
    EXPECT_NO_THROW(CodeDirectory::parse(CodeDirectoryBuilder().scatter(closed).build()));
    expectRefused(CodeDirectoryBuilder().scatter(record).codeSlots(0));
    expectRefused(CodeDirectoryBuilder().scatterOffset(sizeOf(CodeDirectoryBuilder())));
    expectRefused(CodeDirectoryBuilder().scatterOffset(44));
}

TEST(SpecialSlot, DemandsItsDigest) {
    const Data digest(32, std::byte{7});
    const CodeDirectory directory =
        CodeDirectory::parse(CodeDirectoryBuilder().specialSlot(5, digest).build());
    EXPECT_EQ(directory.specialSlotDigest(5), digest);
}

TEST(SpecialSlot, DemandsNothingWhenItsDigestIsZero) {
    const CodeDirectory directory =
        CodeDirectory::parse(CodeDirectoryBuilder().specialSlot(5, Data(32)).build());
    EXPECT_EQ(directory.specialSlotDigest(5), std::nullopt);
    EXPECT_EQ(directory.specialSlotDigest(2), std::nullopt);
}

TEST(SpecialSlot, DemandsNothingWhenTheDirectoryHasItNot) {
    const CodeDirectory directory =
        CodeDirectory::parse(CodeDirectoryBuilder().specialSlot(2, Data(32, std::byte{7})).build());
    EXPECT_EQ(directory.specialSlotDigest(3), std::nullopt);
    EXPECT_EQ(directory.specialSlotDigest(0xFFFFFFFF), std::nullopt);
    EXPECT_EQ(directory.specialSlotDigest(0), std::nullopt);
}

TEST(CodeDirectory, EndsCleanlyWhereverItIsCut) {
    const Data whole =
        CodeDirectoryBuilder().version(0x20500).team("TEAM").covers(2, emptyRequirements()).build();
    for (std::size_t length = 0; length < whole.size(); ++length) {
        EXPECT_ANY_THROW(CodeDirectory::parse(base::toData(ByteView(whole).first(length)))) << length;
    }
}

TEST(CodeDirectory, ReportsAnUnknownDigestType) {
    EXPECT_EQ(CodeDirectory::digestTypeNumberOf(CodeDirectoryBuilder().digestType(9).build()), 9);
    EXPECT_THROW(CodeDirectory::digestTypeNumberOf(makeBlob(0xFADE0C02, Data(10))), ShortRead);
    EXPECT_THROW(CodeDirectory::digestTypeNumberOf(makeBlob(0xFADE0C01, Data(100))), CodeError);
}

}  // namespace
}  // namespace pinwell::test
