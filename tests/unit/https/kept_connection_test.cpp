// A session that keeps its connection: exchanges that use it again, and exchanges that do not.
#include <algorithm>

#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::URLErrorCode;
using ::testing::ElementsAre;
using ::testing::SizeIs;

/// A response after which the connection stays open.
Response staying(std::string body) {
    return {.headers = {{"Connection", "keep-alive"}}, .body = std::move(body)};
}

class KeptConnection : public SessionTest {
  protected:
    KeptConnection() { options.keepsConnection = true; }

    std::size_t judgements() const {
        return static_cast<std::size_t>(
            std::count_if(delegate.events.begin(), delegate.events.end(),
                          [](const std::string& event) { return event.starts_with("challenge"); }));
    }
};

TEST_F(KeptConnection, CarriesTheNextExchange) {
    server.enqueue(Script().respond(staying("one")).respond(staying("two")).respond({.body = "three"}));
    EXPECT_EQ(fetch(server.url("/1")).text(), "one");
    EXPECT_EQ(fetch(post(server.url("/2"), "body")).text(), "two");
    EXPECT_EQ(fetch(server.url("/3")).text(), "three");
    EXPECT_THAT(server.connections(), SizeIs(1));
    EXPECT_EQ(judgements(), 1U);
    EXPECT_EQ(server.requests().at(1).body, "body");
}

TEST_F(KeptConnection, CarriesADownload) {
    server.enqueue(Script().respond(staying("one")).respond(staying("two")));
    EXPECT_EQ(fetch(server.url("/1")).text(), "one");
    EXPECT_FALSE(download(get(server.url("/2"))).error);
    EXPECT_THAT(server.connections(), SizeIs(1));
}

TEST_F(KeptConnection, IsKeptOnlyIfTheSessionAllowsIt) {
    options.keepsConnection = false;
    server.enqueue(Script().respond(staying("one")).drain());
    server.enqueue(Script().respond(staying("two")).drain());
    EXPECT_EQ(fetch(server.url()).text(), "one");
    EXPECT_EQ(fetch(server.url()).text(), "two");
    EXPECT_THAT(server.connections(), SizeIs(2));
    EXPECT_EQ(judgements(), 2U);
}

TEST_F(KeptConnection, EndsWithAServerThatClosesIt) {
    server.enqueue(Script().respond({.body = "one"}));
    server.enqueue(Script().respond({.body = "two"}));
    EXPECT_EQ(fetch(server.url()).text(), "one");
    EXPECT_EQ(fetch(server.url()).text(), "two");
    EXPECT_EQ(judgements(), 2U);
}

// The end may come before the next request, or the request may find it.
TEST_F(KeptConnection, EndsWithAServerThatClosesItWithoutSayingSoBefore) {
    for (Script& (Script::*const end)() : {&Script::close, &Script::cut, &Script::reset}) {
        const Gate isOver;
        Script first;
        (first.respond(staying("one")).waitFor(isOver).*end)();
        server.enqueue(first);
        server.enqueue(Script().respond({.body = "two"}));
        EXPECT_EQ(fetch(server.url()).text(), "one");
        isOver.open();
        EXPECT_EQ(fetch(post(server.url(), "body")).text(), "two");
    }
}

TEST_F(KeptConnection, ThatBreaksBeforeTheResponseIsReplacedByAJudgedOne) {
    server.enqueue(Script().respond(staying("one")).readRequest().cut());
    server.enqueue(Script().respond({.body = "two"}));
    EXPECT_EQ(fetch(server.url()).text(), "one");
    EXPECT_EQ(fetch(post(server.url(), "body")).text(), "two");
    EXPECT_EQ(judgements(), 2U);
    EXPECT_EQ(server.requests().at(2).body, "body");
}

TEST_F(KeptConnection, ThatBreaksWithinTheResponseIsAnError) {
    server.enqueue(Script()
                       .respond(staying("one"))
                       .readRequest()
                       .send("HTTP/1.1 200 OK\r\nContent-Length: 10\r\n\r\nhalf")
                       .cut());
    server.enqueue(Script().respond({.body = "three"}));
    EXPECT_EQ(fetch(server.url()).text(), "one");
    expectFailure(fetch(server.url()), URLErrorCode::connectionLost, "");
    EXPECT_EQ(fetch(server.url()).text(), "three");
    EXPECT_EQ(judgements(), 2U);
}

TEST_F(KeptConnection, ThatIsCutWithinAnOpenResponseIsAnError) {
    // The end of the connection is the end of this body, if it is an orderly one.
    server.enqueue(Script().respond(staying("one")).readRequest().send("HTTP/1.1 200 OK\r\n\r\nhalf").cut());
    EXPECT_EQ(fetch(server.url()).text(), "one");
    expectFailure(fetch(server.url()), URLErrorCode::connectionLost, "cut");
}

TEST_F(KeptConnection, IsOfOneHostName) {
    server.enqueue(Script().respond(staying("one")).drain());
    server.enqueue(Script().respond(staying("two")).drain());
    server.enqueue(Script().respond(staying("three")));
    EXPECT_EQ(fetch(server.url("/")).text(), "one");
    EXPECT_EQ(fetch(server.url("/", "localhost")).text(), "two");
    EXPECT_EQ(fetch(server.url("/")).text(), "three");
    EXPECT_THAT(delegate.events, ElementsAre("challenge 127.0.0.1", "completion", "challenge localhost",
                                             "completion", "challenge 127.0.0.1", "completion"));
}

