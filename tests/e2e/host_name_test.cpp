// The names that a server's certificate may have for the requested host. A tunnel leads every host to the
// test's server, so that a test can request any name.
#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Matcher;
using testing::StartsWith;

constexpr const char* kHost = "api.lumora.example";

struct NameRow {
    std::string title;
    std::string presented;  // the subject alternative names
    std::string host = kHost;
};

class HostNameTest : public EndToEndTest {
  protected:
    HostNameTest() { trust(serverChain.root); }

    static ServerChain chainFor(const std::string& names) {
        ServerChain chain(kHost);
        chain.leaf.subjectAlternativeNames = names;
        return chain;
    }
    /// The record service is that host; a proxy connects to this server instead.
    HostileServer& serviceUnder(const std::string& host, const ServerIdentity& identity) {
        HostileServer& server = startService(identity);
        contact(host);
        environment["https_proxy"] = "http://127.0.0.1:" + std::to_string(server.port());
        return server;
    }
    Script answerWithTheTicket() const {
        return Script().acceptTunnel().respond(answer(inlineRecord(ticket())));
    }
    Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
    static Matcher<std::string> notCovered(const std::string& host) {
        return AllOf(StartsWith("Certificate trust evaluation did not return expected result. (5) "),
                     HasSubstr(host));
    }
    /// Both policies reject only the name.
    Matcher<const ProcessResult&> RefusedFor(const std::string& host,
                                             const std::string& title = "Record Service") const {
        const Matcher<std::string> fault =
            StartsWith("Certificate trust evaluation for " + title + " did not return expected result. ");
        return FailedOnTheWay(kCancelled, {notCovered(host), fault, notCovered(host), fault,
                                           "Could not establish secure connection to " + host});
    }
};

std::string titleOfName(const testing::TestParamInfo<NameRow>& row) {
    return row.param.title;
}

class GoodName : public HostNameTest, public testing::WithParamInterface<NameRow> {};

TEST_P(GoodName, IsLetIn) {
    serviceUnder(GetParam().host, identityOf(chainFor(GetParam().presented).issue()))
        .enqueue(answerWithTheTicket());
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().requests().at(0).target, GetParam().host + ":443");
}

INSTANTIATE_TEST_SUITE_P(
    Server, GoodName,
    testing::Values(NameRow{"Same", "DNS:api.lumora.example"}, NameRow{"OtherCase", "DNS:API.Lumora.EXAMPLE"},
                    NameRow{"HostInOtherCase", "DNS:api.lumora.example", "API.Lumora.Example"},
                    NameRow{"Second", "DNS:www.lumora.example,DNS:api.lumora.example"},
                    NameRow{"WildcardForTheFirstLabel", "DNS:*.lumora.example"},
                    NameRow{"BesidesAMisplacedWildcard", "DNS:api.*.example,DNS:api.lumora.example"}),
    titleOfName);

class BadName : public HostNameTest, public testing::WithParamInterface<NameRow> {};

TEST_P(BadName, IsRefusedBeforeAnyRequest) {
    serviceUnder(GetParam().host, identityOf(chainFor(GetParam().presented).issue()))
        .enqueue(answerWithTheTicket());
    EXPECT_THAT(staple(), RefusedFor(GetParam().host));
    EXPECT_EQ(service().requests().size(), 1U) << "the CONNECT alone";
    EXPECT_EQ(stapled(), std::nullopt);
}

INSTANTIATE_TEST_SUITE_P(Server, BadName,
                         testing::Values(NameRow{"OtherName", "DNS:www.lumora.example"},
                                         NameRow{"DotAtTheEnd", "DNS:api.lumora.example."},
                                         NameRow{"DotInFront", "DNS:.lumora.example"},
                                         NameRow{"WildcardAlone", "DNS:*"},
                                         NameRow{"WildcardAndADot", "DNS:*."},
                                         NameRow{"WildcardOverATopLevel", "DNS:*.example", "lumora.example"},
                                         NameRow{"WildcardOverTwoLabels", "DNS:*.example"},
                                         NameRow{"WildcardForTheParent", "DNS:*.api.lumora.example"},
                                         NameRow{"WildcardInTheSecondLabel", "DNS:api.*.example"},
                                         NameRow{"WildcardInTheLastLabel", "DNS:api.lumora.*"},
                                         NameRow{"WildcardBehindLetters", "DNS:a*.lumora.example"},
                                         NameRow{"WildcardBeforeLetters", "DNS:*i.lumora.example"},
                                         NameRow{"WildcardBetweenLetters", "DNS:a*i.lumora.example"},
                                         NameRow{"WildcardTwiceInOneLabel", "DNS:**.lumora.example"},
                                         NameRow{"WildcardInTwoLabels", "DNS:*.*.example"},
                                         NameRow{"WildcardInEveryLabel", "DNS:*.*.*"},
                                         NameRow{"WildcardAndADotAtTheEnd", "DNS:*.lumora.example."},
                                         NameRow{"AddressInstead", "IP:127.0.0.1"},
                                         NameRow{"AsAURL", "URI:https://api.lumora.example/"}),
                         titleOfName);

