#include "xar/markup_guard.h"

#include <gtest/gtest.h>

#include <string>

namespace pinwell::xar {
namespace {

bool passesWhole(const std::string& document) {
    return MarkupGuard().feed(foundation::asBytes(document));
}

bool passesByteByByte(const std::string& document) {
    MarkupGuard guard;
    bool passed = true;
    for (const char c : document) passed = guard.feed(foundation::asBytes({&c, 1}));
    return passed;
}

// However the document is cut into pieces.
bool passes(const std::string& document) {
    const bool passed = passesWhole(document);
    EXPECT_EQ(passesByteByByte(document), passed) << document.substr(0, 100);
    return passed;
}

TEST(MarkupGuard, PassesOrdinaryMarkup) {
    EXPECT_TRUE(passes("<?xml version=\"1.0\"?>\n<a b='c' d=\"e'>\"><!-- f --><![CDATA[g]]>&amp;</a>\n"));
}

TEST(MarkupGuard, RefusesADocumentTypeWhereverItStands) {
    EXPECT_FALSE(passes("<!DOCTYPE a>"));
    EXPECT_FALSE(passes("<?xml version=\"1.0\"?><!DOCTYPE a><a/>"));
    EXPECT_FALSE(passes("<a><!ENTITY b 'c'></a>"));
    EXPECT_FALSE(passes("<a><![INCLUDE[b]]></a>"));
    EXPECT_FALSE(passes("<a><!></a>"));
}

TEST(MarkupGuard, PassesWhatLooksLikeOneInsideACommentOrAMarkedSection) {
    EXPECT_TRUE(passes("<a><!--<!DOCTYPE b>--><![CDATA[<!DOCTYPE c>]]><?d <!DOCTYPE e>?></a>"));
}

TEST(MarkupGuard, KnowsTheEndOfEachPieceByItsLastCharacters) {
    EXPECT_FALSE(passes("<a><!-- -- - > --><!DOCTYPE b>"));
    EXPECT_FALSE(passes("<a><![CDATA[ ]] > ]]]><!DOCTYPE b>"));
    EXPECT_FALSE(
        passes("<a><?b ? > ?"
               "?><!DOCTYPE b>"));
    EXPECT_TRUE(passes("<a><!--><!DOCTYPE b>--></a>")) << "a comment's first dashes do not end it";
    EXPECT_TRUE(passes("<a><?><!DOCTYPE b>?></a>")) << "nor does an instruction's first mark";
}

TEST(MarkupGuard, RefusesAnAngleBracketInsideATag) {
    EXPECT_FALSE(passes("<a <b>"));
    EXPECT_FALSE(passes("<a b='<'>"));
    EXPECT_FALSE(passes("<<a>"));
}

TEST(MarkupGuard, CountsAttributesBehindAQuotedEndOfTag) {
    std::string tag = "<a x='>'";
    for (unsigned i = 1; i < kMaximumAttributes; ++i) tag += " b" + std::to_string(i) + "='='";
    EXPECT_TRUE(passes(tag + ">"));
    EXPECT_FALSE(passes(tag + " c=''>"));
}

TEST(MarkupGuard, CountsEachTagForItself) {
    std::string tag = "<a";
    for (unsigned i = 0; i < kMaximumAttributes; ++i) tag += " b" + std::to_string(i) + "=''";
    EXPECT_TRUE(passes(tag + ">" + tag + ">"));
}

TEST(MarkupGuard, RefusesOverlongPieces) {
    const auto padded = [](const std::string& begin, const std::string& end, std::size_t length) {
        return begin + std::string(length - begin.size() - end.size(), ' ') + end;
    };
    for (const auto& [begin, end] : {std::pair<std::string, std::string>{"<a", ">"},
                                     {"<a b='", "'>"},
                                     {"<!--", "-->"},
                                     {"<![CDATA[", "]]>"},
                                     {"<?a", "?>"}}) {
        EXPECT_TRUE(passes(padded(begin, end, kMaximumMarkup))) << begin;
        EXPECT_FALSE(passes(padded(begin, end, kMaximumMarkup + 1))) << begin;
    }
    EXPECT_TRUE(passes("<a>" + std::string(3 * kMaximumMarkup, 'x') + "</a>"))
        << "text has no limit of its own";
}

TEST(MarkupGuard, RefusesZeroBytes) {
    EXPECT_FALSE(passes(std::string("<a>\0</a>", 8)));
    EXPECT_FALSE(passes(std::string("<\0a\0>\0", 6)));
}

TEST(MarkupGuard, RefusesAFirstCharacterOfAnotherEncoding) {
    EXPECT_FALSE(passes("\xFF\xFE<"));
    EXPECT_FALSE(passes("\x4C\x6F\xA7\x94"));
    EXPECT_FALSE(passes("a"));
    EXPECT_TRUE(passes("\n <a/>"));
    EXPECT_TRUE(passes("\xEF\xBB\xBF<a/>")) << "a byte order mark of UTF-8";
}

TEST(MarkupGuard, StaysWithARefusal) {
    MarkupGuard guard;
    EXPECT_FALSE(guard.feed(foundation::asBytes("<!D")));
    EXPECT_FALSE(guard.feed(foundation::asBytes("<a/>")));
    EXPECT_FALSE(guard.feed({}));
}

}  // namespace
}  // namespace pinwell::xar
