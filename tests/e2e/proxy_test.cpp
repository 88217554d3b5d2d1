// Proxies named by the environment: one from the distribution, and some hostile ones.
#include <arpa/inet.h>
#include <sys/socket.h>

#include <stdexcept>

#include "base/handle.h"
#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Matcher;
using testing::Not;

/// A port of the loopback address that was free a moment ago.
std::uint16_t freePort() {
    const base::FileDescriptor socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t length = sizeof address;
    void* const any = &address;
    if (::bind(socket.get(), static_cast<sockaddr*>(any), length) != 0 ||
        ::getsockname(socket.get(), static_cast<sockaddr*>(any), &length) != 0)
        throw std::runtime_error("no free port");
    return ntohs(address.sin_port);
}

/// tinyproxy in the foreground, which ends with its object. Its log is its standard output.
class RealProxy {
  public:
    RealProxy(const TemporaryDirectory& directory, const std::string& moreSettings = {}) {
        // The system cannot choose its port, and another process may take the port between our check and its
        // start.
        for (int attempt = 0; attempt < 10; ++attempt) {
            port_ = freePort();
            writeFile(directory / "proxy.conf", "Port " + std::to_string(port_) +
                                                    "\nListen 127.0.0.1\nAllow 127.0.0.1\nMaxClients 16\n"
                                                    "Timeout 600\nLogLevel Info\n" +
                                                    moreSettings);
            process_ = std::make_unique<RunningProcess>(Command{
                .executable = TINYPROXY_PROGRAM, .arguments = {"-d", "-c", directory / "proxy.conf"}});
            if (process_->waitForLineWith("Accepting connections")) return;
        }
        throw std::runtime_error("tinyproxy did not start: " + process_->resultSoFar().output +
                                 process_->resultSoFar().errors);
    }

    std::string address() const { return "127.0.0.1:" + std::to_string(port_); }
    std::string url() const { return "http://" + address(); }

    /// Waits for a line of the log.
    bool logs(const std::string& text) { return process_->waitForLineWith(text).has_value(); }

    /// All of the log; the proxy ends.
    std::string wholeLog() {
        process_->sendSignal(SIGTERM);
        return process_->wait().output;
    }

  private:
    std::uint16_t port_ = 0;
    std::unique_ptr<RunningProcess> process_;
};

class ProxyTest : public EndToEndTest {
  protected:
    std::string origin() { return "127.0.0.1:" + std::to_string(service().port()); }
    Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
};

// A real one.

TEST_F(ProxyTest, IsGoneThroughWithConnect) {
    RealProxy proxy(directory);
    serveTicket(ticket());
    environment["https_proxy"] = proxy.url();
    EXPECT_THAT(staple(), Worked());
    EXPECT_TRUE(proxy.logs("CONNECT " + origin() + " HTTP/1.1"));
    EXPECT_TRUE(service().connections().at(0).handshakeDone);
    EXPECT_THAT(proxy.wholeLog(), Not(HasSubstr("records/lookup"))) << "what is asked for is not the proxy's";
}

TEST_F(ProxyTest, IsGoneThroughForTheLargeTicketToo) {
    RealProxy proxy(directory);
    serveAsset(ticket());
    environment["https_proxy"] = proxy.url();
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().requests().size(), 2U);
    const std::string log = proxy.wholeLog();
    const std::string connect = "CONNECT " + origin() + " HTTP/1.1";
    const std::size_t first = log.find(connect);
    ASSERT_NE(first, std::string::npos);
    EXPECT_NE(log.find(connect, first + 1), std::string::npos) << log;
}

TEST_F(ProxyTest, DoesNotMakeAServerTrusted) {
    RealProxy proxy(directory);
    startService(identityOf(ServerChain("127.0.0.2").issue()));
    trust(serverChain.root);
    serveTicket(ticket());
    environment["https_proxy"] = proxy.url();
    EXPECT_EQ(staple().exitStatus, 68);
    EXPECT_TRUE(proxy.logs("CONNECT " + origin()));
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(ProxyTest, ThatRefusesTheConnectionFailsTheLookup) {
    RealProxy proxy(directory, "ConnectPort 1\n");
    serveTicket(ticket());
    environment["https_proxy"] = proxy.url();
    EXPECT_THAT(staple(), AllOf(FailedOnTheWay(kProxyFailed),
                                testing::Field(&ProcessResult::output,
                                               HasSubstr("the proxy refused with status 403"))));
    EXPECT_TRUE(proxy.logs("CONNECT " + origin()));
    EXPECT_THAT(service().connections(), IsEmpty());
}

TEST_F(ProxyTest, ThatCannotReachTheServerFailsTheLookup) {
    RealProxy proxy(directory);
    contact("127.0.0.1:" + std::to_string(freePort()));
    environment["https_proxy"] = proxy.url();
    EXPECT_THAT(staple(), FailedOnTheWay(kProxyFailed));
}

TEST_F(ProxyTest, ThatRequiresAPasswordGetsTheOneOfItsURL) {
    RealProxy proxy(directory, "BasicAuth pinwell secret\n");
    serveTicket(ticket());
    environment["https_proxy"] = proxy.url();
    EXPECT_THAT(staple(), AllOf(FailedOnTheWay(kProxyFailed),
                                testing::Field(&ProcessResult::output,
                                               HasSubstr("the proxy refused with status 407"))));
    environment["https_proxy"] = "http://pinwell:wrong@" + proxy.address();
    EXPECT_THAT(staple(), AllOf(FailedOnTheWay(kProxyFailed),
                                testing::Field(&ProcessResult::output, Not(HasSubstr("wrong")))));
    EXPECT_THAT(service().connections(), IsEmpty());
    environment["https_proxy"] = "http://pinwell:secret@" + proxy.address();
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().requests().at(0).header("Proxy-Authorization"), std::nullopt);
}

