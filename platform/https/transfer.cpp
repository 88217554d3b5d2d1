#include "transfer.h"

#include <curl/curl.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <system_error>

#include "base/bytes.h"
#include "base/handle.h"
#include "http_message.h"
#include "transfer_error.h"
#include "values/value.h"

namespace pinwell::https {
namespace {

using EasyHandle = base::Handle<CURL, curl_easy_cleanup>;
using HeaderListHandle = base::Handle<curl_slist, curl_slist_free_all>;

// Called at the first transfer, because it costs start-up time, and most failed runs never get here.
bool libraryIsReady() {
    static const bool ready = curl_global_init(CURL_GLOBAL_DEFAULT) == CURLE_OK;
    return ready;
}

bool isWellFormed(const Request& request) {
    return isToken(request.method) &&
           std::all_of(request.headers.begin(), request.headers.end(),
                       [](auto& field) { return isToken(field.first) && isFieldValue(field.second); });
}

HeaderListHandle headerList(const Request& request) {
    HeaderListHandle list;
    const auto add = [&list](const std::string& line) {
        curl_slist* const longer = curl_slist_append(list.get(), line.c_str());
        if (longer == nullptr) throw std::bad_alloc();
        static_cast<void>(list.release());
        list.reset(longer);
    };
    for (const auto& [name, value] : request.headers) add(value.empty() ? name + ";" : name + ": " + value);
    // Fields that the library would add by itself.
    for (const char* name : {"Content-Type", "Expect"})
        if (!request.headers.contains(std::string_view(name))) add(std::string(name) + ":");
    return list;
}

class Exchange {
  public:
    Exchange(const Request& request, const TransferContext& context, BodySink& sink, Target target)
        : request_(request),
          context_(context),
          sink_(sink),
          target_(std::move(target)),
          head_(context.options.maximumHeaderBytes, context.options.maximumHeaderFields),
          multi_(context.connection.handleFor(target_)),
          bytesUsed_(bytesArrived()) {}

    Result<TransferAnswer> run() {
        headers_ = headerList(request_);
        if (!easy_ || multi_ == nullptr || !configure()) {
            context_.connection.drop();
            const auto result = setupResult_ == CURLE_OK ? CURLE_FAILED_INIT : setupResult_;
            return makeError(
                URLErrorCode::invalidConfiguration,
                std::string("The transfer could not be set up: ") + curl_easy_strerror(result) + ".");
        }
        lastActivity_ = context_.options.now();
        if (curl_multi_add_handle(multi_, easy_.get()) != CURLM_OK) {
            context_.connection.drop();
            return makeError(URLErrorCode::unknown, "The transfer could not be started.");
        }
        const CURLcode result = drive();
        Result<TransferAnswer> outcome = answer(result);
        curl_socket_t socket = CURL_SOCKET_BAD;
        curl_easy_getinfo(easy_.get(), CURLINFO_ACTIVESOCKET, &socket);
        curl_multi_remove_handle(multi_, easy_.get());
        easy_.reset();
        if (outcome && context_.options.keepsConnection)
            context_.connection.keep(socket);
        else
            context_.connection.drop();
        return outcome;
    }

  private:
    const ServerTrust* trust() const noexcept { return context_.connection.trust(); }
    bool isAccepted() const noexcept { return trust() != nullptr && trust()->accepted(); }
    bool agreedOnHTTP2() const noexcept { return trust() != nullptr && trust()->agreedOnHTTP2(); }
    std::size_t bytesArrived() const noexcept { return trust() != nullptr ? trust()->bytesArrived() : 0; }

    template <class T>
    void set(CURLoption option, T value) {
        if (setupResult_ == CURLE_OK) setupResult_ = curl_easy_setopt(easy_.get(), option, value);
    }

    bool configure() {
        configureConnection();
        configureTrust();
        configureRequest();
        configureCallbacks();
        return setupResult_ == CURLE_OK;
    }

    void configureConnection() {
        set(CURLOPT_CURLU, target_.address.get());
        set(CURLOPT_PROTOCOLS_STR, "https");
        set(CURLOPT_FOLLOWLOCATION, 0L);
        set(CURLOPT_HTTP_VERSION, long{CURL_HTTP_VERSION_2TLS});
        set(CURLOPT_HTTP09_ALLOWED, 0L);
        set(CURLOPT_NETRC, long{CURL_NETRC_IGNORED});
        set(CURLOPT_HTTPAUTH, 0L);
        set(CURLOPT_SUPPRESS_CONNECT_HEADERS, 1L);
        set(CURLOPT_NOSIGNAL, 1L);
        set(CURLOPT_MAXAGE_CONN, static_cast<long>(context_.options.keepsIdleConnectionFor.count()));
        set(CURLOPT_MAXLIFETIME_CONN, static_cast<long>(context_.options.keepsConnectionFor.count()));
        set(CURLOPT_QUICK_EXIT, 1L);  // a silent name server must not delay the end of a task
        set(CURLOPT_ERRORBUFFER, errorText_.data());
    }

