// HTTPS sessions: data and download tasks whose server trust the delegate decides.
//
// A session is ephemeral: it keeps no cookies, cache or credentials, and stores nothing. It owns a serial
// callback queue; the delegate's methods and the completion handlers run there, one at a time, never on the
// thread that started the task. The tasks of a session run one after another. Any callback may end the
// process by exit().
//
// Destroying a session ends its running tasks with `cancelled`, and waits for their callbacks. Never destroy
// a session from its own queue.
#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "runtime/queue.h"
#include "trust/trust.h"
#include "values/format.h"
#include "values/url.h"

namespace pinwell::https {

using base::Data;
using base::Error;
using base::Result;
using values::URL;

inline constexpr int kMaximumRedirects = 10;
inline constexpr long kIdleTimeoutSeconds = 60;
inline constexpr std::size_t kMaximumResponseBody = 64ULL * 1024 * 1024;  // of a data task
inline constexpr std::size_t kMaximumDownload = 64ULL * 1024 * 1024;
inline constexpr std::string_view kUserAgent = "pinwell/34.0";

/// Codes of kURLErrorDomain.
enum class URLErrorCode : std::int64_t {
    cancelled = 1,       // the challenge was cancelled: the server is not trusted
    unsupportedURL = 2,  // no URL, not https, or a redirect to another scheme
    cannotFindHost = 3,
    cannotConnect = 4,
    timedOut = 5,
    tooManyRedirects = 6,
    tooLarge = 7,
    secureConnectionFailed = 8,
    badServerResponse = 9,
    connectionLost = 10,
    proxyFailed = 11,
    cannotWriteFile = 12,
    invalidConfiguration = 13,
    resourceUnavailable = 14,  // no more threads can be started
    unknown = 99,
};

/// Header names compare without regard to case; the first spelling is kept.
struct CaseInsensitiveLess {
    bool operator()(std::string_view a, std::string_view b) const noexcept;
    using is_transparent = void;
};
using Headers = std::map<std::string, std::string, CaseInsensitiveLess>;

/// A request. Without a URL it does not start.
struct Request {
    std::optional<URL> url;
    std::string method = "GET";
    Data body;
    Headers headers;

    void addHeader(std::string_view name, std::string_view value);
};

/// The head of a response; after redirects, of the last one. Fields of one name are joined with ", ".
struct HTTPResponse {
    URL url;
    int status = 0;
    Headers headers;

    /// `nullopt` if the response does not have it.
    std::optional<std::string> header(std::string_view name) const;
};

/// The platform's text for a status code: "not found" for 404.
std::string localizedStringForStatusCode(int status);

/// The kind of a challenge.
enum class AuthenticationMethod { serverTrust, clientCertificate, password };

/// A question that a connection asks the delegate.
struct AuthenticationChallenge {
    std::string host;  // as in the URL, without port or brackets
    AuthenticationMethod method = AuthenticationMethod::serverTrust;
    std::shared_ptr<trust::Trust> serverTrust;  // set for the serverTrust method
};

enum class Disposition { useCredential = 0, performDefaultHandling = 1, cancelChallenge = 2 };

/// Permission to go on with the judged server.
struct Credential {
    std::shared_ptr<trust::Trust> trust;
};

using ChallengeCompletion = std::function<void(Disposition, std::optional<Credential>)>;

class Session;
class Task;

/// Callbacks of a session, on its queue.
class SessionDelegate {
  public:
    virtual ~SessionDelegate() = default;

    /// Must call `completion` exactly once, before it returns. Default handling of a server-trust challenge,
    /// or a credential for another trust object, refuses the server.
    virtual void didReceiveChallenge(Session& session, const AuthenticationChallenge& challenge,
                                     const ChallengeCompletion& completion) = 0;

    /// The body of a download task is in the file at `location` (mode 0600, in the temporary directory),
    /// which is removed when this returns.
    virtual void didFinishDownloading(Session& session, Task& task, const URL& location) = 0;

    /// A download task has ended; without an error, didFinishDownloading was called before.
    virtual void didComplete(Session& session, Task& task, const std::optional<Error>& error) = 0;
};

enum class TaskState { running = 0, suspended = 1, canceling = 2, completed = 3 };

/// One exchange. Made suspended. May be used from any thread.
class Task {
  public:
    virtual ~Task() = default;

    /// Starts it. A task whose request has no URL, or whose session no longer exists, does not start: its
    /// state stays the same, and its completion is not called. A second call does nothing.
    virtual void resume() = 0;

