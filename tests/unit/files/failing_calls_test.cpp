// Whichever call fails: the error is reported, the old or the new file is there, no incomplete file remains,
// and no file stays open.
#include "support/failing_calls.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>
#include <set>

#include "files/file_manager.h"
#include "fixture.h"
#include "support/fake_file_manager.h"
#include "support/volume.h"
#include "values/url.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using files::FileManager;
using files::URL;
using testing::AnyOf;
using testing::ElementsAre;
using testing::IsSubsetOf;
using testing::StartsWith;

struct CallsOfAnOperation {
    std::set<std::string> tried = {};     // at least these: each of them fails once in the operation's test
    std::set<std::string> fatal = {};     // of these, each makes the operation fail at least once
    std::set<std::string> harmless = {};  // only these may fail although the operation does its work
};

const std::map<std::string, CallsOfAnOperation> kCallsOf{
    {"copyContents", {.tried = {"fsync"}}},
    {"copyItem",
     {.tried = {"ioctl"},
      .fatal = {"fstatat", "openat", "fstat", "lseek", "ftruncate", "fchmod", "fchown", "flistxattr",
                "fgetxattr", "fsetxattr", "futimens", "close"},
      .harmless = {"ioctl", "copy_file_range", "close"}}},
    {"replaceItem",
     {.tried = {"fstatat", "openat", "fstat", "fchmod", "fchown", "flistxattr", "fgetxattr", "fsetxattr",
                "fsync", "renameat"},
      .harmless = {"fsync", "close", "unlinkat"}}},
    {"writeFile, atomic", {.tried = {"openat", "fstat", "fchmod", "write", "fsync", "close", "renameat"}}},
    {"writeFile, plain", {.tried = {"openat", "fstat", "fchmod", "write", "fsync", "close"}}},
    {"writeFile, over a file", {.tried = {"ftruncate", "write", "fsync"}}},
    {"createReplacementDirectory", {.tried = {"fstatat", "mkdirat", "openat", "fchmod"}}},
    {"removeItem", {.tried = {"open", "openat", "fstat", "fdopendir", "readdir", "unlinkat"}}},
    {"contentsOfFile", {.tried = {"fstatat", "openat", "fstat", "read"}}},
};

// The kernel's own ways to copy, before the file manager reads and writes.
const std::set<std::string> kCopiesOfTheKernel{"ioctl", "copy_file_range"};

auto IsHarmlessFor(const char* operation) {
    return testing::AnyOfArray(kCallsOf.at(operation).harmless);
}

class FailingCalls : public FilesTest {
  protected:
    // The outcome of an attempt: `nullopt` on success, otherwise its errno.
    using Attempt = std::function<std::optional<std::int64_t>()>;

    template <class T>
    static std::optional<std::int64_t> outcome(const base::Result<T>& result) {
        if (result) return std::nullopt;
        EXPECT_FALSE(result.error().path().empty()) << "the error names no path";
        return result.error().code();
    }

    // Makes the attempt once for every call in it, with that call failing; `check` gets the call and the
    // outcome. Returns the names of the failed calls.
    std::set<std::string> failEachCall(const std::function<void()>& prepare, const Attempt& attempt,
                                       const std::function<void(const std::string&, bool)>& check) {
        std::set<std::string> names;
        for (std::size_t number = 0;; ++number) {
            prepare();
            const std::size_t openBefore = openFileCount();
            std::optional<std::int64_t> reason;
            std::string failed;
            {
                const Trouble trouble = Trouble::atCall(number, EIO);
                reason = attempt();
                failed = trouble.failedCall();
            }
            EXPECT_EQ(openFileCount(), openBefore) << "after call " << number << ", " << failed;
            if (reason) {
                EXPECT_EQ(*reason, EIO) << "after call " << number << ", " << failed;
            }
            check(failed, reason.has_value());
            if (failed.empty()) {
                EXPECT_FALSE(reason) << "failed without a cause";
                return names;
            }
            names.insert(failed);
        }
    }

