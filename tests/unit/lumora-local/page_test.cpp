// The page for people: its contents, and that nothing in the records becomes markup.
#include "lumora-local/page.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>

#include "lumora-local/admin_routes.h"
#include "lumora-local/admin_service.h"
#include "lumora-local/sqlite_store.h"
#include "sample_record.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;
using values::Date;

constexpr const char* kClient = "anna.example";
const std::string kMarkup = "<script>alert(1)</script>\"'><b onclick=x>&amp;";

CodeHash hashOf(int fill) {
    return {2, Data(20, static_cast<std::byte>(fill))};
}

FoundRecord found(const std::string& label, bool revoked = false) {
    Record record;
    record.name = recordName(hashOf(1));
    record.label = label;
    record.hashes = {hashOf(1), hashOf(2)};
    record.revoked = revoked;
    record.signedAt = Date{1'795'000'000};
    return {record, false};
}

Event eventOf(Action action) {
    Event event;
    event.time = Date{1'795'000'000};
    event.actor = "ci.example";
    event.action = action;
    event.record = recordName(hashOf(1));
    event.label = "App";
    event.ticket = std::string(64, 'a');
    event.hash = std::string(64, 'b');
    return event;
}

/// Matches if kMarkup became no markup.
testing::Matcher<const std::string&> HasNoForeignMarkup() {
    return AllOf(Not(HasSubstr("<script")), Not(HasSubstr("<b ")), Not(HasSubstr("\"'>")),
                 HasSubstr("&lt;script&gt;"));
}

std::size_t count(const std::string& text, std::string_view part) {
    std::size_t number = 0;
    for (std::size_t at = 0; (at = text.find(part, at)) != std::string::npos; at += part.size()) ++number;
    return number;
}

std::vector<std::string> everyPage(const std::string& text) {
    RecordView record;
    record.found = found(text);
    record.events = {eventOf(Action::revoked)};
    record.events[0].actor = text;
    record.events[0].comment = text;
    record.events[0].label = text + "?";
    record.paging.next = "/records?text=" + text;
    return {homePage({}, text), resultsPage({{"label", text}, {found(text)}, {text, text}}, text),
            resultsPage({{"hash", text}, {}, {}}, text), recordPage(record, text),
            faultPage(text, text, {"name", text}, text)};
}

// Rendering.

TEST(Page, EscapesMarkupInRecords) {
    for (const std::string& page : everyPage(kMarkup)) EXPECT_THAT(page, HasNoForeignMarkup());
}

TEST(Page, EscapesControlCharactersAndDirectionMarks) {
    for (const std::string& page : everyPage("a\x1b[2J\xE2\x80\xAE\xFF\x7f")) {
        EXPECT_THAT(page, AllOf(Not(HasSubstr("\x1b")), Not(HasSubstr("\xE2\x80\xAE")),
                                Not(HasSubstr("\xFF")), Not(HasSubstr("\x7f"))));
        EXPECT_THAT(page, HasSubstr("\\u202e"));
    }
}

TEST(Page, HasLandmarksAndNoInlineScriptOrStyle) {
    for (const std::string& page : everyPage("App")) {
        EXPECT_THAT(page, testing::StartsWith("<!DOCTYPE html>\n<html lang=\"en\">"));
        for (const char* const once :
             {"<title>", "<h1>", "<header>", "<main id=\"content\" tabindex=\"-1\">", "<footer>",
              "<a class=\"skip\" href=\"#content\">", "<link rel=\"stylesheet\" href=\"/style.css\">"})
            EXPECT_EQ(count(page, once), 1U) << once;
        for (const char* const none : {"<script", "<style", " style=", " on", "http:", "https:"})
            EXPECT_EQ(count(page.substr(page.find("<body>")), none), 0U) << none << page;
    }
}

TEST(Page, ShowsARecordsStateInWords) {
    RecordView view;
    view.found = found("App");
    EXPECT_THAT(
        recordPage(view, kClient),
        AllOf(HasSubstr("<title>Valid: App - Record service</title>"), HasSubstr("valid\">Valid<"),
              HasSubstr("<time datetime=\"2026-11-18T11:06:40Z\"><span class=\"unit\">2026-11-18</span> "
                        "<span class=\"unit\">11:06:40 UTC</span></time>"),
              HasSubstr(recordName(hashOf(2))), HasSubstr("The log has no events here."),
              Not(HasSubstr("further")), Not(HasSubstr("<nav"))));
    view.found = found("App", true);
    view.found.hashesCut = true;
    EXPECT_THAT(recordPage(view, kClient),
                AllOf(HasSubstr("<title>Revoked: App"), HasSubstr("revoked\">Revoked<"),
                      HasSubstr("and further ones"), Not(HasSubstr(">Valid<"))));
}

TEST(Page, ShowsAnEventWithItsReason) {
    RecordView view;
    view.found = found("App", true);
    Event revoked = eventOf(Action::revoked);
    revoked.reason = Reason::compromised;
    revoked.comment = "the key was lost";
    Event renamed = eventOf(Action::reissued);
    renamed.label = "Old name";
    view.events = {eventOf(Action::issued), revoked, renamed, eventOf(Action::refused)};
    const std::string page = recordPage(view, kClient);
    EXPECT_EQ(count(page, "<h3>"), 4U);
    EXPECT_THAT(page,
                AllOf(HasSubstr("<h3>Issued</h3>"), HasSubstr("<h3>Revoked</h3>"),
                      HasSubstr("<dt>Reason</dt><dd>compromised</dd>"), HasSubstr("the key was lost"),
                      HasSubstr("<dt>Label</dt><dd><bdi>Old name</bdi></dd>"), HasSubstr("ci.example")));
    EXPECT_EQ(count(page, "<dt>Label</dt>"), 1U);
}

TEST(Page, NamesARecordWithoutALabelByItsName) {
    EXPECT_THAT(resultsPage({{}, {found("")}, {}}, kClient),
                HasSubstr("<bdi>" + recordName(hashOf(1)) + "</bdi></a>"));
}

TEST(Page, StatesThatThereAreNoRecords) {
    EXPECT_THAT(resultsPage({{"hash", "ab"}, {}, {}}, kClient),
                AllOf(HasSubstr("Records whose ticket lists <bdi>ab</bdi>, production: there are none."),
                      Not(HasSubstr("<table"))));
}

TEST(Page, KeepsTheSearchInTheForm) {
    const std::string page = resultsPage({{"hash", "ab", Environment::development}, {}, {}}, kClient);
    EXPECT_THAT(page, AllOf(HasSubstr("value=\"ab\""), HasSubstr("<option value=\"hash\" selected>"),
                            HasSubstr("<option value=\"development\" selected>")));
    EXPECT_EQ(count(page, " selected"), 2U);
}

TEST(Page, LinksToTheRecordInItsEnvironment) {
    EXPECT_EQ(recordTarget("2/2/ab", Environment::production), "/records/2/2/ab");
    EXPECT_EQ(recordTarget("2/2/ab", Environment::development), "/records/2/2/ab?environment=development");
    EXPECT_EQ(recordTarget("a b/<\"", Environment::production), "/records/a%20b/%3C%22");
    EXPECT_EQ(recordTarget("", Environment::production), "/records/");
}

// Contrast, as WCAG 2.2 has it (1.4.3).

double lightness(std::string_view color) {
    constexpr std::array<double, 3> kWeights{0.2126, 0.7152, 0.0722};
    double sum = 0;
    for (std::size_t i = 0; i < 3; ++i) {
        const double part = std::stoi(std::string(color.substr(1 + 2 * i, 2)), nullptr, 16) / 255.0;
        sum += kWeights.at(i) * (part <= 0.04045 ? part / 12.92 : std::pow((part + 0.055) / 1.055, 2.4));
    }
    return sum;
}

double contrast(std::string_view first, std::string_view second) {
    const auto [less, more] = std::minmax({lightness(first), lightness(second)});
    return (more + 0.05) / (less + 0.05);
}

std::string colorIn(std::string_view scheme, const std::string& name) {
    const std::size_t at = scheme.find("--" + name + ": ");
    return at == std::string_view::npos ? "" : std::string(scheme.substr(at + name.size() + 4, 7));
}

TEST(Page, HasContrastInBothSchemes) {
    const std::string_view style = pageStyle();
    const std::size_t dark = style.find("@media (prefers-color-scheme: dark)");
    for (const std::string_view scheme : {style.substr(0, dark), style.substr(dark)}) {
        for (const std::string ground : {"ground", "raised"}) {
            for (const std::string text : {"text", "quiet", "link", "good", "bad"})
                EXPECT_GE(contrast(colorIn(scheme, text), colorIn(scheme, ground)), 4.5) << text << ground;
            EXPECT_GE(contrast(colorIn(scheme, "edge"), colorIn(scheme, ground)), 3.0) << ground;
        }
    }
}

// Routes.

class PageRoutes : public testing::Test {
  protected:
    PageRoutes() {
        SqliteStore::create(directory_ / "records");
        store_.emplace(directory_ / "records");
    }

    void put(int hash, const std::string& label, Environment environment = test::kProduction) {
        SignedRecord record = test::makeRecord(recordName(hashOf(hash)));
        record.record.label = label;
        record.record.hashes = {hashOf(hash), {4, Data(48, std::byte{9})}};
        store_->put(environment, {record}, test::kOccasion);
    }

    /// The response of the first matching row, as in the listener.
    Answer get(const std::string& target) {
        RequestHead head;
        head.method = "GET";
        head.target = target;
        head.client = kClient;
        const std::string_view path = pathOf(head.target);
        for (const AdminRoute& route : pageRoutes(*store_)) {
            const bool isBeginning = route.path.ends_with('*');
            const std::string_view wanted =
                std::string_view(route.path).substr(0, route.path.size() - (isBeginning ? 1 : 0));
            if (isBeginning ? !path.starts_with(wanted) : path != wanted) continue;
            EXPECT_EQ(route.method, "GET");
            EXPECT_EQ(route.right, &Rights::read);
            const Query query = parseQuery(target).value();
            for (const auto& [name, value] : query)
                EXPECT_NE(std::find(route.parameters.begin(), route.parameters.end(), name),
                          route.parameters.end());
            Rights rights;
            rights.read = true;
            return route.handle({head, path, query, rights, std::nullopt, {}});
        }
        ADD_FAILURE() << "no route for " << target;
        return {};
    }
    std::string body(const std::string& target, int status = 200) {
        const Answer answer = get(target);
        EXPECT_EQ(answer.status, status) << target;
        return answer.body;
    }
    static std::string headerOf(const Answer& answer, const std::string& name) {
        for (const auto& [key, value] : answer.headers)
            if (key == name) return value;
        return {};
    }
    /// The link of that relation or text.
    static std::string linkIn(const std::string& page, const std::string& text) {
        const std::size_t end = page.find("\">" + text + "</a>");
        if (end == std::string::npos) return {};
        const std::size_t begin = page.rfind("href=\"", end) + 6;
        std::string target = page.substr(begin, end - begin);
        for (std::size_t at = 0; (at = target.find("&amp;", at)) != std::string::npos;)
            target.erase(at + 1, 4);
        return target;
    }

    pinwell::test::TemporaryDirectory directory_;
    std::optional<SqliteStore> store_;
};

TEST_F(PageRoutes, SendAStrictPolicy) {
    put(1, "App");
    for (const std::string& target :
         {std::string("/"), std::string("/records"), "/records/" + recordName(hashOf(1)),
          std::string("/records/x"), std::string("/records?by=hash&text=zz")}) {
        const Answer answer = get(target);
        EXPECT_EQ(answer.contentType, "text/html; charset=utf-8");
        const std::string policy = headerOf(answer, "Content-Security-Policy");
        EXPECT_THAT(policy, AllOf(HasSubstr("default-src 'none'"), HasSubstr("style-src 'self'"),
                                  HasSubstr("form-action 'self'"), HasSubstr("base-uri 'none'"),
                                  HasSubstr("frame-ancestors 'none'"), Not(HasSubstr("unsafe"))));
        EXPECT_EQ(headerOf(answer, "Referrer-Policy"), "no-referrer");
        EXPECT_EQ(headerOf(answer, "X-Frame-Options"), "DENY");
    }
    EXPECT_EQ(get("/style.css").contentType, "text/css; charset=utf-8");
    EXPECT_EQ(get("/style.css").body, pageStyle());
}

TEST_F(PageRoutes, ShowARefusalAsAPage) {
    RequestHead head;
    head.client = kClient;
    for (const AdminRoute& route : pageRoutes(*store_)) {
        if (route.path == "/style.css") continue;
        ASSERT_TRUE(route.refuse) << route.path;
        const Answer answer = route.refuse(403, "no role <read>", head);
        EXPECT_EQ(answer.status, 403);
        EXPECT_EQ(answer.contentType, "text/html; charset=utf-8");
        EXPECT_THAT(answer.body, HasSubstr("no role &lt;read&gt;"));
        EXPECT_THAT(headerOf(answer, "Content-Security-Policy"), HasSubstr("default-src 'none'"));
    }
}

TEST_F(PageRoutes, CountRecordsAndEvents) {
    EXPECT_THAT(body("/"), HasSubstr("<dt>Records</dt><dd>0</dd>"));
    put(1, "App");
    put(1, "App");
    EXPECT_THAT(body("/"), AllOf(HasSubstr("<dt>Records</dt><dd>1</dd>"),
                                 HasSubstr("<dt>Events in the log</dt><dd>2</dd>")));
}

TEST_F(PageRoutes, FindRecordsByNameLabelAndHash) {
    put(1, "Alpha");
    put(2, "Beta & Co");
    EXPECT_THAT(body("/records?by=label&text=Alpha&environment=production"),
                AllOf(HasSubstr(">Alpha<"), Not(HasSubstr("Beta"))));
    EXPECT_THAT(body("/records?by=label&text=+Beta+%26+Co%0A"), HasSubstr("Beta &amp; Co</bdi></a>"));
    EXPECT_THAT(body("/records?by=name&text=2%2F2%2F02"), AllOf(HasSubstr("Beta"), Not(HasSubstr("Alpha"))));
    EXPECT_THAT(body("/records?by=hash&text=" + std::string(96, '0')), HasSubstr("there are none"));
    std::string listed;
    for (int i = 0; i < 48; ++i) listed += "09";
    EXPECT_THAT(body("/records?by=hash&text=" + listed), AllOf(HasSubstr("Alpha"), HasSubstr("Beta")));
    EXPECT_THAT(body("/records"), AllOf(HasSubstr("Alpha"), HasSubstr("Beta")));
    put(0xAB, "Gamma");
    std::string pasted;
    for (int i = 0; i < 20; ++i) pasted += "AB";
    EXPECT_THAT(body("/records?by=hash&text=" + pasted), HasSubstr("Gamma"));
    EXPECT_THAT(body("/records?by=name&text=2/2/" + pasted), HasSubstr("Gamma"));
    EXPECT_THAT(body("/records?environment=development"), HasSubstr("there are none"));
}

TEST_F(PageRoutes, ShowAListAPageAtATime) {
    for (int i = 1; i <= 120; ++i) put(i, "App & more");
    std::size_t records = 0;
    std::size_t pages = 0;
    for (std::string target = "/records?by=label&text=App+%26"; !target.empty() && pages < 10; ++pages) {
        const std::string page = body(target);
        records += count(page, "<tr><th scope=\"row\">");
        EXPECT_EQ(linkIn(page, "First page").empty(), pages == 0);
        target = linkIn(page, "Next page");
    }
    EXPECT_EQ(pages, 3U);
    EXPECT_EQ(records, 120U);
}

TEST_F(PageRoutes, ShowAHistoryAPageAtATime) {
    for (int i = 0; i < 120; ++i) put(1, "App");
    put(2, "Other");
    std::size_t events = 0;
    std::size_t pages = 0;
    for (std::string target = "/records/" + recordName(hashOf(1)); !target.empty() && pages < 10; ++pages) {
        const std::string page = body(target);
        events += count(page, "<h3>");
        target = linkIn(page, "Next page");
    }
    EXPECT_EQ(pages, 3U);
    EXPECT_EQ(events, 120U);
}

TEST_F(PageRoutes, ShowTheRecordOfTheEnvironment) {
    put(1, "Of development", Environment::development);
    const std::string target = recordTarget(recordName(hashOf(1)), Environment::development);
    EXPECT_THAT(body(target), AllOf(HasSubstr("Of development"), HasSubstr("<dd>development</dd>")));
    body("/records/" + recordName(hashOf(1)), 404);
    EXPECT_THAT(body("/records?environment=development"), HasSubstr("href=\"" + target + "\""));
}

TEST_F(PageRoutes, ShowNoRecordWithALongerName) {
    put(1, "App");
    const std::string name = recordName(hashOf(1));
    for (const std::string& wrong :
         {name.substr(0, name.size() - 2), name + "00", std::string("2/2/"), std::string(),
          std::string("%zz"), std::string("..%2f"), kMarkup.substr(0, 5)})
        EXPECT_THAT(body("/records/" + wrong, 404), HasSubstr("role=\"alert\"")) << wrong;
    EXPECT_THAT(body("/records/2%2F2" + name.substr(3)), HasSubstr("App"));
}

TEST_F(PageRoutes, ReportInvalidSearches) {
    for (const std::string& query :
         {std::string("by=hash&text=zz"), "by=label&text=" + std::string(65, 'a'),
          "by=name&text=" + std::string(300, 'a'), std::string("by=name&text=%C3%A4"), std::string("after=x"),
          std::string("after=zz%3Ax")})
        EXPECT_THAT(body("/records?" + query, 400), AllOf(HasSubstr("The search is not made"),
                                                          HasSubstr("role=\"alert\""), HasSubstr("<form")))
            << query;
    EXPECT_THAT(
        body("/records?by=hash&text=%3Cscript%3E", 400),
        AllOf(Not(HasSubstr("<script")),
              HasSubstr("value=\"&lt;script&gt;\" aria-invalid=\"true\" aria-describedby=\"fault hint\"")));
    put(1, "App");
    body("/records/" + recordName(hashOf(1)) + "?after=x", 400);
}

}  // namespace
}  // namespace pinwell::lumora