    /// `completed` after the last callback has returned. So after an immediate failure, the caller can
    /// usually still see that the task started.
    virtual TaskState state() const = 0;

    /// `nullopt` until the response is complete, and after an error.
    virtual std::optional<HTTPResponse> response() const = 0;
};

/// Body and response of a data task, or its error; an empty body is an empty buffer.
using DataCompletion = std::function<void(const std::optional<Data>&, const std::optional<HTTPResponse>&,
                                          const std::optional<Error>&)>;

class Session {
  public:
    virtual ~Session() = default;
    virtual std::shared_ptr<Task> dataTask(Request request, DataCompletion completion) = 0;
    virtual std::shared_ptr<Task> downloadTask(Request request) = 0;
};

class SessionService {
  public:
    virtual ~SessionService() = default;

    /// The delegate must outlive the session. A session has its own threads: the error is
    /// `resourceUnavailable` if the user or the container may not start them.
    virtual Result<std::shared_ptr<Session>> ephemeralSession(SessionDelegate& delegate) = 0;
};

/// Longest files that are read. Real files have a few KiB.
inline constexpr std::size_t kMaximumIdentityCertificates = std::size_t{256} * 1024;
inline constexpr std::size_t kMaximumIdentityKey = std::size_t{64} * 1024;

/// The identity of a session: a certificate and its private key, for servers that ask for one in the
/// handshake. Immutable, shared. The key's memory is wiped with the last reference, if OpenSSL wipes freed
/// memory (crypto/crypto.h).
class ClientIdentity {
  public:
    /// Reads two PEM files: the certificate, optionally followed by its issuers', and its unencrypted private
    /// key. The error names the file and its fault in one sentence.
    static Result<std::shared_ptr<const ClientIdentity>> read(const std::string& certificatePath,
                                                              const std::string& keyPath);

    ClientIdentity();
    ~ClientIdentity();
    ClientIdentity(const ClientIdentity&) = delete;
    ClientIdentity& operator=(const ClientIdentity&) = delete;

    /// Makes the TLS context (an SSL_CTX) send it to a server that asks. A server is judged before it gets
    /// anything. Returns false if the TLS library refuses it, for example because the key is too weak.
    bool install(void* context) const noexcept;

  private:
    struct Parts;
    std::unique_ptr<Parts> parts_;
};

using Clock = std::chrono::steady_clock;

/// The limits of a session. The defaults are the product's; tests choose others.
struct SessionOptions {
    std::size_t maximumResponseBody = kMaximumResponseBody;
    std::size_t maximumDownload = kMaximumDownload;

    /// Both of one exchange, with its interim responses and trailers.
    std::size_t maximumHeaderBytes = 128UL * 1024;
    std::size_t maximumHeaderFields = 256;

    /// How many bytes on the wire the server may send without a complete line of a head or a piece of a body.
    /// The transfer library's memory is in proportion.
    std::size_t maximumSilentBytes = 256UL * 1024;

    int maximumRedirects = kMaximumRedirects;

    /// The longest time without a byte sent or received. Name lookup, connection and handshake up to the
    /// server's certificate count as one wait.
    std::chrono::milliseconds idleLimit = std::chrono::seconds(kIdleTimeoutSeconds);
    std::chrono::milliseconds pollInterval = std::chrono::seconds(1);  // how often the clock is read
    std::function<Clock::time_point()> now = Clock::now;

    /// Keeps the connection of an exchange for the session's next one to the same host and port. The server
    /// is not judged again then.
    bool keepsConnection = false;

    /// The maximum time of a kept connection without an exchange, and its maximum age.
    std::chrono::seconds keepsIdleConnectionFor{60};
    std::chrono::seconds keepsConnectionFor{300};

    /// Sent to every server that the delegate has accepted and that asks for it. So do not follow redirects
    /// with it. Null: none.
    std::shared_ptr<const ClientIdentity> identity = nullptr;

    /// The directory for downloads; if empty, the user's temporary directory.
    std::function<URL()> temporaryDirectory = {};
};

/// Sessions over the network. The trust service must outlive them.
std::unique_ptr<SessionService> makeSessionService(trust::TrustService& trust, SessionOptions options = {});

}  // namespace pinwell::https

namespace pinwell::values {

/// "{ URL: ... } { Status Code: 200, Headers { ... } }"; without an address, so equal responses have equal
/// texts.
template <>
struct Description<https::HTTPResponse> {
    static std::string of(const https::HTTPResponse& response);
};

}  // namespace pinwell::values
