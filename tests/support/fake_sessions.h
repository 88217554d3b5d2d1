// HTTPS sessions without a network: they record the requests, and the test plays the server.
#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "https/session.h"

namespace pinwell::test {

class FakeTask : public https::Task {
  public:
    explicit FakeTask(https::Request made) : request(std::move(made)) {}

    void resume() override {
        if (request.url) current = https::TaskState::running;
    }
    https::TaskState state() const override { return current; }
    std::optional<https::HTTPResponse> response() const override { return answered; }

    https::Request request;
    https::TaskState current = https::TaskState::suspended;
    std::optional<https::HTTPResponse> answered;
};

class FakeSession : public https::Session {
  public:
    std::shared_ptr<https::Task> dataTask(https::Request request, https::DataCompletion completion) override {
        dataTasks.push_back(std::make_shared<FakeTask>(std::move(request)));
        completions.push_back(std::move(completion));
        return dataTasks.back();
    }
    std::shared_ptr<https::Task> downloadTask(https::Request request) override {
        downloadTasks.push_back(std::make_shared<FakeTask>(std::move(request)));
        return downloadTasks.back();
    }

    std::vector<std::shared_ptr<FakeTask>> dataTasks;
    std::vector<https::DataCompletion> completions;
    std::vector<std::shared_ptr<FakeTask>> downloadTasks;
};

class FakeSessionService : public https::SessionService {
  public:
    base::Result<std::shared_ptr<https::Session>> ephemeralSession(https::SessionDelegate&) override {
        if (failure) return *failure;
        sessions.push_back(std::make_shared<FakeSession>());
        return std::shared_ptr<https::Session>(sessions.back());
    }

    std::optional<base::Error> failure;  // of the sessions made after this is set
    std::vector<std::shared_ptr<FakeSession>> sessions;
};

}  // namespace pinwell::test
