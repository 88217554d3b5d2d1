#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>
#include <csignal>

#include <algorithm>
#include <array>
#include <cerrno>
#include <iterator>
#include <thread>

#include "base/handle.h"
#include "confined_child.h"
#include "runtime/process.h"
#include "support/file_properties.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using sandbox::Access;
using sandbox::Calls;
using sandbox::Confinement;
using sandbox::Network;

int opening(const std::string& path, int flags) {
    return reasonOf(open(path.c_str(), flags | O_CLOEXEC, 0600));
}

class Confined : public testing::Test {
  protected:
    void SetUp() override {
        if (const auto missing = confinementMissing())
            GTEST_SKIP() << "nothing is confined here: " << *missing;
        writeFile(directory / "given/file", "given");
        writeFile(directory / "given/below/file", "given");
        writeFile(directory / "other/file", "other");
    }

    std::string given(std::string_view name) const { return directory / "given/" + std::string(name); }

    Confinement reading() const { return {.files = {{directory / "given", Access::read}}}; }
    Confinement writing() const { return {.files = {{directory / "given", Access::write}}}; }

    TemporaryDirectory directory;
};

using ConfinedFiles = Confined;

TEST_F(ConfinedFiles, AreReadOnlyWhereNamed) {
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(given("below/file"), O_RDONLY); }), 0);
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(directory / "other/file", O_RDONLY); }), EACCES);
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(directory / "other", O_RDONLY); }), EACCES);
    EXPECT_EQ(whenConfined(reading(), [&] { return opening("/etc/passwd", O_RDONLY); }), EACCES);
}

TEST_F(ConfinedFiles, AreNotReachedByALinkFromWhereTheyAreNamed) {
    makeLink(directory / "other/file", given("link"));
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(given("link"), O_RDONLY); }), EACCES);
}

TEST_F(ConfinedFiles, AreNotWrittenWhereOnlyReadingIsNamed) {
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(given("file"), O_WRONLY); }), EACCES);
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(given("file"), O_RDONLY | O_TRUNC); }), EACCES);
    EXPECT_EQ(whenConfined(reading(), [&] { return opening(given("new"), O_WRONLY | O_CREAT); }), EACCES);
    EXPECT_EQ(whenConfined(reading(), [&] { return reasonOf(unlink(given("file").c_str())); }), EACCES);
    EXPECT_EQ(whenConfined(reading(), [&] { return reasonOf(mkdir(given("new").c_str(), 0700)); }), EACCES);
}

TEST_F(ConfinedFiles, AreMadeReplacedAndRemovedWhereWritingIsNamed) {
    const int result = whenConfined(writing(), [&] {
        if (const int reason = reasonOf(mkdir(given("new").c_str(), 0700))) return reason;
        if (const int reason = opening(given("new/file"), O_WRONLY | O_CREAT)) return reason;
        if (const int reason = reasonOf(truncate(given("new/file").c_str(), 5))) return reason;
        if (const int reason = reasonOf(rename(given("new/file").c_str(), given("file").c_str())))
            return reason;
        return reasonOf(rmdir(given("new").c_str()));
    });
    EXPECT_EQ(result, 0);
    EXPECT_EQ(readFile(given("file")), std::string(5, '\0'));
}

TEST_F(ConfinedFiles, AreNotMovedOutOfWhereWritingIsNamed) {
    const auto attempt = [&] {
        return reasonOf(rename(given("file").c_str(), (directory / "other/taken").c_str()));
    };
    EXPECT_NE(whenConfined(writing(), attempt), 0);
    EXPECT_EQ(readFile(given("file")), "given");
}

TEST_F(ConfinedFiles, AreNeitherLinksNorDevicesNorPipes) {
    EXPECT_EQ(whenConfined(writing(), [&] { return reasonOf(symlink("/etc", given("link").c_str())); }),
              EACCES);
    EXPECT_NE(whenConfined(writing(), [&] { return reasonOf(mkfifo(given("pipe").c_str(), 0600)); }), 0);
}