TEST_F(KeptConnection, IsOfOnePort) {
    HostileServer other(identity());
    server.enqueue(Script().respond(staying("one")).drain());
    other.enqueue(Script().respond(staying("two")));
    EXPECT_EQ(fetch(server.url()).text(), "one");
    EXPECT_EQ(fetch(other.url()).text(), "two");
    EXPECT_EQ(judgements(), 2U);
}

TEST_F(KeptConnection, IsOfOneSession) {
    server.enqueue(Script().respond(staying("one")).drain());
    server.enqueue(Script().respond(staying("two")));
    EXPECT_EQ(fetch(server.url()).text(), "one");
    const auto service = https::makeSessionService(trust, options);
    RecordingDelegate otherDelegate;
    const auto other = *service->ephemeralSession(otherDelegate);
    std::promise<void> done;
    other->dataTask(get(server.url()), [&](auto&, auto&, auto&) { done.set_value(); })->resume();
    done.get_future().wait();
    EXPECT_THAT(otherDelegate.events, ElementsAre("challenge 127.0.0.1"));
}

TEST_F(KeptConnection, IsNotMadeToAServerThatIsRefused) {
    delegate.onChallenge = [](auto&, auto& completion) {
        completion(https::Disposition::cancelChallenge, std::nullopt);
    };
    expectFailure(fetch(server.url()), URLErrorCode::cancelled, "cancelled");
    expectFailure(fetch(server.url()), URLErrorCode::cancelled, "cancelled");
    EXPECT_EQ(judgements(), 2U);
    EXPECT_THAT(server.requests(), SizeIs(0));
}

TEST_F(KeptConnection, WithAnUnrequestedResponseIsDropped) {
    const std::string unasked = staying("unasked").bytes();
    const Gate sent;
    server.enqueue(Script().readRequest().send(staying("one").bytes() + unasked).drain());
    server.enqueue(Script().readRequest().send(staying("two").bytes()).send(unasked).waitFor(sent).drain());
    server.enqueue(Script().respond(staying("three")));
    EXPECT_EQ(fetch(server.url()).text(), "one");
    EXPECT_EQ(fetch(server.url()).text(), "two");
    ASSERT_TRUE(sent.waitUntilReached());
    EXPECT_EQ(fetch(server.url()).text(), "three");
    EXPECT_THAT(server.connections(), SizeIs(3));
}

TEST_F(KeptConnection, RedirectsToTheSameServerGoOverIt) {
    server.enqueue(
        Script()
            .respond({.status = 307, .headers = {{"Location", "/next"}, {"Connection", "keep-alive"}}})
            .respond(staying("arrived")));
    EXPECT_EQ(fetch(post(server.url("/first"), "body")).text(), "arrived");
    EXPECT_THAT(server.connections(), SizeIs(1));
    EXPECT_EQ(judgements(), 1U);
}

TEST_F(KeptConnection, LimitsHoldForEachExchange) {
    options.maximumHeaderFields = 20;
    options.maximumResponseBody = 100;
    Script script;
    for (int i = 0; i < 12; ++i) script.respond(staying(std::string(90, 'x')));
    server.enqueue(script);
    for (int i = 0; i < 12; ++i) EXPECT_EQ(fetch(server.url()).text(), std::string(90, 'x'));
    EXPECT_THAT(server.connections(), SizeIs(1));
}

// HTTP/2, with frames made by hand (RFC 9113).

std::string frame(unsigned char type, unsigned char flags, unsigned char stream, const std::string& payload) {
    std::string bytes;
    for (const unsigned shift : {16U, 8U, 0U}) bytes += static_cast<char>(payload.size() >> shift & 0xFFU);
    bytes += static_cast<char>(type);
    bytes += static_cast<char>(flags);
    return bytes + std::string(3, '\0') + static_cast<char>(stream) + payload;
}

std::string answerOnStream(unsigned char stream, const std::string& body) {
    return frame(1, 4, stream, "\x88") + frame(0, 1, stream, body);  // status 200; the end of the stream
}

TEST_F(KeptConnection, CarriesSeveralExchangesOfHTTP2) {
    HostileServer modern(identity(), {.applicationProtocol = "h2"});
    modern.enqueue(Script()
                       .readHead()
                       .readUntil("first")
                       .send(frame(4, 0, 0, "") + answerOnStream(1, "one"))
                       .readUntil("second")
                       .send(answerOnStream(3, "two"))
                       .readUntil("third")
                       .send(answerOnStream(5, "three"))
                       .drain());
    EXPECT_EQ(fetch(post(modern.url(), "first")).text(), "one");
    EXPECT_EQ(fetch(post(modern.url(), "second")).text(), "two");
    EXPECT_EQ(fetch(post(modern.url(), "third")).text(), "three");
    EXPECT_THAT(modern.connections(), SizeIs(1));
    EXPECT_EQ(judgements(), 1U);
}

TEST_F(KeptConnection, AfterAGoAwayIsReplaced) {
    HostileServer modern(identity(), {.applicationProtocol = "h2"});
    const std::string goAway = frame(7, 0, 0, std::string("\0\0\0\1\0\0\0\0", 8));
    for (const char* body : {"first", "second"})
        modern.enqueue(
            Script()
                .readHead()
                .readUntil(body)
                .send(frame(4, 0, 0, "") + answerOnStream(1, std::string(body) + " answer") + goAway)
                .close());
    EXPECT_EQ(fetch(post(modern.url(), "first")).text(), "first answer");
    EXPECT_EQ(fetch(post(modern.url(), "second")).text(), "second answer");
    EXPECT_EQ(judgements(), 2U);
}

}  // namespace
}  // namespace pinwell::test
