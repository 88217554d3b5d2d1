// Servers that agree on HTTP/2 and then break it, frame by frame (RFC 9113; header blocks as in RFC 7541).
#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

enum FrameType : unsigned {
    kDataFrame = 0,
    kHeaders = 1,
    kResetStream = 3,
    kSettings = 4,
    kPushPromise = 5,
    kPing = 6,
    kGoAway = 7,
    kContinuation = 9
};
constexpr unsigned kEndStream = 1;
constexpr unsigned kEndHeaders = 4;
constexpr unsigned kPadded = 8;
constexpr unsigned kOurStream = 1;

std::string bigEndian(std::size_t value, unsigned width) {
    std::string bytes;
    for (unsigned i = width; i-- > 0;) bytes += static_cast<char>((value >> (8U * i)) & 0xFFU);
    return bytes;
}

/// With any length, whatever follows.
std::string frameHead(std::size_t length, unsigned type, unsigned flags, unsigned stream) {
    return bigEndian(length, 3) + bigEndian(type, 1) + bigEndian(flags, 1) + bigEndian(stream, 4);
}
std::string frame(unsigned type, unsigned flags, unsigned stream, const std::string& payload = {}) {
    return frameHead(payload.size(), type, flags, stream) + payload;
}
std::string settings(const std::string& payload = {}) {
    return frame(kSettings, 0, 0, payload);
}

const std::string kStatus200 = "\x88";  // of the static table

/// A number after an otherwise unused prefix of 7 bits.
std::string prefixed(std::size_t value) {
    if (value < 127) return std::string(1, static_cast<char>(value));
    std::string bytes = "\x7f";
    for (value -= 127; value >= 128; value /= 128) bytes += static_cast<char>(value % 128 + 128);
    return bytes + static_cast<char>(value);
}

/// A field for the dynamic table.
std::string field(const std::string& name, const std::string& value) {
    return "\x40" + prefixed(name.size()) + name + prefixed(value.size()) + value;
}

/// A response with this head; its body follows.
std::string head(const std::string& block) {
    return frame(kHeaders, kEndHeaders, kOurStream, block);
}
std::string lastData(const std::string& body) {
    return frame(kDataFrame, kEndStream, kOurStream, body);
}

class HTTP2 : public EndToEndTest {
  protected:
    HostileServer& http2Service() {
        trust(serverChain.root);
        return startService(identityOf(serverChain), "127.0.0.1", {.applicationProtocol = "h2"});
    }
    /// The connection preface looks like a head of HTTP/1, and the request ends with its body. A server must
    /// not send frames on a stream before its request.
    static Script afterTheRequest() { return Script().readHead().readUntil("}]}"); }
    void expectUntouched() const {
        EXPECT_EQ(stapled(), std::nullopt);
        EXPECT_THAT(temporaryFiles(), IsEmpty());
    }
};

TEST_F(HTTP2, IsSpoken) {
    const std::string body = inlineRecord(ticket());
    ASSERT_LT(body.size(), 16384U);
    http2Service().enqueue(afterTheRequest().send(
        settings() + head(kStatus200 + field("x-ostrel-request-uuid", "TWO")) + lastData(body)));
    EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
    EXPECT_EQ(service().requests().at(0).method, "PRI");
    EXPECT_THAT(temporaryFiles(), ElementsAre("TWO.ticket"));
}

struct Broken {
    std::string title;
    std::string frames;
};

class BrokenHTTP2 : public HTTP2, public testing::WithParamInterface<Broken> {};

TEST_P(BrokenHTTP2, IsNoResponse) {
    http2Service().enqueue(afterTheRequest().send(GetParam().frames).close());
    EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode));
    expectUntouched();
}

INSTANTIATE_TEST_SUITE_P(
    Server, BrokenHTTP2,
    testing::Values(
        Broken{"Nothing", ""}, Broken{"SettingsAlone", settings()},
        Broken{"SettingsOfFiveBytes", settings("\1\1\1\1\1")},
        Broken{"SettingsOnAStream", frame(kSettings, 0, kOurStream)}, Broken{"NoSettings", lastData("{}")},
        Broken{"AFrameCutShort", settings() + frameHead(100, kHeaders, kEndHeaders, kOurStream) + kStatus200},
        Broken{"AFrameLargerThanAgreed", settings() + frameHead(0xFFFFFF, kDataFrame, 0, kOurStream)},
        Broken{"GoAway", settings() + frame(kGoAway, 0, 0, bigEndian(0, 4) + bigEndian(2, 4))},
        Broken{"StreamReset", settings() + frame(kResetStream, 0, kOurStream, bigEndian(2, 4))},
        Broken{"StreamResetWithinTheBody", settings() + head(kStatus200) +
                                               frame(kDataFrame, 0, kOurStream, "{\"r") +
                                               frame(kResetStream, 0, kOurStream, bigEndian(2, 4))},
        Broken{"StreamResetWithoutAnErrorBeforeTheLength",
               settings() + head(kStatus200 + field("content-length", "10")) +
                   frame(kDataFrame, 0, kOurStream, "{}") +
                   frame(kResetStream, 0, kOurStream, bigEndian(0, 4))},
        Broken{"CutWithinTheBody",
               settings() + head(kStatus200) + frame(kDataFrame, 0, kOurStream, "{\"records\":[]}")},
        Broken{"BodyBeforeTheHead", settings() + lastData("{}")},
        Broken{"AnotherStream", settings() + frame(kHeaders, kEndHeaders, 3, kStatus200)},
        Broken{"APromise",
               settings() + frame(kPushPromise, kEndHeaders, kOurStream, bigEndian(2, 4) + "\x82")},
        Broken{"ABlockThatIsNone", settings() + head("\xff\xff\xff\xff\xff\xff")},
        Broken{"AnEntryOfNoTable", settings() + head("\xfe")},
        Broken{"NoStatus", settings() + head(field("x-a", "b")) + lastData("{}")},
        Broken{"TwoStatuses", settings() + head(kStatus200 + kStatus200) + lastData("{}")},
        Broken{"AStatusThatIsNoNumber", settings() + head(field(":status", "two")) + lastData("{}")},
        Broken{"LessThanAnnounced",
               settings() + head(kStatus200 + field("content-length", "10")) + lastData("{}")},
        Broken{"MoreThanAnnounced",
               settings() + head(kStatus200 + field("content-length", "1")) + lastData("{}")},
        Broken{"ABlockThatIsInterrupted",
               settings() + frame(kHeaders, 0, kOurStream, kStatus200) + lastData("{}")},
        Broken{"HTTP1", "HTTP/1.1 200 OK\r\nContent-Length: 2\r\n\r\n{}"}),
    [](const auto& row) { return row.param.title; });

