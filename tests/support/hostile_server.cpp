#include "support/hostile_server.h"

#include <arpa/inet.h>
#include <openssl/err.h>
#include <openssl/pem.h>
#include <openssl/ssl.h>
#include <pthread.h>
#include <strings.h>
#include <sys/eventfd.h>
#include <sys/poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <condition_variable>
#include <csignal>
#include <deque>
#include <mutex>
#include <system_error>
#include <thread>

#include "base/handle.h"
#include "crypto/openssl.h"
#include "support/certificate_builder.h"
#include "support/require.h"

namespace pinwell::test {
namespace {

using base::FileDescriptor;
using crypto::BioHandle;
using crypto::CertificateHandle;
using crypto::KeyHandle;

constexpr std::size_t kMaximumHead = std::size_t{1} << 20U;
constexpr std::size_t kMaximumRequest = std::size_t{80} << 20U;
constexpr std::size_t kMaximumEndless = std::size_t{256} << 20U;
constexpr std::size_t kMaximumConnections = 256;
constexpr std::chrono::seconds kPatience{60};

using ContextHandle = base::Handle<SSL_CTX, SSL_CTX_free>;
using ConnectionHandle = base::Handle<SSL, SSL_free>;

bool equalsWithoutCase(std::string_view a, std::string_view b) {
    return a.size() == b.size() && strncasecmp(a.data(), b.data(), a.size()) == 0;
}

std::optional<std::string> findHeader(const HeaderList& headers, std::string_view name) {
    for (const auto& [key, value] : headers)
        if (equalsWithoutCase(key, name)) return value;
    return std::nullopt;
}

BioHandle bioOf(const std::string& text) {
    return BioHandle(BIO_new_mem_buf(text.data(), static_cast<int>(text.size())));
}

void useIdentity(SSL_CTX* context, const ServerIdentity& identity) {
    const BioHandle chain = bioOf(identity.certificateChain);
    const CertificateHandle leaf(PEM_read_bio_X509(chain.get(), nullptr, nullptr, nullptr));
    require(leaf != nullptr, "no certificate in the chain");
    require(SSL_CTX_use_certificate(context, leaf.get()) == 1, "the leaf certificate cannot be used");
    while (const CertificateHandle next{PEM_read_bio_X509(chain.get(), nullptr, nullptr, nullptr)})
        require(SSL_CTX_add1_chain_cert(context, next.get()) == 1, "a chain certificate cannot be used");
    ERR_clear_error();  // the end of the text is an error there
    const BioHandle keyText = bioOf(identity.privateKey);
    const KeyHandle key(PEM_read_bio_PrivateKey(keyText.get(), nullptr, nullptr, nullptr));
    require(key && SSL_CTX_use_PrivateKey(context, key.get()) == 1, "the private key cannot be used");
}

void requireClients(SSL_CTX* context, const std::string& authority) {
    const BioHandle text = bioOf(authority);
    const CertificateHandle root(PEM_read_bio_X509(text.get(), nullptr, nullptr, nullptr));
    require(root && X509_STORE_add_cert(SSL_CTX_get_cert_store(context), root.get()) == 1,
            "the clients' authority cannot be used");
    SSL_CTX_set_verify(context, SSL_VERIFY_PEER | SSL_VERIFY_FAIL_IF_NO_PEER_CERT, nullptr);
}

std::string commonNameOf(const X509* certificate) {
    std::array<char, 256> name{};
    const int length = X509_NAME_get_text_by_NID(X509_get_subject_name(certificate), NID_commonName,
                                                 name.data(), static_cast<int>(name.size()));
    return length > 0 ? name.data() : "";
}

// Notes the client's offer and chooses the protocol of the options (`argument`), offered or not.
int chooseProtocol(SSL* connection, const unsigned char** chosen, unsigned char* chosenLength,
                   const unsigned char* offered, unsigned int offeredLength, void* argument) {
    auto& record = *static_cast<RecordedConnection*>(SSL_get_app_data(connection));
    record.offeredProtocols.clear();
    for (unsigned int at = 0; at < offeredLength; at += 1U + offered[at]) {
        auto& name = record.offeredProtocols.emplace_back();
        for (unsigned int i = 1; i <= offered[at] && at + i < offeredLength; ++i)
            name += static_cast<char>(offered[at + i]);
    }
    const auto& protocol = *static_cast<const std::vector<unsigned char>*>(argument);
    if (protocol.empty()) return SSL_TLSEXT_ERR_NOACK;
    *chosen = protocol.data();
    *chosenLength = static_cast<unsigned char>(protocol.size());
    return SSL_TLSEXT_ERR_OK;
}

RecordedRequest parseHead(std::string_view head) {
    RecordedRequest request;
    const auto takeLine = [&head] {
        const std::size_t end = std::min(head.find("\r\n"), head.size());
        const std::string_view line = head.substr(0, end);
        head.remove_prefix(std::min(end + 2, head.size()));
        return line;
    };
    const std::string_view first = takeLine();
    const std::size_t space = first.find(' ');
    const std::size_t lastSpace = first.rfind(' ');
    if (space != std::string_view::npos && lastSpace > space) {
        request.method = first.substr(0, space);
        request.target = first.substr(space + 1, lastSpace - space - 1);
        request.version = first.substr(lastSpace + 1);
    }
    for (std::string_view line = takeLine(); !line.empty(); line = takeLine()) {
        const std::size_t colon = std::min(line.find(':'), line.size());
        std::string_view value = line.substr(std::min(colon + 1, line.size()));
        value.remove_prefix(std::min(value.find_first_not_of(' '), value.size()));
        request.headers.emplace_back(line.substr(0, colon), value);
    }
    return request;
}

FileDescriptor listenOn(const std::string& address, std::uint16_t& port) {
    const bool six = address.find(':') != std::string::npos;
    FileDescriptor listener(::socket(six ? AF_INET6 : AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    require(static_cast<bool>(listener), "no socket");
    sockaddr_in v4{};
    sockaddr_in6 v6{};
    v4.sin_family = AF_INET;
    v6.sin6_family = AF_INET6;
    void* const addressPart = six ? static_cast<void*>(&v6.sin6_addr) : static_cast<void*>(&v4.sin_addr);
    require(inet_pton(six ? AF_INET6 : AF_INET, address.c_str(), addressPart) == 1, "not an address");
    void* const whole = six ? static_cast<void*>(&v6) : static_cast<void*>(&v4);
    socklen_t length = six ? sizeof v6 : sizeof v4;
    require(::bind(listener.get(), static_cast<sockaddr*>(whole), length) == 0, "cannot bind");
    require(::listen(listener.get(), 64) == 0, "cannot listen");
    require(::getsockname(listener.get(), static_cast<sockaddr*>(whole), &length) == 0, "no port");
    port = ntohs(six ? v6.sin6_port : v4.sin_port);
    return listener;
}

// A peer that has gone must show as a failed write, not end the test program.
void blockBrokenPipeSignal() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
}

}  // namespace

ServerIdentity identityOf(const IssuedChain& chain) {
    return {chain.serverPem(), chain.leaf.key.pem()};
}

struct Gate::State {
    std::mutex mutex;
    std::condition_variable changed;
    bool reached = false;
    bool isOpen = false;
};

Gate::Gate() : state_(std::make_shared<State>()) {}

void Gate::open() const {
    const std::lock_guard lock(state_->mutex);
    state_->isOpen = true;
    state_->changed.notify_all();
}

bool Gate::waitUntilReached() const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, kPatience, [this] { return state_->reached; });
}

