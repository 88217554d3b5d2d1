// Accepted servers, and the messages about refused ones.
#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Matcher;
using testing::Not;
using testing::StartsWith;

constexpr values::Date kLongAgo{1600000000};
constexpr values::Date kFarAhead{2500000000};

Matcher<std::string> evaluation(int verdict, const std::string& reason = {}) {
    return AllOf(StartsWith("Certificate trust evaluation did not return expected result. (" +
                            std::to_string(verdict) + ") "),
                 HasSubstr(reason));
}

Matcher<std::string> evaluationFor(const std::string& title) {
    return AllOf(
        StartsWith("Certificate trust evaluation for " + title + " did not return expected result. "),
        EndsWith("."));
}

class ServerTrust : public EndToEndTest {
  protected:
    /// A server with this chain, and a genuine ticket for every client.
    ProcessResult stapleFrom(const ChainFields& fields) { return stapleFrom(fields.issue()); }
    ProcessResult stapleFrom(const IssuedChain& issued) { return stapleFrom(identityOf(issued)); }
    ProcessResult stapleFrom(const ServerIdentity& identity) {
        startService(identity);
        serveTicket(ticket());
        return staple();
    }
    /// Both policies fail at the certificate of that title.
    Matcher<const ProcessResult&> RefusedTwice(int verdict, const std::string& title,
                                               const std::string& reason = {}) {
        return FailedOnTheWay(kCancelled,
                              {evaluation(verdict, reason), evaluationFor(title), evaluation(verdict, reason),
                               evaluationFor(title), "Could not establish secure connection to 127.0.0.1"});
    }
    Matcher<const ProcessResult&> Worked(std::vector<Matcher<std::string>> linesBetween = {}) const {
        linesBetween.insert(linesBetween.begin(), Matcher<std::string>(processing()));
        linesBetween.emplace_back(processing());
        linesBetween.emplace_back(kWorked);
        return Ended(0, ElementsAreArray(linesBetween));
    }
    void expectNoRequest() {
        EXPECT_THAT(service().requests(), IsEmpty());
        EXPECT_EQ(stapled(), std::nullopt);
    }

    ServerChain chain{"127.0.0.1"};
};

TEST_F(ServerTrust, ThePinnedPolicyAcceptsInSilence) {
    trust(serverChain.root);
    EXPECT_THAT(stapleFrom(chain), Worked());
}

TEST_F(ServerTrust, TheHostIsNamedInVerboseMode) {
    trust(serverChain.root);
    startService(identityOf(serverChain));
    serveTicket(ticket());
    EXPECT_THAT(pinwell({"staple", "-v", bundle}), Ended(0, Contains("Domain is 127.0.0.1").Times(1)));
}

TEST_F(ServerTrust, AServerWithoutTheMarkerPassesTheSecondPolicyAfterTheFirstOnesFailure) {
    trust(serverChain.root);
    chain.leaf.markers.clear();
    EXPECT_THAT(stapleFrom(chain),
                Worked({evaluation(5, kPinnedServerMarker), evaluationFor("Record Service")}));
}

TEST_F(ServerTrust, ACompatibilityRootServesTheSecondPolicyAlone) {
    trust(serverChain.root, "compat-roots");
    EXPECT_THAT(stapleFrom(chain), Worked({evaluation(5), evaluationFor("Server Intermediate")}));
}

TEST_F(ServerTrust, AnUnknownRootIsRefused) {
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Server Intermediate"));
    expectNoRequest();
}

TEST_F(ServerTrust, ASelfSignedServerIsRefused) {
    trust(serverChain.root);
    const IssuedCertificate alone = issueCertificate(chain.leaf, nullptr);
    EXPECT_THAT(stapleFrom(ServerIdentity{alone.pem(), alone.key.pem()}), RefusedTwice(5, "Record Service"));
    expectNoRequest();
}

TEST_F(ServerTrust, AChainWithoutItsIntermediateIsRefused) {
    trust(serverChain.root);
    EXPECT_THAT(stapleFrom(ServerIdentity{serverChain.leaf.pem(), serverChain.leaf.key.pem()}),
                RefusedTwice(5, "Record Service"));
}

