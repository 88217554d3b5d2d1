#include "base/places.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <seccomp.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <filesystem>
#include <system_error>
#include <thread>

#include "support/file_properties.h"
#include "support/process.h"
#include "support/temporary_directory.h"

namespace pinwell::base {
namespace {

using test::makeDirectory;
using test::makeLink;
using test::readFile;
using test::writeFile;

using Opening = FileDescriptor (*)(int root, const std::string& path, int flags, mode_t mode);

struct Way {
    const char* name;
    Opening open;
};
void PrintTo(const Way& way, std::ostream* stream) {
    *stream << way.name;
}

// A directory `root` with `root/a/b/file` in it, and a file outside.
class Beneath : public testing::TestWithParam<Way> {
  protected:
    void SetUp() override {
        writeFile(path("a/b/file"), "inside");
        writeFile(directory_ / "outside/file", "outside");
        root_ = FileDescriptor(::open((directory_ / "root").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        ASSERT_TRUE(root_);
    }

    std::string path(std::string_view name) const { return directory_ / ("root/" + std::string(name)); }
    std::string outside() const { return directory_ / "outside"; }

    FileDescriptor open(const std::string& relative, int flags = O_RDONLY) const {
        return GetParam().open(root_.get(), relative, flags, 0600);
    }

    // The contents read there, or the reason for a failure.
    std::string at(const std::string& relative, int flags = O_RDONLY) const {
        const FileDescriptor file = open(relative, flags);
        if (!file) return std::generic_category().message(errno);
        return readFile("/proc/self/fd/" + std::to_string(file.get()));
    }

    static std::string reason(int number) { return std::generic_category().message(number); }

    test::TemporaryDirectory directory_;
    FileDescriptor root_;
};

TEST_P(Beneath, OpensFilesBelow) {
    EXPECT_EQ(at("a/b/file"), "inside");
    EXPECT_EQ(at("./a//b/./file"), "inside");
    EXPECT_EQ(at("a/../a/b/file"), "inside");
}

TEST_P(Beneath, OpensTheDirectoryItself) {
    for (const char* const name : {"", ".", "a/..", "a/b/../.."}) {
        const FileDescriptor opened = open(name, O_RDONLY | O_DIRECTORY);
        ASSERT_TRUE(opened) << name;
        struct stat one {};
        struct stat other {};
        ASSERT_EQ(fstat(opened.get(), &one), 0);
        ASSERT_EQ(fstat(root_.get(), &other), 0);
        EXPECT_EQ(one.st_ino, other.st_ino) << name;
    }
}

TEST_P(Beneath, FollowsLinksThatStayBelow) {
    makeLink("b", path("a/link"));
    makeLink("../a/link/file", path("a/file"));
    makeLink("a/file", path("file"));
    EXPECT_EQ(at("a/link/file"), "inside");
    EXPECT_EQ(at("file"), "inside");
}

TEST_P(Beneath, RefusesLinksThatLeadOut) {
    makeLink(outside(), path("absolute"));
    makeLink("../outside", path("relative"));
    makeLink("../../outside/file", path("a/file"));
    makeLink("relative", path("indirect"));
    EXPECT_EQ(at("absolute/file"), reason(EXDEV));
    EXPECT_EQ(at("relative/file"), reason(EXDEV));
    EXPECT_EQ(at("a/file"), reason(EXDEV));
    EXPECT_EQ(at("indirect/file"), reason(EXDEV));
}

// After a move of the directory they would lead somewhere else.
TEST_P(Beneath, RefusesAbsoluteLinksThatLeadBackIn) {
    makeLink(path("a"), path("absolute"));
    EXPECT_EQ(at("absolute/b/file"), reason(EXDEV));
}

TEST_P(Beneath, RefusesPathsThatLeadOut) {
    EXPECT_EQ(at("../outside/file"), reason(EXDEV));
    EXPECT_EQ(at("a/../../outside/file"), reason(EXDEV));
    EXPECT_EQ(at(outside() + "/file"), reason(EXDEV));
}

TEST_P(Beneath, RefusesTheLinksOfTheProcessFileSystem) {
    makeLink("/proc/self/root/etc", path("magic"));
    EXPECT_EQ(at("magic/passwd"), reason(EXDEV));
}

TEST_P(Beneath, DoesNotFollowTheLastLinkOnRequest) {
    makeLink("b/file", path("a/link"));
    EXPECT_EQ(at("a/link"), "inside");
    EXPECT_EQ(at("a/link", O_RDONLY | O_NOFOLLOW), reason(ELOOP));
}

TEST_P(Beneath, EndsOnLinksThatGoRoundInCircles) {
    makeLink("two", path("one"));
    makeLink("one", path("two"));
    makeLink("self/self", path("self"));
    EXPECT_EQ(at("one"), reason(ELOOP));
    EXPECT_EQ(at("self/file"), reason(ELOOP));
}

TEST_P(Beneath, ReportsMissingFilesAndNonDirectories) {
    makeLink("none", path("dangling"));
    EXPECT_EQ(at("none"), reason(ENOENT));
    EXPECT_EQ(at("none/file"), reason(ENOENT));
    EXPECT_EQ(at("dangling"), reason(ENOENT));
    EXPECT_EQ(at("a/b/file/more"), reason(ENOTDIR));
    EXPECT_EQ(at("a/b/file", O_RDONLY | O_DIRECTORY), reason(ENOTDIR));
}

TEST_P(Beneath, MakesAFileBelow) {
    EXPECT_TRUE(open("a/new", O_WRONLY | O_CREAT | O_EXCL));
    EXPECT_EQ(test::permissionsOf(path("a/new")), 0600U);
    EXPECT_EQ(at("a/new"), "");
}

TEST_P(Beneath, MakesNothingThroughALinkThatLeadsOut) {
    makeLink(outside(), path("link"));
    makeLink(outside() + "/other", path("file"));
    EXPECT_FALSE(open("link/new", O_WRONLY | O_CREAT));
    EXPECT_FALSE(open("file", O_WRONLY | O_CREAT));
    EXPECT_EQ(test::namesIn(outside()), std::vector<std::string>{"file"});
}

TEST_P(Beneath, ClosesWithTheProgramThatIsStarted) {
    const FileDescriptor file = open("a/b/file");
    EXPECT_EQ(fcntl(file.get(), F_GETFD), FD_CLOEXEC);
}

// The directory's owner moves it during the test. The opened file is inside, or none is opened.
TEST_P(Beneath, IsNeverLedOutByADirectoryThatIsSwappedForALink) {
    makeLink(outside(), path("swap"));
    std::atomic<bool> stop = false;
    std::thread swapping([&] {
        while (!stop) {
            // RENAME_EXCHANGE: at every moment one of the two is there.
            renameat2(AT_FDCWD, path("swap").c_str(), AT_FDCWD, path("a/b").c_str(), RENAME_EXCHANGE);
        }
    });
    std::size_t seen = 0;
    for (int i = 0; i < 2000; ++i) {
        const std::string found = at(i % 2 == 0 ? "a/b/file" : "a/../a/b/../b/file");
        if (found == "inside") ++seen;
        EXPECT_NE(found, "outside");
    }
    stop = true;
    swapping.join();
    RecordProperty("seen", static_cast<int>(seen));
}

INSTANTIATE_TEST_SUITE_P(BothWays, Beneath,
                         testing::Values(Way{"Openat2", openBeneath}, Way{"Walk", openBeneathByWalking}),
                         [](const auto& way) { return way.param.name; });

// In a child, from which the call is taken as by a kernel or a container that does not know it.
int openingWithoutTheCall(int reason, int root, const char* path) {
    const pid_t child = fork();
    if (child == 0) {
        const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
        seccomp_rule_add(filter, SCMP_ACT_ERRNO(static_cast<unsigned>(reason)), SCMP_SYS(openat2), 0);
        if (seccomp_load(filter) != 0) _exit(255);
        const FileDescriptor opened = openBeneath(root, path, O_RDONLY);
        _exit(opened ? 0 : errno);
    }
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST(KernelWithoutOpenat2, OpensBeneathAllTheSame) {
    if (!test::emulator().empty()) GTEST_SKIP() << "an emulated program cannot filter its system calls";
    const test::TemporaryDirectory directory;
    writeFile(directory / "a/file", "inside");
    makeLink("/etc", directory / "link");
    const FileDescriptor root(::open(directory.path().c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    for (const int reason : {ENOSYS, EPERM}) {
        EXPECT_EQ(openingWithoutTheCall(reason, root.get(), "a/file"), 0);
        EXPECT_EQ(openingWithoutTheCall(reason, root.get(), "link/passwd"), EXDEV);
        EXPECT_EQ(openingWithoutTheCall(reason, root.get(), "a/none"), ENOENT);
    }
}

class HeldPlaces : public testing::Test {
  protected:
    std::string path(std::string_view name) const { return directory_ / name; }

    // The contents read at that place, or the name of the reason for a failure.
    std::string at(std::string_view name) const {
        const auto place = places_.find(path(name));
        if (!place) return place.error().localizedFailureReason();
        const auto file = place->open(O_RDONLY);
        if (!file) return file.error().localizedFailureReason();
        return readFile("/proc/self/fd/" + std::to_string(file->get()));
    }

    test::TemporaryDirectory directory_;
    Places places_;
};

TEST_F(HeldPlaces, FindsItemsThatAreNotHeldAsTheKernelDoes) {
    writeFile(path("real/file"), "there");
    makeLink(path("real"), path("link"));
    EXPECT_EQ(at("link/file"), "there");
    EXPECT_EQ(places_.find(path("none/file")).error().code(), ENOENT);
}

TEST_F(HeldPlaces, DoesNotFollowTheLastLink) {
    writeFile(path("file"), "there");
    makeLink("file", path("link"));
    EXPECT_EQ(places_.find(path("link"))->open(O_RDONLY).error().code(), ELOOP);
    EXPECT_TRUE(S_ISLNK(places_.find(path("link"))->status()->st_mode));
}

TEST_F(HeldPlaces, FindsEverythingBelowAHeldDirectoryFromItsDescriptor) {
    writeFile(path("Held.app/Contents/file"), "held");
    const auto anchor = places_.hold(path("Held.app"));
    ASSERT_TRUE(anchor);

    std::filesystem::rename(path("Held.app"), path("moved"));
    writeFile(path("Held.app/Contents/file"), "another");
    EXPECT_EQ(at("Held.app/Contents/file"), "held");
    EXPECT_TRUE(S_ISDIR(places_.find(path("Held.app"))->status()->st_mode));
}

TEST_F(HeldPlaces, RefusesLinksOutOfAHeldDirectory) {
    writeFile(path("outside/file"), "outside");
    makeDirectory(path("Held.app"));
    makeLink("../outside", path("Held.app/Contents"));
    EXPECT_EQ(at("Held.app/Contents/file"), "outside");

    const auto anchor = places_.hold(path("Held.app"));
    EXPECT_EQ(places_.find(path("Held.app/Contents/file")).error().code(), EXDEV);
    EXPECT_EQ(at("Held.app/../outside/file"), "Invalid cross-device link");
}

TEST_F(HeldPlaces, FindsAHeldFileInTheDirectoryThatWasOpened) {
    writeFile(path("held/file"), "held");
    writeFile(path("other/file"), "another");
    const auto anchor = places_.hold(path("held/file"));
    ASSERT_TRUE(anchor);

    std::filesystem::rename(path("held"), path("moved"));
    makeLink("other", path("held"));
    EXPECT_EQ(at("held/file"), "held");
    // Its siblings are found in the held directory. Deeper paths are resolved again, as they are written.
    writeFile(path("moved/sibling"), "sibling");
    writeFile(path("other/below/file"), "below");
    EXPECT_EQ(at("held/sibling"), "sibling");
    EXPECT_EQ(at("held/below/file"), "below");
}

TEST_F(HeldPlaces, KeepsTheDescriptorOfAnItemThatIsHeldTwice) {
    writeFile(path("held/file"), "held");
    auto first = places_.hold(path("held/file"));
    std::filesystem::rename(path("held"), path("moved"));
    writeFile(path("held/file"), "another");
    const auto second = places_.hold(path("held/file"));
    EXPECT_EQ(*first, *second);
    first = Error::posix(0);
    EXPECT_EQ(at("held/file"), "held");
}

TEST_F(HeldPlaces, LetsGoWithTheLastHolder) {
    writeFile(path("held/file"), "held");
    {
        const auto anchor = places_.hold(path("held/file"));
        std::filesystem::rename(path("held"), path("moved"));
        writeFile(path("held/file"), "another");
        EXPECT_EQ(at("held/file"), "held");
    }
    EXPECT_EQ(at("held/file"), "another");
}

TEST_F(HeldPlaces, FindsFromTheNearestOfSeveral) {
    writeFile(path("outer/inner/file"), "first");
    const auto outer = places_.hold(path("outer"));
    const auto inner = places_.hold(path("outer/inner"));
    std::filesystem::rename(path("outer/inner"), path("moved"));
    writeFile(path("outer/inner/file"), "second");
    EXPECT_EQ(at("outer/inner/file"), "first");
}

TEST_F(HeldPlaces, DoesNotTakeASiblingForSomethingBelow) {
    writeFile(path("Held.app/file"), "held");
    writeFile(path("Held.app2/file"), "sibling");
    const auto anchor = places_.hold(path("Held.app"));
    std::filesystem::remove_all(path("Held.app"));
    EXPECT_EQ(at("Held.app2/file"), "sibling");
}

TEST_F(HeldPlaces, CannotHoldAMissingItem) {
    EXPECT_EQ(places_.hold(path("none")).error().code(), ENOENT);
    EXPECT_EQ(places_.hold(path("none/none")).error().code(), ENOENT);
}

TEST_F(HeldPlaces, HoldsALinkItself) {
    makeDirectory(path("real"));
    makeLink("real", path("Link.app"));
    const auto anchor = places_.hold(path("Link.app"));
    ASSERT_TRUE(anchor);
    EXPECT_FALSE((*anchor)->isTree());
    EXPECT_TRUE(S_ISLNK(places_.find(path("Link.app"))->status()->st_mode));
}

TEST_F(HeldPlaces, HoldsTheRootDirectory) {
    const auto anchor = places_.hold("/");
    ASSERT_TRUE(anchor);
    writeFile(path("file"), "there");
    EXPECT_EQ(at("file"), "there");
}

}  // namespace
}  // namespace pinwell::base
