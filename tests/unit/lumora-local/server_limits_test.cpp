// The server at its limits: it runs in this process, with limits that are small enough to
// reach.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <deque>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <vector>

#include "lumora-local/lookup.h"
#include "lumora-local/server.h"
#include "lumora-local/sqlite_store.h"
#include "running_service.h"

namespace pinwell::lumora {
namespace {

using base::FileDescriptor;
using pinwell::test::TemporaryDirectory;
using test::RawClient;
using values::Date;

constexpr std::chrono::milliseconds kSoon{50};
constexpr const char* kHealth = "GET /healthz HTTP/1.1\r\nHost: localhost\r\n\r\n";

/// Records that cannot be read.
class BrokenRecords final : public RecordSource {
  public:
    std::optional<Delivery> findTicket(Environment, const std::string&) override { fail(); }
    std::optional<base::Data> findAsset(const std::string&) override { fail(); }
    std::size_t countRecords() override { fail(); }

  private:
    [[noreturn]] static void fail() { throw std::runtime_error("the disk is gone"); }
};

/// A server over one source of records, until the end of the test.
class LimitedServer {
  public:
    explicit LimitedServer(ServerLimits limits, RecordSource* source = nullptr)
        : lookups_(source != nullptr ? *source : store_, directory_.hosts(), listener_.endpoint()),
          server_(
              lookups_, tls_, [](std::string_view) {},
              [this](std::string_view line) {
                  const std::lock_guard lock(mutex_);
                  errors_ += line;
              },
              limits),
          thread_([this] { server_.run(listener_, stop_.get()); }) {}

    ~LimitedServer() { finish(); }

    void finish() {
        if (!thread_.joinable()) return;
        const std::uint64_t one = 1;
        EXPECT_EQ(::write(stop_.get(), &one, sizeof one), static_cast<ssize_t>(sizeof one));
        thread_.join();
    }

    int port() const { return listener_.endpoint().port; }

    std::string errors() {
        const std::lock_guard lock(mutex_);
        return errors_;
    }

