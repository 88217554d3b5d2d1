#include "values/xml_parser.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vector>

namespace pinwell::values {
namespace {

using base::asBytes;
using testing::ElementsAre;
using testing::HasSubstr;

using XMLDocumentType = XMLParser::DocumentType;

// Records its events.
class RecordedXML : public XMLEvents {
  public:
    void begin(std::string_view name, const XMLAttributes& attributes) override {
        const auto style = attributes["style"];
        seen.push_back("<" + std::string(name) + (style ? " " + std::string(*style) : "") + ">");
    }
    void end(std::string_view name) override { seen.push_back("</" + std::string(name) + ">"); }
    void text(std::string_view piece) override { allText += piece; }

    std::vector<std::string> seen;
    std::string allText;
};

struct XMLOutcome {
    RecordedXML events;
    std::string refusal;  // empty for a document that was read
    std::uint64_t offset = 0;
};

XMLOutcome parsedDocument(std::string_view document, XMLDocumentType documentType = XMLDocumentType::refused,
                          std::size_t piece = 1'000'000'000) {
    XMLOutcome outcome;
    try {
        XMLParser parser(outcome.events, documentType);
        while (!document.empty()) {
            const auto part = document.substr(0, piece);
            parser.feed(asBytes(part));
            document.remove_prefix(part.size());
        }
        parser.finish();
    } catch (const MalformedXML& refusal) {
        outcome.refusal = refusal.what();
        outcome.offset = refusal.offset();
    }
    return outcome;
}

std::string documentText(std::string_view document) {
    const XMLOutcome outcome = parsedDocument(document);
    return outcome.refusal.empty() ? outcome.events.allText : "refused: " + outcome.refusal;
}

std::string documentRefusal(std::string_view document,
                            XMLDocumentType documentType = XMLDocumentType::refused) {
    return parsedDocument(document, documentType).refusal;
}

TEST(XMLParser, ReportsElementsAttributesAndTextInOrder) {
    const XMLOutcome outcome = parsedDocument("<a style='x'>1<b:c style=\"&lt;\" z=''/>2<![CDATA[<3>]]></a>");
    EXPECT_EQ(outcome.refusal, "");
    EXPECT_THAT(outcome.events.seen, ElementsAre("<a x>", "<b:c <>", "</b:c>", "</a>"));
    EXPECT_EQ(outcome.events.allText, "12<3>");
}

TEST(XMLParser, ReadsADocumentHoweverItIsCut) {
    const std::string document =
        "<?xml version='1.0'?><!-- c --><a><b style='\xC3\xA9'>\xE2\x82\xAC &#x41;</b></a> ";
    const XMLOutcome whole = parsedDocument(document);
    for (std::size_t piece = 1; piece < document.size(); ++piece) {
        const XMLOutcome cut = parsedDocument(document, XMLDocumentType::refused, piece);
        EXPECT_EQ(cut.refusal, "");
        EXPECT_EQ(cut.events.seen, whole.events.seen);
        EXPECT_EQ(cut.events.allText, whole.events.allText);
    }
}

TEST(XMLParser, RefusesMalformedDocuments) {
    for (const char* document : {"",
                                 " ",
                                 "text",
                                 "<a>",
                                 "</a>",
                                 "<a></b>",
                                 "<a/><b/>",
                                 "<a/>text",
                                 "<a b='1' b='2'/>",
                                 "<a b=1/>",
                                 "<a>&none;</a>",
                                 "<a b='<'/>",
                                 "<a>\x01</a>",
                                 "<a>&#0;</a>",
                                 "<a>&#xD800;</a>",
                                 "<a>\xFF</a>",
                                 "<a>\xC0\x80</a>",
                                 "<a>\xED\xA0\x80</a>",
                                 "<a>]]></a>",
                                 "<a><!-- -- --></a>",
                                 " <?xml version='1.0'?><a/>"})
        EXPECT_NE(documentRefusal(document), "") << document;
    EXPECT_NE(documentRefusal(std::string_view("<a>\0</a>", 8)), "");
}

TEST(XMLParser, ReportsThePlaceOfTheFault) {
    EXPECT_EQ(parsedDocument("<a>\n<b></c></a>").offset, 9U);
}

TEST(XMLParser, ReadsTheEncodingsThatAreDeclared) {
    EXPECT_EQ(documentText("<a>\xC3\xA9</a>"), "\xC3\xA9");
    EXPECT_EQ(documentText("\xEF\xBB\xBF<a>\xC3\xA9</a>"), "\xC3\xA9");
    EXPECT_EQ(documentText("<?xml version='1.0' encoding='utf-8'?><a>\xC3\xA9</a>"), "\xC3\xA9");
    EXPECT_EQ(documentText("<?xml version='1.0' encoding='ISO-8859-1'?><a>\xE9\xFF</a>"), "\xC3\xA9\xC3\xBF");
    EXPECT_EQ(documentText("<?xml version='1.0' encoding='iso-8859-1'?><a>\xE9</a>"), "\xC3\xA9");
    EXPECT_EQ(documentText("<?xml version='1.0' encoding='US-ASCII'?><a>e</a>"), "e");
    EXPECT_NE(documentRefusal("<?xml version='1.0' encoding='US-ASCII'?><a>\xE9</a>"), "");
    EXPECT_NE(documentRefusal("<?xml version='1.0' encoding='UTF-8'?><a>\xE9</a>"), "");
}

TEST(XMLParser, RefusesOtherEncodings) {
    for (const char* encoding : {"UTF-7", "UTF-16", "UTF-16LE", "ISO-8859-15", "windows-1252", "x", ""})
        EXPECT_NE(documentRefusal("<?xml version='1.0' encoding='" + std::string(encoding) + "'?><a/>"), "")
            << encoding;
    const std::string_view document = "<a/>";
    std::string wide;
    for (const char c : document) wide += {c, '\0'};
    EXPECT_EQ(documentRefusal(wide), "encoding");
    EXPECT_EQ(documentRefusal("\xFF\xFE" + wide), "encoding");
    EXPECT_EQ(documentRefusal(std::string_view("\0<\0a\0/\0>", 8)), "encoding");
    EXPECT_EQ(documentRefusal(std::string_view("\xFE\xFF\0<\0a\0/\0>", 10)), "encoding");
}

// One reader would follow the mark, and another one the declaration.
TEST(XMLParser, RefusesAByteOrderMarkBeforeAnotherEncoding) {
    EXPECT_EQ(documentText("\xEF\xBB\xBF<?xml version='1.0' encoding='UTF-8'?><a>\xC3\xA9</a>"), "\xC3\xA9");
    EXPECT_EQ(documentRefusal("\xEF\xBB\xBF<?xml version='1.0' encoding='ISO-8859-1'?><a>\xC3\xA9</a>"),
              "encoding");
}

TEST(XMLParser, RefusesADocumentTypeUnlessTheCallerTakesOne) {
    const auto with = [](const std::string& type) { return "<?xml version='1.0'?>" + type + "<a/>"; };
    constexpr auto kTaken = XMLDocumentType::withoutDeclarations;
    for (const char* type :
         {"<!DOCTYPE a>", "<!DOCTYPE a SYSTEM 'b'>", "<!DOCTYPE a PUBLIC 'b' 'file:///etc/passwd'>"}) {
        EXPECT_EQ(documentRefusal(with(type)), "document type") << type;
        EXPECT_EQ(documentRefusal(with(type), kTaken), "") << type;
    }
    for (const char* type :
         {"<!DOCTYPE a []>", "<!DOCTYPE a [<!ENTITY b 'c'>]>", "<!DOCTYPE a SYSTEM 'b>' [ ]>"}) {
        EXPECT_EQ(documentRefusal(with(type)), "document type") << type;
        EXPECT_EQ(documentRefusal(with(type), kTaken), "document type with an internal subset") << type;
    }
}

// With an unread document type, the library must assume that any entity may be declared.
TEST(XMLParser, RefusesUndeclaredEntitiesAfterADocumentTypeToo) {
    EXPECT_THAT(documentRefusal("<!DOCTYPE a SYSTEM 'b'><a>&c;</a>", XMLDocumentType::withoutDeclarations),
                HasSubstr("entity"));
    EXPECT_THAT(documentRefusal("<!DOCTYPE a SYSTEM 'b'><a>&amp;</a>", XMLDocumentType::withoutDeclarations),
                "");
}

TEST(XMLParser, RefusesMarkupOutOfProportion) {
    constexpr std::size_t kMebibyte = std::size_t{1024} * 1024;
    for (const auto& [before, after] : {std::pair<std::string, std::string>{"<!--", "--><a/>"},
                                        {"<?b ", "?><a/>"},
                                        {"<a b='", "'/>"},
                                        {"<a", "/>"}}) {
        EXPECT_EQ(documentRefusal(before + std::string(kMebibyte / 4, 'x') + after), "") << before;
        EXPECT_EQ(documentRefusal(before + std::string(16 * kMebibyte, 'x') + after),
                  "markup out of proportion")
            << before;
    }
    EXPECT_EQ(documentRefusal("<a>" + std::string(16 * kMebibyte, 'x') + "</a>"), "")
        << "text is handed on in pieces";
    EXPECT_EQ(documentRefusal("<a><![CDATA[" + std::string(16 * kMebibyte, 'x') + "]]></a>"), "");
}

TEST(XMLParser, RefusesMoreNamesThanItsMemoryHolds) {
    std::string names;
    for (int i = 0; i < 500'000; ++i) names += "<n" + std::to_string(i) + "/>";
    EXPECT_EQ(documentRefusal("<a>" + names + "</a>"), "markup out of proportion");
}

TEST(XMLParser, GivesMemoryBackToTheDocument) {
    std::string same;
    for (int i = 0; i < 500'000; ++i) same += "<n/>";
    EXPECT_EQ(documentRefusal("<a>" + same + "</a>"), "");
    for (int i = 0; i < 100; ++i)
        EXPECT_EQ(documentRefusal("<a>" + std::string(kMaximumXMLMemory / 8, ' ') + "</a>"), "");
}

class ThrowingEvents : public RecordedXML {
  public:
    void end(std::string_view) override { throw std::runtime_error("from the event"); }
};

TEST(XMLParser, LetsAnEventEndTheParse) {
    ThrowingEvents events;
    XMLParser parser(events, XMLDocumentType::refused);
    parser.feed(asBytes("<a><b/><c/></a>"));
    try {
        parser.finish();
        FAIL();
    } catch (const std::runtime_error& thrown) {
        EXPECT_STREQ(thrown.what(), "from the event");
    }
    EXPECT_THAT(events.seen, ElementsAre("<a>", "<b>"));
}

TEST(XMLParser, ReadsADocumentInsideTheEventOfAnother) {
    class Nested : public RecordedXML {
      public:
        void begin(std::string_view name, const XMLAttributes& attributes) override {
            RecordedXML::begin(name, attributes);
            inner = documentRefusal("<x/>");
        }
        std::string inner = "none was read";
    } events;
    XMLParser parser(events, XMLDocumentType::refused);
    parser.feed(asBytes("<a><b/></a>"));
    parser.finish();
    EXPECT_EQ(events.inner, "");
    EXPECT_THAT(events.seen, ElementsAre("<a>", "<b>", "</b>", "</a>"));
}

}  // namespace
}  // namespace pinwell::values
