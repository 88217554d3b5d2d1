#include "codesign/ber.h"

#include <gtest/gtest.h>

#include <string>

#include "base/byte_io.h"
#include "base/text.h"
#include "codesign/code_error.h"

namespace pinwell::codesign::ber {
namespace {

using base::toData;
using base::toHex;

Data hex(std::string_view digits) {
    Data data;
    for (std::size_t i = 0; i + 1 < digits.size(); i += 2)
        data.push_back(static_cast<std::byte>(std::stoi(std::string(digits.substr(i, 2)), nullptr, 16)));
    return data;
}

Element only(const Data& bytes) {
    Work work;
    Reader reader(bytes, work);
    const Element element = reader.next("it");
    reader.finish("it");
    return element;
}

void expectRefused(std::string_view digits) {
    const Data bytes = hex(digits);
    EXPECT_THROW(only(bytes), CodeError) << digits;
}

TEST(BerElement, HasTagContentsAndWhole) {
    const Data bytes = hex("0403010203");
    const Element element = only(bytes);
    EXPECT_EQ(element.tag, kOctetString);
    EXPECT_EQ(toHex(element.contents), "010203");
    EXPECT_EQ(toHex(element.whole), "0403010203");
    EXPECT_FALSE(element.isConstructed());
}

TEST(BerElement, TakesItsLengthInAnyForm) {
    for (const auto* const header : {"0402", "048102", "04820002", "048400000002"}) {
        const Data bytes = hex(std::string(header) + "AABB");
        EXPECT_EQ(toHex(only(bytes).contents), "aabb") << header;
    }
    const Data padded =
        hex("0490000000000000000000000000000000"
            "02AABB");
    EXPECT_EQ(toHex(only(padded).contents), "aabb");
}

TEST(BerElement, RefusesALengthBeyondItsBytes) {
    expectRefused("0401");
    expectRefused("048101");
    expectRefused("0484FFFFFFFF");
    expectRefused("0488FFFFFFFFFFFFFFFF");
    expectRefused("04898000000000000000000000");
    expectRefused("0482FF");
    expectRefused("04");
    expectRefused("");
}

TEST(BerElement, RefusesTheReservedLength) {
    expectRefused("04FF" + std::string(254, '0'));
}

TEST(BerElement, MayHaveATagNumberInSeveralBytes) {
    const Data bytes = hex("1F8F7F01AA");
    const Element element = only(bytes);
    EXPECT_EQ(toHex(element.wholeTag), "1f8f7f");
    EXPECT_EQ(toHex(element.contents), "aa");
    expectRefused("1F8F");
}

TEST(BerElement, OfIndefiniteLengthEndsAtItsEnd) {
    const Data bytes =
        hex("3080"
            "0401AA"
            "0000");
    const Element element = only(bytes);
    EXPECT_EQ(toHex(element.contents), "0401aa");
    EXPECT_EQ(element.whole.size(), bytes.size());
}

TEST(BerElement, OfIndefiniteLengthMayHoldOthersAndZeros) {
    const Data bytes =
        hex("3080"
            "3080"
            "04020000"
            "0000"
            "30020000"
            "0000");
    EXPECT_EQ(toHex(only(bytes).contents),
              "3080040200000000"
              "30020000");
}

TEST(BerElement, OfIndefiniteLengthMustBeConstructedAndHaveAnEnd) {
    expectRefused("0480AA0000");
    expectRefused("3080");
    expectRefused("30800401AA");
    expectRefused("30800401AA00");
    expectRefused("308030800000");
    expectRefused("3080008100");
    expectRefused("3080000100");
}

TEST(BerElement, RefusesAnEndWithoutABeginning) {
    expectRefused("0000");
    const Data bytes = hex("30020000");
    Work work;
    Reader reader(only(bytes).contents, work);
    EXPECT_THROW(reader.next("it"), CodeError);
}

Data nested(std::size_t levels) {
    base::ByteWriter writer;
    for (std::size_t i = 0; i < levels; ++i) writer.be16(0x3080);
    for (std::size_t i = 0; i < levels; ++i) writer.be16(0);
    return std::move(writer).take();
}

TEST(BerElement, OfIndefiniteLengthIsNestedToTheLimitAndNoDeeper) {
    const Data deepest = nested(kMaximumNesting);
    EXPECT_EQ(only(deepest).whole.size(), deepest.size());
    const Data deeper = nested(kMaximumNesting + 1);
    EXPECT_THROW(only(deeper), CodeError);
}

TEST(BerReader, TakesElementsInTheirOrder) {
    const Data bytes =
        hex("020101"
            "0500"
            "3000");
    Work work;
    Reader reader(bytes, work);
    EXPECT_EQ(reader.nextIf(kOctetString, "it"), std::nullopt);
    EXPECT_EQ(toHex(reader.expect(kInteger, "it").contents), "01");
    EXPECT_THROW(reader.finish("it"), CodeError);
    EXPECT_TRUE(reader.nextIf(0x05, "it"));
    EXPECT_THROW(reader.expect(kSet, "it"), CodeError);
    reader.finish("it");
    EXPECT_EQ(reader.nextIf(kSequence, "it"), std::nullopt);
}

TEST(BerReader, CountsTheHeadersOfAllReadersOfAMessage) {
    const Data bytes =
        hex("3080"
            "0401AA"
            "0401BB"
            "0000");
    Work work;
    Reader reader(bytes, work);
    const Element element = reader.next("it");
    EXPECT_EQ(work.headers, 4U);
    Reader inner(element.contents, work);
    inner.next("it");
    EXPECT_EQ(work.headers, 5U);
    work.headers = kMaximumHeaders;
    EXPECT_THROW(inner.next("it"), CodeError);
}

Data octetsOf(std::string_view digits) {
    const Data bytes = hex(digits);
    Work work;
    return octets(only(bytes), work, "it");
}

TEST(BerOctets, AreThoseOfAllPieces) {
    EXPECT_EQ(octetsOf("0402AABB"), hex("AABB"));
    EXPECT_EQ(octetsOf("24060401AA0401BB"), hex("AABB"));
    EXPECT_EQ(octetsOf("24800401AA24030401BB04000401CC0000"), hex("AABBCC"));
    EXPECT_EQ(octetsOf("2400"), Data());
    EXPECT_EQ(octetsOf("A0030401AA"), hex("AA"));
}

TEST(BerOctets, ArePiecesOfStringsAlone) {
    EXPECT_THROW(octetsOf("24030301AA"), CodeError);
    EXPECT_THROW(octetsOf("24020401"), CodeError);
    EXPECT_NO_THROW(
        octetsOf("240A240824062404240204"
                 "00"));
    EXPECT_THROW(octetsOf("240C240A240824062404240204"
                          "00"),
                 CodeError);
}

Data derOf(std::string_view digits) {
    const Data bytes = hex(digits);
    Work work;
    return inDer(only(bytes), work, "it");
}

TEST(BerInDer, IsTheSameForDer) {
    for (const auto* const der : {"3000", "31050401AA0500",
                                  "0481"
                                  "80",
                                  "1F8F7F01AA", "BF8F7F020500"}) {
        std::string whole = der;
        if (whole == "048180")
            for (int i = 0; i < 128; ++i) whole += "55";
        EXPECT_EQ(derOf(whole), hex(whole));
    }
}

TEST(BerInDer, HasDefiniteShortestLengthsAndWholeStrings) {
    EXPECT_EQ(derOf("3080"
                    "0500"
                    "0000"),
              hex("30020500"));
    EXPECT_EQ(derOf("308200020500"), hex("30020500"));
    EXPECT_EQ(derOf("31800482000101"
                    "3080"
                    "0000"
                    "0000"),
              hex("3105"
                  "040101"
                  "3000"));
    EXPECT_EQ(derOf("3080"
                    "24800401AA0401BB0000"
                    "0000"),
              hex("3004"
                  "0402AABB"));
}

TEST(BerInDer, GoesNoDeeperThanTheLimit) {
    Data deep;
    for (unsigned i = 0; i < kMaximumNesting; ++i) deep = makeElement(kSequence, deep);
    Work work;
    EXPECT_EQ(inDer(only(deep), work, "it"), deep);
    deep = makeElement(kSequence, deep);
    EXPECT_THROW(inDer(only(deep), work, "it"), CodeError);
}

TEST(BerInDer, WritesEveryLengthAsItIsRead) {
    for (const std::size_t length : {0U, 127U, 128U, 255U, 256U, 65535U, 65536U}) {
        const Data made = makeElement(kOctetString, Data(length, std::byte{7}));
        EXPECT_EQ(only(made).contents.size(), length);
        EXPECT_EQ(only(made).whole.size(), made.size());
    }
}

}  // namespace
}  // namespace pinwell::codesign::ber
