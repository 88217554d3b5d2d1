// Servers that fall silent or disconnect, at each point of an exchange. The tests of the session cover the
// time limits, because they can move its clock. Here the silence ends when the test has seen the tool wait.
#include <csignal>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/// The progress of an exchange.
struct Phase {
    std::string title;
    Script script;
    int code = kConnectionLost;  // of a failure there
};

std::string titleOfPhase(const testing::TestParamInfo<Phase>& tested) {
    return tested.param.title;
}

std::vector<Phase> phases() {
    const auto after = [](const std::string& bytes) { return Script().readRequest().send(bytes); };
    const std::string head = "HTTP/1.1 200 OK\r\n";
    return {
        // The transfer library's releases call a failed handshake by different names.
        {"BeforeTheHandshake", Script(), kAnyCode},
        {"WithinTheHandshake", Script().partOfHandshake(), kAnyCode},
        {"AfterTheHandshake", Script().handshake()},
        {"WithinTheRequest", Script().readHead()},
        {"AfterTheRequest", Script().readRequest()},
        {"WithinTheStatusLine", after("HTTP/1.1 20")},
        {"AfterAnInterimAnswer", after("HTTP/1.1 100 Continue\r\n\r\n")},
        {"WithinTheHead", after(head + "Content-Length: 10\r\nX-")},
        {"AfterTheHead", after(head + "Content-Length: 10\r\n\r\n")},
        {"WithinTheBody", after(head + "Content-Length: 10\r\n\r\n{\"recor")},
        {"WithinABodyWithoutALength", after(head + "\r\n{\"recor")},
        {"WithinAChunk", after(head + "Transfer-Encoding: chunked\r\n\r\n6\r\n{\"r")},
        {"BeforeTheLastChunk", after(head + "Transfer-Encoding: chunked\r\n\r\n6\r\n{\"r\":1\r\n")},
        {"WithinTheTrailer", after(head + "Transfer-Encoding: chunked\r\n\r\n2\r\n{}\r\n0\r\nX-")},
    };
}

class BrokenConnection : public EndToEndTest, public testing::WithParamInterface<Phase> {
  protected:
    Script upToHere() const { return GetParam().script; }
    Script record() { return Script().respond(answer(assetRecord(service().url("/${f}"), 10))); }
    void expectUntouched() const {
        EXPECT_EQ(stapled(), std::nullopt);
        EXPECT_THAT(temporaryFiles(), IsEmpty());
    }

    Gate silence;
};

TEST_P(BrokenConnection, ByAResetFailsTheLookup) {
    service().enqueue(upToHere().reset());
    EXPECT_THAT(staple(), FailedOnTheWay(GetParam().code));
    expectUntouched();
}

TEST_P(BrokenConnection, ByAnEndWithoutNoticeFailsTheLookup) {
    service().enqueue(upToHere().cut());
    EXPECT_THAT(staple(), FailedOnTheWay(GetParam().code));
    expectUntouched();
}

TEST_P(BrokenConnection, ByAResetParksADownload) {
    service().enqueue(record());
    service().enqueue(upToHere().reset());
    expectParked(DownloadFailed());
    expectUntouched();
}

TEST_P(BrokenConnection, AfterASilenceFailsTheLookup) {
    service().enqueue(upToHere().waitFor(silence).reset());
    RunningProcess run(command({"staple", bundle}));
    ASSERT_TRUE(silence.waitUntilReached());
    EXPECT_TRUE(run.isRunning());
    silence.open();
    EXPECT_THAT(run.wait(), FailedOnTheWay(GetParam().code));
    expectUntouched();
}

TEST_P(BrokenConnection, ASilenceOfTheLookupCanBeInterrupted) {
    service().enqueue(upToHere().waitFor(silence));
    RunningProcess run(command({"staple", bundle}));
    ASSERT_TRUE(silence.waitUntilReached());
    run.sendSignal(SIGINT);
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.signal, SIGINT);
    EXPECT_EQ(result.output + result.errors, processing() + "\n");
    expectUntouched();
}

INSTANTIATE_TEST_SUITE_P(Server, BrokenConnection, testing::ValuesIn(phases()), titleOfPhase);

class SlowServer : public EndToEndTest {};

TEST_F(SlowServer, IsWaitedForAtEveryStep) {
    const std::string answered = answer(inlineRecord(ticket())).bytes();
    const std::size_t headEnd = answered.find("\r\n\r\n") + 4;
    std::vector<Gate> gates(6);
    service().enqueue(Script()
                          .waitFor(gates[0])
                          .handshake()
                          .waitFor(gates[1])
                          .readRequest()
                          .waitFor(gates[2])
                          .send(answered.substr(0, 20))
                          .waitFor(gates[3])
                          .send(answered.substr(20, headEnd - 20))
                          .waitFor(gates[4])
                          .send(answered.substr(headEnd, 100))
                          .waitFor(gates[5])
                          .send(answered.substr(headEnd + 100)));
    RunningProcess run(command({"staple", bundle}));
    for (const Gate& gate : gates) {
        ASSERT_TRUE(gate.waitUntilReached());
        EXPECT_TRUE(run.isRunning());
        EXPECT_EQ(stapled(), std::nullopt);
        gate.open();
    }
    EXPECT_THAT(run.wait(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
}

}  // namespace
}  // namespace pinwell::test
