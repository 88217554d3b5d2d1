#include "codesign/superblob.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "base/byte_io.h"
#include "codesign/code_error.h"
#include "support/code_directory_builder.h"
#include "support/resident_memory.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using base::MemorySource;
using base::ShortRead;
using codesign::CodeError;
using codesign::parseSuperBlob;
using codesign::readSuperBlob;

/// Three blobs, in the slots 0, 2 and 7.
SuperBlobBuilder threeBlobs() {
    return SuperBlobBuilder()
        .blob(0, makeBlob(0xA0, Data(16, std::byte{1})))
        .blob(2, makeBlob(0xA2, Data(4, std::byte{2})))
        .blob(7, makeBlob(0xA7, Data(1, std::byte{3})));
}

TEST(SuperBlob, GivesItsBlobsInIndexOrder) {
    const Data bytes = threeBlobs().build();
    const auto blobs = parseSuperBlob(bytes);
    ASSERT_EQ(blobs.size(), 3U);
    EXPECT_EQ(blobs[0].slot, 0U);
    EXPECT_EQ(blobs[1].slot, 2U);
    EXPECT_EQ(blobs[1].magic, 0xA2U);
    EXPECT_EQ(base::toData(blobs[1].bytes), makeBlob(0xA2, Data(4, std::byte{2})));
    EXPECT_EQ(blobs[2].slot, 7U);
}

TEST(SuperBlob, MayBeEmpty) {
    EXPECT_TRUE(parseSuperBlob(SuperBlobBuilder().build()).empty());
}

TEST(SuperBlob, MayListItsBlobsOutOfOrder) {
    const Data bytes = threeBlobs().reverseIndex().build();
    const auto blobs = parseSuperBlob(bytes);
    ASSERT_EQ(blobs.size(), 3U);
    EXPECT_EQ(blobs[0].slot, 7U);
    EXPECT_EQ(blobs[0].magic, 0xA7U);
}

TEST(SuperBlob, MayHaveGapsBetweenItsBlobs) {
    const Data bytes = SuperBlobBuilder()
                           .gap(5)
                           .blob(0, makeBlob(0xA0, Data(16)))
                           .gap(100)
                           .blob(2, makeBlob(0xA2, Data(4)))
                           .build();
    EXPECT_EQ(parseSuperBlob(bytes).size(), 2U);
}

TEST(SuperBlob, EndsAtItsOwnLength) {
    Data bytes = threeBlobs().build();
    bytes.resize(bytes.size() + 1000, std::byte{0xFF});
    EXPECT_EQ(parseSuperBlob(bytes).size(), 3U);
}

TEST(SuperBlob, RefusesAnotherMagic) {
    EXPECT_THROW(parseSuperBlob(threeBlobs().magic(0xFADE0CC1).build()), CodeError);
}

TEST(SuperBlob, RefusesALengthBelowItsHeader) {
    EXPECT_THROW(parseSuperBlob(threeBlobs().length(11).build()), CodeError);
}

TEST(SuperBlob, RefusesALengthBeyondTheBytes) {
    const auto size = static_cast<std::uint32_t>(threeBlobs().build().size());
    EXPECT_THROW(parseSuperBlob(threeBlobs().length(size + 1).build()), ShortRead);
}

TEST(SuperBlob, RefusesALengthThatCutsABlob) {
    const auto size = static_cast<std::uint32_t>(threeBlobs().build().size());
    EXPECT_THROW(parseSuperBlob(threeBlobs().length(size - 1).build()), ShortRead);
}

TEST(SuperBlob, RefusesACountBeyondTheBytes) {
    EXPECT_THROW(parseSuperBlob(SuperBlobBuilder().count(1).build()), ShortRead);
}

TEST(SuperBlob, RefusesACountBeyondTheBytesThoughNoBlobIsMissing) {
    EXPECT_THROW(parseSuperBlob(threeBlobs().count(0xFFFFFFFF).build()), ShortRead);
}