TEST_F(ConfinedFiles, AreNamedByARuleForOneFileAlone) {
    const Confinement one{.files = {{given("file"), Access::write}}};
    EXPECT_EQ(whenConfined(one, [&] { return opening(given("file"), O_RDWR); }), 0);
    EXPECT_EQ(whenConfined(one, [&] { return opening(given("below/file"), O_RDONLY); }), EACCES);
    EXPECT_EQ(whenConfined(one, [&] { return reasonOf(unlink(given("file").c_str())); }), EACCES);
}

TEST_F(ConfinedFiles, ThatDoNotExistGiveNoRight) {
    const Confinement missing{.files = {{given("file"), Access::read}, {directory / "none", Access::write}}};
    EXPECT_EQ(whenConfined(missing, [&] { return opening(given("file"), O_RDONLY); }), 0);
    EXPECT_EQ(whenConfined(missing, [&] { return reasonOf(mkdir((directory / "none").c_str(), 0700)); }),
              EACCES);
}

TEST_F(ConfinedFiles, MayBeNamedByAPipeWhichIsReadInAnyCase) {
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    const std::string name = "/proc/self/fd/" + std::to_string(ends[0]);
    Confinement confinement = reading();
    confinement.files.push_back({name, Access::read});
    EXPECT_EQ(whenConfined(confinement, [&] { return opening(given("file"), O_RDONLY); }), 0);
    EXPECT_EQ(whenConfined(confinement, [&] { return opening(directory / "other/file", O_RDONLY); }), EACCES);
    for (const int end : ends) close(end);
}

TEST_F(ConfinedFiles, StayOpenWhenTheyWereOpenBefore) {
    const int before = open((directory / "other/file").c_str(), O_RDONLY | O_CLOEXEC);
    char letter = 0;
    EXPECT_EQ(whenConfined(reading(), [&] { return reasonOf(read(before, &letter, 1)); }), 0);
    close(before);
}

using runtime::kSanitized;  // its own tools start programs, trace, fork and read memory

/// A forbidden call. Its arguments do no harm if it is allowed.
struct ForbiddenCall {
    const char* name;
    Attempt attempt;
    bool unlessSanitized = false;
};

void PrintTo(const ForbiddenCall& call, std::ostream* stream) {
    *stream << call.name;
}

const std::array<const char*, 2> kNoWords{nullptr, nullptr};

const std::vector<ForbiddenCall> kForbiddenCalls{
    {"bpf", [] { return reasonOf(syscall(SYS_bpf, 0, nullptr, 0)); }},
    {"chroot", [] { return reasonOf(chroot("/")); }},
    {"deleteModule", [] { return reasonOf(syscall(SYS_delete_module, nullptr, 0)); }},
    {"ioUring", [] { return reasonOf(syscall(SYS_io_uring_setup, 1, nullptr)); }},
    {"keyctl", [] { return reasonOf(syscall(SYS_keyctl, 0, 0, 0, 0, 0)); }},
    {"killOfTheParent", [] { return reasonOf(kill(getppid(), 0)); }},
    {"mount", [] { return reasonOf(syscall(SYS_mount, nullptr, nullptr, nullptr, 0, nullptr)); }},
    {"openByHandle", [] { return reasonOf(syscall(SYS_open_by_handle_at, -1, nullptr, 0)); }},
    {"openTree", [] { return reasonOf(syscall(SYS_open_tree, -1, "", 0)); }},
    {"packetSocket", [] { return reasonOf(socket(AF_PACKET, SOCK_DGRAM | SOCK_CLOEXEC, 0)); }},
    {"perfEvents", [] { return reasonOf(syscall(SYS_perf_event_open, nullptr, 0, -1, -1, 0)); }},
    {"prlimitOfTheParent", [] { return reasonOf(prlimit(getppid(), RLIMIT_CORE, nullptr, nullptr)); }},
    {"setuid", [] { return reasonOf(syscall(SYS_setuid, getuid())); }},
    {"swapoff", [] { return reasonOf(syscall(SYS_swapoff, nullptr)); }},
    {"terminalInput", [] { return reasonOf(ioctl(-1, TIOCSTI, "x")); }},
    {"umount", [] { return reasonOf(syscall(SYS_umount2, nullptr, 0)); }},
    {"unshare", [] { return reasonOf(unshare(0)); }},
    {"userfaultfd", [] { return reasonOf(syscall(SYS_userfaultfd, 0)); }},
    {"exec",
     [] {
         return reasonOf(
             syscall(SYS_execve, "/proc/self/none", kNoWords.data(), kNoWords.data()));  // NOLINT: no words
     },
     true},
    {"execByDescriptor",
     [] { return reasonOf(syscall(SYS_execveat, -1, "", kNoWords.data(), kNoWords.data(), 0)); }, true},
    {"fork",
     [] {
         const long child = syscall(SYS_clone, SIGCHLD, nullptr, nullptr, nullptr, 0);
         if (child == 0) _exit(0);
         return reasonOf(child);
     },
     true},
    {"processMemory", [] { return reasonOf(syscall(SYS_process_vm_readv, 1, nullptr, 0, nullptr, 0, 0)); },
     true},
    {"ptrace", [] { return reasonOf(syscall(SYS_ptrace, 0, 0, nullptr, nullptr)); }, true},
};