TEST_F(HTTP2, ABlockThatGrowsWhenUnpackedIsRefused) {
    // One field of 3000 bytes, and then its place in the dynamic table again and again.
    http2Service().enqueue(afterTheRequest()
                               .send(settings() + head(kStatus200 + field("x-a", std::string(3000, 'a')) +
                                                       std::string(10000, '\xbe')))
                               .drain());
    EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode));
    expectUntouched();
}

TEST_F(HTTP2, PaddingBeyondItsFrameIsRefused) {
    // The transfer library gives up the connection and passes on the earlier bytes.
    for (const std::string& before : {std::string(), frame(kDataFrame, 0, kOurStream, "{\"records\":")}) {
        http2Service().enqueue(
            afterTheRequest().send(settings() + head(kStatus200) + before +
                                   frame(kDataFrame, kPadded | kEndStream, kOurStream, "\xff[]}")));
        EXPECT_THAT(staple().exitStatus, testing::Optional(testing::AnyOf(65, 68)));
        expectUntouched();
    }
}

// Only the server itself can end a stream this way. Some releases of the transfer library treat it as the end
// of the body. Without a length, the received bytes are judged.
TEST_F(HTTP2, AResetWithoutAnErrorWithinTheBodyGivesNoTicket) {
    http2Service().enqueue(afterTheRequest()
                               .send(settings() + head(kStatus200) +
                                     frame(kDataFrame, 0, kOurStream, "{\"records\":") +
                                     frame(kResetStream, 0, kOurStream, bigEndian(0, 4)))
                               .close());
    EXPECT_THAT(staple().exitStatus, testing::Optional(testing::AnyOf(65, 68)));
    expectUntouched();
}

TEST_F(HTTP2, ABodyWithoutEndIsRefused) {
    const std::string data = frame(kDataFrame, 0, kOurStream, std::string(16384, ' '));
    // The client gives out room for more as it reads; this server does not wait for it.
    http2Service().enqueue(afterTheRequest().send(settings() + head(kStatus200)).sendEndlessly(data));
    EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode));
    expectUntouched();
}

TEST_F(HTTP2, EndlessFramesAreRefused) {
    const std::string open = settings() + frame(kHeaders, 0, kOurStream, kStatus200);
    for (const auto& [first, again] :
         {std::pair(open, frame(kContinuation, 0, kOurStream, "\x04\x01z\x01z")),
          std::pair(settings(), settings()), std::pair(settings(), frame(kPing, 0, 0, "12345678")),
          std::pair(settings(), frame(0x42, 0, kOurStream, "unknown"))}) {
        std::string many;
        while (many.size() < std::size_t{4} << 20U) many += again;
        http2Service().enqueue(afterTheRequest().send(first).send(many).close());
        EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode));
        expectUntouched();
    }
}

TEST_F(HTTP2, IsNotSpokenWithoutAnAgreement) {
    for (const std::string& bytes : {settings(), std::string("PRI * HTTP/2.0\r\n\r\nSM\r\n\r\n") + settings(),
                                     settings() + head(kStatus200) + lastData(inlineRecord(ticket()))}) {
        service().enqueue(Script().readRequest().send(bytes).close());
        EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode));
    }
    expectUntouched();
}

TEST_F(HTTP2, AVersionThatWasNotAgreedOnIsNoWayToPassOffACutBody) {
    // In HTTP/2 the length of a body is certain; in a response that only claims HTTP/2, it is not.
    for (const std::string version : {"HTTP/2", "HTTP/2.0", "HTTP/3", "HTTP/0.9", "HTTP/1.2"}) {
        service().enqueue(
            Script().readRequest().send(version + " 200 OK\r\n\r\n" + inlineRecord(ticket())).cut());
        EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode)) << version;
        expectUntouched();
    }
}

TEST_F(HTTP2, AProtocolWithoutAnOfferIsNotUsed) {
    trust(serverChain.root);
    for (const char* protocol : {"h3", "smtp", "spdy/3"}) {
        startService(identityOf(serverChain), "127.0.0.1", {.applicationProtocol = protocol});
        service().enqueue(Script().readRequest().send("220 " + std::string(protocol) + "\r\n").close());
        EXPECT_THAT(staple(), FailedOnTheWay(kAnyCode)) << protocol;
        expectUntouched();
    }
}

}  // namespace
}  // namespace pinwell::test
