// Runs with unusual standard streams: a lost message never prevents a staple.
#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class Streams : public EndToEndTest {
  protected:
    Streams() { serveTicket(genuine); }

    /// Lost messages may never get into a file or onto the wire.
    void expectGoodStaple(const Command& run) {
        const ProcessResult result = runProcess(run);
        EXPECT_EQ(result.exitStatus, 0);
        EXPECT_EQ(result.signal, 0);
        EXPECT_EQ(result.errors, "");
        EXPECT_EQ(stapled(), genuine);
        EXPECT_THAT(temporaryFiles(), ElementsAre("REQUEST.ticket"));
        EXPECT_EQ(readFile(temporaryPath("REQUEST.ticket")), base::toString(genuine));
        ASSERT_EQ(service().requests().size(), 1U);
        EXPECT_EQ(service().requests()[0].body,
                  R"({"records":[{"recordName":")" + ("2/" + prettyHash()) + R"("}]})");
    }
    /// With the most verbose output.
    Command verboseStaple() const { return command({"staple", "-v", bundle}); }

    const Data genuine = ticket();
};

TEST_F(Streams, StandardOutputHasNoReader) {
    Command run = verboseStaple();
    run.output = Output::brokenPipe;
    expectGoodStaple(run);
}

TEST_F(Streams, StandardOutputIsFull) {
    Command run = verboseStaple();
    run.output = Output::full;
    expectGoodStaple(run);
}

TEST_F(Streams, StandardOutputIsClosed) {
    Command run = verboseStaple();
    run.output = Output::closed;
    expectGoodStaple(run);
}

TEST_F(Streams, StandardInputIsClosed) {
    Command run = verboseStaple();
    run.hasInput = false;
    expectGoodStaple(run);
}

TEST_F(Streams, AllStreamsAreClosed) {
    Command run = verboseStaple();
    run.hasInput = false;
    run.output = Output::closed;
    run.errors = Output::closed;
    expectGoodStaple(run);
}

TEST_F(Streams, NothingElseTakesThePlaceOfAClosedStream) {
    // Otherwise a message would go to whatever file or connection got the descriptor.
    const Gate gate;
    service().enqueue(Script().readRequest().waitFor(gate).send(answer(inlineRecord(genuine)).bytes()));
    Command closed = verboseStaple();
    closed.hasInput = false;
    closed.output = Output::closed;
    closed.errors = Output::closed;
    RunningProcess run(closed);
    ASSERT_TRUE(gate.waitUntilReached());
    for (const char* descriptor : {"0", "1", "2"}) {
        const std::string link = "/proc/" + std::to_string(run.id()) + "/fd/" + descriptor;
        EXPECT_EQ(std::filesystem::read_symlink(link), "/dev/null") << descriptor;
    }
    gate.open();
    EXPECT_EQ(run.wait().exitStatus, 0);
    EXPECT_EQ(stapled(), genuine);
}

TEST_F(Streams, AValidationOnAClosedOutputChangesNothing) {
    stapleByHand(genuine);
    Command run = command({"validate", "-v", bundle});
    run.output = Output::closed;
    expectGoodStaple(run);
}

TEST_F(Streams, ALargeTicketOnAClosedOutputIsWhole) {
    const std::string url = service().url("/${f}");
    const std::string record = R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":")" +
                               url + R"(","size":)" + std::to_string(genuine.size()) + "}}}}]}";
    const Response asset{.body =
                             base::toString(genuine)};  // a copy: the server outlives this class's members
    service().setHandler([record, asset](const RecordedRequest& request) {
        return request.method == "POST" ? answer(record) : asset;
    });
    Command run = verboseStaple();
    run.output = Output::closed;
    EXPECT_EQ(runProcess(run).exitStatus, 0);
    EXPECT_EQ(stapled(), genuine);
}

TEST_F(Streams, TheUsageHasNoReader) {
    for (const Output errors : {Output::brokenPipe, Output::closed, Output::full}) {
        Command run = command({"stapel", bundle});
        run.errors = errors;
        const ProcessResult result = runProcess(run);
        EXPECT_EQ(result.exitStatus, 64);
        EXPECT_EQ(result.output, "");
    }
    EXPECT_THAT(service().connections(), IsEmpty());
}

}  // namespace
}  // namespace pinwell::test
