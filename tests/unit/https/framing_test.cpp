// The end of a response: stated in one known way, in two ways, or in an unknown one.
#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::URLErrorCode;

class Framing : public SessionTest {
  protected:
    /// A whole response with these fields, and an orderly end.
    Outcome fetchAnswer(const std::string& fields, const std::string& body,
                        const std::string& version = "HTTP/1.1") {
        return fetchFrom(
            Script().readRequest().send(version + " 200 OK\r\n" + fields + "\r\n" + body).close());
    }
    /// The outcome is one of these failures. Releases of the transfer library differ in their own checks.
    static void expectRefused(const Outcome& outcome, const std::string& what) {
        EXPECT_FALSE(outcome.body) << what;
        ASSERT_TRUE(outcome.error) << what;
        const auto code = static_cast<URLErrorCode>(outcome.error->code());
        EXPECT_TRUE(code == URLErrorCode::badServerResponse || code == URLErrorCode::connectionLost ||
                    code == URLErrorCode::tooLarge)
            << what << ": " << outcome.error->localizedDescription();
    }
};

TEST_F(Framing, TheSameContentLengthTwiceIsOne) {
    EXPECT_EQ(fetchAnswer("Content-Length: 4\r\nContent-Length: 4\r\n", "body").text(), "body");
}

TEST_F(Framing, TheSameContentLengthTwiceInOneFieldIsOneOrRefused) {
    const Outcome outcome = fetchAnswer("Content-Length: 4, 4\r\n", "body");
    EXPECT_TRUE(outcome.error || outcome.text() == "body");
}

TEST_F(Framing, ContentLengthsThatDifferAreRefused) {
    for (const char* fields :
         {"Content-Length: 4\r\nContent-Length: 9\r\n", "Content-Length: 9\r\nContent-Length: 4\r\n",
          "Content-Length: 4, 9\r\n", "Content-Length: 4\r\nX-A: b\r\ncontent-length: 0\r\n"})
        expectRefused(fetchAnswer(fields, "body"), fields);
}

TEST_F(Framing, AContentLengthThatIsNoLengthIsRefused) {
    for (const char* value : {"-1", "-4", "+4", "4.0", "0x4", "4 4", "4;", "four", "", "1e0",
                              "18446744073709551620", "99999999999999999999999999999999", "\"4\"", "4,"})
        expectRefused(fetchAnswer("Content-Length: " + std::string(value) + "\r\n", "body"), value);
}

TEST_F(Framing, ABrokenContentLengthIsNoWayToPassOffACutBody) {
    expectRefused(
        fetchFrom(Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: -1\r\n\r\nbo").cut()),
        "cut");
}

// One reader would see a length, and another an unknown field: a cut body would seem complete.
TEST_F(Framing, ASpaceBeforeTheColonIsRefused) {
    for (const char* field :
         {"Content-Length : 9\r\n", "Content-Length\t: 9\r\n", "Transfer-Encoding : chunked\r\n"})
        expectRefused(fetchFrom(Script()
                                    .readRequest()
                                    .send("HTTP/1.1 200 OK\r\n" + std::string(field) + "\r\n2\r\nbo")
                                    .cut()),
                      field);
}

TEST_F(Framing, AFoldedFieldThatDefinesTheBodysEndIsRefused) {
    for (const char* field : {"Content-Length:\r\n 9\r\n", "Transfer-Encoding:\r\n\tchunked\r\n"})
        expectRefused(fetchFrom(Script()
                                    .readRequest()
                                    .send("HTTP/1.1 200 OK\r\n" + std::string(field) + "\r\n2\r\nbo")
                                    .cut()),
                      field);
}

TEST_F(Framing, AFoldedFieldOfAnotherNameIsUnfolded) {
    const Outcome outcome = fetchAnswer("X-A: b\r\n  c\r\nContent-Length: 4\r\n", "body");
    EXPECT_EQ(outcome.text(), "body");
    EXPECT_EQ(outcome.response->header("X-A"), "b c");
}

// RFC 9112, section 6.3: the coding takes precedence over the length.
TEST_F(Framing, ChunksGoBeforeAContentLength) {
    EXPECT_EQ(
        fetchAnswer("Content-Length: 1\r\nTransfer-Encoding: chunked\r\n", "4\r\nbody\r\n0\r\n\r\n").text(),
        "body");
    EXPECT_EQ(
        fetchAnswer("Transfer-Encoding: Chunked\r\nContent-Length: 900\r\n", "4\r\nbody\r\n0\r\n\r\n").text(),
        "body");
}

std::string gzipOfBody() {
    using namespace std::string_literals;
    return "\x1f\x8b\x08\0\0\0\0\0\0\x03\x4b\xca\x4f\xa9\x04\0\xb2\x0b\xa8\xdb\x04\0\0\0"s;
}

// A compressed transfer was not requested; unpacked, a few bytes could become very many.
TEST_F(Framing, TransferCodingsOtherThanChunkedAreRefused) {
    for (const char* coding : {"gzip, chunked", "chunked, gzip", "deflate", "identity", "br", "x-gzip",
                               "chunked, chunked", "xchunked", "chunked;q=1", ""})
        expectRefused(
            fetchAnswer("Transfer-Encoding: " + std::string(coding) + "\r\n", "4\r\nbody\r\n0\r\n\r\n"),
            coding);
}

TEST_F(Framing, ACompressedTransferIsNotUnpacked) {
    expectRefused(fetchAnswer("Transfer-Encoding: gzip\r\n", gzipOfBody()), "gzip of \"body\"");
}

TEST_F(Framing, TransferCodingsInTwoFieldsAreRefused) {
    expectRefused(
        fetchAnswer("Transfer-Encoding: gzip\r\nTransfer-Encoding: chunked\r\n", "4\r\nbody\r\n0\r\n\r\n"),
        "two fields");
}

TEST_F(Framing, AChunkSizeThatIsNoneIsRefused) {
    for (const char* size : {"-4", "+4", "0x4", "zz", "", " ", "ffffffffffffffff", "10000000000000000",
                             "fffffffffffffffffffffffffffffffff", "7fffffffffffffff"})
        expectRefused(
            fetchAnswer("Transfer-Encoding: chunked\r\n", std::string(size) + "\r\nbody\r\n0\r\n\r\n"), size);
}

TEST_F(Framing, AChunkLongerThanItsSizeIsRefused) {
    expectRefused(fetchAnswer("Transfer-Encoding: chunked\r\n", "2\r\nbody\r\n0\r\n\r\n"), "longer");
}

TEST_F(Framing, AChunkOfGreatSizeIsReadUpToTheLimitOnly) {
    options.maximumResponseBody = 1000;
    expectFailure(
        fetchFrom(Script()
                      .readRequest()
                      .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n7ffffffffffffff\r\n")
                      .sendEndlessly(std::string(256, 'x'))),
        URLErrorCode::tooLarge, "larger than the 1000 bytes allowed");
}

TEST_F(Framing, ChunkExtensionsAreSkipped) {
    EXPECT_EQ(
        fetchAnswer("Transfer-Encoding: chunked\r\n", "4;name=\"value\"\r\nbody\r\n0;last\r\n\r\n").text(),
        "body");
}

TEST_F(Framing, AnEndlessChunkExtensionIsRefused) {
    expectFailure(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n4;")
                                .sendEndlessly(std::string(16384, 'x'))),
                  URLErrorCode::badServerResponse, "much that is no part of an answer");
}

