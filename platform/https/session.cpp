#include "https/session.h"

#include <pthread.h>

#include <condition_variable>
#include <csignal>
#include <deque>
#include <mutex>
#include <system_error>
#include <thread>

#include "body_sink.h"
#include "http_message.h"
#include "runtime/process.h"
#include "runtime/signals.h"
#include "transfer.h"
#include "transfer_error.h"
#include "values/value.h"

namespace pinwell::https {
namespace {

// The delegate, and its queue.
struct ChallengeContext {
    Session& session;
    SessionDelegate& delegate;
    runtime::SerialQueue& queue;
    trust::TrustService& trust;
};

// The policy of a trust object until the delegate chooses one: only the platform's anchors, for this host. So
// a delegate that forgets to choose is too strict, not too lax.
trust::PolicyRef initialPolicy(const std::string& host) {
    namespace option = trust::option;
    trust::Policy policy;
    policy.oid = "1.3.6.1.5.5.7.3.1";  // id-kp-serverAuth, RFC 5280, section 4.2.1.12
    policy.options.emplace(option::kHostName, host);
    policy.options.emplace(option::kPlatformAnchor, values::Dictionary{});
    for (const auto check : {option::kServerAuthentication, option::kValidityDates, option::kBasicConstraints,
                             option::kNameConstraints, option::kCriticalExtensions, option::kIdLinkage})
        policy.options.emplace(check, true);
    return std::make_shared<const trust::Policy>(std::move(policy));
}

std::shared_ptr<trust::Trust> makeTrust(const trust::TrustService& service, const std::string& host,
                                        const std::vector<Data>& list) {
    std::vector<trust::CertificateRef> certificates;
    for (const Data& der : list) {
        certificates.push_back(service.parseCertificate(der));
        if (!certificates.back()) return nullptr;
    }
    const auto trust = service.makeTrust(std::move(certificates), initialPolicy(host));
    return trust ? *trust : nullptr;
}

// Outlives the delegate's call, because a faulty delegate may keep the completion and call it later.
struct Answer {
    std::mutex mutex;
    bool given = false;
    bool accepted = false;
};

bool ask(const ChallengeContext& context, const std::string& host,
         const std::shared_ptr<trust::Trust>& trust) {
    const auto answer = std::make_shared<Answer>();
    const auto completion = [answer, wanted = std::weak_ptr(trust)](
                                Disposition disposition, const std::optional<Credential>& credential) {
        const std::lock_guard lock(answer->mutex);
        if (answer->given) return;
        answer->given = true;
        answer->accepted = disposition == Disposition::useCredential && credential && credential->trust &&
                           credential->trust == wanted.lock();
    };
    context.queue.sync([&] {
        context.delegate.didReceiveChallenge(context.session,
                                             {host, AuthenticationMethod::serverTrust, trust}, completion);
    });
    const std::lock_guard lock(answer->mutex);
    answer->given = true;  // later calls are ignored
    return answer->accepted;
}

// Asks the delegate on the queue and waits for its decision. Succeeds if it accepts: with a credential for
// the given trust object, before it returns; only its first decision counts. Every other outcome is an error.
Result<void> challengeDelegate(const ChallengeContext& context, const std::string& host,
                               const std::vector<Data>& certificates) {
    const std::shared_ptr<trust::Trust> trust = makeTrust(context.trust, host, certificates);
    if (!trust)
        return makeError(URLErrorCode::secureConnectionFailed,
                         "The certificates sent by \"" + host + "\" could not be read.");
    if (ask(context, host, trust)) return {};
    return makeError(URLErrorCode::cancelled,
                     "The connection to \"" + host + "\" was cancelled: the server is not trusted.");
}

class SessionTask;

// The started tasks that wait for their turn. Shared with the tasks, which may outlive their
// session.
class Inbox {
  public:
    /// Returns false if the session no longer exists.
    bool add(std::shared_ptr<SessionTask> task) {
        const std::lock_guard lock(mutex_);
        if (closed_) return false;
        tasks_.push_back(std::move(task));
        changed_.notify_one();
        return true;
    }

