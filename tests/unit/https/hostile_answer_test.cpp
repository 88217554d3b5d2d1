// Servers that lie, break off, stall or never stop.
#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::URLErrorCode;
using ::testing::HasSubstr;

class HostileAnswer : public SessionTest {
  protected:
    // Runs until the script has reached the gate, then lets time pass.
    void expectTimeout(Script script) {
        server.enqueue(std::move(script));
        auto outcome = start(post(server.url(), "body"));
        ASSERT_TRUE(gate.waitUntilReached());
        expectFailure(outlast(std::move(outcome)), URLErrorCode::timedOut, "no answer for 60 seconds");
    }

    // For failures to which releases of the transfer library, or other timing, give different codes.
    static void expectFailureOf(const Outcome& outcome, std::initializer_list<URLErrorCode> codes) {
        ASSERT_TRUE(outcome.error);
        EXPECT_TRUE(std::any_of(codes.begin(), codes.end(), [&](URLErrorCode code) {
            return outcome.error->code() == static_cast<std::int64_t>(code);
        })) << outcome.error->localizedDescription();
        EXPECT_FALSE(outcome.body);
    }

    Gate gate;
};

TEST_F(HostileAnswer, GarbageInsteadOfTLS) {
    expectFailure(fetchFrom(Script().sendPlain("SSH-2.0-nothing\r\n").close()),
                  URLErrorCode::secureConnectionFailed,
                  "127.0.0.1 port " + std::to_string(server.port()) + ": the TLS handshake failed");
    EXPECT_THAT(delegate.events, ::testing::ElementsAre("completion"));
}

TEST_F(HostileAnswer, PlainHTTPInsteadOfTLS) {
    expectFailure(fetchFrom(Script().sendPlain(Response{.body = "plain"}.bytes()).close()),
                  URLErrorCode::secureConnectionFailed, "the TLS handshake failed");
}

TEST_F(HostileAnswer, GarbageInsteadOfHTTP) {
    expectFailure(fetchFrom(Script().readRequest().send("220 mail.example ESMTP\r\n").close()),
                  URLErrorCode::badServerResponse, "not HTTP");
}

TEST_F(HostileAnswer, HTTP1WhereHTTP2WasAgreed) {
    HostileServer liar(identity(), {.applicationProtocol = "h2"});
    liar.enqueue(Script().handshake().send(Response{.body = "one"}.bytes()).drain());
    expectFailureOf(fetch(liar.url()), {URLErrorCode::badServerResponse, URLErrorCode::connectionLost});
}

TEST_F(HostileAnswer, AProtocolThatWasNotOffered) {
    HostileServer liar(identity(), {.applicationProtocol = "smtp"});
    const Outcome outcome = fetch(liar.url());
    EXPECT_TRUE(outcome.error || outcome.status() == 404);
}

TEST_F(HostileAnswer, ResetBeforeTheHandshake) {
    // The client's progress determines where it notices the reset.
    expectFailureOf(fetchFrom(Script().reset()),
                    {URLErrorCode::cannotConnect, URLErrorCode::secureConnectionFailed});
}

TEST_F(HostileAnswer, ResetAfterTheHandshake) {
    const Outcome outcome = fetchFrom(Script().handshake().reset());
    expectFailure(outcome, URLErrorCode::connectionLost, "the connection was");
}

TEST_F(HostileAnswer, ResetWithinTheHeader) {
    expectFailure(fetchFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\nX-A: ").reset()),
                  URLErrorCode::connectionLost, "the connection was");
}

TEST_F(HostileAnswer, ResetWithinTheBody) {
    expectFailure(
        fetchFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 9\r\n\r\nhal").reset()),
        URLErrorCode::connectionLost, "the connection was");
}

TEST_F(HostileAnswer, ResetWhileALargeBodyIsSent) {
    server.enqueue(Script().readHead().reset());
    expectFailure(fetch(post(server.url(), std::string(std::size_t{8} << 20U, 'x'))),
                  URLErrorCode::connectionLost, "the connection was");
}

TEST_F(HostileAnswer, ClosedWithoutAResponse) {
    expectFailure(fetchFrom(Script().readRequest().close()), URLErrorCode::connectionLost,
                  "without an answer");
}

TEST_F(HostileAnswer, ClosedWithinABodyOfKnownLength) {
    expectFailure(
        fetchFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 9\r\n\r\nhal").close()),
        URLErrorCode::connectionLost, "within the answer");
}

TEST_F(HostileAnswer, ClosedWithinAChunk) {
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n9\r\nhal")
                                .close()),
                  URLErrorCode::connectionLost, "the connection was");
}

