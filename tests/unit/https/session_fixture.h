// A session, its recording delegate and a server for it to talk to.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>

#include "base/bytes.h"
#include "https/session.h"
#include "support/certificate_builder.h"
#include "support/fake_trust_service.h"
#include "support/hostile_server.h"
#include "support/temporary_directory.h"
#include "values/url.h"

namespace pinwell::test {

/// A clock that only the test advances.
class ManualClock {
  public:
    https::Clock::time_point now() const { return https::Clock::time_point(std::chrono::seconds(seconds_)); }
    void advance(int seconds) { seconds_ += seconds; }

  private:
    std::atomic<int> seconds_ = 0;
};

/// Accepts every server by default. Read its records only after the task has ended.
class RecordingDelegate : public https::SessionDelegate {
  public:
    using Challenge = https::AuthenticationChallenge;

    std::function<void(const Challenge&, const https::ChallengeCompletion&)> onChallenge = accept;
    std::function<void(https::Task&, const values::URL&)> onDownload = [](auto&, auto&) {};
    std::function<void(https::Task&, const std::optional<base::Error>&)> onComplete = [](auto&, auto&) {};

    std::vector<std::string> events;  // "challenge HOST", "downloaded", "complete", "completion"
    std::vector<std::thread::id> threads;

    static void accept(const Challenge& challenge, const https::ChallengeCompletion& completion) {
        completion(https::Disposition::useCredential, https::Credential{challenge.serverTrust});
    }

    void record(std::string event) {
        events.push_back(std::move(event));
        threads.push_back(std::this_thread::get_id());
    }

    void didReceiveChallenge(https::Session&, const Challenge& challenge,
                             const https::ChallengeCompletion& completion) override {
        record("challenge " + challenge.host);
        onChallenge(challenge, completion);
    }
    void didFinishDownloading(https::Session&, https::Task& task, const values::URL& location) override {
        record("downloaded");
        onDownload(task, location);
    }
    void didComplete(https::Session&, https::Task& task, const std::optional<base::Error>& error) override {
        record("complete");
        onComplete(task, error);
    }
};

/// The outcome of a task.
struct Outcome {
    std::optional<base::Data> body;
    std::optional<https::HTTPResponse> response;
    std::optional<base::Error> error;

    std::string text() const { return body ? base::toString(*body) : "(no body)"; }
    int status() const { return response ? response->status : 0; }
};

https::Request get(const std::string& url);
https::Request post(const std::string& url, std::string_view body);

/// Expects this failure, with a text of one line that contains these words.
void expectFailure(const Outcome& outcome, https::URLErrorCode code, std::string_view words);

class SessionTest : public ::testing::Test {
  protected:
    SessionTest();

    https::Session& session();
    std::future<Outcome> start(https::Request request);
    Outcome fetch(https::Request request) { return start(std::move(request)).get(); }
    Outcome fetch(const std::string& url) { return fetch(get(url)); }
    Outcome download(https::Request request);

    /// Fetches from a server of one script.
    Outcome fetchFrom(Script script);

    /// Moves the clock on until the task has given up.
    Outcome outlast(std::future<Outcome> outcome);

    static ServerIdentity identity();

    ManualClock clock;
    TemporaryDirectory directory;
    FakeTrustService trust;
    RecordingDelegate delegate;
    https::SessionOptions options;
    HostileServer server{identity()};

  private:
    std::unique_ptr<https::SessionService> service_;
    std::shared_ptr<https::Session> session_;  // last: it uses all of the above
};

}  // namespace pinwell::test
