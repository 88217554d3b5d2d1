#include "support/process.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <functional>
#include <system_error>

#include "base/handle.h"
#include "runtime/process.h"

namespace pinwell::test {
namespace {

using Clock = std::chrono::steady_clock;
using base::FileDescriptor;

void check(int error, const char* what) {
    if (error != 0) throw std::system_error(error, std::generic_category(), what);
}

struct Pipe {
    FileDescriptor readEnd;
    FileDescriptor writeEnd;

    Pipe() {
        std::array<int, 2> ends{};
        check(::pipe2(ends.data(), O_CLOEXEC) == 0 ? 0 : errno, "pipe");
        readEnd = FileDescriptor(ends[0]);
        writeEnd = FileDescriptor(ends[1]);
    }
};

/// The descriptors that a child starts with.
class FileActions {
  public:
    FileActions() { check(posix_spawn_file_actions_init(&actions_), "file actions"); }
    ~FileActions() { posix_spawn_file_actions_destroy(&actions_); }
    FileActions(const FileActions&) = delete;
    FileActions& operator=(const FileActions&) = delete;

    void open(int descriptor, const char* path) {
        check(posix_spawn_file_actions_addopen(&actions_, descriptor, path, O_RDWR, 0), "open");
    }
    void duplicate(const FileDescriptor& from, int descriptor) {
        check(posix_spawn_file_actions_adddup2(&actions_, from.get(), descriptor), "dup2");
    }
    void close(int descriptor) { check(posix_spawn_file_actions_addclose(&actions_, descriptor), "close"); }
    void changeDirectory(const std::string& path) {
        check(posix_spawn_file_actions_addchdir_np(&actions_, path.c_str()), "chdir");
    }

    const posix_spawn_file_actions_t* get() const noexcept { return &actions_; }

  private:
    posix_spawn_file_actions_t actions_{};
};

/// Default dispositions and an empty mask, whatever the state of this program and its threads.
class CleanSignals {
  public:
    CleanSignals() {
        check(posix_spawnattr_init(&attributes_), "attributes");
        sigset_t all;
        sigset_t none;
        sigfillset(&all);
        sigemptyset(&none);
        check(posix_spawnattr_setsigdefault(&attributes_, &all), "signals");
        check(posix_spawnattr_setsigmask(&attributes_, &none), "signals");
        check(posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK),
              "signals");
    }
    ~CleanSignals() { posix_spawnattr_destroy(&attributes_); }
    CleanSignals(const CleanSignals&) = delete;
    CleanSignals& operator=(const CleanSignals&) = delete;

    const posix_spawnattr_t* get() const noexcept { return &attributes_; }

  private:
    posix_spawnattr_t attributes_{};
};

/// The variables, with the sanitizers' settings that make a report end the child. Our settings are last, and
/// the last one counts.
std::vector<std::string> environmentList(const Environment& variables) {
    std::vector<std::string> list;
    for (const auto& [name, value] : variables) list.push_back(name + "=" + value);
    for (const char* name : {"ASAN_OPTIONS", "LSAN_OPTIONS", "TSAN_OPTIONS", "UBSAN_OPTIONS"}) {
        const char* inherited = std::getenv(name);
        list.push_back(std::string(name) + "=" + (inherited != nullptr ? std::string(inherited) + ":" : "") +
                       "halt_on_error=1:exitcode=" + std::to_string(kSanitizerStatus));
    }
    return list;
}

std::vector<char*> pointersTo(std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (std::string& text : texts) pointers.push_back(text.data());
    pointers.push_back(nullptr);
    return pointers;
}

/// Returns the end that the test reads, if it does.
FileDescriptor connectOutput(FileActions& actions, Output output, int descriptor, std::vector<Pipe>& pipes) {
    if (output == Output::closed) {
        actions.close(descriptor);
        return {};
    }
    if (output == Output::full) {
        actions.open(descriptor, "/dev/full");
        return {};
    }
    Pipe& pipe = pipes.emplace_back();
    actions.duplicate(pipe.writeEnd, descriptor);
    if (output == Output::captured) return std::move(pipe.readEnd);
    pipe.readEnd = FileDescriptor();
    return {};
}

}  // namespace

bool programsAreSanitized() {
    return runtime::kSanitized;
}

std::string emulator() {
    return EMULATOR;
}

std::vector<std::string> linesOf(std::string_view text) {
    std::vector<std::string> lines;
    while (!text.empty()) {
        const std::size_t end = text.find('\n');
        lines.emplace_back(text.substr(0, end));
        if (end == std::string_view::npos) break;
        text.remove_prefix(end + 1);
    }
    return lines;
}

std::vector<std::string> ProcessResult::outputLines() const {
    return linesOf(output);
}

struct RunningProcess::State {
    pid_t id = -1;
    FileDescriptor process;  // readable once the child has ended
    FileDescriptor output;
    FileDescriptor errors;
    bool ended = false;
    ProcessResult result;

    void start(const Command& command);
    bool drain(FileDescriptor& from, std::string& into);
    bool step(Clock::time_point deadline);
    std::optional<std::string> waitForLine(const std::function<bool(std::string_view)>& isWanted);
    void reap();
    void send(int number) const;
    void kill();
};

