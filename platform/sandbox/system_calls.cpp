// seccomp: gives up system calls permanently.
#include <asm/ioctls.h>
#include <asm/termbits.h>
#include <fcntl.h>
#include <sched.h>
#include <seccomp.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <initializer_list>
#include <memory>
#include <span>
#include <system_error>

#include "base/handle.h"
#include "facilities.h"
#include "runtime/process.h"

namespace pinwell::sandbox {
namespace {

// The leak checker of a sanitized build forks at the end and traces its parent; its reports start a program.
using runtime::kSanitized;

using Names = std::span<const char* const>;

// Calls that no program of ours makes at this point, but an intruder would.
constexpr std::array kForbidden{
    // other processes
    "process_vm_readv", "process_vm_writev", "process_madvise", "process_mrelease", "kcmp", "pidfd_open",
    "pidfd_getfd", "pidfd_send_signal", "perf_event_open", "tkill", "migrate_pages", "move_pages",
    // mounts, and files by handle, which no path check sees
    "mount", "umount", "umount2", "mount_setattr", "move_mount", "open_tree", "open_tree_attr", "fsopen",
    "fsconfig", "fsmount", "fspick", "pivot_root", "chroot", "open_by_handle_at", "mknod", "mknodat",
    "fanotify_init",
    // name spaces and identity
    "unshare", "setns", "setuid", "setgid", "setreuid", "setregid", "setresuid", "setresgid", "setgroups",
    "setfsuid", "setfsgid", "capset",
    // the kernel and the machine
    "bpf", "userfaultfd", "init_module", "finit_module", "delete_module", "kexec_load", "kexec_file_load",
    "reboot", "swapon", "swapoff", "acct", "quotactl", "quotactl_fd", "syslog", "vhangup", "iopl", "ioperm",
    "modify_ldt", "settimeofday", "clock_settime", "clock_adjtime", "adjtimex", "sethostname",
    "setdomainname", "lookup_dcookie", "nfsservctl", "_sysctl", "uselib", "personality",
    // the kernel's keys
    "add_key", "request_key", "keyctl",
    // a second way into most calls, past this filter
    "io_uring_setup", "io_uring_enter", "io_uring_register"};

// Also forbidden, unless a leak checker needs them.
constexpr std::array kForbiddenUnlessSanitized{"execve", "execveat", "fork", "vfork", "ptrace"};
constexpr std::array kNeededBySanitizers{"execve", "fork",        "vfork", "ptrace",
                                         "clone",  "wait4",       "pipe",  "process_vm_readv",
                                         "kill",   "personality", "unlink"};

// Calls for reading: files, memory, threads, time, and exiting.
constexpr std::array kReading{
    // files; opening has its own rules, so only reports opened before can be written
    "close", "close_range", "read", "readv", "pread64", "preadv", "preadv2", "write", "writev", "ftruncate",
    "ftruncate64", "lseek", "_llseek", "fstat", "fstat64", "stat", "stat64", "lstat", "lstat64", "newfstatat",
    "fstatat64", "statx", "statfs", "statfs64", "fstatfs", "fstatfs64", "access", "faccessat", "faccessat2",
    "getdents", "getdents64", "readlink", "readlinkat", "getcwd", "fadvise64", "fadvise64_64", "readahead",
    "fcntl", "fcntl64", "dup", "dup2", "dup3", "pipe2", "eventfd2", "poll", "ppoll", "ppoll_time64", "select",
    "_newselect", "pselect6", "pselect6_time64", "umask",
    // memory
    "brk", "mmap", "mmap2", "map_shadow_stack", "mseal", "munmap", "mremap", "mprotect", "madvise", "mincore",
    "membarrier",
    // threads and signals of the process itself
    "futex", "futex_time64", "futex_wait", "futex_wake", "futex_waitv", "futex_requeue", "set_robust_list",
    "get_robust_list", "set_tid_address", "rseq", "arch_prctl", "sched_getaffinity", "sched_yield",
    "sched_getparam", "sched_getscheduler", "getcpu", "gettid", "restart_syscall", "sigaltstack",
    "rt_sigaction", "rt_sigprocmask", "rt_sigreturn", "rt_sigpending", "rt_sigsuspend", "rt_sigtimedwait",
    "sigreturn", "exit", "exit_group",
    // time
    "clock_gettime", "clock_gettime64", "clock_getres", "clock_getres_time64", "clock_nanosleep",
    "clock_nanosleep_time64", "nanosleep", "gettimeofday", "time", "times",
    // identity and place
    "getpid", "getppid", "getpgrp", "getuid", "getuid32", "geteuid", "geteuid32", "getgid", "getgid32",
    "getegid", "getegid32", "getgroups", "getgroups32", "getresuid", "getresgid", "getrlimit", "ugetrlimit",
    "setrlimit", "getrusage", "uname", "sysinfo", "getrandom",
    // for some processors
    "riscv_hwprobe", "riscv_flush_icache", "cacheflush", "set_tls"};

constexpr std::uint64_t kLowWord = 0xFFFFFFFF;  // the bits of an int argument that the kernel reads
constexpr std::uint64_t kOpenToWrite =
    O_ACCMODE | O_CREAT | O_TRUNC | (static_cast<unsigned>(O_TMPFILE) & ~static_cast<unsigned>(O_DIRECTORY));
constexpr std::array<std::uint64_t, 2> kTerminalInput{TIOCSTI, TIOCLINUX};
#ifdef TCGETS2
constexpr std::array<std::uint64_t, 3> kTerminalQuestions{TCGETS, TCGETS2, TIOCGWINSZ};
#else
constexpr std::array<std::uint64_t, 2> kTerminalQuestions{TCGETS, TIOCGWINSZ};
#endif
constexpr std::uint64_t kNameMemory = 0x53564d41;  // PR_SET_VMA, of Linux 5.17

constexpr std::uint32_t kRefuse = SCMP_ACT_ERRNO(EPERM);
constexpr std::uint32_t kUnknown = SCMP_ACT_ERRNO(ENOSYS);

using Filter = base::Handle<void, seccomp_release>;

// Collects the rules and keeps the first failure, as an errno value.
class Rules {
  public:
    explicit Rules(std::uint32_t byDefault) : filter_(seccomp_init(byDefault)) {
        if (filter_ == nullptr) failure_ = ENOMEM;
    }