// A dot at the end makes a name absolute; it still names the same host.

TEST_F(HostNameTest, ADotAtTheEndIsNoHostInThePlatformFile) {
    contact("api.lumora.example.");
    EXPECT_THAT(staple(),
                Ended(68, ElementsAre(processing(),
                                      AllOf(StartsWith("error is Error Domain="), HasSubstr("HOST:PORT"),
                                            HasSubstr(directory / "platform/platform.json")),
                                      "Lumora's response is inconsistent with expections: (null)",
                                      stapleFailed(68))));
}

TEST_F(HostNameTest, ADotAtTheEndOfARedirectsHostNamesTheSameHost) {
    HostileServer& server = serviceUnder(kHost, identityOf(chainFor("DNS:api.lumora.example").issue()));
    server.enqueue(Script().acceptTunnel().respond(
        {.status = 307, .headers = {{"Location", "https://api.lumora.example./there"}}}));
    server.enqueue(answerWithTheTicket());
    EXPECT_THAT(pinwell({"staple", "-v", bundle}),
                Ended(0, AllOf(Contains("Domain is api.lumora.example"),
                               Contains("Domain is api.lumora.example."), Contains(kWorked))));
    EXPECT_EQ(server.connections().back().serverName, kHost);
}

TEST_F(HostNameTest, ADotAtTheEndOfBothNamesIsRefusedAllTheSame) {
    HostileServer& server =
        serviceUnder(kHost, identityOf(chainFor("DNS:api.lumora.example,DNS:www.lumora.example.").issue()));
    server.enqueue(Script().acceptTunnel().respond(
        {.status = 307, .headers = {{"Location", "https://www.lumora.example./"}}}));
    server.enqueue(answerWithTheTicket());
    EXPECT_THAT(staple(), RefusedFor("www.lumora.example."));
}

// The owner of the certificate.

TEST_F(HostNameTest, ATrustedCertificateAfterTheServersOwnDoesNotCount) {
    const IssuedChain genuine = chainFor("DNS:api.lumora.example").issue();
    ServerChain rogue(kHost);
    rogue.leaf.subject = commonName("Rogue");
    rogue.leaf.key = SigningKey::cached(KeyKind::p256, "rogue");
    const IssuedCertificate alone = issueCertificate(rogue.leaf, nullptr);
    // It names the genuine server as its issuer, without the server's key.
    rogue.leaf.signer = rogue.leaf.key;
    const IssuedCertificate below = issueCertificate(rogue.leaf, &genuine.leaf);
    for (const IssuedCertificate* own : {&alone, &below}) {
        serviceUnder(kHost, {own->pem() + genuine.serverPem() + genuine.root.pem(), own->key.pem()})
            .enqueue(answerWithTheTicket());
        const ProcessResult result = staple();
        EXPECT_EQ(result.exitStatus, 68);
        EXPECT_THAT(result.outputLines(),
                    AllOf(Contains(StartsWith("Certificate trust evaluation for Rogue did not")).Times(2),
                          Contains("Could not establish secure connection to api.lumora.example")));
        EXPECT_EQ(service().requests().size(), 1U);
        EXPECT_EQ(stapled(), std::nullopt);
    }
}

TEST_F(HostNameTest, ACertificateThatTheServerIssuedItselfIsNone) {
    // Genuinely signed with the key of a trusted server, which is no authority.
    const IssuedChain genuine = chainFor("DNS:www.lumora.example").issue();
    ServerChain below(kHost);
    below.leaf.subject = commonName("Below");
    below.leaf.key = SigningKey::cached(KeyKind::p256, "below");
    const IssuedCertificate leaf = issueCertificate(below.leaf, &genuine.leaf);
    serviceUnder(kHost, {leaf.pem() + genuine.serverPem(), leaf.key.pem()}).enqueue(answerWithTheTicket());
    EXPECT_THAT(
        staple().outputLines(),
        AllOf(Contains(StartsWith("Certificate trust evaluation for Record Service did not return "
                                  "expected result. the certificate is not a certificate authority's"))
                  .Times(2),
              Contains("Could not establish secure connection to api.lumora.example"),
              Contains(stapleFailed(68))));
    EXPECT_EQ(service().requests().size(), 1U);
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(HostNameTest, WithoutTheMarkerACompatibilityRootIsEnough) {
    std::filesystem::remove_all(directory / "platform/roots");
    trust(ticketChain.root);
    trust(serverChain.root, "compat-roots");
    ServerChain chain = chainFor("DNS:api.lumora.example");
    chain.leaf.markers.clear();
    serviceUnder(kHost, identityOf(chain.issue())).enqueue(answerWithTheTicket());
    const ProcessResult result = staple();
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_THAT(
        result.outputLines(),
        Contains(StartsWith("Certificate trust evaluation did not return expected result. (5) ")).Times(1));
}

}  // namespace
}  // namespace pinwell::test
