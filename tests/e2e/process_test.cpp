// The process runner of all tests here.
#include <csignal>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;

Command shell(const std::string& script) {
    return {.executable = "/bin/sh", .arguments = {"-c", script}};
}

TEST(Process, KeepsTheTwoOutputsApart) {
    const ProcessResult result = runProcess(shell("echo out; echo err >&2; echo more"));
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.output, "out\nmore\n");
    EXPECT_EQ(result.errors, "err\n");
}

TEST(Process, DistinguishesAStatusFromASignal) {
    EXPECT_EQ(runProcess(shell("exit 77")).exitStatus, 77);
    const ProcessResult killed = runProcess(shell("kill -TERM $$"));
    EXPECT_EQ(killed.exitStatus, std::nullopt);
    EXPECT_EQ(killed.signal, SIGTERM);
}

TEST(Process, HasTheGivenEnvironmentAndDirectoryOnly) {
    Command command = shell("pwd; echo \"$GIVEN,$HOME\"");
    command.environment = {{"GIVEN", "value"}};
    command.workingDirectory = "/usr";
    EXPECT_EQ(runProcess(command).output, "/usr\nvalue,\n");
}

TEST(Process, StartsWithDefaultSignals) {
    // A pipe without a reader ends a child that does not handle the signal.
    Command command = shell("echo lost; echo more");
    command.output = Output::brokenPipe;
    const auto disposition = std::signal(SIGPIPE, SIG_IGN);
    EXPECT_EQ(runProcess(command).signal, SIGPIPE);
    std::signal(SIGPIPE, disposition);
}

TEST(Process, MayStartWithClosedStreams) {
    Command command = shell("[ -e /proc/self/fd/0 ] || [ -e /proc/self/fd/1 ] || exit 3");
    command.hasInput = false;
    command.output = Output::closed;
    EXPECT_EQ(runProcess(command).exitStatus, 3);
}

TEST(Process, TakesMoreOutputThanAPipeHolds) {
    const ProcessResult result = runProcess(
        shell("i=0; while [ $i -lt 3000 ]; do echo 0123456789012345678901234567890123456789012345678901234; "
              "echo err >&2; i=$((i+1)); done"));
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.output.size(), 3000U * 56U);
    EXPECT_EQ(result.errors.size(), 3000U * 4U);
}

TEST(Process, IsWaitedForThoughItsOutputsAreClosed) {
    EXPECT_EQ(runProcess(shell("exec >&- 2>&-; read nothing; exit 5")).exitStatus, 5);
}

TEST(Process, ALineIsSeenWhileItRuns) {
    RunningProcess process(shell("echo first; echo second; kill -STOP $$"));
    EXPECT_EQ(process.waitForLine("sec"), "second");
    EXPECT_TRUE(process.isRunning());
    process.sendSignal(SIGKILL);
    EXPECT_EQ(process.wait().signal, SIGKILL);
    EXPECT_FALSE(process.isRunning());
}

TEST(Process, ALineThatNeverComesIsNothing) {
    RunningProcess process(shell("echo other"));
    EXPECT_EQ(process.waitForLine("sec"), std::nullopt);
    EXPECT_THAT(process.wait().outputLines(), ElementsAre("other"));
}

TEST(Process, AProgramThatCannotBeStartedIsAnError) {
    EXPECT_THROW(runProcess({.executable = "/nowhere/program"}), std::system_error);
}

TEST(Process, LinesAreTheTextsBetweenNewlines) {
    EXPECT_THAT(linesOf("a\n\nb"), ElementsAre("a", "", "b"));
    EXPECT_THAT(linesOf(""), ElementsAre());
    EXPECT_THAT(linesOf("\n"), ElementsAre(""));
}

}  // namespace
}  // namespace pinwell::test
