#include "base/byte_io.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>

namespace pinwell::base {
namespace {

using testing::AllOf;
using testing::HasSubstr;

constexpr std::uint64_t kHuge = std::numeric_limits<std::uint64_t>::max();

// The message of the ShortRead that `read` throws, or a note that it threw none.
template <class Read>
std::string shortage(Read read) {
    try {
        read();
    } catch (const ShortRead& error) {
        return error.what();
    }
    return "nothing was thrown";
}

TEST(ByteReader, ReadsIntegersOfEitherOrder) {
    const Data data = ByteWriter().u8(0x01).be16(0x0203).be32(0x04050607).be64(0x08090A0B0C0D0E0F).data();
    ByteReader big(data);
    EXPECT_EQ(big.u8("a"), 0x01);
    EXPECT_EQ(big.be16("b"), 0x0203);
    EXPECT_EQ(big.be32("c"), 0x04050607U);
    EXPECT_EQ(big.be64("d"), 0x08090A0B0C0D0E0FU);
    EXPECT_TRUE(big.atEnd());
    ByteReader little(data);
    little.skip(1, "a");
    EXPECT_EQ(little.le16("b"), 0x0302);
    EXPECT_EQ(little.le32("c"), 0x07060504U);
    EXPECT_EQ(little.le64("d"), 0x0F0E0D0C0B0A0908U);
}

TEST(ByteReader, KeepsTheHighestBit) {
    const Data data(8, std::byte{0xFF});
    EXPECT_EQ(ByteReader(data).be64("x"), kHuge);
    EXPECT_EQ(ByteReader(data).le64("x"), kHuge);
    EXPECT_EQ(ByteReader(data).be16("x"), 0xFFFF);
}

TEST(ByteReader, NamesTheFieldAndItsOffset) {
    const Data data(6);
    ByteReader reader(data, 100);
    reader.skip(4, "header");
    EXPECT_THAT(shortage([&] { reader.be32("blob length"); }),
                AllOf(HasSubstr("blob length"), HasSubstr("offset 104"), HasSubstr("4 bytes"),
                      HasSubstr("2 remain")));
}

TEST(ByteReader, DoesNotMoveWhenAReadFails) {
    const Data data(3);
    ByteReader reader(data);
    reader.skip(1, "x");
    EXPECT_THROW(reader.be32("y"), ShortRead);
    EXPECT_THROW(reader.seek(4, "y"), ShortRead);
    EXPECT_EQ(reader.position(), 1U);
    EXPECT_EQ(reader.remaining(), 2U);
}

TEST(ByteReader, RefusesLengthsThatWouldWrap) {
    const Data data(16);
    ByteReader reader(data);
    reader.skip(8, "x");
    EXPECT_THROW(reader.bytes(kHuge, "y"), ShortRead);
    EXPECT_THROW(reader.bytes(kHuge - 7, "y"), ShortRead);
    EXPECT_THROW(reader.seek(kHuge, "y"), ShortRead);
    EXPECT_THROW(reader.sub(8, kHuge - 7, "y"), ShortRead);
    EXPECT_THROW(reader.sub(kHuge, 1, "y"), ShortRead);
}

TEST(ByteReader, ReadsUpToTheEndAndNotAByteFurther) {
    const Data data(4);
    for (std::size_t at = 0; at <= data.size(); ++at) {
        ByteReader reader(data);
        reader.seek(at, "start");
        EXPECT_EQ(reader.bytes(data.size() - at, "rest").size(), data.size() - at);
        EXPECT_THROW(reader.u8("past the end"), ShortRead);
    }
}

TEST(ByteReader, ReadsNothingFromAnEmptyBuffer) {
    ByteReader reader(ByteView{});
    EXPECT_TRUE(reader.atEnd());
    EXPECT_TRUE(reader.bytes(0, "nothing").empty());
    EXPECT_THROW(reader.u8("x"), ShortRead);
}

TEST(ByteReader, HandsOutViewsIntoTheSameBytes) {
    const Data data = toData("abcdef");
    ByteReader reader(data);
    reader.skip(2, "x");
    EXPECT_EQ(reader.bytes(3, "y").data(), data.data() + 2);
}

TEST(ByteReader, SubReaderKeepsToItsRangeAndSpeaksOfTheOuterOffset) {
    const Data data = toData("0123456789");
    const ByteReader outer(data, 50);
    ByteReader inner = outer.sub(4, 2, "inner");
    EXPECT_EQ(inner.u8("x"), '4');
    EXPECT_EQ(inner.u8("x"), '5');
    EXPECT_THAT(shortage([&] { inner.u8("field"); }),
                HasSubstr("field: 1 bytes wanted at offset 56, 0 remain"));
    EXPECT_EQ(outer.position(), 0U);
}

TEST(ByteReader, NamesAPlaceOutsideTheBytes) {
    const Data data(10);
    ByteReader reader(data, 5);
    EXPECT_THAT(shortage([&] { reader.seek(11, "trailer"); }),
                HasSubstr("trailer: 11 bytes wanted at offset 5, 10 remain"));
    EXPECT_THAT(shortage([&] { (void)reader.sub(12, 1, "blob"); }),
                HasSubstr("blob: 12 bytes wanted at offset 5, 10"));
    EXPECT_THAT(shortage([&] { (void)reader.sub(9, 2, "blob"); }),
                HasSubstr("blob: 2 bytes wanted at offset 14, 1 remain"));
}

TEST(ByteReader, SubReaderMayBeEmptyAtTheEnd) {
    const Data data(3);
    EXPECT_TRUE(ByteReader(data).sub(3, 0, "rest").atEnd());
}

TEST(ByteWriter, WritesTheFormOfTheReader) {
    const Data data = ByteWriter().le16(0x0102).le32(0x03040506).le64(7).text("ab").zeros(2).u8(9).data();
    ByteReader reader(data);
    EXPECT_EQ(reader.le16("a"), 0x0102);
    EXPECT_EQ(reader.le32("b"), 0x03040506U);
    EXPECT_EQ(reader.le64("c"), 7U);
    EXPECT_EQ(toString(reader.bytes(4, "d")), std::string("ab\0\0", 4));
    EXPECT_EQ(reader.u8("e"), 9);
    EXPECT_TRUE(reader.atEnd());
}

TEST(Bytes, BecomeTextAndComeBack) {
    const std::string text("a\0\xFF", 3);
    EXPECT_EQ(toString(toData(text)), text);
}

}  // namespace
}  // namespace pinwell::base
