// Rights at the administration listener, without a socket.
#include "lumora-local/admin_service.h"

#include <gtest/gtest.h>

#include <map>

#include "lumora-local/admin_routes.h"
#include "lumora-local/sqlite_store.h"
#include "support/temporary_directory.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::TemporaryDirectory;
using values::Value;

class AdminServiceTest : public testing::Test {
  protected:
    AdminServiceTest() {
        SqliteStore::create(directory_ / "records.sqlite");
        store_ = std::make_unique<SqliteStore>(directory_ / "records.sqlite");
        pinwell::test::writeFile(directory_ / "access.toml",
                                 "[clients]\nreader = [\"read\"]\nissuer = [\"issue\"]\n");
        access_ = std::make_unique<AccessList>(directory_ / "access.toml");
        refusals_ = std::make_unique<RefusalLog>(
            *store_, [this](std::string_view line) { errors_ += line; }, [this] { return now_; });
        rates_ = std::make_unique<TokenBuckets>(TokenBuckets::Allowance{5, std::chrono::seconds(10)}, 32,
                                                [this] { return now_; });
        const auto handled = [this](const AdminRequest& request) {
            seen_ = std::string(request.path) + "|" + std::string(request.body) + "|" +
                    request.idempotencyKey.value_or("none");
            return Answer{};
        };
        const auto failing = [](const AdminRequest&) -> Answer {
            throw Failure(EX_IOERR, "the disk is gone");
        };
        const auto inWords = [](int status, std::string_view detail, const RequestHead&) {
            Answer answer;
            answer.status = status;
            answer.contentType = "text/plain";
            answer.body = detail;
            return answer;
        };
        service_ =
            std::make_unique<AdminService>(AdminRoutes{{"GET", "/things", &Rights::read, {"a", "b"}, handled},
                                                       {"POST", "/things", &Rights::issue, {}, handled},
                                                       {"GET", "/pages/*", &Rights::read, {}, handled},
                                                       {"GET", "/words", &Rights::read, {}, handled, inWords},
                                                       {"GET", "/failing", &Rights::read, {}, failing}},
                                           *access_, *rates_, *refusals_);
    }

    static RequestHead head(const std::string& method, const std::string& target, const std::string& client) {
        RequestHead head{method, target, "localhost", method == "POST" ? "application/json" : "", ""};
        head.client = client;
        return head;
    }

    /// Of the head; 0 if the body is wanted.
    int statusOf(const RequestHead& head) const {
        const auto answer = service_->answerHead(head);
        if (!answer) return 0;
        if (answer->status >= 400) expectProblem(*answer);
        return answer->status;
    }

    static void expectProblem(const Answer& answer) {
        EXPECT_EQ(answer.contentType, "application/problem+json");
        const auto document = values::parseJSON(base::asBytes(answer.body));
        ASSERT_TRUE(document) << answer.body;
        EXPECT_EQ(*(*document)["type"].string(), "about:blank");
        EXPECT_EQ((*document)["status"].unsignedIntegerValue(), static_cast<std::uint64_t>(answer.status));
        EXPECT_EQ(*(*document)["title"].string(), titleOf(answer.status));
        EXPECT_FALSE((*document)["detail"].string()->empty());
    }

    static std::string headerOf(const Answer& answer, const std::string& name) {
        const std::map<std::string, std::string> headers(answer.headers.begin(), answer.headers.end());
        const auto found = headers.find(name);
        return found == headers.end() ? "" : found->second;
    }

    std::vector<Event> events() const {
        std::vector<Event> all;
        store_->forEachEvent({}, [&](const Event& event) { all.push_back(event); });
        return all;
    }

    const TemporaryDirectory directory_;
    std::unique_ptr<SqliteStore> store_;
    std::unique_ptr<AccessList> access_;
    std::unique_ptr<RefusalLog> refusals_;
    std::unique_ptr<TokenBuckets> rates_;
    std::unique_ptr<AdminService> service_;
    TokenBuckets::Clock::time_point now_{std::chrono::seconds(1000)};
    std::string errors_;
    std::string seen_;
};