std::optional<std::string> RecordedRequest::header(std::string_view name) const {
    return findHeader(headers, name);
}

std::string Response::bytes() const {
    std::string text = version + " " + std::to_string(status) + " Status\r\n";
    for (const auto& [name, value] : headers) text += name + ": " + value + "\r\n";
    if (!findHeader(headers, "Content-Length"))
        text += "Content-Length: " + std::to_string(body.size()) + "\r\n";
    if (!findHeader(headers, "Connection")) text += "Connection: close\r\n";
    return text + "\r\n" + body;
}

struct Script::Step {
    enum class Kind {
        sendPlain,
        readPlainHead,
        handshake,
        partOfHandshake,
        readRequest,
        readHead,
        readUntil,
        send,
        drip,
        sendEndlessly,
        wait,
        drain,
        close,
        cut,
        reset
    };
    Kind kind;
    std::string bytes = {};
    std::optional<Gate> gate = std::nullopt;
};

using Kind = Script::Step::Kind;

Script& Script::add(Step step) {
    steps_.push_back(std::make_shared<const Step>(std::move(step)));
    return *this;
}

Script& Script::sendPlain(std::string bytes) {
    return add({Kind::sendPlain, std::move(bytes)});
}
Script& Script::readPlainHead() {
    return add({Kind::readPlainHead});
}
Script& Script::acceptTunnel() {
    return readPlainHead().sendPlain("HTTP/1.1 200 Connection established\r\n\r\n");
}
Script& Script::handshake() {
    return add({Kind::handshake});
}
Script& Script::partOfHandshake() {
    return add({Kind::partOfHandshake});
}
Script& Script::readRequest() {
    return add({Kind::readRequest});
}
Script& Script::readHead() {
    return add({Kind::readHead});
}
Script& Script::readUntil(std::string bytes) {
    return add({Kind::readUntil, std::move(bytes)});
}
Script& Script::send(std::string bytes) {
    return add({Kind::send, std::move(bytes)});
}
Script& Script::drip(std::string bytes) {
    return add({Kind::drip, std::move(bytes)});
}
Script& Script::sendEndlessly(std::string bytes) {
    return add({Kind::sendEndlessly, std::move(bytes)});
}
Script& Script::respond(Response response) {
    return readRequest().send(response.bytes());
}
Script& Script::waitFor(Gate gate) {
    return add({Kind::wait, {}, std::move(gate)});
}
Script& Script::drain() {
    return add({Kind::drain});
}
Script& Script::close() {
    return add({Kind::close});
}
Script& Script::cut() {
    return add({Kind::cut});
}
Script& Script::reset() {
    return add({Kind::reset});
}

