// Proxies that the environment names.
#include <cstdlib>

#include "connect_proxy.h"
#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::URLErrorCode;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

class Proxy : public SessionTest {
  protected:
    // A variable is set before the session's threads exist, and gone when they are.
    class Variable {
      public:
        Variable(const char* name, const std::string& value) : name_(name) {
            ::setenv(name, value.c_str(), 1);
        }
        ~Variable() { ::unsetenv(name_); }
        Variable(const Variable&) = delete;
        Variable& operator=(const Variable&) = delete;

      private:
        const char* name_;
    };
};

TEST_F(Proxy, IsTakenFromTheEnvironment) {
    for (const char* name : {"https_proxy", "HTTPS_PROXY", "all_proxy", "ALL_PROXY"}) {
        const ConnectProxy proxy(server.port());
        const Variable variable(name, proxy.url());
        const Outcome outcome = fetch("https://lumora.example/path");
        EXPECT_EQ(outcome.status(), 404) << name;
        ASSERT_THAT(proxy.heads(), SizeIs(1)) << name;
        EXPECT_THAT(proxy.heads().at(0), StartsWith("CONNECT lumora.example:443 HTTP/1.1\r\n"));
        EXPECT_FALSE(outcome.response->header("X-Proxy"));
    }
}

TEST_F(Proxy, DoesNotChangeWhichHostIsJudged) {
    const ConnectProxy proxy(server.port());
    const Variable variable("https_proxy", proxy.url());
    fetch("https://lumora.example/");
    EXPECT_THAT(delegate.events, ::testing::ElementsAre("challenge lumora.example", "completion"));
}

TEST_F(Proxy, DoesNotGetTheHeadersOfTheRequest) {
    const ConnectProxy proxy(server.port());
    const Variable variable("https_proxy", proxy.url());
    fetch(post("https://lumora.example/", "{}"));
    EXPECT_THAT(proxy.heads().at(0), Not(HasSubstr("application/json")));
}

TEST_F(Proxy, IsPassedByForTheHostsOfNoProxy) {
    for (const char* name : {"no_proxy", "NO_PROXY"}) {
        const ConnectProxy proxy(server.port());
        const Variable variable("https_proxy", proxy.url());
        const Variable exception(name, "other.example,127.0.0.1");
        EXPECT_EQ(fetch(server.url()).status(), 404);
        EXPECT_THAT(proxy.heads(), IsEmpty()) << name;
    }
}

TEST_F(Proxy, ThatRefusesIsAProxyFailure) {
    const ConnectProxy proxy(server.port(), 407);
    const Variable variable("https_proxy", proxy.url());
    expectFailure(fetch("https://lumora.example/"), URLErrorCode::proxyFailed,
                  "the proxy refused with status 407");
    EXPECT_THAT(proxy.heads(), SizeIs(1));
}

TEST_F(Proxy, PasswordDoesNotShowInTheError) {
    const ConnectProxy proxy(server.port(), 403);
    const Variable variable("https_proxy", proxy.url("http", "user:secret"));
    const Outcome outcome = fetch("https://lumora.example/");
    expectFailure(outcome, URLErrorCode::proxyFailed, "403");
    EXPECT_THAT(values::describe(*outcome.error), Not(HasSubstr("secret")));
}

TEST_F(Proxy, ThatCannotBeFoundIsAProxyFailure) {
    const Variable variable("https_proxy", "http://no-such-proxy.invalid:3128");
    expectFailure(fetch("https://lumora.example/"), URLErrorCode::proxyFailed, "proxy");
}

TEST_F(Proxy, ThatDoesNotRespondIsGivenUp) {
    for (const char* said : {"", "HTTP/1.1 2", "HTTP/1.1 200 Connection established\r\nX-A: b\r\n",
                             "HTTP/1.1 407 Password\r\nContent-Length: 9\r\n\r\nhal"}) {
        Gate gate;
        server.enqueue(Script().readPlainHead().sendPlain(said).waitFor(gate));
        const Variable variable("https_proxy", "http://127.0.0.1:" + std::to_string(server.port()));
        auto outcome = start(get("https://lumora.example/"));
        ASSERT_TRUE(gate.waitUntilReached());
        expectFailure(outlast(std::move(outcome)), URLErrorCode::timedOut, "no answer for 60 seconds");
    }
}

TEST_F(Proxy, ReachedByHTTPSIsRefusedBeforeAnythingIsSent) {
    const Variable variable("https_proxy", "https://127.0.0.1:" + std::to_string(server.port()));
    expectFailure(fetch("https://lumora.example/"), URLErrorCode::proxyFailed,
                  "a proxy that is itself reached by https is not used");
    EXPECT_TRUE(server.waitForEndedConnections(1));
    EXPECT_FALSE(server.connections().at(0).handshakeDone);
    EXPECT_TRUE(server.requests().empty());
    EXPECT_THAT(delegate.events, ::testing::ElementsAre("completion"));
}

}  // namespace
}  // namespace pinwell::test
