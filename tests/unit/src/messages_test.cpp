#include "src/messages.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <unistd.h>

#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "support/message_capture.h"

namespace pinwell {
namespace {

using test::MessageCapture;

TEST(Messages, NormalRunShowsTheUsersLinesOnly) {
    const MessageCapture capture(kVerbosityNormal);
    MessageLog("for the user %d", 1);
    NoisyLog("for diagnosis");
    EXPECT_EQ(capture.text(), "for the user 1\n");
}

TEST(Messages, VerboseRunShowsBothInOrder) {
    const MessageCapture capture(kVerbosityVerbose);
    NoisyLog("first");
    MessageLog("second");
    EXPECT_EQ(capture.text(), "first\nsecond\n");
}

TEST(Messages, QuietRunShowsNothing) {
    const MessageCapture capture(kVerbosityQuiet);
    MessageLog("for the user");
    NoisyLog("for diagnosis");
    EXPECT_EQ(capture.text(), "");
}

TEST(Messages, AFormatThatEndsInANewlineGivesAnEmptyLineAfterIt) {
    const MessageCapture capture(kVerbosityNormal);
    MessageLog("line\n");
    EXPECT_EQ(capture.text(), "line\n\n");
}

TEST(Messages, TextFromAFileCannotDriveTheTerminal) {
    const MessageCapture capture(kVerbosityNormal);
    MessageLog("name: %@", std::string("a\x1b[31m\nb"));
    EXPECT_EQ(capture.text(), "name: a\\x1b[31m\\nb\n");
}

TEST(Messages, RedirectedLinesGoToTheReceiverOnly) {
    const MessageCapture capture(kVerbosityVerbose);
    std::vector<std::string> received;
    {
        const MessageRedirection redirection([&](std::string line) { received.push_back(std::move(line)); });
        MessageLog("for the user %d", 1);
        NoisyLog("for diagnosis");
    }
    MessageLog("after it");
    EXPECT_THAT(received, testing::ElementsAre("for the user 1", "for diagnosis"));
    EXPECT_EQ(capture.text(), "after it\n");
}

TEST(Messages, AReceiverGetsTheUsersLinesInQuietModeToo) {
    const MessageCapture capture(kVerbosityQuiet);
    std::vector<std::string> received;
    const MessageRedirection redirection([&](std::string line) { received.push_back(std::move(line)); });
    MessageLog("for the user");
    NoisyLog("for diagnosis");
    EXPECT_THAT(received, testing::ElementsAre("for the user"));
}

TEST(Messages, ARedirectionIsOfItsThreadAlone) {
    const MessageCapture capture(kVerbosityNormal);
    std::vector<std::string> received;
    const MessageRedirection redirection([&](std::string line) { received.push_back(std::move(line)); });
    std::thread([] { MessageLog("of another thread"); }).join();
    EXPECT_THAT(received, testing::IsEmpty());
    EXPECT_EQ(capture.text(), "of another thread\n");
}

TEST(Messages, AnInnerRedirectionReplacesTheOuterOneUntilItEnds) {
    std::vector<std::string> outer;
    std::vector<std::string> inner;
    const MessageRedirection first([&](std::string line) { outer.push_back(std::move(line)); });
    {
        const MessageRedirection second([&](std::string line) { inner.push_back(std::move(line)); });
        MessageLog("inside");
    }
    MessageLog("outside");
    EXPECT_THAT(inner, testing::ElementsAre("inside"));
    EXPECT_THAT(outer, testing::ElementsAre("outside"));
}

TEST(Messages, AClosedOutputLosesTheLineAndNothingElse) {
    const MessageCapture capture(kVerbosityNormal);
    const int output = dup(STDOUT_FILENO);
    const int full = open("/dev/full", O_WRONLY | O_CLOEXEC);
    ASSERT_GE(full, 0);
    dup2(full, STDOUT_FILENO);
    MessageLog("lost");
    dup2(output, STDOUT_FILENO);
    close(full);
    close(output);
    MessageLog("kept");
    EXPECT_EQ(capture.text(), "kept\n");
}

TEST(Messages, AReaderThatLagsBehindANonBlockingPipeGetsEveryLine) {
    const MessageCapture capture(kVerbosityNormal);
    const int output = dup(STDOUT_FILENO);
    int ends[2] = {-1, -1};
    ASSERT_EQ(pipe2(ends, O_CLOEXEC | O_NONBLOCK), 0);
    const int room = fcntl(ends[1], F_SETPIPE_SZ, 4096);
    ASSERT_GT(room, 0);
    dup2(ends[1], STDOUT_FILENO);
    close(ends[1]);

    const std::string line(static_cast<std::size_t>(room) + 100, 'x');  // more than fits at once
    std::string read;
    std::thread reader([&, end = ends[0]] {
        pollfd ready{end, POLLIN, 0};
        char chunk[512];
        while (poll(&ready, 1, -1) > 0) {
            const ssize_t count = ::read(end, chunk, sizeof chunk);
            if (count <= 0) return;
            read.append(chunk, static_cast<std::size_t>(count));
        }
    });
    for (int i = 0; i < 20; ++i) MessageLog("%@", line);
    dup2(output, STDOUT_FILENO);
    reader.join();
    close(ends[0]);
    close(output);

    std::string all;
    for (int i = 0; i < 20; ++i) all += line + '\n';
    EXPECT_EQ(read, all);
}

}  // namespace
}  // namespace pinwell