// Which one, if any.

struct ProxyChoice {
    std::string title;
    Environment variables;  // PROXY is a working one, DEAD is not
    bool isUsed;            // whether the working one is used
};

class ProxyVariables : public ProxyTest, public testing::WithParamInterface<ProxyChoice> {};

TEST_P(ProxyVariables, SayWhichProxyIsUsed) {
    RealProxy proxy(directory);
    serveTicket(ticket());
    for (auto [name, value] : GetParam().variables) {
        if (value == "PROXY") value = proxy.url();
        if (value == "PROXY without scheme") value = proxy.address();
        if (value == "DEAD") value = "http://127.0.0.1:1";
        environment[name] = value;
    }
    EXPECT_THAT(staple(), Worked());
    EXPECT_THAT(proxy.wholeLog(), GetParam().isUsed ? Matcher<std::string>(HasSubstr("CONNECT " + origin()))
                                                    : Not(HasSubstr("CONNECT")));
}

INSTANTIATE_TEST_SUITE_P(
    Environment, ProxyVariables,
    testing::Values(
        ProxyChoice{"Lower", {{"https_proxy", "PROXY"}}, true},
        ProxyChoice{"Upper", {{"HTTPS_PROXY", "PROXY"}}, true},
        ProxyChoice{"LowerForAll", {{"all_proxy", "PROXY"}}, true},
        ProxyChoice{"UpperForAll", {{"ALL_PROXY", "PROXY"}}, true},
        ProxyChoice{"WithoutScheme", {{"https_proxy", "PROXY without scheme"}}, true},
        ProxyChoice{"LowerGoesBeforeUpper", {{"https_proxy", "PROXY"}, {"HTTPS_PROXY", "DEAD"}}, true},
        ProxyChoice{"OwnGoesBeforeAll", {{"HTTPS_PROXY", "PROXY"}, {"all_proxy", "DEAD"}}, true},
        ProxyChoice{"LowerForAllGoesBeforeUpper", {{"all_proxy", "PROXY"}, {"ALL_PROXY", "DEAD"}}, true},
        ProxyChoice{"NotForHTTPOnly", {{"http_proxy", "PROXY"}, {"HTTP_PROXY", "PROXY"}}, false},
        ProxyChoice{"Empty", {{"https_proxy", ""}}, false},
        ProxyChoice{"ExceptTheHost", {{"https_proxy", "PROXY"}, {"no_proxy", "127.0.0.1"}}, false},
        ProxyChoice{"ExceptTheHostUpper", {{"https_proxy", "PROXY"}, {"NO_PROXY", "127.0.0.1"}}, false},
        ProxyChoice{"ExceptTheHostForAll", {{"all_proxy", "DEAD"}, {"no_proxy", "127.0.0.1"}}, false},
        ProxyChoice{"ExceptSeveral", {{"https_proxy", "DEAD"}, {"no_proxy", "a.example, 127.0.0.1"}}, false},
        ProxyChoice{"ExceptEverything", {{"https_proxy", "DEAD"}, {"no_proxy", "*"}}, false},
        ProxyChoice{
            "ExceptOthers", {{"https_proxy", "PROXY"}, {"no_proxy", "127.0.0.2,lumora.example"}}, true}),
    [](const auto& row) { return row.param.title; });

TEST_F(ProxyTest, ThatIsDeadFailsTheLookupWhicheverVariableNamesIt) {
    serveTicket(ticket());
    for (const char* variable : {"HTTPS_PROXY", "ALL_PROXY"}) {
        environment[variable] = "http://127.0.0.1:" + std::to_string(freePort());
        EXPECT_THAT(staple(), FailedOnTheWay(kCannotConnect)) << variable;
        environment.erase(variable);
    }
    EXPECT_THAT(service().connections(), IsEmpty());
}