TEST_F(Framing, TrailersCannotChangeTheHead) {
    const Outcome outcome = fetchAnswer(
        "X-Ostrel-Request-UUID: REAL\r\nTransfer-Encoding: chunked\r\n",
        "4\r\nbody\r\n0\r\nX-Ostrel-Request-UUID: FORGED\r\nContent-Length: 9\r\nLocation: /\r\n\r\n");
    EXPECT_EQ(outcome.text(), "body");
    EXPECT_EQ(outcome.status(), 200);
    EXPECT_EQ(outcome.response->header("X-Ostrel-Request-UUID"), "REAL");
    EXPECT_FALSE(outcome.response->header("Location"));
}

TEST_F(Framing, BytesAfterTheResponseAreNotRead) {
    EXPECT_EQ(
        fetchAnswer("Content-Length: 4\r\n", "bodyHTTP/1.1 200 OK\r\nContent-Length: 3\r\n\r\ntwo").text(),
        "body");
    EXPECT_EQ(fetchAnswer("Transfer-Encoding: chunked\r\n", "4\r\nbody\r\n0\r\n\r\nmore").text(), "body");
}

TEST_F(Framing, AStatusLineThatIsNoneIsRefused) {
    for (const char* line :
         {"HTTP/1.1", "HTTP/1.1 ", "HTTP/1.1 abc", "HTTP/1.1 -200 OK", "HTTP/1.1 20 OK", "HTTP/1.1 2000 OK",
          "HTTP/9.9 200 OK", "HTTP/1.x 200 OK", "http 200", "HTTP/1.1 099 Low", "HTTP/1.1 000 None"})
        expectRefused(
            fetchFrom(
                Script().readRequest().send(std::string(line) + "\r\nContent-Length: 4\r\n\r\nbody").close()),
            line);
}

TEST_F(Framing, AVersionThatWasNotAgreedOnIsRefused) {
    for (const char* version : {"HTTP/2", "HTTP/2.0", "HTTP/3"}) {
        const std::string head = std::string(version) + " 200 OK\r\n";
        expectRefused(fetchFrom(Script().readRequest().send(head + "\r\nbo").cut()), version);
        expectRefused(fetchFrom(Script().readRequest().send(head + "Content-Length: 4\r\n\r\nbody").close()),
                      version);
    }
}

TEST_F(Framing, AFieldThatLooksLikeAStatusLineHidesNothing) {
    const std::string_view disguise = "HTTP/1.1 200 OK: yes\r\n";
    expectRefused(fetchAnswer("Transfer-Encoding: gzip\r\n" + std::string(disguise), gzipOfBody()), "gzip");
    expectRefused(fetchAnswer("Content-Length: 9\r\nContent-Length: 4\r\n" + std::string(disguise), "body"),
                  "lengths");
    expectRefused(fetchAnswer("X-A: b\r\n" + std::string(disguise), "body"), "by itself");
}

TEST_F(Framing, AnUnrequestedProtocolSwitchIsRefused) {
    expectRefused(fetchFrom(Script()
                                .readRequest()
                                .send("HTTP/1.1 101 Switching Protocols\r\nUpgrade: other\r\n\r\nbody")
                                .close()),
                  "101");
}

TEST_F(Framing, AHeaderWithANulByteIsRefused) {
    expectRefused(fetchAnswer(std::string("X-A: a\0b\r\n", 10) + "Content-Length: 4\r\n", "body"), "NUL");
}

}  // namespace
}  // namespace pinwell::test