  private:
    TemporaryDirectory temporary_;
    ServiceDirectory directory_ = ServiceDirectory::create(temporary_ / "service", {}, Date::now());
    SqliteStore store_{directory_.storePath()};
    TlsContext tls_{{directory_.serverCertificatePath(), directory_.serverKeyPath()}};
    Listener listener_{Endpoint{"127.0.0.1", 0}};
    FileDescriptor stop_{::eventfd(0, EFD_CLOEXEC)};
    std::mutex mutex_;
    std::string errors_;
    LookupService lookups_;
    Server server_;
    std::thread thread_;  // last: it uses all of the above
};

TEST(ServerLimits, EndARequestWhoseHeadTakesTooLong) {
    LimitedServer server({.requestTime = kSoon});
    RawClient client(server.port());
    ASSERT_TRUE(client.send("GET /healthz HTTP/1.1\r\nHost: local"));
    EXPECT_EQ(client.readToEnd().substr(0, 12), "HTTP/1.1 408");
}

TEST(ServerLimits, EndARequestWhoseBodyTakesTooLong) {
    LimitedServer server({.requestTime = kSoon});
    RawClient client(server.port());
    ASSERT_TRUE(client.send(
        "POST /database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup HTTP/1.1\r\n"
        "Host: localhost\r\nContent-Type: application/json\r\nContent-Length: 5\r\n\r\n{"));
    EXPECT_EQ(client.readToEnd().substr(0, 12), "HTTP/1.1 408");
}

TEST(ServerLimits, EndAConnectionThatStaysIdle) {
    LimitedServer server({.idleTime = kSoon});
    RawClient client(server.port());
    EXPECT_EQ(client.readToEnd(), "");
}

TEST(ServerLimits, EndAConnectionAfterItsShareOfRequests) {
    LimitedServer server({.requestsPerConnection = 2});
    RawClient client(server.port());
    ASSERT_TRUE(client.send(std::string(kHealth) + kHealth + kHealth));
    const std::string answers = client.readToEnd();
    const std::size_t first = answers.find("HTTP/1.1 200");
    const std::size_t second = answers.find("HTTP/1.1 200", first + 1);
    ASSERT_NE(second, std::string::npos) << answers;
    EXPECT_EQ(answers.find("HTTP/1.1 200", second + 1), std::string::npos);
    EXPECT_EQ(answers.substr(first, second - first).find("Connection: close"), std::string::npos);
    EXPECT_NE(answers.find("Connection: close", second), std::string::npos);
}

TEST(ServerLimits, LetFurtherConnectionsWaitTheirTurn) {
    LimitedServer server({.workers = 1, .connections = 1});
    std::vector<std::thread> clients;
    std::atomic<int> answered{0};
    for (int i = 0; i < 4; ++i) {
        clients.emplace_back([&] {
            RawClient client(server.port());
            client.send(kHealth);
            if (client.readUntil("}").starts_with("HTTP/1.1 200")) ++answered;
        });
    }
    for (std::thread& client : clients) client.join();
    EXPECT_EQ(answered, 4);
}

TEST(ServerLimits, DoNotDelayTheStop) {
    LimitedServer server({.idleTime = std::chrono::hours(1)});
    RawClient idle(server.port());
    server.finish();
    EXPECT_EQ(idle.readToEnd(), "");
}

/// Silent TCP connections.
class SilentPeers {
  public:
    void connect(int port) {
        const FileDescriptor& socket =
            sockets_.emplace_back(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        const auto* generic = reinterpret_cast<const sockaddr*>(&address);
        ASSERT_EQ(::connect(socket.get(), generic, sizeof address), 0);
    }

    /// Waits for the service to close the connection.
    bool isClosed(std::size_t index) {
        pollfd state{sockets_[index].get(), POLLIN, 0};
        char byte = 0;
        return ::poll(&state, 1, 10'000) == 1 && ::recv(sockets_[index].get(), &byte, 1, 0) <= 0;
    }

    bool isOpen(std::size_t index) {
        pollfd state{sockets_[index].get(), POLLIN, 0};
        return ::poll(&state, 1, 0) == 0;
    }

  private:
    std::vector<FileDescriptor> sockets_;
};

std::string healthAt(int port) {
    RawClient client(port);
    client.send(kHealth);
    return client.readUntil("}").substr(0, 12);
}

TEST(SilentConnections, DelayNoOtherConnection) {
    LimitedServer server({.handshakeTime = std::chrono::hours(1)});
    SilentPeers silent;
    for (int i = 0; i < 150; ++i) silent.connect(server.port());
    for (int i = 0; i < 20; ++i) EXPECT_EQ(healthAt(server.port()), "HTTP/1.1 200");
    EXPECT_TRUE(silent.isOpen(0));
}

TEST(SilentConnections, MakeRoomTheOldestFirst) {
    LimitedServer server({.connectionsPerAddress = 64, .handshakeTime = std::chrono::hours(1)});
    SilentPeers silent;
    for (int i = 0; i < 64; ++i) silent.connect(server.port());
    EXPECT_EQ(healthAt(server.port()), "HTTP/1.1 200");
    EXPECT_TRUE(silent.isClosed(0));
    EXPECT_TRUE(silent.isOpen(1));
}

TEST(SilentConnections, MakeRoomForOtherPeersWhenAllPlacesAreTaken) {
    LimitedServer server({.connections = 8, .handshakeTime = std::chrono::hours(1)});
    SilentPeers silent;
    for (int i = 0; i < 8; ++i) silent.connect(server.port());
    for (int i = 0; i < 3; ++i) EXPECT_EQ(healthAt(server.port()), "HTTP/1.1 200");
    EXPECT_TRUE(silent.isClosed(0));
}

TEST(SilentConnections, EndWhenTheHandshakeTakesTooLong) {
    LimitedServer server({.handshakeTime = kSoon});
    SilentPeers silent;
    silent.connect(server.port());
    EXPECT_TRUE(silent.isClosed(0));
}

TEST(SilentConnections, DoNotDelayTheStop) {
    LimitedServer server({.handshakeTime = std::chrono::hours(1)});
    SilentPeers silent;
    silent.connect(server.port());
    EXPECT_EQ(healthAt(server.port()), "HTTP/1.1 200");
    server.finish();
    EXPECT_TRUE(silent.isClosed(0));
}

/// A client whose request has arrived except its body.
class HalfSentRequest {
  public:
    explicit HalfSentRequest(int port) : client_(port) {
        client_.send(std::string("POST ") + test::kLookupPath +
                     " HTTP/1.1\r\nHost: localhost\r\nContent-Type: application/json\r\n"
                     "Content-Length: 2\r\nExpect: 100-continue\r\n\r\n");
        EXPECT_EQ(client_.readUntil("\r\n\r\n"), "HTTP/1.1 100 Continue\r\n\r\n");
    }

    RawClient& client() { return client_; }

  private:
    RawClient client_;
};

TEST(HalfSentRequests, MakeRoomTheOldestFirst) {
    LimitedServer server({.connectionsPerAddress = 64, .requestTime = std::chrono::hours(1)});
    std::deque<HalfSentRequest> halves;
    for (int i = 0; i < 64; ++i) halves.emplace_back(server.port());
    EXPECT_EQ(healthAt(server.port()), "HTTP/1.1 200");
    EXPECT_EQ(halves.front().client().readToEnd(), "");
    halves.back().client().send("{}");
    EXPECT_THAT(halves.back().client().readUntil("}"), testing::StartsWith("HTTP/1.1 "));
}

TEST(HalfSentRequests, FinishBeforeTheServiceEnds) {
    LimitedServer server({.requestTime = std::chrono::hours(1)});
    HalfSentRequest half(server.port());
    std::thread ending([&] { server.finish(); });
    half.client().send("{}");
    EXPECT_THAT(half.client().readUntil("}"), testing::StartsWith("HTTP/1.1 "));
    ending.join();
}

TEST(Server, ReportsUnreadableRecordsAndContinues) {
    BrokenRecords records;
    LimitedServer server({}, &records);
    for (int i = 0; i < 2; ++i) {
        RawClient client(server.port());
        ASSERT_TRUE(client.send("GET /healthz HTTP/1.1\r\nHost: x\r\nConnection: close\r\n\r\n"));
        const std::string answer = client.readToEnd();
        EXPECT_EQ(answer.substr(0, 12), "HTTP/1.1 503");
        EXPECT_EQ(answer.find("the disk is gone"), std::string::npos);
        EXPECT_NE(server.errors().find("the disk is gone"), std::string::npos);
    }
}

}  // namespace
}  // namespace pinwell::lumora
