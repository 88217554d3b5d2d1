#include "session_fixture.h"

#include <cstdlib>

namespace pinwell::test {

https::Request get(const std::string& url) {
    https::Request request;
    request.url = values::URL::fromString(url);
    return request;
}

https::Request post(const std::string& url, std::string_view body) {
    https::Request request = get(url);
    request.method = "POST";
    request.body = base::toData(body);
    request.addHeader("Content-Type", "application/json");
    return request;
}

void expectFailure(const Outcome& outcome, https::URLErrorCode code, std::string_view words) {
    EXPECT_FALSE(outcome.body.has_value());
    EXPECT_FALSE(outcome.response.has_value());
    ASSERT_TRUE(outcome.error.has_value());
    EXPECT_EQ(outcome.error->domain(), base::kURLErrorDomain);
    EXPECT_EQ(outcome.error->code(), static_cast<std::int64_t>(code))
        << outcome.error->localizedDescription();
    EXPECT_THAT(outcome.error->localizedFailureReason(), ::testing::HasSubstr(words));
    EXPECT_THAT(outcome.error->localizedFailureReason(), ::testing::Not(::testing::HasSubstr("\n")));
}

SessionTest::SessionTest() {
    for (const char* name :
         {"https_proxy", "HTTPS_PROXY", "http_proxy", "all_proxy", "ALL_PROXY", "no_proxy", "NO_PROXY"})
        ::unsetenv(name);
    options.now = [this] { return clock.now(); };
    options.pollInterval = std::chrono::milliseconds(5);
    options.temporaryDirectory = [this] { return directory.url("."); };
}

ServerIdentity SessionTest::identity() {
    return identityOf(ServerChain("localhost").issue());
}

https::Session& SessionTest::session() {
    if (!session_) {
        service_ = https::makeSessionService(trust, options);
        session_ = *service_->ephemeralSession(delegate);
    }
    return *session_;
}

std::future<Outcome> SessionTest::start(https::Request request) {
    const auto promise = std::make_shared<std::promise<Outcome>>();
    const auto task = session().dataTask(
        std::move(request), [this, promise](const auto& body, const auto& response, const auto& error) {
            delegate.record("completion");
            promise->set_value({body, response, error});
        });
    task->resume();
    return promise->get_future();
}

Outcome SessionTest::download(https::Request request) {
    std::promise<Outcome> promise;
    Outcome outcome;
    delegate.onDownload = [&, inner = delegate.onDownload](https::Task& task, const values::URL& location) {
        outcome.body = base::toData(readFile(location.path()));
        outcome.response = task.response();
        inner(task, location);
    };
    delegate.onComplete = [&](https::Task&, const std::optional<base::Error>& error) {
        outcome.error = error;
        promise.set_value(outcome);
    };
    session().downloadTask(std::move(request))->resume();
    return promise.get_future().get();
}

Outcome SessionTest::fetchFrom(Script script) {
    server.enqueue(std::move(script));
    return fetch(server.url());
}

Outcome SessionTest::outlast(std::future<Outcome> outcome) {
    // Repeatedly, because bytes in transit reset the time.
    while (outcome.wait_for(options.pollInterval) != std::future_status::ready)
        clock.advance(static_cast<int>(https::kIdleTimeoutSeconds));
    return outcome.get();
}

}  // namespace pinwell::test