TEST_F(AdminServiceTest, HandsARequestToItsHandler) {
    EXPECT_EQ(statusOf(head("GET", "/things?a=1", "reader")), 200);
    EXPECT_EQ(seen_, "/things||none");
    EXPECT_EQ(statusOf(head("HEAD", "/things", "reader")), 200);
    EXPECT_EQ(statusOf(head("GET", "/pages/2/2/ab", "reader")), 200);
    EXPECT_EQ(seen_, "/pages/2/2/ab||none");
    RequestHead post = head("POST", "/things", "issuer");
    post.idempotencyKey = "\"k\"";
    EXPECT_EQ(statusOf(post), 0);
    EXPECT_EQ(service_->answerBody(post, "{}").status, 200);
    EXPECT_EQ(seen_, "/things|{}|k");
    EXPECT_TRUE(events().empty());
}

TEST_F(AdminServiceTest, RefusesRequestsWithoutTheRole) {
    EXPECT_EQ(statusOf(head("GET", "/things", "issuer")), 403);
    EXPECT_EQ(statusOf(head("POST", "/things", "reader")), 403);
    EXPECT_EQ(statusOf(head("GET", "/things", "stranger")), 403);
    EXPECT_EQ(statusOf(head("GET", "/things", "")), 403);
    EXPECT_EQ(seen_, "");
}

TEST_F(AdminServiceTest, ChecksTheRolesAgainAfterTheBodyArrived) {
    const RequestHead post = head("POST", "/things", "issuer");
    EXPECT_EQ(statusOf(post), 0);
    pinwell::test::writeFile(directory_ / "access.toml", "");
    access_->reload();
    EXPECT_EQ(service_->answerBody(post, "{}").status, 403);
    EXPECT_EQ(seen_, "");
}

TEST_F(AdminServiceTest, RefusesInTheFormOfThePath) {
    const auto forbidden = service_->answerHead(head("GET", "/words", "issuer"));
    ASSERT_TRUE(forbidden);
    EXPECT_EQ(forbidden->status, 403);
    EXPECT_EQ(forbidden->contentType, "text/plain");
    EXPECT_EQ(forbidden->body, "access.toml does not give issuer the role read");
    EXPECT_EQ(headerOf(*forbidden, "Cache-Control"), "no-store");
    std::optional<Answer> answer;
    for (int i = 0; i < 6; ++i) answer = service_->answerHead(head("GET", "/words", "reader"));
    EXPECT_EQ(answer->status, 429);
    EXPECT_EQ(answer->contentType, "text/plain");
    EXPECT_NE(headerOf(*answer, "Retry-After"), "");
}

TEST_F(AdminServiceTest, RefusesUnknownPathsAndMethods) {
    int client = 0;
    for (const char* path : {"/", "/thing", "/things/", "/pages", "/v1/tickets", "//things"})
        EXPECT_EQ(statusOf(head("GET", path, "client " + std::to_string(++client))), 404) << path;
    const auto answer = service_->answerHead(head("DELETE", "/things", "another"));
    EXPECT_EQ(answer->status, 405);
    EXPECT_EQ(headerOf(*answer, "Allow"), "GET, POST");
}

TEST_F(AdminServiceTest, RefusesUnknownQueries) {
    EXPECT_EQ(statusOf(head("GET", "/things?c=1", "reader")), 400);
    EXPECT_EQ(statusOf(head("GET", "/things?a=%", "reader")), 400);
    EXPECT_EQ(statusOf(head("POST", "/things?a=1", "issuer")), 400);
}

TEST_F(AdminServiceTest, AcceptsOnlyJson) {
    RequestHead post = head("POST", "/things", "issuer");
    post.contentType = "text/plain";
    EXPECT_EQ(statusOf(post), 415);
    post.contentType = "application/json; charset=utf-8";
    EXPECT_EQ(statusOf(post), 0);
    post.contentEncoding = "gzip";
    EXPECT_EQ(statusOf(post), 415);
}

TEST_F(AdminServiceTest, RefusesAnInvalidKey) {
    RequestHead post = head("POST", "/things", "issuer");
    post.idempotencyKey = "a, b";
    EXPECT_EQ(statusOf(post), 400);
}

TEST_F(AdminServiceTest, LimitsTheRateOfEachClient) {
    for (int i = 0; i < 5; ++i) EXPECT_EQ(statusOf(head("GET", "/things", "reader")), 200);
    const auto answer = service_->answerHead(head("GET", "/things", "reader"));
    EXPECT_EQ(answer->status, 429);
    EXPECT_EQ(headerOf(*answer, "Retry-After"), "10");
    EXPECT_EQ(statusOf(head("GET", "/things", "stranger")), 403);
    now_ += std::chrono::seconds(10);
    EXPECT_EQ(statusOf(head("GET", "/things", "reader")), 200);
}