struct HostileServer::Impl {
    HostileServerOptions options;
    std::vector<unsigned char> protocol;
    ContextHandle context;
    std::uint16_t port = 0;
    FileDescriptor listener;
    FileDescriptor stopEvent;

    mutable std::mutex mutex;
    mutable std::condition_variable changed;
    bool stopping = false;
    std::deque<Script> scripts;
    std::vector<RecordedRequest> requests;
    std::vector<RecordedConnection> connections;
    std::vector<int> liveSockets;
    std::vector<Gate> gatesInUse;

    std::mutex handlerMutex;
    std::function<Response(const RecordedRequest&)> handler;

    std::vector<std::thread> connectionThreads;  // of the acceptor thread, and of the destructor after it
    std::thread acceptor;

    void accept();
    void serve(FileDescriptor socket, std::size_t index, std::optional<Script> script);
};

// One connection, step by step. Every step returns whether the script continues.
class ScriptRun {
  public:
    ScriptRun(HostileServer::Impl& server, FileDescriptor socket, std::size_t index)
        : server_(server), socket_(std::move(socket)), index_(index) {}

    void run(const Script& script) {
        for (const auto& step : script.steps_)
            if (ended_ || !perform(*step)) break;
        if (!ended_) closeOrderly(true);
    }

    void runHandler() {
        RecordedRequest request;
        if (readRequest(true, &request)) {
            std::string answer;
            {
                const std::lock_guard lock(server_.handlerMutex);
                answer = (server_.handler ? server_.handler(request) : Response{.status = 404}).bytes();
            }
            sendSecurely(answer);
        }
        closeOrderly(true);
    }

  private:
    bool perform(const Script::Step& step) {
        switch (step.kind) {
            case Kind::sendPlain:
                return sendOnSocket(step.bytes);
            case Kind::readPlainHead:
                return readPlainHead();
            case Kind::handshake:
                return ensureHandshake();
            case Kind::partOfHandshake:
                return partOfHandshake();
            case Kind::readRequest:
                return readRequest(true, nullptr);
            case Kind::readHead:
                return readRequest(false, nullptr);
            case Kind::readUntil:
                return readUntil(step.bytes);
            case Kind::send:
                return sendSecurely(step.bytes);
            case Kind::drip:
                return std::all_of(step.bytes.begin(), step.bytes.end(),
                                   [this](char c) { return sendSecurely(std::string(1, c)); });
            case Kind::sendEndlessly:
                return sendEndlessly(step.bytes);
            case Kind::wait:
                return waitAt(*step.gate);
            case Kind::drain:
                return drain();
            case Kind::close:
                return closeOrderly(true), false;
            case Kind::cut:
                return closeOrderly(false), false;
            case Kind::reset:
                return reset(), false;
        }
        return false;
    }

