// Failures between the tool and the record service: broken connections, responses of excessive length,
// redirects.
#include "fixture.h"
#include "values/format.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

constexpr std::size_t kMebibyte = std::size_t{1} << 20U;

class Transport : public EndToEndTest {
  protected:
    ProcessResult stapleFrom(Script script) {
        service().enqueue(std::move(script));
        return staple();
    }
    testing::Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
    void TearDown() override {
        if (!stapled()) {
            EXPECT_THAT(temporaryFiles(), IsEmpty());
        }
        EndToEndTest::TearDown();
    }

    const std::string body = inlineRecord(ticket());
    const std::string head = "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) + "\r\n";
};

// Connections.

TEST_F(Transport, ThereIsNoListener) {
    std::string host;
    {
        const HostileServer gone(identityOf(serverChain));
        host = "127.0.0.1:" + std::to_string(gone.port());
    }
    contact(host);
    EXPECT_THAT(staple(), FailedOnTheWay(kCannotConnect));
}

TEST_F(Transport, TheServerClosesAtOnce) {
    EXPECT_THAT(stapleFrom(Script().reset()), FailedOnTheWay(kAnyCode));
}

TEST_F(Transport, TheServerDoesNotSpeakTLS) {
    EXPECT_THAT(stapleFrom(Script().sendPlain("HTTP/1.1 200 OK\r\n\r\n{}").close()),
                FailedOnTheWay(kSecureConnectionFailed));
    EXPECT_THAT(stapleFrom(Script().sendPlain(std::string(4096, '\xff')).close()),
                FailedOnTheWay(kSecureConnectionFailed));
}

TEST_F(Transport, CutAfterTheHandshake) {
    EXPECT_THAT(stapleFrom(Script().handshake().cut()), FailedOnTheWay(kConnectionLost));
}

TEST_F(Transport, CutAfterTheRequest) {
    EXPECT_THAT(stapleFrom(Script().readRequest().cut()), FailedOnTheWay(kConnectionLost));
    EXPECT_THAT(stapleFrom(Script().readRequest().reset()), FailedOnTheWay(kConnectionLost));
}

TEST_F(Transport, ClosedInOrderWithoutAResponse) {
    EXPECT_THAT(stapleFrom(Script().readRequest().close()), FailedOnTheWay(kConnectionLost));
}