    // The library's own checks stay enabled, without any anchors: if our callback is not called, the
    // connection is refused. The host name is part of the policy that our callback's judge applies.
    void configureTrust() {
        set(CURLOPT_SSLVERSION, long{CURL_SSLVERSION_TLSv1_2});
        set(CURLOPT_SSL_VERIFYPEER, 1L);
        set(CURLOPT_SSL_VERIFYHOST, 0L);
        set(CURLOPT_SSL_SESSIONID_CACHE, 0L);
        for (const CURLoption option :
             {CURLOPT_CAINFO, CURLOPT_CAPATH, CURLOPT_PROXY_CAINFO, CURLOPT_PROXY_CAPATH})
            set(option, static_cast<const char*>(nullptr));
        set(CURLOPT_SSL_CTX_FUNCTION, &Exchange::onTLSContext);
        set(CURLOPT_SSL_CTX_DATA, this);
        set(CURLOPT_PREREQFUNCTION, &Exchange::onConnected);
        set(CURLOPT_PREREQDATA, this);
        // A proxy's certificate would be judged for the wrong host. Only the library knows whether the
        // environment's proxy applies to this host, so the library chooses one, and fails by itself on an
        // https proxy.
        set(CURLOPT_PROXY_SSL_CIPHER_LIST, "no-cipher");
    }

    void configureRequest() {
        set(CURLOPT_USERAGENT, std::string(kUserAgent).c_str());
        set(CURLOPT_HTTPHEADER, headers_.get());
        set(CURLOPT_HEADEROPT, long{CURLHEADER_SEPARATE});  // not sent to a proxy
        if (request_.method == "HEAD") {
            set(CURLOPT_NOBODY, 1L);
            return;
        }
        if (!request_.body.empty() || request_.method == "POST" || request_.method == "PUT") {
            set(CURLOPT_POST, 1L);
            set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request_.body.size()));
            // Never null: null would mean that the body comes from a callback.
            set(CURLOPT_POSTFIELDS, request_.body.empty() ? static_cast<const void*>("")
                                                          : static_cast<const void*>(request_.body.data()));
        }
        set(CURLOPT_CUSTOMREQUEST, request_.method.c_str());
    }

    void configureCallbacks() {
        set(CURLOPT_HEADERFUNCTION, &Exchange::onHeader);
        set(CURLOPT_HEADERDATA, this);
        set(CURLOPT_WRITEFUNCTION, &Exchange::onBody);
        set(CURLOPT_WRITEDATA, this);
        set(CURLOPT_XFERINFOFUNCTION, &Exchange::onProgress);
        set(CURLOPT_XFERINFODATA, this);
        set(CURLOPT_NOPROGRESS, 0L);
    }

    CURLcode drive() {
        while (true) {
            int running = 0;
            if (curl_multi_perform(multi_, &running) != CURLM_OK) return CURLE_FAILED_INIT;
            if (running == 0) break;
            if (!mayGoOn()) return CURLE_ABORTED_BY_CALLBACK;
            curl_waitfd interrupt{context_.interrupt.descriptor(), CURL_WAIT_POLLIN, 0};
            const auto wait = static_cast<int>(context_.options.pollInterval.count());
            if (curl_multi_poll(multi_, &interrupt, 1, wait, nullptr) != CURLM_OK) return CURLE_FAILED_INIT;
        }
        int remaining = 0;
        const CURLMsg* const message = curl_multi_info_read(multi_, &remaining);
        return message != nullptr && message->msg == CURLMSG_DONE ? message->data.result : CURLE_FAILED_INIT;
    }

    bool mayGoOn() {
        if (context_.interrupt.isRaised()) {
            fail(URLErrorCode::cancelled, "the session was ended");
            return false;
        }
        if (bytesArrived() - bytesUsed_ > context_.options.maximumSilentBytes) {
            fail(URLErrorCode::badServerResponse, "the server sends much that is no part of an answer");
            return false;
        }
        if (context_.options.now() - lastActivity_ < context_.options.idleLimit) return true;
        const auto limit =
            std::chrono::duration_cast<std::chrono::seconds>(context_.options.idleLimit).count();
        fail(URLErrorCode::timedOut, "no answer for " + std::to_string(limit) + " seconds");
        return false;
    }

