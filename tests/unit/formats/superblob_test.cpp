#include "formats/superblob.h"

#include <gtest/gtest.h>

#include "base/byte_io.h"
#include "support/collected_diagnostics.h"
#include "support/disk_image_builder.h"

namespace pinwell {
namespace {

using base::ByteReader;
using base::ByteView;
using base::ByteWriter;
using base::Data;
using base::toData;
using test::CollectedDiagnostics;
using test::makeBlob;
using test::SuperBlobBuilder;
using values::Value;
using Lines = std::vector<std::string>;

const Data kFields = ByteWriter().be32(0xFADE0CC0).be32(300).be32(2).data();

TEST(SuperblobLayout, ReadsTheHeaderInBigEndian) {
    ByteReader reader(kFields);
    const SuperblobHeader header = readSuperblobHeader(reader);
    EXPECT_EQ(header.magic, kSuperblobMagic);
    EXPECT_EQ(header.length, 300U);
    EXPECT_EQ(header.count, 2U);
    EXPECT_EQ(reader.position(), kSuperblobHeaderSize);
}

TEST(SuperblobLayout, ReadsAnIndexEntryAndABlobHeaderAtThePosition) {
    ByteReader reader(kFields);
    reader.skip(4, "");
    EXPECT_EQ(readBlobIndexEntry(reader), (BlobIndexEntry{300, 2}));
    EXPECT_EQ(reader.remaining(), 0U);
    ByteReader blob(kFields);
    EXPECT_EQ(readBlobHeader(blob).length, 300U);
    EXPECT_EQ(blob.position(), kBlobHeaderSize);
}

TEST(SuperblobLayout, NamesTheFieldWhereTheBytesEnd) {
    ByteReader reader(ByteView(kFields).first(11));
    try {
        readSuperblobHeader(reader);
        FAIL() << "eleven bytes are no header";
    } catch (const base::ShortRead& error) {
        EXPECT_NE(std::string(error.what()).find("superblob count"), std::string::npos) << error.what();
    }
}

Data first() {
    return makeBlob(0xFADE0C02, Data(12, std::byte{1}));
}  // 20 bytes
Data second() {
    return makeBlob(0xFADE0C01, Data(4, std::byte{2}));
}  // 12 bytes

SuperBlobBuilder twoBlobs() {
    return SuperBlobBuilder().blob(0, first()).blob(2, second());
}

struct Outcome {
    Data superblob;  // which the blobs are views of
    std::optional<BlobSet> blobs;
    Lines lines;
};

Outcome read(Data superblob, std::uint32_t count) {
    CollectedDiagnostics said;
    auto blobs = orderedBlobSetForSuperBlob(superblob, count, said.diagnostics());
    return {std::move(superblob), std::move(blobs), said.lines()};
}

TEST(BlobSet, HasARecordOfExactlyFiveKeysForEachBlobInIndexOrder) {
    const auto [viewed, blobs, lines] = read(twoBlobs().build(), 2);
    ASSERT_TRUE(blobs.has_value());
    ASSERT_EQ(blobs->size(), 2U);
    const auto valuesOf = [](const BlobRecord& record) {
        return values::Dictionary{{"cs slot type", record.at("cs slot type")},
                                  {"offset", record.at("offset")},
                                  {"length", record.at("length")},
                                  {"data", record.at("data")},
                                  {"magic", record.at("magic")}};
    };
    EXPECT_EQ(valuesOf((*blobs)[0]), (values::Dictionary{{"cs slot type", Value(0U)},
                                                         {"offset", Value(28U)},
                                                         {"length", Value(20U)},
                                                         {"data", Value(first())},
                                                         {"magic", Value(0xFADE0C02U)}}));
    EXPECT_EQ(valuesOf((*blobs)[1]), (values::Dictionary{{"cs slot type", Value(2U)},
                                                         {"offset", Value(48U)},
                                                         {"length", Value(12U)},
                                                         {"data", Value(second())},
                                                         {"magic", Value(0xFADE0C01U)}}));
    EXPECT_EQ((*blobs)[0].at("another key"), Value());
    EXPECT_EQ(lines, Lines{"Total Length: 60 Found blobs: 2"});
}

TEST(BlobSet, OfTheEmptySuperblobIsEmpty) {
    EXPECT_EQ(emptySuperblob(), ByteWriter().be32(0xFADE0CC0).be32(12).be32(0).data());
    const auto [viewed, blobs, lines] = read(emptySuperblob(), 0);
    EXPECT_EQ(blobs, BlobSet{});
    EXPECT_EQ(lines, Lines{"Total Length: 12 Found blobs: 0"});
}

TEST(BlobSet, RefusesTwoEqualIndexEntries) {
    const Data superblob = SuperBlobBuilder().blob(2, second()).blob(2, second()).offsetOf(2, 28).build();
    const auto [viewed, blobs, lines] = read(superblob, 2);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, Lines{"Did not find 2 unique blobs in the code signing data."});
}

TEST(BlobSet, DistinguishesTwoBlobsOfOneSlot) {
    const auto [viewed, blobs, lines] =
        read(SuperBlobBuilder().blob(2, second()).blob(2, second()).build(), 2);
    ASSERT_TRUE(blobs.has_value());
    EXPECT_EQ(blobs->size(), 2U);
}

TEST(BlobSet, RefusesAnIndexOutOfFileOrder) {
    const auto [viewed, blobs, lines] = read(twoBlobs().reverseIndex().build(), 2);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines,
              (Lines{"Calculated length (18446744073709551596) does not match embedded blob length (12)",
                     "Length of all blobs (28) did not match length of code signing data (60)."}));
}

