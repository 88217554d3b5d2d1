#include "killed_child.h"

#include <signal.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <exception>

#include "base/handle.h"
#include "support/require.h"

namespace pinwell::lumora::test {
namespace {

using base::FileDescriptor;
using pinwell::test::require;

constexpr char kDone = 'd';

[[noreturn]] void beTheChild(int pipe, const std::function<void()>& prepare,
                             const std::function<void()>& act) {
    const auto say = [pipe](const std::string& text) {
        if (::write(pipe, text.data(), text.size()) < 0) ::_exit(2);
    };
    try {
        prepare();
        if (::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0) ::_exit(3);
        ::raise(SIGSTOP);
        act();
        say(std::string(1, kDone));
    } catch (const std::exception& error) {
        say(error.what());
    }
    ::_exit(0);
}

/// Lets the child run to its next stop. Returns false if it has ended.
bool nextStop(pid_t child, int& status) {
    require(::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr) == 0, "ptrace");
    require(::waitpid(child, &status, 0) == child, "waitpid");
    return WIFSTOPPED(status);
}

/// True if the child was killed, false if it ended before.
bool killAt(pid_t child, int call) {
    int status = 0;
    require(::waitpid(child, &status, 0) == child, "waitpid");
    if (!WIFSTOPPED(status)) return false;
    // Each call stops the child twice: as it enters and as it leaves.
    for (int stop = 1; nextStop(child, status); ++stop) {
        if (stop < 2 * call - 1) continue;
        ::kill(child, SIGKILL);
        require(::waitpid(child, &status, 0) == child, "waitpid");
        return true;
    }
    return false;
}

std::string readAll(const FileDescriptor& pipe) {
    std::string text;
    std::array<char, 4096> buffer{};
    for (;;) {
        const ssize_t count = ::read(pipe.get(), buffer.data(), buffer.size());
        if (count <= 0) return text;
        text.append(buffer.data(), static_cast<std::size_t>(count));
    }
}

}  // namespace

std::optional<std::string> cannotTrace() {
    const KilledChild child = runAndKillAt(
        1'000'000, [] {}, [] {});
    if (child.reachedTheEnd && child.acknowledged) return std::nullopt;
    return "ptrace is not permitted here";
}

KilledChild runAndKillAt(int call, const std::function<void()>& prepare, const std::function<void()>& act) {
    std::array<int, 2> ends{};
    require(::pipe(ends.data()) == 0, "pipe");
    const FileDescriptor reading(ends[0]);
    FileDescriptor writing(ends[1]);
    const pid_t child = ::fork();
    require(child >= 0, "fork");
    if (child == 0) beTheChild(writing.get(), prepare, act);
    writing.reset();
    KilledChild outcome;
    outcome.reachedTheEnd = !killAt(child, call);
    outcome.said = readAll(reading);
    outcome.acknowledged = outcome.said == std::string(1, kDone);
    return outcome;
}

}  // namespace pinwell::lumora::test