    /// Waits for a task; null if it is closed and empty.
    std::shared_ptr<SessionTask> take() {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return closed_ || !tasks_.empty(); });
        if (tasks_.empty()) return nullptr;
        auto task = std::move(tasks_.front());
        tasks_.pop_front();
        return task;
    }

    void close() {
        const std::lock_guard lock(mutex_);
        closed_ = true;
        changed_.notify_one();
    }

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::shared_ptr<SessionTask>> tasks_;
    bool closed_ = false;
};

class SessionTask : public Task, public std::enable_shared_from_this<SessionTask> {
  public:
    /// Without a completion it is a download.
    SessionTask(std::shared_ptr<Inbox> inbox, Request request, std::optional<DataCompletion> completion)
        : inbox_(std::move(inbox)), request_(std::move(request)), completion_(std::move(completion)) {}

    void resume() override {
        {
            const std::lock_guard lock(mutex_);
            if (state_ != TaskState::suspended || !request_.url) return;
            state_ = TaskState::running;
        }
        if (!inbox_->add(shared_from_this())) setState(TaskState::suspended);
    }

    TaskState state() const override {
        const std::lock_guard lock(mutex_);
        return state_;
    }

    std::optional<HTTPResponse> response() const override {
        const std::lock_guard lock(mutex_);
        return response_;
    }

    void setState(TaskState state) {
        const std::lock_guard lock(mutex_);
        state_ = state;
    }

    void setResponse(const HTTPResponse& response) {
        const std::lock_guard lock(mutex_);
        response_ = response;
    }

    // Only for the worker.
    const Request& request() const { return request_; }
    bool isDownload() const { return !completion_; }
    DataCompletion takeCompletion() { return std::move(*completion_); }

  private:
    const std::shared_ptr<Inbox> inbox_;
    const Request request_;
    std::optional<DataCompletion> completion_;

    mutable std::mutex mutex_;
    TaskState state_ = TaskState::suspended;
    std::optional<HTTPResponse> response_;
};

// One worker thread runs the tasks, one after another. It waits while a callback runs. Any callback
// may end the process by exit(), which frees objects of the transfer and TLS libraries. So the worker
// uses no such object during a callback, except during a challenge. A kept connection stays open, but
// idle.
class NetworkSession : public Session {
  public:
    NetworkSession(SessionDelegate& delegate, trust::TrustService& trust, const SessionOptions& options)
        : delegate_(delegate), trust_(trust), options_(options), worker_([this] { work(); }) {}

    /// Running tasks end with `cancelled`; the destructor waits for their callbacks.
    ~NetworkSession() override {
        interrupt_.raise();
        inbox_->close();
        worker_.join();
    }

    std::shared_ptr<Task> dataTask(Request request, DataCompletion completion) override {
        return std::make_shared<SessionTask>(inbox_, std::move(request), std::move(completion));
    }
    std::shared_ptr<Task> downloadTask(Request request) override {
        return std::make_shared<SessionTask>(inbox_, std::move(request), std::nullopt);
    }

  private:
    void work() {
        const runtime::StackGuard guard;
        // A write to a closed connection must fail, not end the process.
        sigset_t signals;
        sigemptyset(&signals);
        sigaddset(&signals, SIGPIPE);
        pthread_sigmask(SIG_BLOCK, &signals, nullptr);
        pthread_setname_np(pthread_self(), "https-worker");
        while (const auto task = inbox_->take()) {
            if (task->isDownload())
                carryOutDownload(*task);
            else
                carryOutData(*task);
            task->setState(TaskState::completed);
        }
        connection_.drop();  // on the thread that used it
    }