// Proxies that lie.

class LyingProxy : public ProxyTest {
  protected:
    LyingProxy() : proxy(identityOf(ServerChain("127.0.0.2").issue())) {
        serveTicket(ticket());
        environment["https_proxy"] = "http://127.0.0.1:" + std::to_string(proxy.port());
    }
    void TearDown() override {
        EXPECT_THAT(service().connections(), IsEmpty());
        EXPECT_EQ(stapled(), std::nullopt);
        EXPECT_THAT(temporaryFiles(), IsEmpty());
        ProxyTest::TearDown();
    }
    ProcessResult stapleThrough(Script script) {
        proxy.enqueue(std::move(script));
        return staple();
    }
    ProcessResult stapleAfterAnswer(const std::string& bytes) {
        return stapleThrough(Script().readPlainHead().sendPlain(bytes).close());
    }

    HostileServer proxy;
};

TEST_F(LyingProxy, RespondsWithoutHTTP) {
    for (const std::string& bytes :
         {std::string("SSH-2.0-server\r\n\r\n"), std::string(4096, '\0'), std::string(4096, '\xff'),
          std::string("\x05\x00", 2), std::string("\r\n\r\n"), std::string("HTTP/1.1 abc\r\n\r\n")})
        EXPECT_THAT(stapleAfterAnswer(bytes), FailedOnTheWay(kAnyCode)) << bytes.substr(0, 20);
}

TEST_F(LyingProxy, RespondsWithAPage) {
    EXPECT_THAT(stapleAfterAnswer(Response{.status = 503, .body = "<html>Sorry</html>"}.bytes()),
                FailedOnTheWay(kProxyFailed));
}

TEST_F(LyingProxy, RespondsInsteadOfTheServer) {
    // The ticket is genuine, but it did not come from a TLS server.
    EXPECT_THAT(stapleAfterAnswer(answer(inlineRecord(ticket())).bytes()), FailedOnTheWay(kAnyCode));
    EXPECT_THAT(stapleAfterAnswer("HTTP/1.1 200 OK\r\n\r\n" + answer(inlineRecord(ticket())).bytes()),
                FailedOnTheWay(kSecureConnectionFailed));
}

TEST_F(LyingProxy, RedirectsElsewhere) {
    EXPECT_THAT(stapleAfterAnswer(
                    Response{.status = 302, .headers = {{"Location", service().url("/there")}}}.bytes()),
                FailedOnTheWay(kProxyFailed));
}

TEST_F(LyingProxy, PosesAsTheServer) {
    EXPECT_EQ(stapleThrough(Script().acceptTunnel().respond(answer(inlineRecord(ticket())))).exitStatus, 68);
    EXPECT_THAT(proxy.requests(), testing::SizeIs(1)) << "the CONNECT alone";
    EXPECT_FALSE(proxy.connections().at(0).handshakeDone);
}

TEST_F(LyingProxy, HasAHeadWithoutEnd) {
    std::string head = "HTTP/1.1 200 OK\r\n";
    while (head.size() < std::size_t{8} << 20U) head += "X-Filler: " + std::string(1000, 'a') + "\r\n";
    EXPECT_THAT(stapleAfterAnswer(head), FailedOnTheWay(kAnyCode));
    EXPECT_THAT(stapleAfterAnswer("HTTP/1.1 200 OK\r\nX-Filler: " + std::string(std::size_t{8} << 20U, 'a')),
                FailedOnTheWay(kAnyCode));
}

TEST_F(LyingProxy, BreaksOff) {
    for (const std::string bytes : {"", "HTTP/1.1 2", "HTTP/1.1 200 OK\r\nX-", "HTTP/1.1 200 OK\r\n\r\n"}) {
        EXPECT_THAT(stapleAfterAnswer(bytes), FailedOnTheWay(kAnyCode)) << bytes;
        EXPECT_THAT(stapleThrough(Script().readPlainHead().sendPlain(bytes).reset()),
                    FailedOnTheWay(kAnyCode))
            << bytes;
    }
}

TEST_F(LyingProxy, CannotDriveTheTerminal) {
    for (const std::string bytes :
         {"HTTP/1.1 403 \x1b[2JNo\r\nX-A: \x1b[2J\r\nContent-Length: 4\r\n\r\n\x1b[2J", "\x1b[2J\r\n\r\n"}) {
        proxy.enqueue(Script().readPlainHead().sendPlain(bytes).close());
        const ProcessResult result = pinwell({"staple", "-v", bundle});
        EXPECT_EQ(result.exitStatus, 68);
        EXPECT_THAT(result.output + result.errors, Not(HasSubstr("\x1b")));
    }
}

}  // namespace
}  // namespace pinwell::test