TEST_F(AdminServiceTest, CountsHeadAndBodyAsOneRequest) {
    const RequestHead post = head("POST", "/things", "issuer");
    for (int i = 0; i < 5; ++i) {
        EXPECT_EQ(statusOf(post), 0);
        EXPECT_EQ(service_->answerBody(post, "{}").status, 200);
    }
    EXPECT_EQ(statusOf(post), 429);
}

TEST_F(AdminServiceTest, ForbidsCachingOfItsResponses) {
    EXPECT_EQ(headerOf(*service_->answerHead(head("GET", "/things", "reader")), "Cache-Control"), "no-store");
    EXPECT_EQ(headerOf(*service_->answerHead(head("GET", "/x", "reader")), "Cache-Control"), "no-store");
}

TEST_F(AdminServiceTest, PassesFailuresOnAndStatesWhenToTryAgain) {
    EXPECT_THROW(static_cast<void>(service_->answerHead(head("GET", "/failing", "reader"))), Failure);
    const Answer answer = service_->refuseForNow("the disk is gone");
    EXPECT_EQ(answer.status, 503);
    EXPECT_EQ(headerOf(answer, "Retry-After"), "1");
    EXPECT_EQ(answer.body.find("disk"), std::string::npos);
    expectProblem(answer);
}

TEST_F(AdminServiceTest, LogsRefusedAttemptsToChangeRecords) {
    const std::string name = "2/2/" + std::string(40, 'a');
    statusOf(head("POST", "/things", "reader"));
    const RequestHead post = head("POST", "/things", "issuer");
    pinwell::test::writeFile(directory_ / "access.toml", "");
    access_->reload();
    service_->answerBody(post, R"({"record":")" + name + R"("})");
    service_->refuse(413, &post);
    const std::vector<Event> all = events();
    ASSERT_EQ(all.size(), 3U);
    EXPECT_EQ(all[0].action, Action::refused);
    EXPECT_EQ(all[0].actor, "reader");
    EXPECT_EQ(all[0].comment, "403 Forbidden: POST /things: access.toml does not give reader the role issue");
    EXPECT_EQ(all[1].record, name);
    EXPECT_EQ(all[2].comment, "413 Content Too Large: POST /things: the body has more than 1 MiB");
}

TEST_F(AdminServiceTest, LogsNoOtherRefusals) {
    statusOf(head("GET", "/things", "stranger"));
    statusOf(head("POST", "/nothing", "stranger"));
    statusOf(head("DELETE", "/things", "reader"));
    const RequestHead post = head("POST", "/things", "issuer");
    service_->refuse(408, &post);
    service_->refuse(400, nullptr);
    for (int i = 0; i < 6; ++i) statusOf(post);  // the last one is over the rate
    EXPECT_TRUE(events().empty());
}

TEST_F(AdminServiceTest, BoundsTheEventsOfOneClient) {
    for (int i = 0; i < 30; ++i) refusals_->note("flood", {}, "403");
    EXPECT_EQ(events().size(), 20U);
    now_ += std::chrono::minutes(1);
    refusals_->note("flood", {}, "403");
    ASSERT_EQ(events().size(), 21U);
    EXPECT_EQ(events().back().comment, "403 (10 more attempts before it are not in the log)");
}

TEST_F(AdminServiceTest, BoundsTheEventsOfAllClients) {
    for (int i = 0; i < 300; ++i) refusals_->note("c" + std::to_string(i), {}, "403");
    EXPECT_EQ(events().size(), 100U);
}

TEST_F(AdminServiceTest, RefusesEvenIfTheRefusalCannotBeLogged) {
    store_.reset();
    SqliteStore broken(directory_ / "records.sqlite", [](StoreUse) { throw Failure(EX_IOERR, "no store"); });
    RefusalLog refusals(broken, [this](std::string_view line) { errors_ += line; });
    refusals.note("client", {}, "403");
    EXPECT_EQ(errors_, "cannot note a refused attempt of client: no store");
}