    void carryOutData(SessionTask& task) {
        std::optional<Data> body;
        std::optional<HTTPResponse> response;
        std::optional<Error> error;
        {
            MemorySink sink;
            Result<HTTPResponse> answer = fetch(task.request(), options_.maximumResponseBody, sink);
            if (answer) {
                body = sink.take();
                response = std::move(*answer);
                task.setResponse(*response);
            } else {
                error = answer.error();
            }
        }
        callbacks_.sync([&] {
            // Its captures are the caller's objects: they are freed on the queue, where the caller expects
            // calls.
            const DataCompletion completion = task.takeCompletion();
            if (completion) completion(body, response, error);
        });
    }

    void carryOutDownload(SessionTask& task) {
        const Result<void> done = download(task);
        const std::optional<Error> error = done ? std::nullopt : std::optional(done.error());
        callbacks_.sync([&] { delegate_.didComplete(*this, task, error); });
    }

    // The file is removed when this returns.
    Result<void> download(SessionTask& task) {
        Result<std::unique_ptr<DownloadFile>> file = DownloadFile::make(temporaryDirectory());
        if (!file) return file.error();
        const Result<HTTPResponse> answer = fetch(task.request(), options_.maximumDownload, **file);
        if (!answer) return answer.error();
        if (auto finished = (*file)->finish(); !finished) return finished;
        task.setResponse(*answer);
        callbacks_.sync([&] { delegate_.didFinishDownloading(*this, task, (*file)->location()); });
        return {};
    }

    URL temporaryDirectory() const {
        return options_.temporaryDirectory ? options_.temporaryDirectory() : runtime::temporaryDirectory();
    }

    // Follows redirects to the final response.
    Result<HTTPResponse> fetch(Request request, std::size_t maximumBody, BodySink& sink) {
        const TransferContext context{
            options_, connection_, interrupt_, maximumBody,
            [this](const std::string& host, const std::vector<Data>& certificates) {
                return challengeDelegate({*this, delegate_, callbacks_, trust_}, host, certificates);
            }};
        for (int redirects = 0;; ++redirects) {
            Result<TransferAnswer> answer = transfer(request, context, sink);
            if (!answer) return answer.error();
            if (!answer->redirectTarget) return std::move(answer->response);
            if (redirects == options_.maximumRedirects)
                return makeError(
                    URLErrorCode::tooManyRedirects,
                    "\"" + request.url->host() + "\" redirects " +
                        (redirects == 0 ? "a request that must not be redirected."
                                        : "once more after " + std::to_string(redirects) + " redirects."));
            Result<Request> next =
                requestAfterRedirect(request, answer->response.status, *answer->redirectTarget);
            if (!next) return next.error();
            request = std::move(*next);
        }
    }

    SessionDelegate& delegate_;
    trust::TrustService& trust_;
    const SessionOptions options_;
    const std::shared_ptr<Inbox> inbox_ = std::make_shared<Inbox>();
    ConnectionSlot connection_;  // only for the worker
    Interrupt interrupt_;
    runtime::SerialQueue callbacks_{"https-callbacks"};
    std::thread worker_;  // last: it uses all of the above
};

class NetworkSessionService : public SessionService {
  public:
    NetworkSessionService(trust::TrustService& trust, SessionOptions options)
        : trust_(trust), options_(std::move(options)) {}

    Result<std::shared_ptr<Session>> ephemeralSession(SessionDelegate& delegate) override {
        try {
            return std::shared_ptr<Session>(std::make_shared<NetworkSession>(delegate, trust_, options_));
        } catch (const std::system_error& failure) {
            return makeError(
                URLErrorCode::resourceUnavailable,
                "No thread could be started for the connection: " + failure.code().message() + ".");
        }
    }

  private:
    trust::TrustService& trust_;
    SessionOptions options_;
};

}  // namespace

std::unique_ptr<SessionService> makeSessionService(trust::TrustService& trust, SessionOptions options) {
    return std::make_unique<NetworkSessionService>(trust, std::move(options));
}

}  // namespace pinwell::https