    bool ensureHandshake() {
        if (handshakeTried_) return handshakeDone_;
        handshakeTried_ = true;
        RecordedConnection record;
        connection_.reset(SSL_new(server_.context.get()));
        SSL_set_app_data(connection_.get(), &record);
        handshakeDone_ =
            SSL_set_fd(connection_.get(), socket_.get()) == 1 && SSL_accept(connection_.get()) == 1;
        SSL_set_app_data(connection_.get(), nullptr);
        ERR_clear_error();
        record.handshakeDone = handshakeDone_;
        record.version = SSL_get_version(connection_.get());
        record.sessionReused = SSL_session_reused(connection_.get()) == 1;
        if (const char* name = SSL_get_servername(connection_.get(), TLSEXT_NAMETYPE_host_name))
            record.serverName = name;
        const CertificateHandle peer(SSL_get1_peer_certificate(connection_.get()));
        record.presentedClientCertificate = peer != nullptr;
        if (peer) record.clientName = commonNameOf(peer.get());
        const std::lock_guard lock(server_.mutex);
        server_.connections[index_] = std::move(record);
        return handshakeDone_;
    }

    // The handshake is made in memory, so that only a part of it can be sent.
    bool partOfHandshake() {
        handshakeTried_ = true;
        RecordedConnection record;
        const ConnectionHandle connection(SSL_new(server_.context.get()));
        SSL_set_app_data(connection.get(), &record);
        BIO* const in = BIO_new(BIO_s_mem());
        BIO* const out = BIO_new(BIO_s_mem());
        SSL_set_bio(connection.get(), in, out);  // which owns them from here on
        while (BIO_pending(out) == 0) {
            std::array<char, 16384> chunk{};
            const ssize_t count = ::recv(socket_.get(), chunk.data(), chunk.size(), 0);
            if (count <= 0) return false;
            BIO_write(in, chunk.data(), static_cast<int>(count));
            const int result = SSL_accept(connection.get());
            if (SSL_get_error(connection.get(), result) != SSL_ERROR_WANT_READ) return fail();
        }
        std::string flight(BIO_ctrl_pending(out), '\0');
        BIO_read(out, flight.data(), static_cast<int>(flight.size()));
        flight.pop_back();
        return sendOnSocket(flight);
    }

    // Byte by byte, because the bytes after the head belong to another step.
    bool readPlainHead() {
        std::string head;
        while (!head.ends_with("\r\n\r\n")) {
            char next = 0;
            if (head.size() > kMaximumHead || ::recv(socket_.get(), &next, 1, 0) != 1) return false;
            head += next;
        }
        head.resize(head.size() - 2);
        const std::lock_guard lock(server_.mutex);
        server_.requests.push_back(parseHead(head));
        server_.changed.notify_all();
        return true;
    }

    bool sendOnSocket(std::string_view bytes) {
        while (!bytes.empty()) {
            const ssize_t count = ::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
            if (count <= 0) return false;
            bytes.remove_prefix(static_cast<std::size_t>(count));
        }
        return true;
    }

    bool sendSecurely(std::string_view bytes) {
        if (!ensureHandshake()) return false;
        while (!bytes.empty()) {
            std::size_t written = 0;
            if (SSL_write_ex(connection_.get(), bytes.data(), bytes.size(), &written) != 1) return fail();
            bytes.remove_prefix(written);
        }
        return true;
    }

    bool sendEndlessly(const std::string& bytes) {
        for (std::size_t sent = 0; sent < kMaximumEndless; sent += bytes.size())
            if (bytes.empty() || !sendSecurely(bytes)) return false;
        return true;
    }

    // Appends the next bytes to the buffer.
    bool receive() {
        std::array<char, 16384> chunk{};
        std::size_t count = 0;
        if (!ensureHandshake()) return false;
        if (SSL_read_ex(connection_.get(), chunk.data(), chunk.size(), &count) != 1) return fail();
        received_.append(chunk.data(), count);
        return true;
    }

    bool readRequest(bool withBody, RecordedRequest* copy) {
        std::size_t end = std::string::npos;
        while ((end = received_.find("\r\n\r\n")) == std::string::npos)
            if (received_.size() > kMaximumHead || !receive()) return false;
        RecordedRequest request = parseHead(std::string_view(received_).substr(0, end + 2));
        received_.erase(0, end + 4);
        if (withBody) {
            const std::string text = request.header("Content-Length").value_or("0");
            std::size_t length = 0;
            std::from_chars(text.data(), text.data() + text.size(), length);
            if (length > kMaximumRequest) return false;
            while (received_.size() < length)
                if (!receive()) return false;
            request.body = received_.substr(0, length);
            received_.erase(0, length);
        }
        if (copy != nullptr) *copy = request;
        const std::lock_guard lock(server_.mutex);
        server_.requests.push_back(std::move(request));
        server_.changed.notify_all();
        return true;
    }