// A body that ends with the connection is complete only if the server said so: an attacker in between could
// cut it.
TEST_F(HostileAnswer, CutWithinABodyThatEndsWithTheConnection) {
    expectFailure(fetchFrom(Script().readRequest().send("HTTP/1.0 200 OK\r\n\r\nhalf").cut()),
                  URLErrorCode::connectionLost, "was cut within the answer");
}

TEST_F(HostileAnswer, ABrokenChunkLength) {
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\nzz\r\n")
                                .close()),
                  URLErrorCode::connectionLost, "the connection was");
}

TEST_F(HostileAnswer, ABodyOfTheGreatestSizeAllowed) {
    options.maximumResponseBody = 1000;
    EXPECT_EQ(fetchFrom(Script().respond({.body = std::string(1000, 'x')})).text().size(), 1000U);
}

TEST_F(HostileAnswer, ABodyThatAnnouncesTooMuch) {
    options.maximumResponseBody = 1000;
    expectFailure(fetchFrom(Script().respond({.body = std::string(1001, 'x')})), URLErrorCode::tooLarge,
                  "larger than the 1000 bytes allowed");
}

TEST_F(HostileAnswer, ABodyThatAnnouncesMoreThanANumberHolds) {
    for (const char* length :
         {"9223372036854775808", "18446744073709551616", "99999999999999999999999999999999"})
        expectFailure(
            fetchFrom(Script()
                          .readRequest()
                          .send("HTTP/1.1 200 OK\r\nContent-Length: " + std::string(length) + "\r\n\r\nbody")
                          .close()),
            URLErrorCode::tooLarge, "larger than the 67108864 bytes allowed");
}

TEST_F(HostileAnswer, AnEndlessBodyOneByteTooLong) {
    options.maximumResponseBody = 1000;
    const auto endedByConnection = [](std::size_t size) {
        return Script().readRequest().send("HTTP/1.0 200 OK\r\n\r\n" + std::string(size, 'x')).close();
    };
    EXPECT_EQ(fetchFrom(endedByConnection(1000)).text().size(), 1000U);
    expectFailure(fetchFrom(endedByConnection(1001)), URLErrorCode::tooLarge,
                  "larger than the 1000 bytes allowed");
}

TEST_F(HostileAnswer, AChunkedBodyOneByteTooLong) {
    options.maximumResponseBody = 16;
    const auto chunks = [](const std::string& last) {
        return Script().readRequest().send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n" + last +
                                           "0\r\n\r\n");
    };
    EXPECT_EQ(fetchFrom(chunks("8\r\n12345678\r\n8\r\n12345678\r\n")).text().size(), 16U);
    expectFailure(fetchFrom(chunks("8\r\n12345678\r\n9\r\n123456789\r\n")), URLErrorCode::tooLarge,
                  "larger than the 16 bytes allowed");
}

TEST_F(HostileAnswer, AChunkedBodyThatGrowsTooLarge) {
    options.maximumResponseBody = 1000;
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n")
                                .sendEndlessly("100\r\n" + std::string(256, 'x') + "\r\n")),
                  URLErrorCode::tooLarge, "larger than the 1000 bytes allowed");
}

TEST_F(HostileAnswer, AnEndlessBodyUnderTheProductsOwnLimit) {
    expectFailure(
        fetchFrom(
            Script().readRequest().send("HTTP/1.0 200 OK\r\n\r\n").sendEndlessly(std::string(16384, 'x'))),
        URLErrorCode::tooLarge, "larger than the 67108864 bytes allowed");
}

TEST_F(HostileAnswer, AnEndlessBodyOfARedirect) {
    options.maximumResponseBody = 1000;
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.0 302 Found\r\nLocation: /\r\n\r\n")
                                .sendEndlessly(std::string(256, 'x'))),
                  URLErrorCode::tooLarge, "larger than");
}

TEST_F(HostileAnswer, EndlessHeaders) {
    expectFailure(fetchFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\n").sendEndlessly("X-A: b\r\n")),
                  URLErrorCode::tooLarge, "header is larger than allowed");
}

TEST_F(HostileAnswer, AnEndlessHeaderLine) {
    expectFailure(
        fetchFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\nX-A: ").sendEndlessly("bbbbbbbbbbbbbbbb")),
        URLErrorCode::tooLarge, "larger than");
}