TEST(BlobSet, RefusesAGapBetweenBlobs) {
    const Data superblob = SuperBlobBuilder().blob(0, first()).gap(4).blob(2, second()).build();
    const auto [viewed, blobs, lines] = read(superblob, 2);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, (Lines{"Calculated length (24) does not match embedded blob length (20)",
                            "Length of all blobs (28) did not match length of code signing data (64)."}));
}

TEST(BlobSet, RefusesAGapAfterTheIndex) {
    const Data superblob = SuperBlobBuilder().gap(4).blob(0, first()).blob(2, second()).build();
    const auto [viewed, blobs, lines] = read(superblob, 2);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, Lines{"Length of all blobs (60) did not match length of code signing data (64)."});
}

TEST(BlobSet, RefusesBytesAfterTheLastBlob) {
    Data superblob = twoBlobs().build();
    superblob.push_back(std::byte{0});
    const auto [viewed, blobs, lines] = read(superblob, 2);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, (Lines{"Calculated length (13) does not match embedded blob length (12)",
                            "Length of all blobs (48) did not match length of code signing data (61)."}));
}

TEST(BlobSet, IsShorterThanTheCountWhenTheBlobsBeforeAWrongOneFillTheSuperblob) {
    // The second entry leads to the superblob's end, where there is no room even for a header.
    const Data superblob = SuperBlobBuilder().blob(0, first()).blob(2, {}).build();
    const auto [viewed, blobs, lines] = read(superblob, 2);
    ASSERT_TRUE(blobs.has_value());
    EXPECT_EQ(blobs->size(), 1U);
    EXPECT_EQ(lines, Lines{"Total Length: 48 Found blobs: 1"});
}

TEST(BlobSet, RefusesABlobThatBeginsAfterTheSuperblob) {
    const auto [viewed, blobs, lines] =
        read(SuperBlobBuilder().blob(2, second()).offsetOf(2, 0xFFFFFFF0).build(), 1);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, Lines{"Length of all blobs (20) did not match length of code signing data (32)."});
}

TEST(BlobSet, RefusesABlobThatEndsAfterTheSuperblob) {
    // Its own length (1000) agrees with the offsets (28 and 1028).
    const Data overlong = ByteWriter().be32(0xFADE0C01).be32(1000).be32(0).data();
    const auto [viewed, blobs, lines] =
        read(SuperBlobBuilder().blob(2, overlong).blob(5, second()).offsetOf(5, 1028).build(), 2);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, Lines{"Length of all blobs (28) did not match length of code signing data (52)."});
}

TEST(BlobSet, RefusesAnIndexThatTheSuperblobIsTooShortFor) {
    Data superblob = SuperBlobBuilder().count(1).build();
    superblob.resize(16);
    const auto [viewed, blobs, lines] = read(superblob, 1);
    EXPECT_EQ(blobs, std::nullopt);
    EXPECT_EQ(lines, Lines{"Did not find 1 unique blobs in the code signing data."});
}

SuperBlobBuilder blobsOfHeadersAlone(std::uint32_t count) {
    SuperBlobBuilder builder;
    for (std::uint32_t i = 0; i < count; ++i) builder.blob(i, makeBlob(0xFADE0C01, {}));
    return builder;
}

TEST(BlobSet, HasMoreBlobsThan16BitsCount) {
    constexpr std::uint32_t kCount = 70'000;
    const Data superblob = blobsOfHeadersAlone(kCount).build();
    const auto [viewed, blobs, lines] = read(superblob, kCount);
    ASSERT_TRUE(blobs.has_value());
    EXPECT_EQ(blobs->size(), kCount);
    EXPECT_EQ(blobs->back().slotType, kCount - 1);
}

TEST(BlobSet, RefusesTwoEqualEntriesFarApart) {
    constexpr std::uint32_t kCount = 1000;
    SuperBlobBuilder builder = blobsOfHeadersAlone(kCount);
    builder.blob(0, makeBlob(0xFADE0C01, {})).offsetOf(0, 12 + 8 * (kCount + 1));
    EXPECT_EQ(read(builder.build(), kCount + 1).lines,
              Lines{"Did not find 1001 unique blobs in the code signing data."});
}