TEST_F(ServerTrust, TheTicketsRootIsTrustedForServersToo) {
    // Both kinds of root have the same place: the policies distinguish the chains.
    const IssuedCertificate leaf = issueCertificate(chain.leaf, &ticketChain.intermediate);
    EXPECT_THAT(stapleFrom(ServerIdentity{leaf.pem() + ticketChain.intermediate.pem(), leaf.key.pem()}),
                Worked());
}

TEST_F(ServerTrust, ATicketSignerIsNoServer) {
    EXPECT_THAT(stapleFrom(ticketChain),
                FailedOnTheWay(kCancelled, {evaluation(5), evaluationFor("Ticket Signer"), evaluation(5),
                                            evaluationFor("Ticket Signer"),
                                            "Could not establish secure connection to 127.0.0.1"}));
    expectNoRequest();
}

TEST_F(ServerTrust, AnExpiredServerIsRefused) {
    trust(serverChain.root);
    chain.leaf.notAfter = kLongAgo;
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Record Service", "expired"));
    expectNoRequest();
}

TEST_F(ServerTrust, AServerOfTheFutureIsRefused) {
    trust(serverChain.root);
    chain.leaf.notBefore = kFarAhead;
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Record Service", "not valid yet"));
}

TEST_F(ServerTrust, AnExpiredIntermediateIsRefused) {
    trust(serverChain.root);
    chain.intermediate.notAfter = kLongAgo;
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Server Intermediate", "expired"));
}

TEST_F(ServerTrust, AServerOfAnotherNameIsRefused) {
    trust(serverChain.root);
    for (const char* names :
         {"IP:127.0.0.2", "DNS:localhost", "DNS:127.0.0.1", "DNS:*", "email:a@127.0.0.1", ""}) {
        chain.leaf.subjectAlternativeNames = names;
        EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Record Service", "127.0.0.1")) << names;
        expectNoRequest();
    }
}

TEST_F(ServerTrust, TheSubjectsCommonNameIsNoHostName) {
    trust(serverChain.root);
    chain.leaf.subject = {{"CN", "127.0.0.1"}};
    chain.leaf.subjectAlternativeNames.clear();
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "127.0.0.1"));
}

TEST_F(ServerTrust, ACertificateForOtherPurposesIsRefused) {
    trust(serverChain.root);
    for (const char* purposes : {"clientAuth", "anyExtendedKeyUsage", ""}) {
        chain.leaf.extendedKeyUsage = purposes;
        EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Record Service")) << purposes;
    }
}

TEST_F(ServerTrust, AnIssuerThatIsNoAuthorityIsRefused) {
    trust(serverChain.root);
    chain.intermediate.basicConstraints = BasicConstraints{false};
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Server Intermediate"));
}

TEST_F(ServerTrust, ABadSignatureIsAFatalFailure) {
    trust(serverChain.root);
    chain.leaf.corruptSignature = true;
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(6, "Record Service"));
    expectNoRequest();
}

TEST_F(ServerTrust, AnUnknownCriticalExtensionIsAFatalFailure) {
    trust(serverChain.root);
    chain.leaf.extensions = {{.oid = "1.2.3.4", .critical = true}};
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(6, "Record Service", "1.2.3.4"));
}

TEST_F(ServerTrust, ATitleCannotDriveTheTerminal) {
    trust(serverChain.root);
    chain.leaf.subject = {{"CN", "\x1b[2JGood"}};
    chain.leaf.notAfter = kLongAgo;
    const ProcessResult result = stapleFrom(chain);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(result.output, Not(HasSubstr("\x1b")));
    EXPECT_THAT(result.outputLines(), Contains(HasSubstr("[2JGood")));
}

// The user's choices.

TEST_F(ServerTrust, ARootThatTheUserAllowsServesServers) {
    trust(serverChain.root, "user-trust/allow");
    EXPECT_THAT(stapleFrom(chain), Worked());
}

TEST_F(ServerTrust, ALeafThatTheUserAllowsServesItself) {
    const IssuedCertificate alone = issueCertificate(chain.leaf, nullptr);
    trust(alone, "user-trust/allow");
    EXPECT_THAT(stapleFrom(ServerIdentity{alone.pem(), alone.key.pem()}), Worked());
}

TEST_F(ServerTrust, ACertificateThatTheUserAllowsMustStillFitThePolicy) {
    trust(serverChain.root, "user-trust/allow");
    chain.leaf.notAfter = kLongAgo;
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Record Service", "expired"));
}