TEST_F(Transport, CutInTheHead) {
    EXPECT_THAT(stapleFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-").cut()),
                FailedOnTheWay(kAnyCode));
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(Transport, CutInTheBody) {
    EXPECT_THAT(
        stapleFrom(Script().readRequest().send(head + "\r\n" + body.substr(0, body.size() - 1)).cut()),
        FailedOnTheWay(kConnectionLost));
    EXPECT_THAT(stapleFrom(Script().readRequest().send(head + "\r\n" + body.substr(0, 10)).close()),
                FailedOnTheWay(kConnectionLost));
}

TEST_F(Transport, ACutBodyOfUnknownLengthIsRefused) {
    // Without a length, only the orderly end of the connection distinguishes a whole body from a part.
    EXPECT_THAT(stapleFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\n\r\n" + body).cut()),
                FailedOnTheWay(kConnectionLost));
    EXPECT_THAT(stapleFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\n\r\n" + body).close()), Worked());
}

TEST_F(Transport, AResponseThatIsNotHTTP) {
    for (const std::string& bytes : {std::string("SSH-2.0-server\r\n\r\n"), "HTTP/0.9\r\n\r\n" + body, body})
        EXPECT_THAT(stapleFrom(Script().readRequest().send(bytes).close()),
                    FailedOnTheWay(kBadServerResponse))
            << bytes.substr(0, 20);
}

TEST_F(Transport, AResponseByteByByteIsAccepted) {
    EXPECT_THAT(stapleFrom(Script().readRequest().drip(head + "\r\n" + body)), Worked());
}

TEST_F(Transport, AResponseInChunksIsAccepted) {
    std::string chunks;
    for (std::size_t at = 0; at < body.size(); at += 15)
        chunks += values::format("%x\r\n", static_cast<std::uint32_t>(body.substr(at, 15).size())) +
                  body.substr(at, 15) + "\r\n";
    const std::string chunkedHead = "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n";
    EXPECT_THAT(stapleFrom(Script().readRequest().send(chunkedHead + chunks + "0\r\n\r\n")), Worked());
}

TEST_F(Transport, AResponseWithoutItsLastChunkIsRefused) {
    const std::string chunk = values::format("%zx\r\n", body.size()) + body + "\r\n";
    EXPECT_THAT(stapleFrom(Script()
                               .readRequest()
                               .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n" + chunk)
                               .close()),
                FailedOnTheWay(kConnectionLost));
}

TEST_F(Transport, AResponseWithoutACertainEndIsRefused) {
    for (const std::string fields :
         {"Content-Length: 4\r\nContent-Length: 9\r\n", "Content-Length: -1\r\n", "Content-Length: 4, 9\r\n",
          "Transfer-Encoding: gzip\r\n", "Transfer-Encoding: gzip, chunked\r\n"}) {
        EXPECT_THAT(
            stapleFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\n" + fields + "\r\n" + body).close()),
            FailedOnTheWay(kAnyCode))
            << fields;
        EXPECT_EQ(stapled(), std::nullopt);
    }
    EXPECT_EQ(service().requests().size(), 5U);
}

TEST_F(Transport, AResponseOfHTTP10IsAccepted) {
    EXPECT_THAT(stapleFrom(Script().readRequest().send("HTTP/1.0 200 OK\r\n\r\n" + body).close()), Worked());
}

TEST_F(Transport, AnInformationalResponseComesBeforeTheFinalOne) {
    EXPECT_THAT(
        stapleFrom(Script().readRequest().send("HTTP/1.1 103 Early Hints\r\nX-Ostrel-Request-UUID: EARLY\r\n"
                                               "\r\n" +
                                               answer(body).bytes())),
        Worked());
    EXPECT_THAT(temporaryFiles(), ElementsAre("REQUEST.ticket"));
}

TEST_F(Transport, AServerThatChoosesAProtocolItDoesNotSpeak) {
    trust(serverChain.root);
    startService(identityOf(serverChain), "127.0.0.1", {.applicationProtocol = "h2"});
    serveTicket(ticket());
    EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode));
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(Transport, AProxyThatCannotBeReachedFailsTheLookup) {
    serveTicket(ticket());
    for (const char* variable : {"https_proxy", "all_proxy"}) {
        environment[variable] = "http://127.0.0.1:1";
        EXPECT_THAT(staple(), FailedOnTheWay(kCannotConnect)) << variable;
        environment.erase(variable);
    }
    EXPECT_THAT(service().connections(), IsEmpty());
}

TEST_F(Transport, AHostThatTheProxyIsNotForIsReachedWithoutIt) {
    serveTicket(ticket());
    environment["https_proxy"] = "http://127.0.0.1:1";
    environment["no_proxy"] = "127.0.0.1";
    EXPECT_THAT(staple(), Worked());
}

TEST_F(Transport, ProxiesForOtherProtocolsAreNotUsed) {
    serveTicket(ticket());
    environment["http_proxy"] = "http://127.0.0.1:1";
    EXPECT_THAT(staple(), Worked());
}

// Responses.

TEST_F(Transport, ARequestForAPasswordIsAResponseLikeAnyOther) {
    Response question = answer(body);
    question.status = 401;
    question.headers.emplace_back("WWW-Authenticate", "Basic realm=\"records\"");
    serve(question);
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().requests().size(), 1U);
}

TEST_F(Transport, AnEmptyBodyIsInconsistentWhateverItsStatus) {
    for (const int status : {200, 404, 500}) {
        Response empty = answer("");
        empty.status = status;
        serve(empty);
        EXPECT_THAT(
            staple(),
            Ended(68, ElementsAre(processing(),
                                  AllOf(StartsWith("Lumora's response is inconsistent with expections: "),
                                        HasSubstr("Status Code: " + std::to_string(status))),
                                  stapleFailed(68))))
            << status;
    }
}

TEST_F(Transport, NoContentIsInconsistent) {
    EXPECT_THAT(
        stapleFrom(Script().readRequest().send("HTTP/1.1 204 No Content\r\n\r\n").close()),
        Ended(68,
              ElementsAre(processing(),
                          StartsWith("Lumora's response is inconsistent with expections: { URL: https://"),
                          stapleFailed(68))));
}

TEST_F(Transport, HeadersCannotDriveTheTerminal) {
    const ProcessResult result =
        stapleFrom(Script()
                       .readRequest()
                       .send("HTTP/1.1 200 OK\r\nX-A: a\x1b[2Jb\r\nContent-Length: 0\r\n\r\n")
                       .close());
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(result.output, testing::Not(HasSubstr("\x1b")));
}

