#include "system_call_trace.h"

#include <fcntl.h>
#include <sys/ptrace.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <csignal>
#include <set>
#include <system_error>
#include <utility>
#include <vector>

namespace pinwell::test {
namespace {

// The position of a call's file among its arguments.
enum class File { path, descriptor, directoryAndPath };

struct Call {
    long number;
    const char* name;
    File file;
    unsigned argument;  // of the path, the descriptor, or the directory's descriptor
    bool changes;
};

constexpr std::array kCalls{
    Call{SYS_openat, "openat", File::directoryAndPath, 0, false},  // unless it may create: see below
    Call{SYS_newfstatat, "newfstatat", File::directoryAndPath, 0, false},
    Call{SYS_statx, "statx", File::directoryAndPath, 0, false},
    Call{SYS_unlinkat, "unlinkat", File::directoryAndPath, 0, true},
    Call{SYS_mkdirat, "mkdirat", File::directoryAndPath, 0, true},
    Call{SYS_renameat2, "renameat2", File::directoryAndPath, 0, true},
    Call{SYS_utimensat, "utimensat", File::directoryAndPath, 0, true},
    Call{SYS_fchmodat, "fchmodat", File::directoryAndPath, 0, true},
    Call{SYS_truncate, "truncate", File::path, 0, true},
#ifdef SYS_open
    Call{SYS_rename, "rename", File::path, 0, true},
    Call{SYS_unlink, "unlink", File::path, 0, true},
    Call{SYS_rmdir, "rmdir", File::path, 0, true},
    Call{SYS_mkdir, "mkdir", File::path, 0, true},
    Call{SYS_chmod, "chmod", File::path, 0, true},
#endif
    Call{SYS_fstat, "fstat", File::descriptor, 0, false},
    Call{SYS_read, "read", File::descriptor, 0, false},
    Call{SYS_pread64, "pread64", File::descriptor, 0, false},
    Call{SYS_lseek, "lseek", File::descriptor, 0, false},
    Call{SYS_getdents64, "getdents64", File::descriptor, 0, false},
    Call{SYS_fgetxattr, "fgetxattr", File::descriptor, 0, false},
    Call{SYS_flistxattr, "flistxattr", File::descriptor, 0, false},
    Call{SYS_flock, "flock", File::descriptor, 0, false},
    Call{SYS_close, "close", File::descriptor, 0, false},
    Call{SYS_write, "write", File::descriptor, 0, true},
    Call{SYS_pwrite64, "pwrite64", File::descriptor, 0, true},
    Call{SYS_ftruncate, "ftruncate", File::descriptor, 0, true},
    Call{SYS_fallocate, "fallocate", File::descriptor, 0, true},
    Call{SYS_fsync, "fsync", File::descriptor, 0, true},
    Call{SYS_ioctl, "ioctl", File::descriptor, 0, true},
    Call{SYS_copy_file_range, "copy_file_range", File::descriptor, 2, true},
    Call{SYS_fchmod, "fchmod", File::descriptor, 0, true},
    Call{SYS_fchown, "fchown", File::descriptor, 0, true},
    Call{SYS_fsetxattr, "fsetxattr", File::descriptor, 0, true},
    Call{SYS_fremovexattr, "fremovexattr", File::descriptor, 0, true},
};

[[noreturn]] void fail(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

std::vector<char*> pointersTo(std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (std::string& text : texts) pointers.push_back(text.data());
    pointers.push_back(nullptr);
    return pointers;
}

// The text at that address of the other process; as much of it as can be read.
std::string textAt(pid_t thread, std::uint64_t address) {
    std::string text;
    const auto page = static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE));
    while (text.size() < PATH_MAX) {
        const std::uint64_t from = address + text.size();
        std::vector<char> piece(page - from % page);  // memory is mapped by pages
        iovec local{piece.data(), piece.size()};
        // NOLINTNEXTLINE: an address of another process is a number here
        iovec remote{reinterpret_cast<void*>(from), piece.size()};
        const ssize_t count = process_vm_readv(thread, &local, 1, &remote, 1, 0);
        if (count <= 0) return text;
        const auto end = std::find(piece.begin(), piece.begin() + count, '\0');
        text.append(piece.begin(), end);
        if (end != piece.begin() + count) return text;
    }
    return text;
}

std::string pathOfDescriptor(pid_t thread, int descriptor) {
    const std::string link = "/proc/" + std::to_string(thread) + "/fd/" + std::to_string(descriptor);
    std::array<char, PATH_MAX> path{};
    const ssize_t length = readlink(link.c_str(), path.data(), path.size());
    return length < 0 ? std::string() : std::string(path.data(), static_cast<std::size_t>(length));
}

class Trace {
  public:
    Trace(const Command& command, TracedCalls calls, std::size_t number, Interruption interruption)
        : calls_(std::move(calls)),
          number_(number),
          interruption_(std::move(interruption)),
          process_(start(command)) {}

    ~Trace() {
        if (ended_) return;
        kill(process_, SIGKILL);
        while (waitpid(process_, nullptr, __WALL) > 0) {
        }
    }
    Trace(const Trace&) = delete;
    Trace& operator=(const Trace&) = delete;