void RunningProcess::State::start(const Command& command) {
    FileActions actions;
    std::vector<Pipe> pipes;
    if (command.hasInput)
        actions.open(STDIN_FILENO, "/dev/null");
    else
        actions.close(STDIN_FILENO);
    output = connectOutput(actions, command.output, STDOUT_FILENO, pipes);
    errors = connectOutput(actions, command.errors, STDERR_FILENO, pipes);
    actions.changeDirectory(command.workingDirectory);

    std::vector<std::string> arguments{command.executable};
    arguments.insert(arguments.end(), command.arguments.begin(), command.arguments.end());
    std::vector<std::string> variables = environmentList(command.environment);
    const CleanSignals signals;
    check(::posix_spawn(&id, command.executable.c_str(), actions.get(), signals.get(),
                        pointersTo(arguments).data(), pointersTo(variables).data()),
          command.executable.c_str());
    // Not the C library's wrapper: its header cannot be used from C++ everywhere.
    process = FileDescriptor(static_cast<int>(::syscall(SYS_pidfd_open, id, 0)));
    if (process) return;
    const int error = errno;
    kill();
    check(error, "pidfd_open");
}

// False at the end of the stream.
bool RunningProcess::State::drain(FileDescriptor& from, std::string& into) {
    std::array<char, 4096> chunk{};
    const ssize_t count = ::read(from.get(), chunk.data(), chunk.size());
    if (count < 0 && errno == EINTR) return true;
    if (count <= 0) return false;
    into.append(chunk.data(), static_cast<std::size_t>(count));
    return true;
}

// Takes the next event. Returns false if the child has ended and its output is complete, or at the deadline.
bool RunningProcess::State::step(Clock::time_point deadline) {
    const auto rest = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
    if (ended || rest.count() <= 0) return false;
    std::array<pollfd, 3> waits{pollfd{process.get(), POLLIN, 0},
                                pollfd{output ? output.get() : -1, POLLIN, 0},
                                pollfd{errors ? errors.get() : -1, POLLIN, 0}};
    if (::poll(waits.data(), waits.size(), static_cast<int>(rest.count()) + 1) < 0 && errno != EINTR)
        check(errno, "poll");
    if (waits[1].revents != 0 && !drain(output, result.output)) output = FileDescriptor();
    if (waits[2].revents != 0 && !drain(errors, result.errors)) errors = FileDescriptor();
    // All output before the child's end is in the pipes now: they are emptied first.
    if (waits[0].revents != 0 && waits[1].revents == 0 && waits[2].revents == 0) reap();
    return !ended;
}

std::optional<std::string> RunningProcess::State::waitForLine(
    const std::function<bool(std::string_view)>& isWanted) {
    const auto deadline = Clock::now() + kProcessPatience;
    while (true) {
        const std::string_view whole =
            std::string_view(result.output).substr(0, result.output.rfind('\n') + 1);
        for (const std::string& line : linesOf(whole))
            if (isWanted(line)) return line;
        if (!step(deadline)) return std::nullopt;
    }
}

void RunningProcess::State::reap() {
    int status = 0;
    while (::waitpid(id, &status, 0) < 0 && errno == EINTR) {
    }
    ended = true;
    if (WIFEXITED(status)) result.exitStatus = WEXITSTATUS(status);
    if (WIFSIGNALED(status)) result.signal = WTERMSIG(status);
}

void RunningProcess::State::send(int number) const {
    ::kill(id, number);  // not reaped yet: the number is still the child's
}

void RunningProcess::State::kill() {
    send(SIGKILL);
    reap();
}

RunningProcess::RunningProcess(const Command& command) : state_(std::make_unique<State>()) {
    state_->start(command);
}

RunningProcess::~RunningProcess() {
    if (!state_->ended) state_->kill();
}

std::optional<std::string> RunningProcess::waitForLine(std::string_view prefix) {
    return state_->waitForLine([prefix](std::string_view line) { return line.starts_with(prefix); });
}

std::optional<std::string> RunningProcess::waitForLineWith(std::string_view part) {
    return state_->waitForLine(
        [part](std::string_view line) { return line.find(part) != std::string_view::npos; });
}

bool RunningProcess::isRunning() {
    if (state_->ended) return false;
    pollfd wait{state_->process.get(), POLLIN, 0};
    return ::poll(&wait, 1, 0) == 0;
}

int RunningProcess::id() const noexcept {
    return state_->id;
}

void RunningProcess::sendSignal(int number) {
    if (!state_->ended) state_->send(number);
}

ProcessResult RunningProcess::wait() {
    const auto deadline = Clock::now() + kProcessPatience;
    while (state_->step(deadline)) {
    }
    if (!state_->ended) {
        state_->kill();
        ADD_FAILURE() << "the process did not end; so far it wrote\n"
                      << state_->result.output << state_->result.errors;
    }
    return state_->result;
}

const ProcessResult& RunningProcess::resultSoFar() const noexcept {
    return state_->result;
}

ProcessResult runProcess(const Command& command) {
    return RunningProcess(command).wait();
}

}  // namespace pinwell::test
