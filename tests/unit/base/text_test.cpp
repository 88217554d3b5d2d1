#include "base/text.h"

#include <gtest/gtest.h>

#include <limits>

namespace pinwell::base {
namespace {

TEST(Hex, ComesBackAsTheBytesThatItWasMadeOf) {
    Data all;
    for (int value = 0; value < 256; ++value) all.push_back(static_cast<std::byte>(value));
    EXPECT_EQ(parseHex(toHex(all)), all);
    EXPECT_EQ(parseHex(""), Data());
}

TEST(Hex, IsLowerCaseDigitsInPairs) {
    for (const char* text : {"a", "abc", "AB", "aG", "0x12", " 12", "12 ", "1-", "\xC3\xA9"})
        EXPECT_FALSE(parseHex(text)) << text;
}

struct Vector {
    std::string_view plain;
    std::string_view encoded;
};

// RFC 4648, section 10.
constexpr Vector kVectors[] = {{"", ""},
                               {"f", "Zg=="},
                               {"fo", "Zm8="},
                               {"foo", "Zm9v"},
                               {"foob", "Zm9vYg=="},
                               {"fooba", "Zm9vYmE="},
                               {"foobar", "Zm9vYmFy"}};

TEST(Base64, DecodesTheVectorsOfItsStandard) {
    for (const auto& [plain, encoded] : kVectors) EXPECT_EQ(decodeBase64(encoded), toData(plain)) << encoded;
}

TEST(Base64, EncodesTheVectorsOfItsStandard) {
    for (const auto& [plain, encoded] : kVectors) EXPECT_EQ(encodeBase64(asBytes(plain)), encoded);
}

TEST(Base64, BringsEveryByteBack) {
    Data bytes;
    for (unsigned i = 0; i < 256; ++i) bytes.push_back(static_cast<std::byte>(i));
    EXPECT_EQ(decodeBase64(encodeBase64(bytes)), bytes);
}

TEST(Base64, KnowsThePlusAndTheSlash) {
    EXPECT_EQ(decodeBase64("+/+/"), toData("\xFB\xFF\xBF"));
}

TEST(Base64, RefusesTheAlphabetForURLs) {
    EXPECT_FALSE(decodeBase64("-_-_"));
}

TEST(Base64, RefusesMissingPadding) {
    EXPECT_FALSE(decodeBase64("Zg"));
    EXPECT_FALSE(decodeBase64("Zg="));
    EXPECT_FALSE(decodeBase64("Zm9vY"));
}

TEST(Base64, RefusesPaddingWhereItDoesNotBelong) {
    EXPECT_FALSE(decodeBase64("===="));
    EXPECT_FALSE(decodeBase64("Z==="));
    EXPECT_FALSE(decodeBase64("=Zm9"));
    EXPECT_FALSE(decodeBase64("Zg==Zm9v"));
    EXPECT_FALSE(decodeBase64("Zm9v===="));
}

TEST(Base64, RefusesSetBitsThatThePaddingCutsOff) {
    EXPECT_FALSE(decodeBase64("Zh=="));
    EXPECT_FALSE(decodeBase64("Zm9="));
}

TEST(Base64, RefusesWhiteSpaceAndLineBreaks) {
    EXPECT_FALSE(decodeBase64("Zm9v\n"));
    EXPECT_FALSE(decodeBase64("Zm9\n"));
    EXPECT_FALSE(decodeBase64(" Zm9"));
}

TEST(Base64, RefusesAZeroByte) {
    EXPECT_FALSE(decodeBase64(std::string_view("Zm9\0", 4)));
}

TEST(TextForDisplay, ShowsCharactersThatChangeTheDirectionOfWriting) {
    EXPECT_EQ(escapeForDisplay("a\u202egpj.exe"), "a\\u202egpj.exe");
    EXPECT_EQ(escapeForDisplay("\u2066\u2069\u200f\u061c"), "\\u2066\\u2069\\u200f\\u061c");
}

TEST(TextForDisplay, ShowsSeparatorsOfLines) {
    EXPECT_EQ(escapeForDisplay("a\u2028b\u2029"), "a\\u2028b\\u2029");
}

TEST(TextForDisplay, ShowsControlCharactersAndWhatIsNotUtf8) {
    EXPECT_EQ(escapeForDisplay("a\x1b[2J\n\xff"), "a\\x1b[2J\\n\\xff");
}

TEST(TextForDisplay, KeepsLettersOfEveryScript) {
    const char* const text = "R\u00fcdiger, \u05d0\u05d1, \u0627\u0628, \u4e2d";
    EXPECT_EQ(escapeForDisplay(text), text);
}

TEST(TextForMarkup, HasNoMarkupOfItsOwn) {
    EXPECT_EQ(markupText("<a b=\"c\">'&\u202e"), "&lt;a b=&quot;c&quot;&gt;&#39;&amp;\\u202e");
}

TEST(TextForMarkup, HasNoCodePointsThatXmlForbids) {
    EXPECT_EQ(markupText("a\xEF\xBF\xBE\xEF\xBF\xBF"), "a\xEF\xBF\xBD\xEF\xBF\xBD");
}

constexpr std::uint64_t kKilo = 1024;
constexpr std::uint64_t kMega = 1024 * kKilo;
constexpr std::uint64_t kGiga = 1024 * kMega;

TEST(ByteCount, SpellsOutNothing) {
    EXPECT_EQ(formatByteCount(0), "Zero KB");
}

TEST(ByteCount, CountsBytesBelowAKilobyte) {
    EXPECT_EQ(formatByteCount(1), "1 byte");
    EXPECT_EQ(formatByteCount(512), "512 bytes");
    EXPECT_EQ(formatByteCount(1023), "1023 bytes");
}

TEST(ByteCount, ShowsKilobytesWithoutFraction) {
    EXPECT_EQ(formatByteCount(kKilo), "1 KB");
    EXPECT_EQ(formatByteCount(kKilo + 511), "1 KB");
    EXPECT_EQ(formatByteCount(kKilo + 512), "2 KB");
}

TEST(ByteCount, ShowsMegabytesWithOneDigit) {
    EXPECT_EQ(formatByteCount(kMega + kMega / 2), "1.5 MB");
    EXPECT_EQ(formatByteCount(64 * kMega), "64 MB");
    EXPECT_EQ(formatByteCount(kMega + 1), "1 MB");
}

TEST(ByteCount, ShowsGigabytesWithTwoDigits) {
    EXPECT_EQ(formatByteCount(2 * kGiga + kGiga / 4), "2.25 GB");
    EXPECT_EQ(formatByteCount(2 * kGiga + kGiga / 2), "2.5 GB");
    EXPECT_EQ(formatByteCount(kGiga + kGiga / 50), "1.02 GB");
}

TEST(ByteCount, ShowsWhatRoundsUpToAThousandAsTheNextUnit) {
    EXPECT_EQ(formatByteCount(kMega - 1), "1 MB");
    EXPECT_EQ(formatByteCount(kGiga - 1), "1 GB");
}

TEST(ByteCount, HoldsTheLargestCount) {
    EXPECT_EQ(formatByteCount(std::numeric_limits<std::uint64_t>::max()), "16 EB");
    EXPECT_EQ(formatByteCount(std::uint64_t{1} << 60U), "1 EB");
    EXPECT_EQ(formatByteCount((std::uint64_t{1} << 60U) + (std::uint64_t{1} << 58U)), "1.25 EB");
}

TEST(Bytes, AreShownAsTwoDigitsEach) {
    EXPECT_EQ(toHex(asBytes(std::string_view("\x00\x0F\xFF", 3))), "000fff");
    EXPECT_EQ(toHex({}), "");
}

TEST(TerminalText, PassesOrdinaryTextThrough) {
    EXPECT_EQ(escapeForTerminal("plain, \\ \"quoted\" \xC3\xA9 \xE2\x82\xAC \xF0\x9F\x93\x8C"),
              "plain, \\ \"quoted\" \xC3\xA9 \xE2\x82\xAC \xF0\x9F\x93\x8C");
    EXPECT_EQ(escapeForTerminal(""), "");
}

TEST(TerminalText, EscapesControlCharacters) {
    EXPECT_EQ(escapeForTerminal("a\x1B[2Jb"), "a\\x1b[2Jb");
    EXPECT_EQ(escapeForTerminal("\n\r\t"), "\\n\\r\\t");
    EXPECT_EQ(escapeForTerminal("\x7F"), "\\x7f");
    EXPECT_EQ(escapeForTerminal(std::string_view("\0", 1)), "\\x00");
    EXPECT_EQ(escapeForTerminal("\xC2\x9B"
                                "31m"),
              "\\xc2\\x9b31m");
    EXPECT_EQ(escapeForTerminal("\xC2\xA0"), "\xC2\xA0");
}

TEST(TerminalText, EscapesMalformedUTF8ByteByByte) {
    EXPECT_EQ(escapeForTerminal("\xFF"), "\\xff");
    EXPECT_EQ(escapeForTerminal("a\x80z"), "a\\x80z");
    EXPECT_EQ(escapeForTerminal("\xC0\x9B"), "\\xc0\\x9b");                    // overlong escape
    EXPECT_EQ(escapeForTerminal("\xE0\x80\x9B"), "\\xe0\\x80\\x9b");           // the same, longer
    EXPECT_EQ(escapeForTerminal("\xED\xA0\x80"), "\\xed\\xa0\\x80");           // surrogate
    EXPECT_EQ(escapeForTerminal("\xF4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80");  // past the last code point
    EXPECT_EQ(escapeForTerminal("\xE2\x82"), "\\xe2\\x82");                    // cut short
    EXPECT_EQ(escapeForTerminal("\xE2\x82"
                                "A"),
              "\\xe2\\x82"
              "A");
}

TEST(UTF8, KnowsTheLengthOfASequence) {
    EXPECT_EQ(utf8SequenceLength("a"), 1U);
    EXPECT_EQ(utf8SequenceLength("\xC3\xA9"), 2U);
    EXPECT_EQ(utf8SequenceLength("\xEF\xBF\xBF"), 3U);
    EXPECT_EQ(utf8SequenceLength("\xF4\x8F\xBF\xBF"), 4U);
    EXPECT_EQ(utf8SequenceLength(""), 0U);
    EXPECT_EQ(utf8SequenceLength("\xF5\x80\x80\x80"), 0U);
}

TEST(UTF8, IsAllOrNothing) {
    EXPECT_TRUE(isUTF8("a\xC3\xA9"));
    EXPECT_FALSE(isUTF8("a\xC3"));
    EXPECT_FALSE(isUTF8("\xC1\xBF"));
}

}  // namespace
}  // namespace pinwell::base