TEST_F(AdminServiceTest, ShowsLabelsInAnyEncoding) {
    Record record;
    record.name = "2/2/" + std::string(40, 'a');
    record.label = "caf\xE9\x1B[2J";
    record.hashes = {{2, base::Data(20, std::byte{0xAA})}};
    store_->put(Environment::production, {{record, base::toData("ticket")}},
                {values::Date{100}, "tester", std::nullopt, "", false});
    const RequestHead request = head("GET", "/v1/records", "reader");
    for (const AdminRoute& route : readingRoutes(*store_)) {
        const Answer answer = route.handle({request, route.path, {}, {}, std::nullopt, {}});
        EXPECT_TRUE(values::parseJSON(base::asBytes(answer.body))) << answer.body;
        EXPECT_NE(answer.body.find("caf"), std::string::npos);
        EXPECT_EQ(answer.body.find('\x1B'), std::string::npos);
    }
}

TEST(RecordSearchOf, AcceptsItsParameters) {
    const RecordSearch search = recordSearchOf(
        {{"label", "Example"}, {"environment", "development"}, {"limit", "7"}, {"after", "4578:2/2/ab"}});
    EXPECT_EQ(search.label, "Example");
    EXPECT_EQ(search.environment, Environment::development);
    EXPECT_EQ(search.limit, 7U);
    EXPECT_EQ(search.after, (RecordCursor{"Ex", "2/2/ab"}));
    EXPECT_EQ(toString(*search.after), "4578:2/2/ab");
    EXPECT_EQ(recordSearchOf({}).limit, kDefaultPage);
}

TEST(RecordSearchOf, AcceptsAHashByItsDigitsOrByName) {
    const std::string hex(40, 'a');
    const base::Data hash(20, std::byte{0xAA});
    EXPECT_EQ(recordSearchOf({{"hash", hex}}).hash, hash);
    EXPECT_EQ(recordSearchOf({{"hash", "2/3/" + hex}}).hash, hash);
    EXPECT_EQ(recordSearchOf({{"hash", "1/" + hex}}).hash, hash);
    EXPECT_EQ(recordSearchOf({{"hash", std::string(96, 'a')}}).hash, base::Data(48, std::byte{0xAA}));
}

TEST(RecordSearchOf, RefusesParametersOutOfBounds) {
    for (const Query& query : std::initializer_list<Query>{{{"name", ""}},
                                                           {{"name", std::string(256, 'x')}},
                                                           {{"name", "a b"}},
                                                           {{"name", "\u00e9"}},
                                                           {{"label", std::string(65, 'x')}},
                                                           {{"hash", "ab"}},
                                                           {{"hash", std::string(40, 'A')}},
                                                           {{"hash", std::string(41, 'a')}},
                                                           {{"name", "a"}, {"label", "b"}},
                                                           {{"limit", "0"}},
                                                           {{"limit", "101"}},
                                                           {{"limit", "-1"}},
                                                           {{"limit", "1x"}},
                                                           {{"limit", "99999999999"}},
                                                           {{"environment", "test"}},
                                                           {{"after", "x"}},
                                                           {{"after", "4:a"}},
                                                           {{"after", "45:"}},
                                                           {{"after", ":a b"}},
                                                           {{"after", std::string(513, 'a')}}}) {
        EXPECT_THROW(recordSearchOf(query), Refused) << query.begin()->second;
    }
}

TEST(EventSearchOf, AcceptsItsParameters) {
    const EventSearch search = eventSearchOf({{"record", "2/2/ab"},
                                              {"since", "1970-01-01T00:01:40Z"},
                                              {"environment", "development"},
                                              {"after", "-5:7"}});
    EXPECT_EQ(search.record, "2/2/ab");
    EXPECT_EQ(search.since, values::Date{100});
    EXPECT_EQ(search.environment, Environment::development);
    EXPECT_EQ(search.after, (EventCursor{-5, 7}));
    EXPECT_EQ(toString(*search.after), "-5:7");
}

TEST(EventSearchOf, RefusesParametersOutOfBounds) {
    for (const Query& query : std::initializer_list<Query>{{{"since", "yesterday"}},
                                                           {{"since", ""}},
                                                           {{"environment", "production"}},
                                                           {{"record", "a\tb"}},
                                                           {{"after", "1"}},
                                                           {{"after", "1:-1"}},
                                                           {{"after", "1:2:3"}},
                                                           {{"after", ":1"}},
                                                           {{"after", "99999999999999999999:1"}}}) {
        EXPECT_THROW(eventSearchOf(query), Refused) << query.begin()->second;
    }
}

}  // namespace
}  // namespace pinwell::lumora