std::vector<ForbiddenCall> forbiddenCalls(bool unlessSanitized) {
    std::vector<ForbiddenCall> calls;
    std::copy_if(kForbiddenCalls.begin(), kForbiddenCalls.end(), std::back_inserter(calls),
                 [&](const ForbiddenCall& call) { return call.unlessSanitized == unlessSanitized; });
    return calls;
}

class ForbiddenCalls : public Confined, public testing::WithParamInterface<ForbiddenCall> {};

TEST_P(ForbiddenCalls, AreRefusedToAService) {
    EXPECT_EQ(whenConfined(writing(), GetParam().attempt), EPERM);
}

TEST_P(ForbiddenCalls, AreRefusedToAReader) {
    Confinement confinement = reading();
    confinement.calls = Calls::reading;
    EXPECT_THAT(whenConfined(confinement, GetParam().attempt), testing::AnyOf(EPERM, ENOSYS));
}

std::string nameOf(const testing::TestParamInfo<ForbiddenCall>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(Everywhere, ForbiddenCalls, testing::ValuesIn(forbiddenCalls(false)), nameOf);
INSTANTIATE_TEST_SUITE_P(UnlessSanitized, ForbiddenCalls,
                         testing::ValuesIn(kSanitized ? std::vector<ForbiddenCall>{} : forbiddenCalls(true)),
                         nameOf);
GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(ForbiddenCalls);

using ConfinedReader = Confined;

#if defined(__x86_64__)
// getpid(2) by the gate and the number of 32-bit programs; a kernel without them faults.
int callingAs32Bit() {
    long result = 20;
    __asm__ volatile("int $0x80" : "+a"(result) : : "memory");
    return result < 0 ? static_cast<int>(-result) : 0;
}

TEST_F(ConfinedReader, HasNoCallsOfOtherArchitectures) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) _exit(callingAs32Bit());
    int status = 0;
    waitpid(child, &status, 0);
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) GTEST_SKIP() << "this kernel has none";
    EXPECT_EQ(whenConfined(writing(), callingAs32Bit), ENOSYS);
    Confinement confinement = reading();
    confinement.calls = Calls::reading;
    EXPECT_EQ(whenConfined(confinement, callingAs32Bit), ENOSYS);
}
#endif

#ifdef PINWELL_COUNTS
constexpr bool kReaderWritesCounts = true;
#else
constexpr bool kReaderWritesCounts = false;
#endif

