// The decision about a server, and its basis.
#include <cstdlib>
#include <filesystem>

#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::Disposition;
using https::URLErrorCode;
using ::testing::ElementsAre;

class ServerTrustChallenge : public SessionTest {
  protected:
    // No byte of a request may reach a server that was not accepted.
    void expectRefused(const Outcome& outcome) {
        expectFailure(outcome, URLErrorCode::cancelled, "\"127.0.0.1\" was cancelled");
        EXPECT_TRUE(server.waitForEndedConnections(1));
        EXPECT_TRUE(server.requests().empty());
        EXPECT_THAT(delegate.events, ElementsAre("challenge 127.0.0.1", "completion"));
    }
};

TEST_F(ServerTrustChallenge, NamesTheHostOfTheURLWithoutPort) {
    fetchFrom(Script().respond({}));
    EXPECT_THAT(delegate.events, ElementsAre("challenge 127.0.0.1", "completion"));
}

TEST_F(ServerTrustChallenge, NamesAnIPv6HostWithoutBrackets) {
    std::unique_ptr<HostileServer> six;
    try {
        six = std::make_unique<HostileServer>(identity(), HostileServerOptions{.address = "::1"});
    } catch (const std::runtime_error&) {
        GTEST_SKIP() << "no IPv6 on this machine";
    }
    EXPECT_EQ(fetch(six->url()).status(), 404);
    EXPECT_THAT(delegate.events, ElementsAre("challenge ::1", "completion"));
}

TEST_F(ServerTrustChallenge, CarriesTheCertificatesThatTheServerSentLeafFirst) {
    const IssuedChain chain = ServerChain("localhost").issue();
    HostileServer other(identityOf(chain));
    fetch(other.url());
    ASSERT_EQ(trust.certificateLists.size(), 1U);
    EXPECT_EQ(trust.certificateLists[0], chain.list(false));
}

TEST_F(ServerTrustChallenge, RefusesWhenCancelled) {
    delegate.onChallenge = [](auto&, auto& completion) {
        completion(Disposition::cancelChallenge, std::nullopt);
    };
    expectRefused(fetch(server.url()));
}

TEST_F(ServerTrustChallenge, RefusesUnderDefaultHandling) {
    delegate.onChallenge = [](auto& challenge, auto& completion) {
        completion(Disposition::performDefaultHandling, https::Credential{challenge.serverTrust});
    };
    expectRefused(fetch(server.url()));
}

TEST_F(ServerTrustChallenge, RefusesWithoutACredential) {
    delegate.onChallenge = [](auto&, auto& completion) {
        completion(Disposition::useCredential, std::nullopt);
    };
    expectRefused(fetch(server.url()));
}

TEST_F(ServerTrustChallenge, RefusesACredentialForAnotherTrustObject) {
    delegate.onChallenge = [this](auto&, auto& completion) {
        completion(Disposition::useCredential, https::Credential{trust.trustOfChallenge()});
    };
    expectRefused(fetch(server.url()));
}

TEST_F(ServerTrustChallenge, RefusesIfTheDelegateDoesNotDecide) {
    delegate.onChallenge = [](auto&, auto&) {};
    expectRefused(fetch(server.url()));
}

TEST_F(ServerTrustChallenge, IgnoresALateDecision) {
    https::ChallengeCompletion kept;
    std::shared_ptr<trust::Trust> object;
    delegate.onChallenge = [&](auto& challenge, auto& completion) {
        kept = completion;
        object = challenge.serverTrust;
    };
    expectRefused(fetch(server.url()));
    kept(Disposition::useCredential, https::Credential{object});
}

TEST_F(ServerTrustChallenge, CountsOnlyTheFirstDecision) {
    delegate.onChallenge = [](auto& challenge, auto& completion) {
        completion(Disposition::cancelChallenge, std::nullopt);
        completion(Disposition::useCredential, https::Credential{challenge.serverTrust});
    };
    expectRefused(fetch(server.url()));
}

TEST_F(ServerTrustChallenge, RefusesCertificatesThatTheTrustServiceCannotRead) {
    trust.parsesCertificate = [](base::ByteView) { return false; };
    expectFailure(fetch(server.url()), URLErrorCode::secureConnectionFailed, "could not be read");
    EXPECT_THAT(delegate.events, ElementsAre("completion"));
}

