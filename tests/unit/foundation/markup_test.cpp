#include "foundation/markup.h"

#include <gtest/gtest.h>

namespace pinwell::foundation {
namespace {

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

}  // namespace
}  // namespace pinwell::foundation