TEST(SuperBlob, HasMoreBlobsThan16BitsCount) {
    SuperBlobBuilder builder;
    for (std::uint32_t i = 0; i < 70'000; ++i) builder.blob(0x20000 + i, makeBlob(0xA0, {}));
    EXPECT_EQ(parseSuperBlob(builder.build()).size(), 70'000U);
}

TEST(SuperBlob, RefusesABlobThatBeginsBeyondTheEnd) {
    EXPECT_THROW(parseSuperBlob(threeBlobs().offsetOf(7, 0xFFFFFFFF).build()), ShortRead);
}

TEST(SuperBlob, RefusesABlobWhoseHeaderIsCut) {
    const auto size = static_cast<std::uint32_t>(threeBlobs().build().size());
    EXPECT_THROW(parseSuperBlob(threeBlobs().offsetOf(7, size - 7).build()), ShortRead);
}

TEST(SuperBlob, RefusesABlobShorterThanItsHeader) {
    const Data blob = base::ByteWriter().be32(0xA0).be32(7).data();
    EXPECT_THROW(parseSuperBlob(SuperBlobBuilder().blob(0, blob).build()), CodeError);
}

TEST(SuperBlob, RefusesABlobLongerThanTheSuperBlob) {
    const Data blob = base::ByteWriter().be32(0xA0).be32(9).data();
    EXPECT_THROW(parseSuperBlob(SuperBlobBuilder().blob(0, blob).build()), ShortRead);
}

SuperBlobBuilder twice(std::uint32_t slot) {
    return SuperBlobBuilder().blob(slot, makeBlob(0xA0, {})).blob(slot, makeBlob(0xA1, {}));
}

TEST(SuperBlob, RefusesTwoEntriesForASlotOfTheSignature) {
    for (const std::uint32_t slot : {0U, 2U, 5U, 7U, 0x1000U, 0x1001U, 0x1002U, 0x1003U, 0x1004U, 0x10000U})
        EXPECT_THROW(parseSuperBlob(twice(slot).build()), CodeError) << slot;
}

TEST(SuperBlob, MayHaveSeveralEntriesForAnyOtherSlot) {
    for (const std::uint32_t slot : {1U, 3U, 4U, 6U, 8U, 0xFFFU, 0x1005U, 0x10001U, 0x10002U, 0xFFFFFFFFU})
        EXPECT_EQ(parseSuperBlob(twice(slot).build()).size(), 2U) << slot;
}

TEST(SuperBlob, RefusesTwoSlotsOnOneBlob) {
    const std::uint32_t first = 12 + 3 * 8;
    EXPECT_THROW(parseSuperBlob(threeBlobs().offsetOf(2, first).build()), CodeError);
}

TEST(SuperBlob, RefusesABlobInsideAnother) {
    const Data inner = makeBlob(0xA2, Data(8));
    auto builder = SuperBlobBuilder().blob(0, makeBlob(0xA0, inner)).blob(2, makeBlob(0xA2, {}));
    EXPECT_THROW(parseSuperBlob(builder.offsetOf(2, 12 + 2 * 8 + 8).build()), CodeError);
}

TEST(SuperBlob, RefusesABlobThatReachesIntoTheIndex) {
    // The count (1) and the slot (8) of the index read as the blob's magic and length.
    EXPECT_THROW(parseSuperBlob(SuperBlobBuilder().blob(8, makeBlob(0xA0, {})).offsetOf(8, 8).build()),
                 CodeError);
}

TEST(SuperBlob, EndsCleanlyWhereverItIsCut) {
    const Data whole = threeBlobs().build();
    for (std::size_t length = 0; length < whole.size(); ++length) {
        EXPECT_ANY_THROW(parseSuperBlob(ByteView(whole).first(length))) << length;
    }
}

TEST(SuperBlobInAFile, IsReadWithoutThePaddingOfItsArea) {
    const Data superblob = threeBlobs().build();
    Data file(100);
    base::append(file, superblob);
    file.resize(file.size() + 500, std::byte{0xFF});
    EXPECT_EQ(readSuperBlob(MemorySource(file), 100, superblob.size() + 500), superblob);
}

TEST(SuperBlobInAFile, RefusesAnAreaShorterThanItself) {
    const Data superblob = threeBlobs().build();
    EXPECT_THROW(readSuperBlob(MemorySource(superblob), 0, superblob.size() - 1), CodeError);
    EXPECT_THROW(readSuperBlob(MemorySource(superblob), 0, 11), CodeError);
}

TEST(SuperBlobInAFile, RefusesAnAreaBeyondTheFile) {
    EXPECT_THROW(readSuperBlob(MemorySource(Data(100)), 101, 12), base::ReadFailure);
    EXPECT_THROW(readSuperBlob(MemorySource(Data(100)), 0xFFFFFFFFFFFFFFFF, 12), base::ReadFailure);
}

// A file with zeros after the blobs.
TEST(SuperBlobInAFile, TakesMemoryForExistingBytesWhateverItsLength) {
    const TemporaryDirectory directory;
    const std::string path = directory / "signed";
    writeFile(path, ByteView(threeBlobs().length(0xFFFFFFFF).build()));
    std::filesystem::resize_file(path, 0xFFFFFFFF);
    const base::FileSource source = codesign::openCode(base::Places(), path);
    const std::size_t before = residentMemory();
    const base::SharedBytes superblob = readSuperBlob(source, 0, source.size());
    EXPECT_EQ(superblob.size(), 0xFFFFFFFF);
    EXPECT_EQ(parseSuperBlob(superblob).size(), 3U);
    EXPECT_LE(residentMemory(), before + kLittleMemory);
}

TEST(BuiltSuperBlob, IsReadBack) {
    const Data expected = threeBlobs().build();
    EXPECT_EQ(codesign::buildSuperBlob({{0, makeBlob(0xA0, Data(16, std::byte{1}))},
                                        {2, makeBlob(0xA2, Data(4, std::byte{2}))},
                                        {7, makeBlob(0xA7, Data(1, std::byte{3}))}}),
              expected);
}

}  // namespace
}  // namespace pinwell::test