    TracedRun run() {
        constexpr long kOptions =
            PTRACE_O_TRACESYSGOOD | PTRACE_O_TRACECLONE | PTRACE_O_TRACEEXEC | PTRACE_O_EXITKILL;
        int status = 0;
        if (waitpid(process_, &status, __WALL) != process_) fail("waitpid");
        if (!WIFSTOPPED(status)) fail("the traced program did not start");
        if (ptrace(PTRACE_SETOPTIONS, process_, nullptr, kOptions) != 0) fail("ptrace");
        known_.insert(process_);
        proceed(process_, 0);
        while (!ended_) step();
        return result_;
    }

  private:
    static pid_t start(const Command& command) {
        std::vector<std::string> arguments{command.executable};
        arguments.insert(arguments.end(), command.arguments.begin(), command.arguments.end());
        std::vector<std::string> environment;
        for (const auto& [name, value] : command.environment) environment.push_back(name + "=" + value);
        environment.emplace_back("ASAN_OPTIONS=detect_leaks=0");  // LeakSanitizer is a tracer itself
        const std::vector<char*> argv = pointersTo(arguments);
        const std::vector<char*> envp = pointersTo(environment);

        const pid_t child = fork();
        if (child < 0) fail("fork");
        if (child > 0) return child;
        // Only system calls from here on: other threads may have held any lock.
        const int nothing = open("/dev/null", O_RDWR);
        for (const int stream : {0, 1, 2}) dup2(nothing, stream);
        // A test run in the background or under nohup(1) passes its ignored signals on.
        for (const int number : {SIGHUP, SIGINT, SIGTERM}) std::signal(number, SIG_DFL);
        if (chdir(command.workingDirectory.c_str()) != 0 || ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0)
            _exit(127);
        raise(SIGSTOP);
        execve(command.executable.c_str(), argv.data(), envp.data());
        _exit(127);
    }

    void proceed(pid_t thread, int signal) {
        // A killed thread no longer exists; its end will be reported.
        if (ptrace(PTRACE_SYSCALL, thread, nullptr, static_cast<long>(signal)) != 0 && errno != ESRCH)
            fail("ptrace");
    }

    void step() {
        int status = 0;
        const pid_t thread = waitpid(-1, &status, __WALL);
        if (thread < 0) fail("waitpid");
        if (WIFEXITED(status) || WIFSIGNALED(status)) {
            if (thread != process_) return;
            ended_ = true;
            if (WIFEXITED(status)) result_.exitStatus = WEXITSTATUS(status);
            if (WIFSIGNALED(status)) result_.signal = WTERMSIG(status);
            return;
        }
        const int stop = WSTOPSIG(status);
        const bool isNew = known_.insert(thread).second;
        if (stop == (SIGTRAP | 0x80)) {
            if (!result_.interruptedAt) look(thread);
            proceed(thread, 0);
        } else if ((static_cast<unsigned>(status) >> 16U) != 0 || (isNew && stop == SIGSTOP)) {
            proceed(thread, 0);  // an event of tracing, and no signal of the program's
        } else {
            proceed(thread, stop);
        }
    }

    void look(pid_t thread) {
        __ptrace_syscall_info info{};
        if (ptrace(PTRACE_GET_SYSCALL_INFO, thread, sizeof info, &info) <= 0) return;
        if (info.op != PTRACE_SYSCALL_INFO_ENTRY) return;
        const auto call = std::find_if(kCalls.begin(), kCalls.end(), [&](const Call& candidate) {
            return static_cast<std::uint64_t>(candidate.number) == info.entry.nr;
        });
        if (call == kCalls.end() || !touches(thread, *call, info)) return;
        bool changes = call->changes;
        if (call->number == SYS_openat) changes = mayChange(static_cast<int>(info.entry.args[2]));
        if (calls_.changesOnly && !changes) return;
        if (seen_++ != number_) return;
        result_.interruptedAt = call->name;
        interruption_(process_, thread);
    }

    // O_DIRECTORY is part of O_TMPFILE.
    static bool mayChange(int flags) {
        return (flags & (O_CREAT | O_TRUNC)) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
    }

    bool touches(pid_t thread, const Call& call, const __ptrace_syscall_info& info) const {
        const std::uint64_t argument = info.entry.args[call.argument];
        std::string path;
        switch (call.file) {
            case File::path:
                path = textAt(thread, argument);
                break;
            case File::descriptor:
                path = pathOfDescriptor(thread, static_cast<int>(argument));
                break;
            case File::directoryAndPath:
                path = textAt(thread, info.entry.args[call.argument + 1]);
                if (!path.starts_with('/')) path = pathOfDescriptor(thread, static_cast<int>(argument));
                break;
        }
        return path.starts_with(calls_.directory + "/") || path == calls_.directory;
    }

    const TracedCalls calls_;
    const std::size_t number_;
    const Interruption interruption_;
    const pid_t process_;
    std::set<pid_t> known_;
    std::size_t seen_ = 0;
    TracedRun result_;
    bool ended_ = false;
};

}  // namespace

Interruption sending(int signal) {
    return [signal](int process, int thread) { tgkill(process, thread, signal); };
}

TracedRun interruptRun(const Command& command, const TracedCalls& calls, std::size_t number,
                       const Interruption& interruption) {
    return Trace(command, calls, number, interruption).run();
}

std::optional<std::string> tracingMissing() {
    try {
        const TracedRun run =
            interruptRun({.executable = "/bin/true"}, {.directory = "/none"}, 0, sending(SIGKILL));
        if (run.exitStatus == 0) return std::nullopt;
        return "a traced program did not end as it should";
    } catch (const std::system_error& error) {
        return std::string("no program can be traced here: ") + error.what();
    }
}

}  // namespace pinwell::test