    Result<TransferAnswer> answer(CURLcode result) {
        if (!failure_ && head_.isComplete()) failWhereCut(result);
        if (result == CURLE_OK && !failure_ && !(isAccepted() && head_.isComplete()))
            fail(URLErrorCode::badServerResponse, "the answer is not HTTP");
        if (allocationFailed_) fail(URLErrorCode::tooLarge, "the answer is larger than can be kept");
        if (result != CURLE_OK && !failure_) failFrom(result);
        if (failure_) return std::move(*failure_).withURL(request_.url->absoluteString());

        TransferAnswer answer{{*request_.url, head_.status(), head_.headers()}, std::nullopt};
        if (!isRedirect(answer.response)) return answer;
        // Fields of one name were joined with a space; an address has none.
        if (answer.response.header("Location")->find(' ') != std::string::npos)
            return makeError(
                URLErrorCode::unsupportedURL,
                target_.text() + ": the redirect names more than one target, or a malformed one.");
        const char* target = nullptr;
        curl_easy_getinfo(easy_.get(), CURLINFO_REDIRECT_URL, &target);
        answer.redirectTarget = target != nullptr ? target : "";
        return answer;
    }

    // If only the connection's end ends a body (RFC 9112, section 6.3), an attacker can shorten it by cutting
    // the connection, and older releases of the library accept any end. HTTP/2 marks the end itself.
    void failWhereCut(CURLcode result) {
        const bool endSeen = agreedOnHTTP2() || (trust() != nullptr && trust()->sawOrderlyEnd());
        const bool cut = head_.hasOpenEnd(request_.method) && !endSeen;
        if (cut && (result == CURLE_OK || result == CURLE_RECV_ERROR))
            fail(URLErrorCode::connectionLost, "the connection was cut within the answer");
        const auto length = head_.bodyLength(request_.method);
        if (result == CURLE_OK && length && *length != received_)
            fail(URLErrorCode::badServerResponse, "the answer is not as long as it says");
    }

    // The first failure is the cause; later reports of the library are consequences.
    void fail(URLErrorCode code, const std::string& reason) {
        if (!failure_) failure_ = makeError(code, target_.text() + ": " + reason + ".");
    }

    void failFrom(CURLcode result) {
        if (isAccepted() && !trust()->objection().empty()) {
            fail(URLErrorCode::secureConnectionFailed,
                 context_.options.identity
                     ? "the server does not accept this client's certificate (" + trust()->objection() + ")"
                     : "the server asks for a certificate (" + trust()->objection() + ")");
            return;
        }
        const TransferFailure& failure = failureOf(result);
        long proxyStatus = 0;
        curl_easy_getinfo(easy_.get(), CURLINFO_HTTP_CONNECTCODE, &proxyStatus);
        if (proxyStatus != 0 && proxyStatus / 100 != 2) {
            fail(URLErrorCode::proxyFailed, "the proxy refused with status " + std::to_string(proxyStatus));
            return;
        }
        std::string reason(failure.reason);
        long number = 0;
        curl_easy_getinfo(easy_.get(), CURLINFO_OS_ERRNO, &number);
        if (failure.code == URLErrorCode::cannotConnect && number != 0)
            reason += " (" + std::generic_category().message(static_cast<int>(number)) + ")";
        else if (failure.code != URLErrorCode::cannotFindHost && std::strlen(errorText_.data()) > 0)
            reason += " (" + std::string(errorText_.data()) + ")";
        fail(failure.code, reason);
    }

    bool judge(const std::vector<Data>& certificates) {
        const Result<void> accepted = context_.judge(target_.host, certificates);
        lastActivity_ = context_.options.now();  // the judge's time does not count as the server's
        if (!accepted && !failure_) failure_ = accepted.error();
        return !failure_;
    }

    // The library's callbacks are called from C: no exception may leave them.
    template <class Work>
    bool guarded(Work work) noexcept {
        try {
            return work();
        } catch (const std::exception&) {
            allocationFailed_ = true;
            return false;
        }
    }

    static CURLcode onTLSContext(CURL*, void* context, void* self) noexcept {
        auto& exchange = *static_cast<Exchange*>(self);
        exchange.bytesUsed_ = 0;
        const bool isStrict = exchange.context_.connection.prepare(
            context,
            [&exchange](const std::vector<Data>& certificates) { return exchange.judge(certificates); });
        const auto& identity = exchange.context_.options.identity;
        return isStrict && (!identity || identity->install(context)) ? CURLE_OK : CURLE_SSL_CONNECT_ERROR;
    }