// The transfer library has its own, larger limit for a line.
TEST_F(HostileAnswer, AnEndlessHeaderLineUnderOurOwnLimit) {
    options.maximumSilentBytes = 10000;
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 200 OK\r\nX-A: ")
                                .send(std::string(10000, 'b'))
                                .waitFor(gate)),
                  URLErrorCode::badServerResponse, "much that is no part of an answer");
}

TEST_F(HostileAnswer, AnEndlessTrailerLine) {
    expectFailureOf(fetchFrom(Script()
                                  .readRequest()
                                  .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n0\r\nX-A: ")
                                  .sendEndlessly(std::string(4096, 'b'))),
                    {URLErrorCode::badServerResponse, URLErrorCode::tooLarge, URLErrorCode::connectionLost});
}

TEST_F(HostileAnswer, ALargeBodyThatComesInManyPiecesIsNoSilence) {
    options.maximumSilentBytes = 40000;
    const std::string body(std::size_t{1} << 20U, 'x');
    EXPECT_EQ(fetchFrom(Script().respond({.body = body})).text(), body);
}

TEST_F(HostileAnswer, EndlessInterimResponses) {
    expectFailure(fetchFrom(Script().readRequest().sendEndlessly("HTTP/1.1 103 Early Hints\r\n\r\n")),
                  URLErrorCode::tooLarge, "header is larger than allowed");
}

TEST_F(HostileAnswer, EndlessTrailers) {
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n")
                                .sendEndlessly("X-A: b\r\n")),
                  URLErrorCode::tooLarge, "header is larger than allowed");
}

TEST_F(HostileAnswer, StallsBeforeTheHandshake) {
    expectTimeout(Script().waitFor(gate));
}

TEST_F(HostileAnswer, StallsWithinTheHandshake) {
    expectTimeout(Script().partOfHandshake().waitFor(gate));
}

TEST_F(HostileAnswer, StallsWithinItsFirstRecord) {
    expectTimeout(Script().sendPlain("\x16\x03\x03").waitFor(gate));
}

TEST_F(HostileAnswer, StallsAfterTheHandshake) {
    expectTimeout(Script().handshake().waitFor(gate));
}

TEST_F(HostileAnswer, StallsWithinTheHeader) {
    expectTimeout(Script().readRequest().send("HTTP/1.1 200 OK\r\nX-A: b\r\n").waitFor(gate));
}

TEST_F(HostileAnswer, StallsAfterTheRequest) {
    expectTimeout(Script().readRequest().waitFor(gate));
}

TEST_F(HostileAnswer, StallsWithinAChunk) {
    expectTimeout(Script()
                      .readRequest()
                      .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n9\r\nhal")
                      .waitFor(gate));
}

TEST_F(HostileAnswer, StallsBeforeTheLastChunk) {
    expectTimeout(Script()
                      .readRequest()
                      .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n4\r\nbody\r\n")
                      .waitFor(gate));
}

TEST_F(HostileAnswer, StallsBeforeTheBody) {
    expectTimeout(Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 9\r\n\r\n").waitFor(gate));
}

TEST_F(HostileAnswer, StallsWithinTheBody) {
    expectTimeout(
        Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 9\r\n\r\nhal").waitFor(gate));
}

TEST_F(HostileAnswer, StallsAfterAnInterimResponse) {
    expectTimeout(Script().readRequest().send("HTTP/1.1 100 Continue\r\n\r\n").waitFor(gate));
}

TEST_F(HostileAnswer, IsWaitedForNearlyAMinuteAtEveryStep) {
    Gate first;
    Gate second;
    server.enqueue(Script()
                       .readRequest()
                       .waitFor(first)
                       .send("HTTP/1.1 200 OK\r\nContent-Length: 4\r\n\r\nha")
                       .waitFor(second)
                       .send("lf"));
    auto outcome = start(get(server.url()));
    ASSERT_TRUE(first.waitUntilReached());
    clock.advance(59);
    first.open();
    ASSERT_TRUE(second.waitUntilReached());
    second.open();
    EXPECT_EQ(outcome.get().text(), "half");
}

TEST_F(HostileAnswer, ControlCharactersOfTheServerStayOffTheTerminal) {
    const Outcome outcome = fetchFrom(Script().respond({.headers = {{"X-A", "\x1b[2Jx"}}}));
    ASSERT_TRUE(outcome.response);
    const std::string text = values::Description<https::HTTPResponse>::of(*outcome.response);
    EXPECT_EQ(text.find('\x1b'), std::string::npos);
    EXPECT_THAT(text, HasSubstr("\\x1b[2Jx"));
}

}  // namespace
}  // namespace pinwell::test
