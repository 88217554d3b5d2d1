// Tasks, their states, and the queue that callbacks run on.
#include <sys/resource.h>
#include <unistd.h>

#include "session_fixture.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using https::TaskState;
using https::URLErrorCode;

class SessionTasks : public SessionTest {};

TEST_F(SessionTasks, StartSuspendedRunAndComplete) {
    Gate gate;
    server.enqueue(Script().readRequest().waitFor(gate).send(Response{.body = "x"}.bytes()));
    std::promise<void> done;
    const auto task = session().dataTask(get(server.url()), [&](auto&, auto&, auto&) { done.set_value(); });
    EXPECT_EQ(task->state(), TaskState::suspended);
    EXPECT_FALSE(task->response());
    task->resume();
    EXPECT_EQ(task->state(), TaskState::running);
    ASSERT_TRUE(gate.waitUntilReached());
    EXPECT_EQ(task->state(), TaskState::running);
    gate.open();
    done.get_future().wait();
    fetch(server.url());  // the next task begins when this one has completed
    EXPECT_EQ(task->state(), TaskState::completed);
    EXPECT_EQ(task->response()->status, 200);
}

TEST_F(SessionTasks, WithoutAURLDoNotStart) {
    bool called = false;
    const auto task = session().dataTask({}, [&](auto&, auto&, auto&) { called = true; });
    const auto download = session().downloadTask({});
    task->resume();
    download->resume();
    EXPECT_EQ(task->state(), TaskState::suspended);
    EXPECT_EQ(download->state(), TaskState::suspended);
    fetch(server.url());
    EXPECT_FALSE(called);
}

TEST_F(SessionTasks, StartOnce) {
    std::atomic<int> calls = 0;
    const auto task = session().dataTask(get(server.url()), [&](auto&, auto&, auto&) { ++calls; });
    task->resume();
    task->resume();
    fetch(server.url());
    task->resume();
    fetch(server.url());
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(server.requests().size(), 3U);
}

TEST_F(SessionTasks, CallBackOnOneThreadThatIsNotTheCallers) {
    for (int i = 0; i < 3; ++i) fetch(server.url());
    ASSERT_EQ(delegate.threads.size(), 6U);
    EXPECT_THAT(delegate.threads, ::testing::Each(delegate.threads[0]));
    EXPECT_NE(delegate.threads[0], std::this_thread::get_id());
}

TEST_F(SessionTasks, OfTwoSessionsCallBackOnDifferentThreads) {
    const auto service = https::makeSessionService(trust, options);
    RecordingDelegate otherDelegate;
    const auto other = *service->ephemeralSession(otherDelegate);
    fetch(server.url());
    std::promise<void> done;
    other->dataTask(get(server.url()), [&](auto&, auto&, auto&) { done.set_value(); })->resume();
    done.get_future().wait();
    EXPECT_NE(otherDelegate.threads.at(0), delegate.threads.at(0));
}

TEST_F(SessionTasks, NeverCallBackTwoAtOnce) {
    std::atomic<int> inside = 0;
    std::atomic<bool> overlapped = false;
    const auto enter = [&] {
        if (++inside != 1) overlapped = true;
        std::this_thread::yield();
        --inside;
    };
    delegate.onChallenge = [&](auto& challenge, auto& completion) {
        enter();
        RecordingDelegate::accept(challenge, completion);
    };
    constexpr int kTasks = 20;
    std::atomic<int> ended = 0;
    std::promise<void> allEnded;
    for (int i = 0; i < kTasks; ++i)
        session()
            .dataTask(get(server.url()),
                      [&](auto& body, auto&, auto&) {
                          enter();
                          EXPECT_TRUE(body.has_value());
                          if (++ended == kTasks) allEnded.set_value();
                      })
            ->resume();
    allEnded.get_future().wait();
    EXPECT_FALSE(overlapped);
    EXPECT_EQ(server.requests().size(), 20U);
}