    void add(std::uint32_t action, const char* name, std::initializer_list<scmp_arg_cmp> conditions = {}) {
        if (failure_ != 0) return;
        const int number = seccomp_syscall_resolve_name(name);
        if (number == __NR_SCMP_ERROR) return;  // newer than the library, so the default action applies
        const int done = seccomp_rule_add_array(filter_.get(), action, number,
                                                static_cast<unsigned>(conditions.size()), conditions.begin());
        // EDOM: not on this processor. EACCES: the default action does that anyway.
        if (done < 0 && done != -EDOM && done != -EACCES) failure_ = -done;
    }

    void add(std::uint32_t action, Names names) {
        for (const char* const name : names) add(action, name);
    }

    // Returns an errno value; 0 if the filter is in force.
    int load() {
        if (failure_ != 0) return failure_;
        // Calls of another architecture, for example of 32-bit programs, have other numbers.
        seccomp_attr_set(filter_.get(), SCMP_FLTATR_ACT_BADARCH, kUnknown);
        seccomp_attr_set(filter_.get(), SCMP_FLTATR_CTL_NNP, 0);       // set already
        seccomp_attr_set(filter_.get(), SCMP_FLTATR_CTL_OPTIMIZE, 2);  // a search tree, quicker at every call
        return -seccomp_load(filter_.get());
    }