    void clear() {
        for (const auto& entry : std::filesystem::directory_iterator(directory.path()))
            std::filesystem::remove_all(entry.path());
    }

    void prepareFiles() {
        clear();
        writeFile(path("original"), "old");
        setAttribute(path("original"), "user.origin", "somewhere");
        setAttribute(path("original"), kAccessControlList, listThatLetsAnotherRead());
    }
};

TEST_F(FailingCalls, InACopyOfContentsLeaveAllOfThemOrNone) {
    const auto calls = failEachCall(
        [&] { prepareFiles(); }, [&] { return outcome(manager->copyContents(url("original"), url("copy"))); },
        [&](const std::string& failed, bool isError) {
            EXPECT_EQ(readFile(path("original")), "old");
            if (isError) {
                EXPECT_THAT(namesIn(directory.path()), ElementsAre("original")) << failed;
            } else {
                EXPECT_EQ(readFile(path("copy")), "old");
            }
        });
    EXPECT_THAT(kCallsOf.at("copyContents").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InACopyLeaveAWholeCopyOrNone) {
    std::set<std::string> fatal;
    const auto calls = failEachCall(
        [&] { prepareFiles(); }, [&] { return outcome(manager->copyItem(url("original"), url("copy"))); },
        [&](const std::string& failed, bool isError) {
            EXPECT_EQ(readFile(path("original")), "old");
            if (isError) {
                fatal.insert(failed);
                EXPECT_THAT(namesIn(directory.path()), ElementsAre("original")) << failed;
                return;
            }
            EXPECT_THAT(failed, AnyOf("", IsHarmlessFor("copyItem")));
            EXPECT_EQ(readFile(path("copy")), "old");
            EXPECT_EQ(attribute(path("copy"), "user.origin"), "somewhere");
            EXPECT_EQ(attribute(path("copy"), kAccessControlList), listThatLetsAnotherRead());
        });
    EXPECT_THAT(kCallsOf.at("copyItem").fatal, IsSubsetOf(fatal));
    EXPECT_THAT(kCallsOf.at("copyItem").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InACopyByHandNameTheFileThatTheyConcern) {
    for (const auto& [call, name] : {std::pair{"pread", "original"}, {"pwrite", "copy"}}) {
        prepareFiles();
        base::Result<void> done;
        {
            std::set<std::string> failing = kCopiesOfTheKernel;
            failing.insert(call);
            const Trouble trouble = Trouble::atEvery(failing, ENOSPC);
            done = manager->copyItem(url("original"), url("copy"));
        }
        EXPECT_THAT(done, FailsWith(ENOSPC, path(name)));
        EXPECT_THAT(namesIn(directory.path()), ElementsAre("original"));
    }
}

TEST_F(FailingCalls, InACopyFallBackToReadingAndWriting) {
    const std::string contents = irregularBytes(300'001);
    for (const int reason : {EXDEV, EINVAL, EOPNOTSUPP, ENOSYS, EPERM}) {
        clear();
        writeFile(path("original"), contents);
        {
            const Trouble trouble = Trouble::atEvery(kCopiesOfTheKernel, reason);
            ASSERT_THAT(manager->copyItem(url("original"), url("copy")), Succeeds());
        }
        EXPECT_EQ(readFile(path("copy")), contents);
    }
}

TEST_F(FailingCalls, InACopyOfAFileSystemThatKnowsNoHoles) {
    const std::string contents = irregularBytes(300'001);
    writeFile(path("original"), contents);
    {
        const Trouble trouble = Trouble::atEvery({"lseek"}, EINVAL);
        ASSERT_THAT(manager->copyItem(url("original"), url("copy")), Succeeds());
    }
    EXPECT_EQ(readFile(path("copy")), contents);
}

TEST_F(FailingCalls, ThatLoseAnAccessControlListGrantNoAccess) {
    prepareFiles();
    ASSERT_EQ(permissionsOf(path("original")), 0640U);  // the mask; the owning group itself has no rights
    {
        const Trouble trouble = Trouble::atEvery({"fsetxattr"}, EOPNOTSUPP);
        ASSERT_THAT(manager->copyItem(url("original"), url("copy")), Succeeds());
    }
    EXPECT_EQ(permissionsOf(path("copy")), 0600U);
}

TEST_F(FailingCalls, InAReplacementLeaveTheOldFileOrTheNewOne) {
    URL copy = url("none");
    const auto calls = failEachCall(
        [&] {
            prepareFiles();
            // By another manager: the one that makes a replacement directory keeps it open.
            const auto made =
                files::makeLocalFileManager(plainTypeNaming)->createReplacementDirectory(url("original"));
            copy = made->appendingPathComponent("original");
            writeFile(copy.path(), "new");
        },
        [&] { return outcome(manager->replaceItem(url("original"), copy)); },
        [&](const std::string& failed, bool isError) {
            const std::string now = readFile(path("original"));
            EXPECT_THAT(now, AnyOf("old", "new")) << failed;
            EXPECT_EQ(attribute(path("original"), "user.origin"), "somewhere") << failed;
            EXPECT_EQ(attribute(path("original"), kAccessControlList), listThatLetsAnotherRead()) << failed;
            if (now == "old") {
                EXPECT_TRUE(isError) << failed;
                EXPECT_EQ(readFile(copy.path()), "new") << failed;
            } else {
                EXPECT_EQ(namesIn(directory.path()).size(), failed == "unlinkat" ? 2U : 1U) << failed;
                EXPECT_THAT(failed, AnyOf("", IsHarmlessFor("replaceItem")));
            }
        });
    EXPECT_THAT(kCallsOf.at("replaceItem").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InAnAtomicWriteLeaveTheOldFileOrTheNewOne) {
    const auto calls = failEachCall(
        [&] {
            clear();
            writeFile(path("file"), "old");
        },
        [&] {
            return outcome(manager->writeFile(asBytes("new"), url("file"), FileManager::Writing::atomic));
        },
        [&](const std::string& failed, bool isError) {
            EXPECT_THAT(namesIn(directory.path()), ElementsAre("file")) << failed;
            const std::string now = readFile(path("file"));
            EXPECT_THAT(now, AnyOf("old", "new")) << failed;
            if (now == "old") {
                EXPECT_TRUE(isError) << failed;
            }
        });
    EXPECT_THAT(kCallsOf.at("writeFile, atomic").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InAPlainWriteLeaveAWholeNewFileOrNone) {
    const auto calls = failEachCall(
        [&] { clear(); },
        [&] { return outcome(manager->writeFile(asBytes("new"), url("file"), FileManager::Writing::plain)); },
        [&](const std::string& failed, bool isError) {
            EXPECT_EQ(exists(path("file")), !isError) << failed;
            if (!isError) {
                EXPECT_EQ(readFile(path("file")), "new") << failed;
            }
        });
    EXPECT_THAT(kCallsOf.at("writeFile, plain").tried, IsSubsetOf(calls));
}

// A flush of the file alone would not make its name durable.
TEST_F(FailingCalls, OrNotANewFileIsFlushedAndThenItsDirectory) {
    const URL original = url("folder/original");
    struct Row {
        const char* way;
        std::function<base::Result<void>(const URL&)> make;
    };
    const std::vector<Row> rows{
        {"written plainly",
         [&](const URL& file) {
             return manager->writeFile(asBytes("x"), file, FileManager::Writing::plain);
         }},
        {"written atomically",
         [&](const URL& file) {
             return manager->writeFile(asBytes("x"), file, FileManager::Writing::atomic);
         }},
        {"copied", [&](const URL& file) { return manager->copyContents(original, file); }},
        {"put in another's place", [&](const URL& file) { return manager->replaceItem(original, file); }},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.way);
        clear();
        writeFile(original.path(), "contents");
        const bool replaces = &row == &rows.back();
        if (replaces) writeFile(path("folder/file"), "replacement");
        const Trouble trouble = Trouble::none();
        ASSERT_THAT(row.make(url("folder/file")), Succeeds());
        EXPECT_THAT(trouble.flushed(), ElementsAre(StartsWith(path("folder/")), path("folder")));
    }
}

TEST_F(FailingCalls, InTheFlushOfADirectoryMeanNothingWhereItsFileSystemKnowsNone) {
    for (const auto& [reason, status] : {std::pair{EINVAL, true}, {EIO, false}}) {
        std::size_t flushes = 0;
        for (std::size_t number = 0; flushes < 2; ++number) {
            clear();
            const Trouble trouble = Trouble::atCall(number, reason);
            const auto done = manager->writeFile(asBytes("x"), url("file"), FileManager::Writing::plain);
            ASSERT_FALSE(trouble.failedCall().empty());
            if (trouble.failedCall() != "fsync" || ++flushes == 1) continue;
            EXPECT_EQ(done.has_value(), status) << strerror(reason);
        }
    }
}

TEST_F(FailingCalls, InAnOverwriteComeOut) {
    const auto calls = failEachCall(
        [&] {
            clear();
            writeFile(path("file"), "older");
        },
        [&] { return outcome(manager->writeFile(asBytes("new"), url("file"), FileManager::Writing::plain)); },
        [&](const std::string& failed, bool isError) {
            EXPECT_TRUE(exists(path("file"))) << failed;
            if (!isError) {
                EXPECT_EQ(readFile(path("file")), "new") << failed;
            }
        });
    EXPECT_THAT(kCallsOf.at("writeFile, over a file").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InTheQuestionOfCloningLeaveNothing) {
    failEachCall([&] { prepareFiles(); },
                 [&] { return outcome(manager->volumeSupportsCloning(url("original"))); },
                 [&](const std::string& failed, bool) {
                     EXPECT_THAT(namesIn(directory.path()), ElementsAre("original")) << failed;
                     EXPECT_EQ(readFile(path("original")), "old") << failed;
                 });
}

TEST_F(FailingCalls, InTheProbeOfCloningMeanNoIfTheKernelLacksSupport) {
    prepareFiles();
    for (const int reason : {EOPNOTSUPP, EXDEV, ENOTTY, EINVAL}) {
        const Trouble trouble = Trouble::atEvery({"ioctl"}, reason);
        const auto answer = manager->volumeSupportsCloning(url("original"));
        ASSERT_THAT(answer, Succeeds());
        EXPECT_FALSE(*answer) << reason;
    }
}

TEST_F(FailingCalls, InTheMakingOfAReplacementDirectoryLeaveNone) {
    const auto calls = failEachCall([&] { prepareFiles(); },
                                    [&] {
                                        // Keeps the directory that it makes open during its life.
                                        const auto fresh = files::makeLocalFileManager(plainTypeNaming);
                                        return outcome(fresh->createReplacementDirectory(url("original")));
                                    },
                                    [&](const std::string& failed, bool isError) {
                                        EXPECT_EQ(namesIn(directory.path()).size(), isError ? 1U : 2U)
                                            << failed;
                                    });
    EXPECT_THAT(kCallsOf.at("createReplacementDirectory").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InARemovalComeOutAndItCanBeFinished) {
    const auto calls = failEachCall(
        [&] {
            clear();
            for (const char* name : {"tree/a/b/c", "tree/a/d", "tree/e"}) writeFile(path(name), "x");
        },
        [&] { return outcome(manager->removeItem(url("tree"))); },
        [&](const std::string& failed, bool isError) {
            EXPECT_EQ(exists(path("tree")), isError) << failed;
            if (isError) {
                EXPECT_THAT(manager->removeItem(url("tree")), Succeeds()) << failed;
            }
            EXPECT_THAT(namesIn(directory.path()), ElementsAre()) << failed;
        });
    EXPECT_THAT(kCallsOf.at("removeItem").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, InAWholeReadComeOut) {
    const auto calls = failEachCall([&] { prepareFiles(); },
                                    [&] { return outcome(manager->contentsOfFile(url("original"))); },
                                    [](const std::string&, bool) {});
    EXPECT_THAT(kCallsOf.at("contentsOfFile").tried, IsSubsetOf(calls));
}

TEST_F(FailingCalls, OfAHandleAreReportedWithTheOperation) {
    writeFile(path("file"), "contents");
    struct Row {
        const char* call;
        std::function<void(files::FileHandle&)> operation;
        std::string attempt;
    };
    const std::vector<Row> rows{
        {"lseek", [](files::FileHandle& handle) { handle.seekToEnd(); }, "seek in"},
        {"lseek", [](files::FileHandle& handle) { handle.seek(1); }, "seek in"},
        {"lseek", [](files::FileHandle& handle) { handle.position(); }, "seek in"},
        {"pread", [](files::FileHandle& handle) { handle.readUpTo(0, 1); }, "read"},
        {"write", [](files::FileHandle& handle) { handle.write(asBytes("x")); }, "write to"},
        {"ftruncate", [](files::FileHandle& handle) { handle.truncate(1); }, "truncate"},
        {"fsync", [](files::FileHandle& handle) { handle.synchronize(); }, "synchronize"},
        {"close", [](files::FileHandle& handle) { handle.close(); }, "close"},
    };
    for (const Row& row : rows) {
        const auto handle = manager->openForUpdating(url("file"));
        ASSERT_THAT(handle, Succeeds());
        std::string reason;
        {
            const Trouble trouble = Trouble::atEvery({row.call}, EIO);
            try {
                row.operation(**handle);
            } catch (const base::FileFailure& failure) {
                reason = failure.what();
            }
        }
        EXPECT_EQ(reason, "Cannot " + row.attempt + " " + path("file") + ": Input/output error");
    }
}

// All operations of the file manager on files, once each.
void doAll(FileManager& manager, const TemporaryDirectory& directory) {
    const URL file = directory.url("file");
    const std::string contents = irregularBytes(5000);
    ASSERT_THAT(manager.writeFile(asBytes(contents), file, FileManager::Writing::plain), Succeeds());
    ASSERT_THAT(manager.writeFile(asBytes(contents), file, FileManager::Writing::atomic), Succeeds());
    ASSERT_THAT(manager.resourceProperties(file), Succeeds());
    ASSERT_THAT(manager.volumeSupportsCloning(file), Succeeds());
    const auto made = manager.createReplacementDirectory(file);
    ASSERT_THAT(made, Succeeds());
    const URL copy = made->appendingPathComponent("file");
    ASSERT_THAT(manager.copyItem(file, copy), Succeeds());
    {
        const auto handle = manager.openForUpdating(copy);
        ASSERT_THAT(handle, Succeeds());
        EXPECT_EQ((*handle)->seekToEnd(), contents.size());
        (*handle)->write(asBytes("more"));
        EXPECT_EQ(base::toString((*handle)->readUpTo(0, 6000)), contents + "more");
        (*handle)->truncate(4000);
        (*handle)->synchronize();
        (*handle)->close();
    }
    ASSERT_THAT(manager.replaceItem(file, copy), Succeeds());
    const auto read = manager.contentsOfFile(file);
    ASSERT_THAT(read, Succeeds());
    EXPECT_EQ(base::toString(*read), contents.substr(0, 4000));
    ASSERT_THAT(manager.removeItem(file), Succeeds());
}

TEST_F(FailingCalls, ThatWereOnlyInterruptedAreMadeAgain) {
    {
        const Trouble trouble = Trouble::interruptions();
        doAll(*manager, directory);
    }
    EXPECT_THAT(namesIn(directory.path()), ElementsAre());
}

TEST_F(FailingCalls, ThatMovedAFewBytesOnlyAreContinued) {
    {
        const Trouble trouble = Trouble::shortCounts();
        doAll(*manager, directory);
    }
    EXPECT_THAT(namesIn(directory.path()), ElementsAre());
}

TEST_F(FailingCalls, OrNotEveryFileIsOpenedCloseOnExec) {
    const Trouble trouble = Trouble::none();
    doAll(*manager, directory);
    EXPECT_GT(trouble.callCount(), 50U);
    EXPECT_EQ(trouble.openedWithoutCloseOnExec(), 0U);
}

}  // namespace
}  // namespace pinwell::test
