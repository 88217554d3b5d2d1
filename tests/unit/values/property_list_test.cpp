#include "values/property_list.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <limits>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "support/text.h"
#include "values/date.h"
#include "values/value.h"

namespace pinwell::values {
namespace {

using base::asBytes;
using base::ByteView;
using base::ByteWriter;
using base::Data;
using base::toData;
using test::repeated;
using testing::HasSubstr;

Value parsed(ByteView document) {
    auto result = parsePropertyList(document);
    EXPECT_TRUE(result) << result.error().localizedDescription();
    return result ? *result : Value();
}

std::string refusal(ByteView document) {
    const auto result = parsePropertyList(document);
    if (result) return "it was read";
    EXPECT_EQ(result.error().domain(), base::kDataErrorDomain);
    return result.error().localizedDescription();
}

std::string refusal(std::string_view text) {
    return refusal(asBytes(text));
}

std::string xml(std::string_view body) {
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE plist PUBLIC \"-//A//DTD PLIST 1.0//EN\" "
           "\"http://example.test/list.dtd\">\n<plist version=\"1.0\">\n" +
           std::string(body) + "\n</plist>\n";
}

Value parsedXML(std::string_view body) {
    return parsed(asBytes(xml(body)));
}

// Lays out a binary list object by object; every number of the trailer can be false.
class BinaryList {
  public:
    BinaryList() { writer_.text("bplist00"); }

    BinaryList& object(ByteView bytes) {
        offsets_.push_back(writer_.size());
        writer_.bytes(bytes);
        return *this;
    }
    BinaryList& object(std::initializer_list<unsigned> bytes) {
        ByteWriter contents;
        for (const unsigned byte : bytes) contents.u8(static_cast<std::uint8_t>(byte));
        return object(contents.data());
    }
    BinaryList& offsetOfLast(std::uint64_t offset) {
        offsets_.back() = offset;
        return *this;
    }
    BinaryList& referenceWidth(unsigned width) {
        referenceWidth_ = static_cast<std::uint8_t>(width);
        return *this;
    }
    BinaryList& offsetWidth(unsigned width) {
        offsetWidth_ = static_cast<std::uint8_t>(width);
        return *this;
    }
    BinaryList& root(std::uint64_t object) {
        root_ = object;
        return *this;
    }
    BinaryList& count(std::uint64_t count) {
        count_ = count;
        return *this;
    }
    BinaryList& tableOffset(std::uint64_t offset) {
        tableOffset_ = offset;
        return *this;
    }

    Data build() const {
        ByteWriter list = writer_;
        const std::uint64_t table = list.size();
        for (const std::uint64_t offset : offsets_) list.be32(static_cast<std::uint32_t>(offset));
        list.zeros(6).u8(offsetWidth_).u8(referenceWidth_);
        list.be64(count_.value_or(offsets_.size())).be64(root_).be64(tableOffset_.value_or(table));
        return std::move(list).take();
    }