TEST_F(ServerTrust, ARootThatTheUserAllowsDoesNotServeTickets) {
    std::filesystem::remove_all(directory / "platform/roots");
    trust(ticketChain.root, "user-trust/allow");
    trust(serverChain.root);
    EXPECT_THAT(
        stapleFrom(chain),
        Ended(65, ElementsAre(processing(), "Could not validate ticket for " + bundle, stapleFailed(65))));
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(ServerTrust, ACertificateThatTheUserDeniesIsRefusedWithVerdict3) {
    for (const IssuedCertificate* denied :
         {&serverChain.root, &serverChain.intermediate, &serverChain.leaf}) {
        std::filesystem::remove_all(directory / "platform/user-trust");
        trust(serverChain.root);
        trust(*denied, "user-trust/deny");
        EXPECT_THAT(stapleFrom(serverChain), RefusedTwice(3, denied->subject.back().second));
        expectNoRequest();
    }
}

TEST_F(ServerTrust, DenialGoesBeforeAllowance) {
    trust(serverChain.root, "user-trust/allow");
    trust(serverChain.root, "user-trust/deny");
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(3, "Server Root"));
}

// The anchors' files.

TEST_F(ServerTrust, WithoutAnyRootNothingIsTrusted) {
    std::filesystem::remove_all(directory / "platform/roots");
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Server Intermediate"));
    expectNoRequest();
}

TEST_F(ServerTrust, AFileThatCannotBeReadCountsForNothing) {
    trust(serverChain.root);
    writeFile(directory / "platform/roots/aaa.pem", std::string_view("-----BEGIN CERTIFICATE-----\nMIIB\n"));
    writeFile(directory / "platform/roots/zzz.pem", std::string_view());
    std::filesystem::create_directory(directory / "platform/roots/directory.pem");
    std::filesystem::create_symlink("nowhere", directory / "platform/roots/dangling.pem");
    EXPECT_THAT(stapleFrom(chain), Worked());
}

TEST_F(ServerTrust, OneFileMayHoldSeveralRoots) {
    std::filesystem::remove_all(directory / "platform/roots");
    writeFile(directory / "platform/roots/all.pem",
              "# ours\n" + ticketChain.root.pem() + "\n# theirs\n" + serverChain.root.pem());
    EXPECT_THAT(stapleFrom(chain), Worked());
}

TEST_F(ServerTrust, OnlyPemFilesAreRoots) {
    writeFile(directory / "platform/roots/server.crt", serverChain.root.pem());
    EXPECT_THAT(stapleFrom(chain), RefusedTwice(5, "Server Intermediate"));
}

// The handshake.

TEST_F(ServerTrust, AServerThatAsksForAClientCertificateGetsNone) {
    trust(serverChain.root);
    startService(identityOf(serverChain), "127.0.0.1", {.requestsClientCertificate = true});
    serveTicket(ticket());
    EXPECT_THAT(staple(), Worked());
    EXPECT_FALSE(service().connections()[0].presentedClientCertificate);
}

TEST_F(ServerTrust, VersionsBelow12AreNotSpoken) {
    trust(serverChain.root);
    constexpr int kSecureConnectionFailed = 8;
    startService(identityOf(serverChain), "127.0.0.1",
                 {.minimum = TLSVersion::tls10, .maximum = TLSVersion::tls11});
    serveTicket(ticket());
    EXPECT_THAT(staple(), FailedOnTheWay(kSecureConnectionFailed));
    expectNoRequest();
}

TEST_F(ServerTrust, Version12IsSpoken) {
    trust(serverChain.root);
    startService(identityOf(serverChain), "127.0.0.1", {.maximum = TLSVersion::tls12});
    serveTicket(ticket());
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().connections()[0].version, "TLSv1.2");
}

// Redirects.

TEST_F(ServerTrust, EveryHostOfARedirectIsJudged) {
    trust(serverChain.root);
    HostileServer stranger(identityOf(ServerChain("127.0.0.2").issue()));  // a certificate for someone else
    startService(identityOf(serverChain));
    serve({.status = 307, .headers = {{"Location", stranger.url("/elsewhere")}}});
    EXPECT_THAT(staple(), RefusedTwice(5, "Record Service", "127.0.0.1"));
    EXPECT_THAT(stranger.requests(), IsEmpty());
}

}  // namespace
}  // namespace pinwell::test
