// exit() may end the process in any callback, while the threads of all sessions live.
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>

#include <array>
#include <cstdlib>
#include <filesystem>

#include "session_fixture.h"

namespace pinwell::test {
namespace {

struct ProbeResult {
    int status = -1;
    std::string errors;
};

class ExitFromACallback : public SessionTest {
  protected:
    // All reports of the sanitizers about the end of the process are in `errors`.
    ProbeResult run(std::string mode) {
        const std::string errorFile = directory / "errors";
        const std::string temporary = directory / "tmp";
        std::filesystem::create_directory(temporary);
        ::setenv("TMPDIR", temporary.c_str(), 1);
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, errorFile.c_str(),
                                         O_WRONLY | O_CREAT | O_TRUNC, 0600);
        std::string program = PINWELL_EXIT_PROBE;
        std::string url = server.url();
        const std::array<char*, 4> arguments{program.data(), mode.data(), url.data(), nullptr};
        pid_t child = 0;
        const int spawned =
            posix_spawn(&child, program.c_str(), &actions, nullptr, arguments.data(), environ);
        posix_spawn_file_actions_destroy(&actions);
        ::unsetenv("TMPDIR");
        if (spawned != 0) return {};
        ProbeResult result;
        int raw = 0;
        if (waitpid(child, &raw, 0) == child && WIFEXITED(raw)) result.status = WEXITSTATUS(raw);
        result.errors = readFile(errorFile);
        leftovers =
            static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator(temporary), {}));
        return result;
    }

    std::size_t leftovers = 0;
};

TEST_F(ExitFromACallback, OfADataTaskIsClean) {
    const ProbeResult result = run("lookup");
    EXPECT_EQ(result.status, 7);
    EXPECT_EQ(result.errors, "");
}

TEST_F(ExitFromACallback, OfADataTaskIsCleanWhileAnotherWaits) {
    const ProbeResult result = run("several");
    EXPECT_EQ(result.status, 7);
    EXPECT_EQ(result.errors, "");
    EXPECT_EQ(server.requests().size(), 1U);
}

TEST_F(ExitFromACallback, OfAFinishedDownloadIsCleanAndLeavesNoFile) {
    const ProbeResult result = run("download");
    EXPECT_EQ(result.status, 7);
    EXPECT_EQ(result.errors, "");
    EXPECT_EQ(leftovers, 0U);
    EXPECT_EQ(server.requests().size(), 2U);
}

TEST_F(ExitFromACallback, OfAChallengeIsClean) {
    const ProbeResult result = run("challenge");
    EXPECT_EQ(result.status, 7);
    EXPECT_EQ(result.errors, "");
    EXPECT_TRUE(server.requests().empty());
}

}  // namespace
}  // namespace pinwell::test