TEST_F(ServerTrustChallenge, RefusesWhenNoTrustObjectCanBeMade) {
    trust.makeTrustStatus = trust::kParameterError;
    expectFailure(fetch(server.url()), URLErrorCode::secureConnectionFailed, "could not be read");
    EXPECT_THAT(delegate.events, ElementsAre("completion"));
}

TEST_F(ServerTrustChallenge, RefusesATooLongCertificateListUnseen) {
    ServerIdentity many = identity();
    const std::string chain = many.certificateChain;
    for (int i = 0; i < 16; ++i) many.certificateChain += chain;
    HostileServer other(many);
    expectFailure(fetch(other.url()), URLErrorCode::secureConnectionFailed, "refused");
    EXPECT_THAT(delegate.events, ElementsAre("completion"));
    EXPECT_TRUE(trust.parsedCertificates.empty());
}

TEST_F(ServerTrustChallenge, StartsFromAPolicyForThatHostAndThePlatformsAnchors) {
    fetchFrom(Script().respond({}));
    ASSERT_EQ(trust.policies.size(), 1U);
    EXPECT_EQ(trust.policies[0]->options.at(std::string(trust::option::kHostName)),
              values::Value("127.0.0.1"));
    EXPECT_EQ(trust.policies[0]->options.count(trust::option::kPlatformAnchor), 1U);
}

TEST_F(ServerTrustChallenge, IsMadeForEveryConnectionEvenIfTheServerOffersResumption) {
    for (const TLSVersion version : {TLSVersion::tls12, TLSVersion::tls13}) {
        HostileServer tickets(identity(), {.maximum = version});
        fetch(tickets.url());
        fetch(tickets.url());
        ASSERT_EQ(tickets.connections().size(), 2U);
        EXPECT_FALSE(tickets.connections().at(1).sessionReused);
    }
    EXPECT_EQ(std::count(delegate.events.begin(), delegate.events.end(), "challenge 127.0.0.1"), 4);
}

TEST_F(ServerTrustChallenge, IsNotSkippedOnTheSecondTaskOfASession) {
    EXPECT_EQ(fetch(server.url()).status(), 404);
    delegate.onChallenge = [](auto&, auto& completion) {
        completion(Disposition::cancelChallenge, std::nullopt);
    };
    expectFailure(fetch(server.url()), URLErrorCode::cancelled, "cancelled");
    EXPECT_EQ(server.requests().size(), 1U);
}

TEST_F(ServerTrustChallenge, AcceptsTLS12) {
    HostileServer old(identity(), {.maximum = TLSVersion::tls12});
    EXPECT_EQ(fetch(old.url()).status(), 404);
    EXPECT_EQ(old.connections().at(0).version, "TLSv1.2");
}

TEST_F(ServerTrustChallenge, IsNotMadeForAServerWithOnlyOlderTLS) {
    HostileServer old(identity(), {.minimum = TLSVersion::tls10, .maximum = TLSVersion::tls11});
    expectFailure(fetch(old.url()), URLErrorCode::secureConnectionFailed, "the TLS handshake failed");
    EXPECT_THAT(delegate.events, ElementsAre("completion"));
}

TEST_F(ServerTrustChallenge, PresentsNoClientCertificate) {
    HostileServer asking(identity(), {.requestsClientCertificate = true});
    EXPECT_EQ(fetch(asking.url()).status(), 404);
    EXPECT_FALSE(asking.connections().at(0).presentedClientCertificate);
    EXPECT_THAT(delegate.events, ElementsAre("challenge 127.0.0.1", "completion"));
}

TEST_F(ServerTrustChallenge, SendsTheHostNameInTheHandshake) {
    fetch(server.url("/", "localhost"));
    EXPECT_EQ(server.connections().at(0).serverName, "localhost");
}

// The transfer library reads SSLKEYLOGFILE once in a process, so this test is most useful alone, as under
// ctest.
TEST_F(ServerTrustChallenge, WritesNoSessionKeysInAnyEnvironment) {
    const std::string keys = directory / "keys";
    ::setenv("SSLKEYLOGFILE", keys.c_str(), 1);
    EXPECT_EQ(fetch(server.url()).status(), 404);
    ::unsetenv("SSLKEYLOGFILE");
    EXPECT_EQ(std::filesystem::exists(keys) ? readFile(keys) : "", "");
}

}  // namespace
}  // namespace pinwell::test