    bool readUntil(const std::string& bytes) {
        std::size_t at = std::string::npos;
        while ((at = received_.find(bytes)) == std::string::npos)
            if (received_.size() > kMaximumHead || !receive()) return false;
        received_.erase(0, at + bytes.size());
        return true;
    }

    bool waitAt(const Gate& gate) {
        {
            const std::lock_guard lock(server_.mutex);
            if (server_.stopping) return false;
            server_.gatesInUse.push_back(gate);
        }
        std::unique_lock lock(gate.state_->mutex);
        gate.state_->reached = true;
        gate.state_->changed.notify_all();
        gate.state_->changed.wait(lock, [&] { return gate.state_->isOpen; });
        return true;
    }

    bool drain() {
        if (!handshakeDone_) return drainSocket(), true;
        while (receive()) received_.clear();
        return true;
    }

    void drainSocket() {
        std::array<char, 16384> chunk{};
        while (::recv(socket_.get(), chunk.data(), chunk.size(), 0) > 0) {
        }
    }

    // A close with unread input would be a reset, so it waits for the peer's end.
    void closeOrderly(bool notify) {
        ended_ = true;
        if (notify && handshakeDone_ && !failed_) SSL_shutdown(connection_.get());
        ERR_clear_error();
        ::shutdown(socket_.get(), SHUT_WR);
        drainSocket();
    }

    void reset() {
        ended_ = true;
        const linger hard{1, 0};
        ::setsockopt(socket_.get(), SOL_SOCKET, SO_LINGER, &hard, sizeof hard);
        const std::lock_guard lock(server_.mutex);
        std::erase(server_.liveSockets, socket_.get());
        socket_.reset();
    }

    bool fail() {
        failed_ = true;
        ERR_clear_error();
        return false;
    }

  public:
    ~ScriptRun() {
        connection_.reset();
        const std::lock_guard lock(server_.mutex);
        std::erase(server_.liveSockets, socket_.get());
        socket_.reset();
        server_.connections[index_].ended = true;
        server_.changed.notify_all();
    }
    ScriptRun(const ScriptRun&) = delete;
    ScriptRun& operator=(const ScriptRun&) = delete;

  private:
    HostileServer::Impl& server_;
    FileDescriptor socket_;
    std::size_t index_;
    ConnectionHandle connection_;
    bool handshakeTried_ = false;
    bool handshakeDone_ = false;
    bool failed_ = false;  // no close_notify may follow a failed operation
    bool ended_ = false;
    std::string received_;
};