  private:
    Filter filter_;
    int failure_ = 0;
};

scmp_arg_cmp is(unsigned argument, scmp_compare comparison, std::uint64_t value, std::uint64_t second = 0) {
    return {argument, comparison, value, second};
}

// Which argument of clone(2) holds the flags.
#if defined(__s390__) || defined(__CRIS__)
constexpr unsigned kCloneFlags = 1;
#else
constexpr unsigned kCloneFlags = 0;
#endif

// clone(2) starts threads; without the thread flag it makes a new process. The flags of clone3(2) are in
// memory, where no filter sees them; without clone3(2) the C library uses clone(2).
void allowThreadsOnly(Rules& rules, Calls calls) {
    rules.add(kUnknown, "clone3");
    if (kSanitized) return;
    if (calls == Calls::reading) {
        rules.add(SCMP_ACT_ALLOW, "clone", {is(kCloneFlags, SCMP_CMP_MASKED_EQ, CLONE_THREAD, CLONE_THREAD)});
    } else {
        rules.add(kRefuse, "clone", {is(kCloneFlags, SCMP_CMP_MASKED_EQ, CLONE_THREAD, 0)});
    }
}

// Whether one system call does all socket operations, as on s390x and i386. Its arguments are in memory, so a
// rule would affect every socket.
bool hasOneCallForSockets() {
    return seccomp_syscall_resolve_name("socketcall") >= 0;
}

void restrictSockets(Rules& rules, Network network) {
    if (hasOneCallForSockets()) return;
    // Every family except Unix (1), and with a network except IPv4 (2), IPv6 (10) and netlink (16); of
    // netlink, everything except routing (0).
    const bool hasNetwork = network != Network::none;
    for (std::uint64_t family = 0; family < AF_NETLINK; ++family) {
        const bool isOfTheNetwork = family == AF_INET || family == AF_INET6;
        if (family != AF_UNIX && !(hasNetwork && isOfTheNetwork))
            rules.add(kRefuse, "socket", {is(0, SCMP_CMP_EQ, family)});
    }
    rules.add(kRefuse, "socket", {is(0, SCMP_CMP_GT, AF_NETLINK)});
    if (hasNetwork)
        rules.add(kRefuse, "socket", {is(0, SCMP_CMP_EQ, AF_NETLINK), is(2, SCMP_CMP_NE, 0)});
    else
        rules.add(kRefuse, "socket", {is(0, SCMP_CMP_EQ, AF_NETLINK)});
}

Rules serviceRules(Network network) {
    Rules rules(SCMP_ACT_ALLOW);
    for (const char* const name : kForbidden) {
        if (kSanitized && std::string_view(name).starts_with("process_vm_")) continue;
        if (kSanitized && std::string_view(name) == "personality") continue;
        rules.add(kRefuse, name);
    }
    if (!kSanitized) rules.add(kRefuse, kForbiddenUnlessSanitized);
    allowThreadsOnly(rules, Calls::service);
    restrictSockets(rules, network);
    const auto self = static_cast<std::uint64_t>(getpid());
    for (const char* const call : {"kill", "tgkill", "rt_sigqueueinfo", "rt_tgsigqueueinfo"})
        if (!kSanitized) rules.add(kRefuse, call, {is(0, SCMP_CMP_NE, self)});
    rules.add(kRefuse, "prlimit64", {is(0, SCMP_CMP_NE, 0)});
    // Text inserted into the caller's terminal becomes commands for its shell.
    for (const std::uint64_t request : kTerminalInput)
        rules.add(kRefuse, "ioctl", {is(1, SCMP_CMP_MASKED_EQ, kLowWord, request)});
    return rules;
}

Rules readingRules(FilesAre files) {
    Rules rules(kUnknown);
    rules.add(SCMP_ACT_ALLOW, kReading);
    if (kSanitized) rules.add(SCMP_ACT_ALLOW, kNeededBySanitizers);
    allowThreadsOnly(rules, Calls::reading);
#ifdef PINWELL_COUNTS_DIRECTORY
    rules.add(SCMP_ACT_ALLOW, "openat");  // the counts are written at the end of the process
#endif
    rules.add(SCMP_ACT_ALLOW, "open", {is(1, SCMP_CMP_MASKED_EQ, kOpenToWrite, 0)});
    rules.add(SCMP_ACT_ALLOW, "openat", {is(2, SCMP_CMP_MASKED_EQ, kOpenToWrite, 0)});
    // Its flags are in memory too.
    if (files == FilesAre::restricted) rules.add(SCMP_ACT_ALLOW, "openat2");
    for (const std::uint64_t request : kTerminalQuestions)
        rules.add(SCMP_ACT_ALLOW, "ioctl", {is(1, SCMP_CMP_MASKED_EQ, kLowWord, request)});
    for (const std::uint64_t option : {std::uint64_t{PR_SET_NAME}, std::uint64_t{PR_GET_NAME}, kNameMemory})
        rules.add(SCMP_ACT_ALLOW, "prctl", {is(0, SCMP_CMP_EQ, option)});
    rules.add(SCMP_ACT_ALLOW, "prlimit64", {is(0, SCMP_CMP_EQ, 0)});
    rules.add(SCMP_ACT_ALLOW, "tgkill", {is(0, SCMP_CMP_EQ, static_cast<std::uint64_t>(getpid()))});
    // On a socket that is connected already: the system log.
    rules.add(SCMP_ACT_ALLOW, "sendto", {is(4, SCMP_CMP_EQ, 0)});
    return rules;
}

}  // namespace

base::Result<void> restrictCalls(Calls calls, Network network, FilesAre files) {
    Rules rules = calls == Calls::reading ? readingRules(files) : serviceRules(network);
    const int failure = rules.load();
    if (failure == 0) return {};
    // ECANCELED is the library's code for every refusal of the kernel.
    return base::Error(
        base::kPOSIXErrorDomain, failure,
        failure == ECANCELED ? "the kernel refuses it" : std::generic_category().message(failure));
}

}  // namespace pinwell::sandbox
