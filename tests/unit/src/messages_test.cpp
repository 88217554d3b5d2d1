#include "src/messages.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

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

}  // namespace
}  // namespace pinwell