void HostileServer::Impl::serve(FileDescriptor socket, std::size_t index, std::optional<Script> script) {
    blockBrokenPipeSignal();
    const timeval patience{kPatience.count(), 0};
    ::setsockopt(socket.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    ::setsockopt(socket.get(), SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
    ScriptRun run(*this, std::move(socket), index);
    if (script)
        run.run(*script);
    else
        run.runHandler();
}

void HostileServer::Impl::accept() {
    while (true) {
        std::array<pollfd, 2> waiting{pollfd{listener.get(), POLLIN, 0}, pollfd{stopEvent.get(), POLLIN, 0}};
        if (::poll(waiting.data(), waiting.size(), -1) < 0 && errno != EINTR) return;
        const std::lock_guard lock(mutex);
        if (stopping) return;
        if ((waiting[0].revents & POLLIN) == 0) continue;
        FileDescriptor socket(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
        if (!socket || connections.size() >= kMaximumConnections) continue;
        std::optional<Script> script;
        if (!scripts.empty()) {
            script = std::move(scripts.front());
            scripts.pop_front();
        }
        const std::size_t index = connections.size();
        connections.emplace_back();
        liveSockets.push_back(socket.get());
        connectionThreads.emplace_back(
            [this, index, owned = std::move(socket), own = std::move(script)]() mutable {
                serve(std::move(owned), index, std::move(own));
            });
    }
}

HostileServer::HostileServer(const ServerIdentity& identity, HostileServerOptions options)
    : impl_(std::make_unique<Impl>()) {
    impl_->options = std::move(options);
    impl_->protocol.assign(impl_->options.applicationProtocol.begin(),
                           impl_->options.applicationProtocol.end());
    impl_->context.reset(SSL_CTX_new(TLS_server_method()));
    SSL_CTX* const context = impl_->context.get();
    require(context != nullptr, "no TLS context");
    SSL_CTX_set_security_level(context,
                               0);  // this server also offers obsolete keys and versions
    require(SSL_CTX_set_min_proto_version(context, static_cast<int>(impl_->options.minimum)) == 1 &&
                SSL_CTX_set_max_proto_version(context, static_cast<int>(impl_->options.maximum)) == 1,
            "the TLS versions cannot be set");
    useIdentity(context, identity);
    static constexpr std::array<unsigned char, 7> kSessionContext{'h', 'o', 's', 't', 'i', 'l', 'e'};
    SSL_CTX_set_session_id_context(context, kSessionContext.data(), kSessionContext.size());
    if (!impl_->options.offersSessionTickets) {
        SSL_CTX_set_options(context, SSL_OP_NO_TICKET);
        SSL_CTX_set_num_tickets(context, 0);
        SSL_CTX_set_session_cache_mode(context, SSL_SESS_CACHE_OFF);
    }
    if (impl_->options.requestsClientCertificate) {
        SSL_CTX_set_verify(context, SSL_VERIFY_PEER, nullptr);
        SSL_CTX_set_cert_verify_callback(
            context, [](X509_STORE_CTX*, void*) { return 1; }, nullptr);
    }
    if (!impl_->options.clientAuthority.empty()) requireClients(context, impl_->options.clientAuthority);
    SSL_CTX_set_alpn_select_cb(context, chooseProtocol, &impl_->protocol);

    impl_->listener = listenOn(impl_->options.address, impl_->port);
    impl_->stopEvent = FileDescriptor(::eventfd(0, EFD_CLOEXEC));
    require(static_cast<bool>(impl_->stopEvent), "no event");
    impl_->acceptor = std::thread([impl = impl_.get()] { impl->accept(); });
}

HostileServer::~HostileServer() {
    std::vector<Gate> gates;
    {
        const std::lock_guard lock(impl_->mutex);
        impl_->stopping = true;
        gates.swap(impl_->gatesInUse);
        for (const int socket : impl_->liveSockets) ::shutdown(socket, SHUT_RDWR);
        const std::uint64_t one = 1;
        if (::write(impl_->stopEvent.get(), &one, sizeof one) < 0) std::terminate();
    }
    for (const Gate& gate : gates) gate.open();
    impl_->acceptor.join();
    for (std::thread& thread : impl_->connectionThreads) thread.join();
}

std::uint16_t HostileServer::port() const noexcept {
    return impl_->port;
}

std::string HostileServer::url(std::string_view path, std::string_view host) const {
    std::string name(host.empty() ? std::string_view(impl_->options.address) : host);
    if (name.find(':') != std::string::npos) name = "[" + name + "]";
    return "https://" + name + ":" + std::to_string(port()) + std::string(path);
}

void HostileServer::enqueue(Script script) {
    const std::lock_guard lock(impl_->mutex);
    impl_->scripts.push_back(std::move(script));
}

void HostileServer::setHandler(std::function<Response(const RecordedRequest&)> handler) {
    const std::lock_guard lock(impl_->handlerMutex);
    impl_->handler = std::move(handler);
}

std::vector<RecordedRequest> HostileServer::requests() const {
    const std::lock_guard lock(impl_->mutex);
    return impl_->requests;
}

std::vector<RecordedConnection> HostileServer::connections() const {
    const std::lock_guard lock(impl_->mutex);
    return impl_->connections;
}

bool HostileServer::waitForRequests(std::size_t count) const {
    std::unique_lock lock(impl_->mutex);
    return impl_->changed.wait_for(lock, kPatience, [&] { return impl_->requests.size() >= count; });
}

bool HostileServer::waitForEndedConnections(std::size_t count) const {
    std::unique_lock lock(impl_->mutex);
    return impl_->changed.wait_for(lock, kPatience, [&] {
        return static_cast<std::size_t>(std::count_if(impl_->connections.begin(), impl_->connections.end(),
                                                      [](const auto& c) { return c.ended; })) >= count;
    });
}

}  // namespace pinwell::test