TEST_F(ConfinedReader, ChangesNothingOfAFile) {
    if (kReaderWritesCounts) GTEST_SKIP() << "this build writes down what runs";
    if (kSanitized) GTEST_SKIP() << "a sanitizer removes files of its own";
    const std::string file = given("file");
    // Even if a rule would allow it.
    Confinement confinement = writing();
    confinement.calls = Calls::reading;
    const auto refused = testing::AnyOf(EPERM, ENOSYS);
    EXPECT_THAT(whenConfined(confinement, [&] { return reasonOf(chmod(file.c_str(), 0)); }), refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return reasonOf(chown(file.c_str(), 0, 0)); }), refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return reasonOf(utimensat(0, file.c_str(), nullptr, 0)); }),
                refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return reasonOf(truncate(file.c_str(), 0)); }), refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return reasonOf(unlink(file.c_str())); }), refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return reasonOf(rename(file.c_str(), file.c_str())); }),
                refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return opening(file, O_WRONLY); }), refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return opening(file, O_RDONLY | O_TRUNC); }), refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return opening(given("new"), O_RDONLY | O_CREAT); }),
                refused);
    EXPECT_THAT(whenConfined(confinement, [&] { return opening(given(""), O_RDWR | O_TMPFILE); }), refused);
    EXPECT_EQ(readFile(file), "given");
}

TEST_F(ConfinedReader, HasNoSockets) {
    Confinement confinement = reading();
    confinement.calls = Calls::reading;
    for (const int family : {AF_UNIX, AF_INET, AF_INET6, AF_NETLINK}) {
        EXPECT_THAT(whenConfined(confinement,
                                 [&] { return reasonOf(socket(family, SOCK_STREAM | SOCK_CLOEXEC, 0)); }),
                    testing::AnyOf(EPERM, ENOSYS))
            << family;
    }
}

TEST_F(ConfinedReader, StillHasThreadsAndMemory) {
    Confinement confinement = reading();
    confinement.calls = Calls::reading;
    const int result = whenConfined(confinement, [&] {
        int seen = 1;
        std::thread([&] { seen = opening(given("file"), O_RDONLY); }).join();
        return seen;
    });
    EXPECT_EQ(result, 0);
}

using ConfinedService = Confined;

#ifdef SYS_socketcall
constexpr bool kOneCallForSockets = true;  // no filter sees its arguments
#else
constexpr bool kOneCallForSockets = false;
#endif

int openingSocket(int family, int type) {
    return reasonOf(socket(family, type | SOCK_CLOEXEC, 0));
}

TEST_F(ConfinedService, HasTheSocketsOfNamesAndConnections) {
    Confinement confinement = writing();
    confinement.network = Network::connect;
    for (const int family : {AF_UNIX, AF_INET, AF_INET6})
        EXPECT_EQ(whenConfined(confinement, [&] { return openingSocket(family, SOCK_STREAM); }), 0) << family;
    EXPECT_EQ(whenConfined(confinement, [] { return openingSocket(AF_NETLINK, SOCK_RAW); }), 0);
}

TEST_F(ConfinedService, WithoutANetworkHasSocketsOfTheFileSystemAlone) {
    if (kOneCallForSockets) GTEST_SKIP() << "here sockets cannot be told apart";
    EXPECT_EQ(whenConfined(writing(), [] { return openingSocket(AF_UNIX, SOCK_STREAM); }), 0);
    for (const int family : {AF_INET, AF_INET6})
        for (const int type : {SOCK_STREAM, SOCK_DGRAM})
            EXPECT_EQ(whenConfined(writing(), [&] { return openingSocket(family, type); }), EPERM) << family;
    EXPECT_EQ(whenConfined(writing(), [] { return openingSocket(AF_NETLINK, SOCK_RAW); }), EPERM);
}

/// A TCP socket from before the confinement.
class OpenSocket {
  public:
    int bindIt() const { return with(0, ::bind); }
    int connectIt() const { return with(1, ::connect); }  // to a port without a listener

  private:
    int with(in_port_t port, int (*call)(int, const sockaddr*, socklen_t)) const {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(port);
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        // NOLINTNEXTLINE: the interface of sockets
        return reasonOf(call(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address));
    }