    static int onConnected(void* self, char*, char*, int, int localPort) noexcept {
        auto& exchange = *static_cast<Exchange*>(self);
        const bool judged = exchange.guarded([&] {
            if (!exchange.context_.connection.confirm(localPort))
                exchange.fail(URLErrorCode::secureConnectionFailed, "the server was not judged");
            return !exchange.failure_;
        });
        return judged ? CURL_PREREQFUNC_OK : CURL_PREREQFUNC_ABORT;
    }

    static std::size_t onHeader(char* bytes, std::size_t, std::size_t count, void* self) noexcept {
        auto& exchange = *static_cast<Exchange*>(self);
        return exchange.guarded([&] { return exchange.takeHeader({bytes, count}); }) ? count : 0;
    }

    bool takeHeader(std::string_view line) {
        noteProgress();
        const ResponseHead::Line taken = head_.addLine(line);
        if (taken == ResponseHead::Line::tooLarge)
            fail(URLErrorCode::tooLarge, "the answer's header is larger than allowed");
        if (taken == ResponseHead::Line::malformed)
            fail(URLErrorCode::badServerResponse, "the answer is not HTTP, or its header is malformed");
        if (head_.isComplete()) checkHead();
        return !failure_;
    }

    void checkHead() {
        // The library accepts a status line of HTTP/2 even if HTTP/1 was agreed on, and then reads the body
        // by other rules.
        if (head_.isHTTP1() == agreedOnHTTP2())
            fail(URLErrorCode::badServerResponse, "the answer is not of the HTTP version agreed on");
        // The library uses the last of several lengths, and the leading digits of a malformed one. It also
        // unpacks a compressed transfer that was not requested, to any size.
        if (!head_.hasPlainFraming())
            fail(URLErrorCode::badServerResponse, "where the answer ends is not said in one plain way");
        else if (head_.bodyLength(request_.method).value_or(0) > context_.maximumBody)
            failAsTooLarge();
    }

    void failAsTooLarge() {
        fail(URLErrorCode::tooLarge,
             "the answer is larger than the " + std::to_string(context_.maximumBody) + " bytes allowed");
    }

    void noteProgress() {
        lastActivity_ = context_.options.now();
        bytesUsed_ = bytesArrived();
    }

    static std::size_t onBody(char* bytes, std::size_t, std::size_t count, void* self) noexcept {
        auto& exchange = *static_cast<Exchange*>(self);
        return exchange.guarded([&] { return exchange.takeBody({bytes, count}); }) ? count : 0;
    }

    bool takeBody(std::string_view bytes) {
        noteProgress();
        if (bytes.size() > context_.maximumBody - received_) {
            failAsTooLarge();
            return false;
        }
        received_ += bytes.size();
        if (isRedirect({*request_.url, head_.status(), head_.headers()})) return true;
        const Result<void> written = sink_.write(base::asBytes(bytes));
        if (!written && !failure_) failure_ = written.error();
        return written.has_value();
    }

    static int onProgress(void* self, curl_off_t, curl_off_t, curl_off_t, curl_off_t uploaded) noexcept {
        auto& exchange = *static_cast<Exchange*>(self);
        if (uploaded == exchange.uploaded_) return 0;
        exchange.uploaded_ = uploaded;
        return exchange.guarded([&] {
            exchange.lastActivity_ = exchange.context_.options.now();
            return true;
        })
                   ? 0
                   : 1;
    }

    const Request& request_;
    const TransferContext& context_;
    BodySink& sink_;
    Target target_;
    ResponseHead head_;
    CURLM* const multi_;  // the slot's
    HeaderListHandle headers_;
    std::array<char, CURL_ERROR_SIZE> errorText_{};
    std::optional<Error> failure_;
    bool allocationFailed_ = false;
    CURLcode setupResult_ = CURLE_OK;
    Clock::time_point lastActivity_;
    std::size_t received_ = 0;  // of the body
    std::size_t bytesUsed_;     // of the arrived bytes, at the last complete line or piece of the body
    curl_off_t uploaded_ = 0;
    EasyHandle easy_{curl_easy_init()};  // last: it uses all of the above until it is gone
};

}  // namespace

Result<TransferAnswer> transfer(const Request& request, const TransferContext& context, BodySink& sink) {
    if (!isWellFormed(request))
        return makeError(URLErrorCode::invalidConfiguration,
                         "The request's method or a header is malformed.");
    if (!libraryIsReady())
        return makeError(URLErrorCode::invalidConfiguration, "The transfer library could not be set up.");
    Result<Target> target = targetOf(*request.url);
    if (!target) return target.error();
    return Exchange(request, context, sink, std::move(*target)).run();
}

}  // namespace pinwell::https
