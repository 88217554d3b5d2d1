// HTTPS sessions without a network. A function of the test gives their responses. For any thread.
//
//   AnsweringSessions sessions([](const https::Request& request) {
//       return AnsweringSessions::Reply{.status = 503, .headers = {{"Retry-After", "0"}}};
//   });
//   const Platform platform = platformWith(test.services(), sessions);
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "https/session.h"
#include "src/platform.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::test {

class AnsweringSessions : public https::SessionService {
  public:
    struct Reply {
        int status = 200;
        https::Headers headers = {};
        std::string body = {};
        std::optional<base::Error> error = {};
        bool isByAStranger = false;  // the delegate gets the server's certificate, and must refuse it
        bool neverComes = false;     // it ends with the session
    };
    using Handler = std::function<Reply(const https::Request& request)>;

    explicit AnsweringSessions(Handler handler) : handler_(std::move(handler)) {}

    base::Result<std::shared_ptr<https::Session>> ephemeralSession(
        https::SessionDelegate& delegate) override {
        const std::lock_guard lock(mutex_);
        if (failure_) return *failure_;
        ++sessions_;
        return std::shared_ptr<https::Session>(std::make_shared<Session>(*this, delegate));
    }

    /// After this call, no session can be made.
    void failWith(base::Error failure) {
        const std::lock_guard lock(mutex_);
        failure_ = std::move(failure);
    }
    void answerBy(Handler handler) {
        const std::lock_guard lock(mutex_);
        handler_ = std::move(handler);
    }
    /// The number of sessions so far.
    std::size_t sessions() const {
        const std::lock_guard lock(mutex_);
        return sessions_;
    }
    std::vector<https::Request> requests() const {
        const std::lock_guard lock(mutex_);
        return requests_;
    }
    /// The names in each lookup.
    std::vector<std::vector<std::string>> lookups() const {
        std::vector<std::vector<std::string>> all;
        for (const https::Request& request : requests())
            if (request.method == "POST") all.push_back(namesIn(request));
        return all;
    }

    static std::vector<std::string> namesIn(const https::Request& request) {
        const auto body = values::parseJSON(request.body);
        std::vector<std::string> names;
        if (!body) return names;
        for (const values::Value& record : *(*body)["records"].array())
            names.push_back(*record["recordName"].string());
        return names;
    }

  private:
    class Task : public https::Task {
      public:
        Task(AnsweringSessions& service, https::SessionDelegate& delegate, https::Session& session,
             https::Request request, https::DataCompletion completion)
            : service_(service),
              delegate_(delegate),
              session_(session),
              request_(std::move(request)),
              completion_(std::move(completion)) {}

        void resume() override {
            Handler handler;
            {
                const std::lock_guard lock(service_.mutex_);
                service_.requests_.push_back(request_);
                handler = service_.handler_;
            }
            const Reply reply = handler(request_);
            if (reply.neverComes) return;
            if (reply.isByAStranger) {
                // A challenge of a kind that is unknown to every delegate.
                delegate_.didReceiveChallenge(
                    session_,
                    {.host = "stranger.example",
                     .method = https::AuthenticationMethod::clientCertificate,
                     .serverTrust = nullptr},
                    [](https::Disposition, const std::optional<https::Credential>&) {});
                fail(https::URLErrorCode::cancelled);
            } else if (reply.error) {
                std::exchange(completion_, nullptr)(std::nullopt, std::nullopt, reply.error);
            } else {
                std::exchange(completion_, nullptr)(
                    base::toData(reply.body), https::HTTPResponse{*request_.url, reply.status, reply.headers},
                    std::nullopt);
            }
        }
        void fail(https::URLErrorCode code) {
            if (const auto completion = std::exchange(completion_, nullptr))
                completion(std::nullopt, std::nullopt,
                           base::Error(base::kURLErrorDomain, static_cast<std::int64_t>(code), "ended"));
        }
        https::TaskState state() const override {
            return completion_ ? https::TaskState::running : https::TaskState::completed;
        }
        std::optional<https::HTTPResponse> response() const override { return std::nullopt; }

      private:
        AnsweringSessions& service_;
        https::SessionDelegate& delegate_;
        https::Session& session_;
        const https::Request request_;
        https::DataCompletion completion_;
    };

    class Session : public https::Session {
      public:
        Session(AnsweringSessions& service, https::SessionDelegate& delegate)
            : service_(service), delegate_(delegate) {}
        ~Session() override {
            if (last_) last_->fail(https::URLErrorCode::cancelled);
        }
        Session(const Session&) = delete;
        Session& operator=(const Session&) = delete;

        std::shared_ptr<https::Task> dataTask(https::Request request,
                                              https::DataCompletion completion) override {
            last_ =
                std::make_shared<Task>(service_, delegate_, *this, std::move(request), std::move(completion));
            return last_;
        }
        std::shared_ptr<https::Task> downloadTask(https::Request) override { return nullptr; }

      private:
        AnsweringSessions& service_;
        https::SessionDelegate& delegate_;
        std::shared_ptr<Task> last_;
    };

    mutable std::mutex mutex_;
    Handler handler_;
    std::optional<base::Error> failure_;
    std::size_t sessions_ = 0;
    std::vector<https::Request> requests_;
};

/// The same services, with these sessions.
inline Platform platformWith(const Platform& services, https::SessionService& sessions) {
    return {services.files,        services.types,     services.codeSigning, services.trust,      sessions,
            services.userDefaults, services.systemLog, services.directory,   services.exitProcess};
}

}  // namespace pinwell::test