TEST_F(SessionTasks, MayStartAnotherFromACallback) {
    std::promise<std::string> second;
    const auto first = session().dataTask(get(server.url()), [&](auto&, auto&, auto&) {
        const auto next = session().dataTask(get(server.url("/second")), [&](auto&, auto& response, auto&) {
            second.set_value(response->url.path());
        });
        next->resume();
    });
    first->resume();
    EXPECT_EQ(second.get_future().get(), "/second");
}

TEST_F(SessionTasks, MayStartADownloadOfAnotherSessionFromACallbackAndFindItRunning) {
    const auto service = https::makeSessionService(trust, options);
    RecordingDelegate other;
    std::promise<void> started;
    std::promise<void> downloaded;
    other.onComplete = [&](auto&, auto& error) {
        EXPECT_FALSE(error);
        downloaded.set_value();
    };
    std::shared_ptr<https::Session> second;
    std::shared_ptr<https::Task> download;
    TaskState stateAfterStart = TaskState::suspended;
    const auto first = session().dataTask(get(server.url()), [&](auto&, auto&, auto&) {
        second = *service->ephemeralSession(other);
        download = second->downloadTask(get(server.url("/ticket")));
        download->resume();
        stateAfterStart = download->state();
        started.set_value();
    });
    first->resume();
    started.get_future().wait();
    downloaded.get_future().wait();
    EXPECT_EQ(stateAfterStart, TaskState::running);
}

class EndedSession : public SessionTest {
  protected:
    std::unique_ptr<https::SessionService> service = https::makeSessionService(trust, options);
    std::optional<base::Error> error;

    https::DataCompletion noteError() {
        return [this](auto&, auto&, auto& failure) { error = failure; };
    }
};

TEST_F(EndedSession, CancelsRunningTasks) {
    Gate gate;
    server.enqueue(Script().readRequest().waitFor(gate));
    auto own = *service->ephemeralSession(delegate);
    own->dataTask(get(server.url()), noteError())->resume();
    ASSERT_TRUE(gate.waitUntilReached());
    own.reset();
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), static_cast<std::int64_t>(URLErrorCode::cancelled));
    EXPECT_THAT(error->localizedFailureReason(), ::testing::HasSubstr("the session was ended"));
}

TEST_F(EndedSession, CancelsWaitingTasks) {
    Gate gate;
    server.enqueue(Script().waitFor(gate));
    auto own = *service->ephemeralSession(delegate);
    own->dataTask(get(server.url()), {})->resume();
    ASSERT_TRUE(gate.waitUntilReached());
    const auto waiting = own->dataTask(get(server.url()), noteError());
    waiting->resume();
    own.reset();
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), static_cast<std::int64_t>(URLErrorCode::cancelled));
    EXPECT_EQ(waiting->state(), TaskState::completed);
}

TEST_F(EndedSession, StartsNothingAnyMore) {
    auto own = *service->ephemeralSession(delegate);
    const auto task = own->dataTask(get(server.url()), noteError());
    own.reset();
    task->resume();
    EXPECT_EQ(task->state(), TaskState::suspended);
    EXPECT_FALSE(error);
}

TEST(SessionService, ReportsThatNoThreadCanBeStarted) {
    const auto check = [] {
        // The limit does not hold for the superuser.
        if (isSuperuser() && setresuid(65534, 65534, 65534) != 0) _exit(2);
        constexpr rlimit kNoMore{0, 0};
        if (setrlimit(RLIMIT_NPROC, &kNoMore) != 0) _exit(3);
        FakeTrustService trust;
        RecordingDelegate delegate;
        const auto session = https::makeSessionService(trust)->ephemeralSession(delegate);
        if (session) _exit(4);
        _exit(session.error().code() == static_cast<std::int64_t>(URLErrorCode::resourceUnavailable) ? 0 : 5);
    };
    EXPECT_EXIT(check(), ::testing::ExitedWithCode(0), "");
}

TEST_F(EndedSession, CostsNothingUnused) {
    EXPECT_TRUE(service->ephemeralSession(delegate));
}

}  // namespace
}  // namespace pinwell::test
