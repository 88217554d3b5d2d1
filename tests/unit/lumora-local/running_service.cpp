#include "running_service.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <httplib.h>
#include <openssl/ssl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/inotify.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <filesystem>
#include <stdexcept>

#include "base/handle.h"
#include "crypto/openssl.h"
#include "lumora-local/sqlite_store.h"
#include "lumora-local/ticket_maker.h"

extern char** environ;

namespace pinwell::lumora::test {
namespace {

using base::Data;
using base::FileDescriptor;
using pinwell::test::readFile;
using pinwell::test::TemporaryDirectory;
using values::Date;

pid_t start(const std::vector<std::string>& arguments, const std::string& out, const std::string& err) {
    std::vector<std::string> words{LUMORA_LOCAL};
    words.insert(words.end(), arguments.begin(), arguments.end());
    std::vector<char*> pointers;
    for (std::string& word : words) pointers.push_back(word.data());
    pointers.push_back(nullptr);

    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    const int flags = O_WRONLY | O_CREAT | O_TRUNC;
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, out.c_str(), flags, 0600);
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, err.c_str(), flags, 0600);
    pid_t process = -1;
    const int error = posix_spawn(&process, LUMORA_LOCAL, &actions, nullptr, pointers.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    if (error != 0) throw std::runtime_error("cannot start " LUMORA_LOCAL);
    return process;
}

int exitStatusOf(int status) {
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

/// Waits until `name` exists in `directory`. The kernel reports it. If a program ends without the file, the
/// check of the process between two messages notices it.
void awaitFile(const std::string& directory, const std::string& name, pid_t process) {
    const FileDescriptor watch(::inotify_init1(IN_CLOEXEC));
    if (!watch || ::inotify_add_watch(watch.get(), directory.c_str(), IN_MOVED_TO | IN_CREATE) < 0) {
        throw std::runtime_error("cannot watch " + directory);
    }
    while (!std::filesystem::exists(directory + "/" + name)) {
        siginfo_t ended{};
        if (::waitid(P_PID, static_cast<id_t>(process), &ended, WEXITED | WNOHANG | WNOWAIT) != 0 ||
            ended.si_pid != 0) {
            throw std::runtime_error("the service ended: " + readFile(directory + "/err"));
        }
        pollfd state{watch.get(), POLLIN, 0};
        if (::poll(&state, 1, 100) > 0) {
            std::array<char, 4096> events{};
            if (::read(watch.get(), events.data(), events.size()) < 0) throw std::runtime_error("inotify");
        }
    }
}

}  // namespace

Outcome runProgram(const std::vector<std::string>& arguments) {
    const TemporaryDirectory directory;
    const pid_t process = start(arguments, directory / "out", directory / "err");
    int status = 0;
    if (::waitpid(process, &status, 0) != process) throw std::runtime_error("cannot wait");
    return {exitStatusOf(status), readFile(directory / "out"), readFile(directory / "err")};
}

RunningService::RunningService(const std::vector<std::string>& options, const std::string& settings)
    : directory_(ServiceDirectory::create(path_, {}, Date::now())) {
    if (!settings.empty()) pinwell::test::writeFile(directory_.descriptionPath(), settings);
    std::vector<std::string> arguments{"serve",       path_,          "--listen",
                                       "127.0.0.1:0", "--ready-file", temporary_ / "ready"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    process_ = start(arguments, temporary_ / "out", temporary_ / "err");
    awaitFile(temporary_.path(), "ready", process_);
    const std::string url = readFile(temporary_ / "ready");
    port_ = std::stoi(url.substr(url.rfind(':') + 1));
}

RunningService::~RunningService() {
    if (process_ < 0) return;
    ::kill(process_, SIGKILL);
    ::waitpid(process_, nullptr, 0);
}

std::string RunningService::put(const CodeHash& hash, bool asAsset, bool revoked) {
    const TicketSigner signer(directory_.signerKeyPath(), directory_.signerChainPaths());
    SignedRecord record{{recordName(hash), "made up", {hash}, revoked, asAsset, Date::now()}, {}};
    record.ticket = signer.makeTicket({record.record.hashes, revoked, record.record.signedAt});
    SqliteStore(directory_.storePath())
        .put(Environment::production, {record}, {values::Date::now(), "tester", std::nullopt, "", false});
    return record.record.name;
}

std::unique_ptr<httplib::SSLClient> RunningService::client() const {
    auto client = std::make_unique<httplib::SSLClient>("127.0.0.1", port_);
    client->set_ca_cert_path(rootPath().c_str());
    client->enable_server_certificate_verification(true);
    return client;
}

void RunningService::sendSignal(int number) const {
    ::kill(process_, number);
}

int RunningService::wait() {
    int status = 0;
    ::waitpid(process_, &status, 0);
    process_ = -1;
    return exitStatusOf(status);
}

std::string RunningService::output() const {
    return readFile(temporary_ / "out");
}
std::string RunningService::errors() const {
    return readFile(temporary_ / "err");
}

struct RawClient::Connection {
    ~Connection() {
        SSL_free(ssl);
        SSL_CTX_free(context);
    }

    FileDescriptor socket;
    SSL_CTX* context = nullptr;
    SSL* ssl = nullptr;
};

RawClient::RawClient(int port) : connection_(std::make_unique<Connection>()) {
    ::signal(SIGPIPE, SIG_IGN);  // in some tests the service hangs up on us
    connection_->socket = FileDescriptor(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (::connect(connection_->socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) !=
        0) {
        throw std::runtime_error("cannot connect");
    }
    connection_->context = SSL_CTX_new(TLS_client_method());
    connection_->ssl = SSL_new(connection_->context);
    SSL_set_fd(connection_->ssl, connection_->socket.get());
    if (SSL_connect(connection_->ssl) != 1) throw std::runtime_error("no TLS");
}

RawClient::~RawClient() = default;

bool RawClient::send(const std::string& bytes) {
    return SSL_write(connection_->ssl, bytes.data(), static_cast<int>(bytes.size())) > 0;
}

std::string RawClient::readToEnd() {
    std::string all;
    std::array<char, 4096> buffer{};
    for (;;) {
        const int count = SSL_read(connection_->ssl, buffer.data(), static_cast<int>(buffer.size()));
        if (count <= 0) return all;
        all.append(buffer.data(), static_cast<std::size_t>(count));
    }
}

std::string RawClient::readUntil(const std::string& mark, std::size_t count) {
    std::string all;
    char byte = 0;
    while (SSL_read(connection_->ssl, &byte, 1) == 1) {
        all += byte;
        if (all.ends_with(mark) && --count == 0) break;
    }
    return all;
}

std::string RawClient::serverCertificate() const {
    const crypto::CertificateHandle certificate(SSL_get1_peer_certificate(connection_->ssl));
    return base::toString(crypto::encodedBy<X509>(i2d_X509, certificate.get()));
}

void RawClient::drop() {
    connection_->socket.reset();
}

}  // namespace pinwell::lumora::test