    base::FileDescriptor socket_{socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)};
};

TEST_F(ConfinedService, UsesTcpAsItWasGiven) {
    if (syscall(SYS_landlock_create_ruleset, nullptr, 0, 1) < 4)
        GTEST_SKIP() << "this kernel's Landlock does not know TCP";
    const OpenSocket tcp;
    const auto binding = [&] { return tcp.bindIt(); };
    const auto connecting = [&] { return tcp.connectIt(); };
    Confinement confinement = reading();
    EXPECT_EQ(whenConfined(confinement, connecting), EACCES);
    EXPECT_EQ(whenConfined(confinement, binding), EACCES);
    confinement.network = Network::connect;
    EXPECT_EQ(whenConfined(confinement, connecting), ECONNREFUSED);
    EXPECT_EQ(whenConfined(confinement, binding), EACCES);
    confinement.network = Network::listen;
    EXPECT_EQ(whenConfined(confinement, binding), 0);
}

TEST_F(ConfinedService, HasThreadsButNoChildren) {
    EXPECT_EQ(whenConfined(writing(),
                           [] {
                               int seen = 1;
                               std::thread([&] { seen = 0; }).join();
                               return seen;
                           }),
              0);
}

TEST_F(ConfinedService, GainsNoPrivileges) {
    EXPECT_EQ(whenConfined(writing(), [] { return prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0); }), 1);
}

using KernelWithoutAFacility = Confined;

TEST_F(KernelWithoutAFacility, LeavesFilesUnconfinedAndReportsIt) {
    const Outcome outcome = whenConfinedWithout(Missing::landlock, reading(),
                                                [&] { return opening(directory / "other/file", O_RDWR); });
    EXPECT_EQ(outcome.said, "Landlock is not in force: Function not implemented\n");
    EXPECT_EQ(outcome.result, 0);
}

TEST_F(KernelWithoutAFacility, StillHasTheOther) {
    const auto mounting = [] { return reasonOf(syscall(SYS_umount2, nullptr, 0)); };
    EXPECT_EQ(whenConfinedWithout(Missing::landlock, reading(), mounting).result, EPERM);

    const Outcome outcome = whenConfinedWithout(Missing::seccomp, reading(),
                                                [&] { return opening(directory / "other/file", O_RDONLY); });
    EXPECT_THAT(outcome.said, testing::StartsWith("seccomp is not in force: "));
    EXPECT_EQ(outcome.result, EACCES);
}

TEST_F(KernelWithoutAFacility, StillKeepsAReaderFromWriting) {
    if (kReaderWritesCounts) GTEST_SKIP() << "this build writes down what runs";
    Confinement confinement = reading();
    confinement.calls = Calls::reading;
    const auto refused = testing::AnyOf(EPERM, ENOSYS);
    const auto attempt = [&] { return opening(given("file"), O_WRONLY); };
    EXPECT_THAT(whenConfinedWithout(Missing::landlock, confinement, attempt).result, refused);

    struct {
        std::uint64_t flags, mode, resolve;
    } how{O_WRONLY, 0, 0};
    const auto around = [&] {
        return reasonOf(syscall(SYS_openat2, AT_FDCWD, given("file").c_str(), &how, sizeof how));
    };
    EXPECT_THAT(whenConfinedWithout(Missing::landlock, confinement, around).result, refused);
}

TEST(CoreDumps, AreForbiddenForEver) {
    const pid_t child = fork();
    if (child == 0) {
        sandbox::forbidCoreDumps();
        rlimit limit{};
        getrlimit(RLIMIT_CORE, &limit);
        // A sanitizer reads the memory of its own process, which must be dumpable for this.
        const bool isDumpable = prctl(PR_GET_DUMPABLE, 0, 0, 0, 0) != 0;
        _exit(limit.rlim_max == 0 && isDumpable == kSanitized ? 0 : 1);
    }
    int status = 0;
    waitpid(child, &status, 0);
    EXPECT_EQ(status, 0);
}

}  // namespace
}  // namespace pinwell::test