  private:
    ByteWriter writer_;
    std::vector<std::uint64_t> offsets_;
    std::uint8_t offsetWidth_ = 4;
    std::uint8_t referenceWidth_ = 1;
    std::uint64_t root_ = 0;
    std::optional<std::uint64_t> count_;
    std::optional<std::uint64_t> tableOffset_;
};

TEST(XMLPropertyList, ReadsEveryKind) {
    EXPECT_EQ(parsedXML("<dict><key>s</key><string>a &amp; b</string><key>i</key><integer>-5</integer>"
                        "<key>r</key><real>1.5</real><key>t</key><true/><key>f</key><false/>"
                        "<key>d</key><data>AAEC</data><key>a</key><array><integer>1</integer></array>"
                        "<key>when</key><date>2026-11-20T19:55:00Z</date><key>e</key><dict/></dict>"),
              Value(Dictionary{{"s", "a & b"},
                               {"i", -5},
                               {"r", 1.5},
                               {"t", true},
                               {"f", false},
                               {"d", toData(std::string_view("\0\1\2", 3))},
                               {"a", Array{1}},
                               {"when", Date{1795204500}},
                               {"e", Dictionary{}}}));
}

TEST(XMLPropertyList, MayHaveScalarsAtTheRoot) {
    EXPECT_EQ(parsedXML("<string>x</string>"), Value("x"));
}

TEST(XMLPropertyList, SkipsCommentsAndAByteOrderMark) {
    EXPECT_EQ(parsedXML("<!-- <dict> --><array><!-- x --><true/></array>"), Value(Array{true}));
    EXPECT_EQ(parsed(asBytes("\xEF\xBB\xBF" + xml("<true/>"))), Value(true));
}

TEST(XMLPropertyList, ReadsMarkedSectionsInText) {
    EXPECT_EQ(parsedXML("<string><![CDATA[a<b>]]></string>"), Value("a<b>"));
}

TEST(XMLPropertyList, RefusesADocumentTypeWithAnInternalSubset) {
    EXPECT_THAT(refusal("<?xml version=\"1.0\"?><!DOCTYPE plist [<!ENTITY a "
                        "\"aaaa\">]><plist><string>&a;</string></plist>"),
                HasSubstr("internal subset"));
    EXPECT_THAT(
        refusal(
            "<!DOCTYPE plist SYSTEM \"x>\" [<!ENTITY a SYSTEM \"/etc/passwd\">]><plist><string/></plist>"),
        HasSubstr("malformed"));
}

TEST(XMLPropertyList, RefusesADeclarationInsideTheDocument) {
    EXPECT_THAT(refusal(xml("<!DOCTYPE plist><true/>")), HasSubstr("malformed"));
    EXPECT_THAT(refusal(xml("<!ENTITY a \"b\"><true/>")), HasSubstr("malformed"));
}

TEST(XMLPropertyList, RefusesUndeclaredEntities) {
    EXPECT_THAT(refusal(xml("<string>&a;</string>")), HasSubstr("malformed"));
}

TEST(XMLPropertyList, ReadsCharacterReferences) {
    EXPECT_EQ(parsedXML("<string>&#65;&#x42;&lt;</string>"), Value("AB<"));
}

TEST(XMLPropertyList, RefusesReferencesToNoCharacter) {
    for (const std::string_view reference :
         {"&#0;", "&#x0;", "&#000;", "&#x110000;", "&#99999999999999999999;", "&#;", "&#x;", "&#-5;", "&#6a;",
          "&#65"})
        EXPECT_THAT(refusal(xml("<dict><key>a" + std::string(reference) + "</key><true/></dict>")),
                    HasSubstr("malformed"))
            << reference;
}

TEST(XMLPropertyList, RefusesUnbalancedElements) {
    for (const std::string_view body :
         {"<dict>", "</dict>", "<array></dict>", "<string>x", "<array><dict></array></dict>"})
        EXPECT_THAT(refusal(xml(body)), HasSubstr("malformed")) << body;
}

TEST(XMLPropertyList, RefusesOtherDocuments) {
    for (const std::string_view text :
         {"", "text", "<html></html>", "<plist></plist>", "<plist version=\"1.0\">", "<", "<?xml", "<!--",
          "<plist", "<plist><string><b/></string></plist>", "<plist><array>x</array></plist>",
          "<plist><![CDATA[x]]><true/></plist>"})
        EXPECT_THAT(refusal(text), HasSubstr("malformed")) << text;
}

TEST(XMLPropertyList, RefusesZeroBytesAndUTF16) {
    EXPECT_THAT(refusal(std::string_view("<\0p\0l\0i\0s\0t\0", 12)), HasSubstr("encoding"));
    EXPECT_THAT(refusal(xml(std::string_view("<string>\0</string>", 18))), HasSubstr("malformed"));
}

TEST(XMLPropertyList, ReadsISO88591WhereThatIsDeclared) {
    EXPECT_EQ(
        parsed(asBytes("<?xml version='1.0' encoding='ISO-8859-1'?><plist><string>\xE9</string></plist>")),
        Value("\xC3\xA9"));
}

TEST(XMLPropertyList, ReadsIntegersOf64BitsWithASignOrWithout) {
    EXPECT_EQ(parsedXML("<integer> 12\n</integer>"), Value(12));
    EXPECT_EQ(parsedXML("<integer>+12</integer>"), Value(12));
    EXPECT_EQ(parsedXML("<integer>0xFf</integer>"), Value(255));
    EXPECT_EQ(parsedXML("<integer>-0x10</integer>"), Value(-16));
    EXPECT_EQ(parsedXML("<integer>-9223372036854775808</integer>"),
              Value(std::numeric_limits<std::int64_t>::min()));
    EXPECT_EQ(parsedXML("<integer>18446744073709551615</integer>"),
              Value(std::numeric_limits<std::uint64_t>::max()));
    for (const char* text :
         {"", "-", "0x", "1.5", "12a", "1 2", "--1", "+-1", "18446744073709551616", "-9223372036854775809"})
        EXPECT_THAT(refusal(xml("<integer>" + std::string(text) + "</integer>")),
                    HasSubstr("no value of its kind"))
            << text;
}

TEST(XMLPropertyList, ReadsReals) {
    EXPECT_EQ(parsedXML("<real>-1.5e3</real>"), Value(-1500.0));
    EXPECT_EQ(parsedXML("<real>+2</real>"), Value(2.0));
    EXPECT_EQ(parsedXML("<real>inf</real>"), Value(std::numeric_limits<double>::infinity()));
    for (const char* text : {"", "x", "1,5", "1e", "+-1", "1e999", "0x1p3"})
        EXPECT_THAT(refusal(xml("<real>" + std::string(text) + "</real>")), HasSubstr("no value of its kind"))
            << text;
}

TEST(XMLPropertyList, ReadsDatesOfOneForm) {
    EXPECT_EQ(parsedXML("<date>1969-12-31T23:59:59Z</date>"), Value(Date{-1}));
    EXPECT_EQ(parsedXML("<date>2024-02-29T00:00:00Z</date>"), Value(Date{1709164800}));
    for (const char* text :
         {"", "2026-11-20", "2026-11-20T19:55:00", "2026-11-20 19:55:00Z", "2026-02-29T00:00:00Z",
          "2026-13-01T00:00:00Z", "2026-11-20T24:00:00Z", "2026-11-20T19:60:00Z", "20260-1-20T19:55:00Z"})
        EXPECT_THAT(refusal(xml("<date>" + std::string(text) + "</date>")), HasSubstr("no value of its kind"))
            << text;
}

TEST(XMLPropertyList, ReadsDataInLines) {
    EXPECT_EQ(parsedXML("<data>\n\tAA\n\tEC\n</data>"), Value(toData(std::string_view("\0\1\2", 3))));
    for (const char* text : {"A", "AAE", "AA!C", "AAEC="})
        EXPECT_THAT(refusal(xml("<data>" + std::string(text) + "</data>")), HasSubstr("no value of its kind"))
            << text;
}

TEST(XMLPropertyList, RefusesElementsWhereTheyDoNotBelong) {
    for (const char* body :
         {"<key>a</key>", "<true/><false/>", "<dict><true/></dict>", "<dict><key>a</key></dict>",
          "<dict><key>a</key><key>b</key><true/></dict>", "<array><key>a</key></array>",
          "<plist><true/></plist>", "<true>x</true>", "<string><true/></string>", "<true/>x", ""})
        EXPECT_THAT(refusal(xml(body)), HasSubstr("malformed")) << body;
    EXPECT_THAT(refusal("<dict/>"), HasSubstr("malformed"));
    EXPECT_THAT(refusal("<p:plist><true/></p:plist>"), HasSubstr("malformed"));
}

TEST(XMLPropertyList, OfTwoEqualKeysTheLastOneCounts) {
    EXPECT_EQ(parsedXML("<dict><key>a</key><integer>1</integer><key>a</key><integer>2</integer></dict>"),
              Value(Dictionary{{"a", 2}}));
}

TEST(XMLPropertyList, ReadsUpToTheLimitOfNestingAndNoDeeper) {
    EXPECT_TRUE(
        parsePropertyList(asBytes(xml(repeated("<array>", 64) + "<true/>" + repeated("</array>", 64)))));
    EXPECT_THAT(refusal(xml(repeated("<array>", 66) + repeated("</array>", 66))),
                HasSubstr("nested too deeply"));
    EXPECT_THAT(refusal(xml(repeated("<dict><key>a</key>", 100) + repeated("</dict>", 100))),
                HasSubstr("nested too deeply"));
    EXPECT_THAT(refusal(xml(repeated("<array>", 65) + "<true/>" + repeated("</array>", 65))),
                HasSubstr("nested too deeply"));
    EXPECT_THAT(refusal("<plist>" + repeated("<array>", 2'000'000)), HasSubstr("nested too deeply"));
}

TEST(XMLPropertyList, RefusesMoreValuesThanItsLimit) {
    EXPECT_THAT(
        refusal("<plist><array>" + repeated("<true/>", kMaximumPropertyListValues) + "</array></plist>"),
        HasSubstr("too many values"));
}

TEST(PropertyList, RefusesALongerDocumentThanItsLimit) {
    EXPECT_THAT(refusal(std::string(kMaximumPropertyListSize + 1, ' ')),
                HasSubstr("longer than 16777216 bytes"));
}

TEST(BinaryPropertyList, ReadsEveryKind) {
    // {"a": [true, -1, 1.5, data, "é", date]}
    const Data list = BinaryList()
                          .object({0xD1, 1, 2})
                          .object({0x51, 'a'})
                          .object({0xA6, 3, 4, 5, 6, 7, 8})
                          .object({0x09})
                          .object({0x13, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF})
                          .object({0x23, 0x3F, 0xF8, 0, 0, 0, 0, 0, 0})
                          .object({0x42, 0xAB, 0x00})
                          .object({0x61, 0x00, 0xE9})
                          .object({0x33, 0, 0, 0, 0, 0, 0, 0, 0})
                          .build();
    EXPECT_EQ(parsed(list), Value(Dictionary{{"a", Array{true, -1, 1.5, toData(std::string_view("\xAB\0", 2)),
                                                         "\xC3\xA9", Date{978307200}}}}));
}

TEST(BinaryPropertyList, ReadsLengthsThatFollow) {
    Data text = toData(std::string_view("\x5F\x10\x14", 3));
    base::append(text, asBytes("abcdefghijklmnopqrst"));
    EXPECT_EQ(parsed(BinaryList().object(text).build()), Value("abcdefghijklmnopqrst"));
}

TEST(BinaryPropertyList, CountsASharedObjectAtEveryUse) {
    EXPECT_EQ(parsed(BinaryList().object({0xA2, 1, 1}).object({0x51, 'x'}).build()), Value(Array{"x", "x"}));
}

TEST(BinaryPropertyList, RefusesOneThatHoldsItself) {
    EXPECT_THAT(refusal(BinaryList().object({0xA1, 0}).build()), HasSubstr("holds itself"));
    EXPECT_THAT(refusal(BinaryList().object({0xA1, 1}).object({0xD1, 2, 0}).object({0x51, 'k'}).build()),
                HasSubstr("holds itself"));
}

BinaryList chain(unsigned containers) {
    BinaryList list;
    for (unsigned i = 0; i < containers; ++i) list.object({0xA1, i + 1});
    list.object({0x09});
    return list;
}

TEST(BinaryPropertyList, ReadsUpToTheLimitOfNestingAndNoDeeper) {
    EXPECT_TRUE(parsePropertyList(chain(64).build()));
    EXPECT_THAT(refusal(chain(65).build()), HasSubstr("nested too deeply"));
    EXPECT_THAT(refusal(chain(250).build()), HasSubstr("nested too deeply"));
}

TEST(BinaryPropertyList, CountsNestingBelowASharedObject) {
    // The root uses the chain twice: first near the top, then at the bottom of another.
    BinaryList list;
    list.object({0xA2, 2, 41});
    list.object({0x09});
    for (unsigned i = 2; i < 40; ++i) list.object({0xA1, i + 1});
    list.object({0x09});  // 40
    for (unsigned i = 41; i < 80; ++i) list.object({0xA1, i + 1});
    list.object({0xA1, 2});  // 80
    EXPECT_THAT(refusal(list.build()), HasSubstr("nested too deeply"));
}

TEST(BinaryPropertyList, RefusesASmallListThatUnfoldsToMillionsOfValues) {
    BinaryList list;
    for (unsigned i = 0; i < 40; ++i) list.object({0xA2, i + 1, i + 1});
    list.object({0x09});
    EXPECT_THAT(refusal(list.build()), HasSubstr("too many values"));
}

TEST(BinaryPropertyList, RefusesASmallListThatUnfoldsToGigabytes) {
    // 256 uses of an array that uses a megabyte of data 15 times.
    ByteWriter outer;
    outer.u8(0xAF).u8(0x11).be16(256);
    for (int i = 0; i < 256; ++i) outer.u8(1);
    ByteWriter data;
    data.u8(0x4F).u8(0x12).be32(1 << 20).zeros(1 << 20);
    const Data list = BinaryList()
                          .object(outer.data())
                          .object({0xAE, 2, 2, 2, 2, 2, 2, 2, 2, 2, 2, 2, 2, 2, 2})
                          .object(data.data())
                          .build();
    EXPECT_THAT(refusal(list), HasSubstr("too many bytes"));
}

TEST(BinaryPropertyList, RefusesOverlappingContainersWithoutWalkingThemAll) {
    // A hundred thousand objects that are all the same array of sixty thousand references.
    ByteWriter array;
    array.u8(0xAF).u8(0x11).be16(60000);
    for (unsigned i = 0; i < 60000; ++i) array.be32(1 + i);
    BinaryList list;
    list.referenceWidth(4).object(array.data());
    for (unsigned i = 0; i < 100'000; ++i) list.object(ByteView{}).offsetOfLast(8);
    EXPECT_NE(refusal(list.build()), "it was read");
}

TEST(BinaryPropertyList, RefusesReferencesToNoObject) {
    EXPECT_THAT(refusal(BinaryList().object({0xA1, 7}).build()), HasSubstr("reference to no object"));
    EXPECT_THAT(refusal(BinaryList().object({0xD1, 7, 7}).build()), HasSubstr("reference to no object"));
}

TEST(BinaryPropertyList, RefusesKeysThatAreNotText) {
    EXPECT_THAT(refusal(BinaryList().object({0xD1, 1, 1}).object({0x10, 5}).build()),
                HasSubstr("a key is not text"));
}

TEST(BinaryPropertyList, ReadsKeysWithAZeroCharacter) {
    EXPECT_EQ(parsed(BinaryList().object({0xD1, 1, 2}).object({0x52, 'a', 0}).object({0x09}).build()),
              Value(Dictionary{{std::string("a\0", 2), true}}));
}

TEST(BinaryPropertyList, OfTwoEqualKeysTheLastOneCounts) {
    EXPECT_EQ(parsed(BinaryList()
                         .object({0xD2, 1, 1, 2, 3})
                         .object({0x51, 'a'})
                         .object({0x10, 1})
                         .object({0x10, 2})
                         .build()),
              Value(Dictionary{{"a", 2}}));
}

TEST(BinaryPropertyList, ReadsTextOfUTF16) {
    const auto text = [](std::initializer_list<unsigned> object) {
        return BinaryList().object(object).build();
    };
    EXPECT_EQ(parsed(text({0x63, 0x00, 0x41, 0x20, 0xAC, 0x07, 0xFF})), Value("A\xE2\x82\xAC\xDF\xBF"));
    EXPECT_EQ(parsed(text({0x62, 0xD8, 0x3D, 0xDE, 0x00})), Value("\xF0\x9F\x98\x80"));
    for (const Data& list : {text({0x61, 0xD8, 0x3D}), text({0x61, 0xDE, 0x00}),
                             text({0x62, 0xD8, 0x3D, 0x00, 0x41}), text({0x62, 0xDE, 0x00, 0xD8, 0x3D})})
        EXPECT_THAT(refusal(list), HasSubstr("not UTF-16"));
}

TEST(BinaryPropertyList, ReadsNumbersOfEveryWidth) {
    const Data list = BinaryList()
                          .object({0xA6, 1, 2, 3, 4, 5, 6})
                          .object({0x10, 0xFF})
                          .object({0x11, 0xFF, 0xFF})
                          .object({0x12, 0xFF, 0xFF, 0xFF, 0xFF})
                          .object({0x22, 0x3F, 0xC0, 0x00, 0x00})
                          .object({0x80, 0x07})
                          .object({0x08})
                          .build();
    EXPECT_EQ(parsed(list), Value(Array{0xFF, 0xFFFF, std::int64_t{0xFFFFFFFF}, 1.5, 7U, false}));
}

TEST(BinaryPropertyList, RefusesDatesThatAreNone) {
    const auto date = [](std::uint64_t bits) {
        ByteWriter object;
        object.u8(0x33).be64(bits);
        return BinaryList().object(object.data()).build();
    };
    EXPECT_EQ(parsed(date(std::bit_cast<std::uint64_t>(-1.5))), Value(Date{978307199}));
    for (const double seconds : {std::nan(""), std::numeric_limits<double>::infinity(), 1e300, -1e300})
        EXPECT_THAT(refusal(date(std::bit_cast<std::uint64_t>(seconds))), HasSubstr("date that is none"))
            << seconds;
}

TEST(BinaryPropertyList, RefusesContentsPastTheEnd) {
    EXPECT_THAT(refusal(BinaryList().object({0x55, 'a'}).build()), HasSubstr("longer than the list"));
    EXPECT_THAT(refusal(BinaryList().object({0x62, 0, 'a'}).build()), HasSubstr("cut short"));
    EXPECT_THAT(
        refusal(BinaryList().object({0x4F, 0x13, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}).build()),
        HasSubstr("longer than the list"));
    EXPECT_THAT(
        refusal(BinaryList().object({0xAF, 0x13, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}).build()),
        HasSubstr("more references than bytes"));
    EXPECT_THAT(refusal(BinaryList().object({0x13, 0, 0}).build()), HasSubstr("cut short"));
    EXPECT_THAT(refusal(BinaryList().object({0x5F}).build()), HasSubstr("cut short"));
}

TEST(BinaryPropertyList, RefusesALengthThatIsNoInteger) {
    EXPECT_THAT(refusal(BinaryList().object({0x5F, 0x51, 'a'}).build()), HasSubstr("a length is no integer"));
    EXPECT_THAT(refusal(BinaryList().object({0x5F, 0x14, 'a'}).build()), HasSubstr("a length is no integer"));
}

TEST(BinaryPropertyList, RefusesUnknownKinds) {
    for (const unsigned marker :
         {0x00U, 0x0FU, 0x14U, 0x21U, 0x24U, 0x30U, 0x70U, 0x88U, 0x90U, 0xB0U, 0xC0U, 0xE0U, 0xF0U})
        EXPECT_THAT(refusal(BinaryList().object({marker, 0, 0, 0, 0, 0, 0, 0, 0, 0}).build()),
                    HasSubstr("malformed"))
            << marker;
}

TEST(BinaryPropertyList, RefusesAFalseTrailer) {
    const BinaryList good = BinaryList().object({0x09});
    ASSERT_EQ(parsed(good.build()), Value(true));
    EXPECT_THAT(refusal(BinaryList(good).root(1).build()), HasSubstr("no such root"));
    EXPECT_THAT(refusal(BinaryList(good).root(~0ULL).build()), HasSubstr("no such root"));
    EXPECT_THAT(refusal(BinaryList(good).count(2).build()), HasSubstr("more objects"));
    EXPECT_THAT(refusal(BinaryList(good).count(~0ULL).build()), HasSubstr("more objects"));
    EXPECT_THAT(refusal(BinaryList(good).count(0).build()), HasSubstr("no such root"));
    EXPECT_THAT(refusal(BinaryList(good).offsetWidth(0).build()), HasSubstr("width"));
    EXPECT_THAT(refusal(BinaryList(good).offsetWidth(9).build()), HasSubstr("width"));
    EXPECT_THAT(refusal(BinaryList(good).referenceWidth(0).build()), HasSubstr("width"));
    EXPECT_THAT(refusal(BinaryList(good).tableOffset(7).build()), HasSubstr("offset table"));
    EXPECT_THAT(refusal(BinaryList(good).tableOffset(~0ULL).build()), HasSubstr("offset table"));
}

TEST(BinaryPropertyList, RefusesAnObjectOutsideTheObjects) {
    EXPECT_THAT(refusal(BinaryList().object({0x09}).offsetOfLast(0).build()), HasSubstr("object outside"));
    EXPECT_THAT(refusal(BinaryList().object({0x09}).offsetOfLast(9).build()), HasSubstr("object outside"));
    EXPECT_THAT(refusal(BinaryList().object({0x09}).offsetOfLast(0xFFFFFFFF).build()),
                HasSubstr("object outside"));
}

TEST(BinaryPropertyList, RefusesEveryTruncation) {
    const Data whole = BinaryList().object({0xA2, 1, 2}).object({0x51, 'x'}).object({0x10, 7}).build();
    for (std::size_t length = 0; length < whole.size(); ++length)
        EXPECT_NE(refusal(ByteView(whole).first(length)), "it was read") << length;
}

TEST(BinaryPropertyList, SurvivesEverySingleWrongByte) {
    const Data whole = BinaryList()
                           .object({0xD2, 1, 2, 3, 4})
                           .object({0x51, 'x'})
                           .object({0x61, 0xD8, 0x00})
                           .object({0x42, 7, 8})
                           .object({0x33, 0x7F, 0xEF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF})
                           .build();
    std::size_t refused = 0;
    for (std::size_t at = 0; at < whole.size(); ++at) {
        for (unsigned value = 0; value < 256; ++value) {
            Data wrong = whole;
            wrong[at] = static_cast<std::byte>(value);
            refused += parsePropertyList(wrong) ? 0U : 1U;
        }
    }
    EXPECT_GT(refused, whole.size());
}

TEST(PropertyList, ReadsItsOwnOutput) {
    const Value value(
        Dictionary{{"text", "<&>]]>\"'\xC3\xA9\n\r\t"},
                   {"numbers", Array{0, -7, std::numeric_limits<std::int64_t>::max(), 0.25, 0.1, 1e300}},
                   {"flags", Array{true, false}},
                   {"data", Data(100, std::byte{0xAB})},
                   {"nested", Dictionary{{"a b", Dictionary{}}}}});
    const auto written = serializePropertyList(value);
    ASSERT_TRUE(written) << written.error().localizedDescription();
    EXPECT_THAT(base::toString(*written), HasSubstr("<?xml"));
    EXPECT_EQ(parsed(*written), value);
}

TEST(PropertyList, CannotWriteValuesOutsideOfItsForm) {
    for (const Value& value :
         {Value(), Value(Value::Null{}), Value(std::nan("")), Value("\xFF"), Value("\xEF\xBF\xBF"),
          Value("\x01"), Value(Array{Value()}), Value(Dictionary{{"\x1B", 1}}),
          Value(std::numeric_limits<std::uint64_t>::max()), Value(base::Error("D", 1, "t"))})
        EXPECT_FALSE(serializePropertyList(value));
}

TEST(PropertyList, CannotWriteDeeperThanItReads) {
    Value deep = true;
    for (unsigned level = 0; level < kMaximumPropertyListDepth; ++level) deep = Array{deep};
    const auto written = serializePropertyList(deep);
    ASSERT_TRUE(written);
    EXPECT_EQ(parsed(*written), deep);
    EXPECT_FALSE(serializePropertyList(Array{deep}));
}

}  // namespace
}  // namespace pinwell::values