class SuperblobWithTicket : public testing::Test {
  protected:
    // The result of rewriting `superblob`, which has `count` blobs.
    Data rewritten(const Data& superblob, std::uint32_t count, std::string_view ticket) {
        const auto blobs = orderedBlobSetForSuperBlob(superblob, count);
        EXPECT_TRUE(blobs.has_value());
        CollectedDiagnostics said;
        Data result = toData(
            superblobWithTicket(blobs.value_or(BlobSet{}), base::asBytes(ticket), 0, said.diagnostics())
                .view());
        lines = said.lines();
        return result;
    }

    Lines lines;
};

TEST_F(SuperblobWithTicket, HasTheTicketLastAndAllOthersAsTheyWere) {
    EXPECT_EQ(rewritten(twoBlobs().build(), 2, "ticket"),
              twoBlobs().blob(0x10002, test::ticketBlob("ticket")).build());
    EXPECT_EQ(lines,
              (Lines{"Adding 3 blobs to superblob. What about Blob?", "Adding blob of size 20 to offset 36.",
                     "Adding blob of size 12 to offset 56.", "Length of new ticket blob is 14"}));
}

TEST_F(SuperblobWithTicket, OfOneByteHasABlobOf9) {
    EXPECT_EQ(rewritten(emptySuperblob(), 0, "t"), ByteWriter()
                                                       .be32(0xFADE0CC0)
                                                       .be32(29)
                                                       .be32(1)
                                                       .be32(0x10002)
                                                       .be32(20)
                                                       .be32(0xFADE0B01)
                                                       .be32(9)
                                                       .text("t")
                                                       .data());
    EXPECT_EQ(lines,
              (Lines{"Adding 1 blobs to superblob. What about Blob?", "Length of new ticket blob is 9"}));
}

TEST_F(SuperblobWithTicket, DropsEveryTicketThatWasThere) {
    const Data old = SuperBlobBuilder()
                         .blob(0x10002, test::ticketBlob("oldest"))
                         .blob(2, second())
                         .blob(0x10002, test::ticketBlob("old"))
                         .build();
    EXPECT_EQ(rewritten(old, 3, "new"),
              SuperBlobBuilder().blob(2, second()).blob(0x10002, test::ticketBlob("new")).build());
}

TEST_F(SuperblobWithTicket, DroppedTakesItByItsSlotAndNotByItsMagic) {
    const Data old = SuperBlobBuilder()
                         .blob(0x10002, makeBlob(0x11111111, Data(5)))
                         .blob(0x10000, makeBlob(0xFADE0B01, Data(3)))
                         .build();
    EXPECT_EQ(rewritten(old, 2, ""), SuperBlobBuilder().blob(0x10000, makeBlob(0xFADE0B01, Data(3))).build());
}

TEST_F(SuperblobWithTicket, DroppedFromItsOwnOnlyBlobIsNoSuperblobAtAll) {
    EXPECT_EQ(rewritten(SuperBlobBuilder().blob(0x10002, test::ticketBlob("old")).build(), 1, ""), Data{});
    EXPECT_EQ(lines, Lines{"Adding 0 blobs to superblob. What about Blob?"});
}

TEST_F(SuperblobWithTicket, HasRoomAfterItForTheCallersBytes) {
    const Data superblob = twoBlobs().build();
    const auto blobs = orderedBlobSetForSuperBlob(superblob, 2);
    ASSERT_TRUE(blobs.has_value());
    Data expected = twoBlobs().blob(0x10002, test::ticketBlob("ticket")).build();
    expected.resize(expected.size() + 512);
    EXPECT_EQ(toData(superblobWithTicket(*blobs, base::asBytes("ticket"), 512).view()), expected);
}

// Views of zeros that are never read.
TEST_F(SuperblobWithTicket, IsNotMadeWhereItsLengthDoesNotFitIn32Bits) {
    const base::SparseBuffer zeros(0xFFFFFFFF);
    const auto blobOf = [&](std::uint64_t length) {
        return BlobSet{{.slotType = 2, .offset = 20, .magic = 0, .data = zeros.view().first(length)}};
    };
    // Header 12, two entries of 8, the ticket's header 8 and its 6 bytes.
    EXPECT_TRUE(hasRoomForTicket(blobOf(0xFFFFFFFF - 42), base::asBytes("ticket")));
    EXPECT_FALSE(hasRoomForTicket(blobOf(0xFFFFFFFF - 41), base::asBytes("ticket")));
    EXPECT_TRUE(hasRoomForTicket({{.slotType = 0x10002, .offset = 20, .magic = 0, .data = zeros.view()}},
                                 base::asBytes("ticket")));
}

}  // namespace
}  // namespace pinwell