TEST_F(Transport, AResponseThatAnnouncesTooMuchIsRefusedBeforeItsBody) {
    EXPECT_THAT(stapleFrom(Script()
                               .readRequest()
                               .send("HTTP/1.1 200 OK\r\nContent-Length: " +
                                     std::to_string(64 * kMebibyte + 1) + "\r\n\r\n")
                               .drain()),
                FailedOnTheWay(kTooLarge));
}

TEST_F(Transport, AnEndlessResponseIsRefused) {
    EXPECT_THAT(stapleFrom(Script()
                               .readRequest()
                               .send("HTTP/1.1 200 OK\r\n\r\n")
                               .sendEndlessly(std::string(kMebibyte, ' '))),
                FailedOnTheWay(kTooLarge));
}

TEST_F(Transport, AHeadWithoutEndIsRefused) {
    EXPECT_THAT(stapleFrom(Script()
                               .readRequest()
                               .send("HTTP/1.1 200 OK\r\n")
                               .sendEndlessly("X-Filler: " + std::string(1000, 'a') + "\r\n")),
                FailedOnTheWay(kTooLarge));
}

// Redirects.

TEST_F(Transport, ARedirectIsFollowedAndItsResponseCounts) {
    service().enqueue(
        Script().respond({.status = 307, .headers = {{"Location", "/elsewhere"}}, .body = "moved"}));
    service().enqueue(Script().respond(answer(body)));
    EXPECT_THAT(staple(), Worked());
    const auto requests = service().requests();
    ASSERT_EQ(requests.size(), 2U);
    EXPECT_EQ(requests[1].target, "/elsewhere");
}

TEST_F(Transport, ARedirectMayLeadToAnotherHost) {
    HostileServer other(identityOf(ServerChain("localhost").issue()));  // of the same root
    other.setHandler([this](const RecordedRequest&) { return answer(body); });
    service().enqueue(
        Script().respond({.status = 302, .headers = {{"Location", other.url("/there", "localhost")}}}));
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(other.requests().at(0).method, "GET");
}

TEST_F(Transport, MovedFoundAndSeeOtherTurnThePostIntoAGet) {
    for (const int status : {301, 302, 303}) {
        service().enqueue(Script().respond({.status = status, .headers = {{"Location", "/there"}}}));
        service().enqueue(Script().respond(answer(body)));
        EXPECT_EQ(staple().exitStatus, 0) << status;
        EXPECT_EQ(service().requests().back().method, "GET") << status;
        EXPECT_EQ(service().requests().back().body, "") << status;
    }
}

TEST_F(Transport, TemporaryAndPermanentRedirectsKeepThePost) {
    for (const int status : {307, 308}) {
        service().enqueue(Script().respond({.status = status, .headers = {{"Location", "/there"}}}));
        service().enqueue(Script().respond(answer(body)));
        EXPECT_EQ(staple().exitStatus, 0) << status;
        EXPECT_EQ(service().requests().back().method, "POST") << status;
        EXPECT_EQ(service().requests().back().body, service().requests().front().body) << status;
        EXPECT_EQ(service().requests().back().header("Content-Type"), "application/json") << status;
    }
}

TEST_F(Transport, ARedirectToAnythingButHTTPSIsRefused) {
    for (const char* target :
         {"http://127.0.0.1/", "ftp://127.0.0.1/", "file:///etc/passwd", "javascript:1"}) {
        service().enqueue(Script().respond({.status = 302, .headers = {{"Location", target}}, .body = body}));
        EXPECT_THAT(staple(), FailedOnTheWay(kUnsupportedURL)) << target;
    }
}

TEST_F(Transport, AnyOtherRedirectIsRefused) {
    for (const int status : {300, 305, 306}) {
        service().enqueue(
            Script().respond({.status = status, .headers = {{"Location", "/there"}}, .body = body}));
        EXPECT_THAT(staple(), FailedOnTheWay(kUnsupportedURL)) << status;
    }
}

TEST_F(Transport, TenRedirectsAreFollowedAndNoMore) {
    const Response onward{.status = 307, .headers = {{"Location", "/again"}}};
    for (int i = 0; i < 10; ++i) service().enqueue(Script().respond(onward));
    service().enqueue(Script().respond(answer(body)));
    EXPECT_THAT(staple(), Worked());
    serve(onward);
    EXPECT_THAT(staple(), FailedOnTheWay(kTooManyRedirects));
    EXPECT_EQ(service().requests().size(), 22U);
}

TEST_F(Transport, ARedirectWithoutATargetIsAResponse) {
    Response odd = answer(body);
    odd.status = 302;
    serve(odd);
    EXPECT_THAT(staple(), Worked());
}

}  // namespace
}  // namespace pinwell::test
