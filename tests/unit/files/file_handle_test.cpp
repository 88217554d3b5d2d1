#include <fcntl.h>
#include <unistd.h>

#include <csignal>
#include <limits>

#include "fixture.h"
#include "support/file_size_limit.h"
#include "support/volume.h"
#include "values/url.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using base::toString;
using files::FileHandle;
using testing::EndsWith;
using testing::HasSubstr;
using testing::StartsWith;

class Handle : public FilesTest {
  protected:
    std::unique_ptr<FileHandle> reading(const std::string& contents) {
        writeFile(path("file"), contents);
        auto opened = manager->openForReading(url("file"));
        return opened ? std::move(*opened) : nullptr;
    }

    std::unique_ptr<FileHandle> updating(const std::string& contents) {
        writeFile(path("file"), contents);
        auto opened = manager->openForUpdating(url("file"));
        return opened ? std::move(*opened) : nullptr;
    }

    // The reason text of the failure that the operation must end in.
    template <class Operation>
    std::string reasonOf(Operation operation) {
        try {
            operation();
        } catch (const base::FileFailure& failure) {
            return failure.what();
        }
        ADD_FAILURE() << "did not fail";
        return {};
    }
};

TEST_F(Handle, ReadsAnywhereAndKeepsItsPosition) {
    const auto handle = reading("0123456789");
    EXPECT_EQ(handle->position(), 0U);
    EXPECT_EQ(toString(handle->readUpTo(0, 4)), "0123");
    EXPECT_EQ(handle->position(), 0U);
    EXPECT_EQ(handle->seek(8), 8U);
    EXPECT_EQ(toString(handle->readUpTo(4, 2)), "45");
    EXPECT_EQ(handle->position(), 8U);
}

TEST_F(Handle, PassesOverHolesAndKeepsItsPosition) {
    const auto handle = updating("data");
    handle->seek(3);
    handle->truncate(10U << 20U);
    EXPECT_EQ(handle->nextData(0), 0U);
    EXPECT_EQ(toString(handle->readSharedUpTo(0, 10U << 20U)), "data" + std::string((10U << 20U) - 4, '\0'));
    EXPECT_EQ(handle->position(), 3U);
}

TEST_F(Handle, ReadsLessOnlyAtTheEnd) {
    const std::string contents = irregularBytes(600'001);
    const auto handle = reading(contents);
    EXPECT_EQ(toString(handle->readUpTo(0, 600'000)), contents.substr(0, 600'000));
    EXPECT_EQ(handle->readUpTo(600'000, 100).size(), 1U);
    EXPECT_EQ(handle->readUpTo(600'001, 100).size(), 0U);
}

TEST_F(Handle, ReadsTheExistingBytesIfFarMoreAreRequested) {
    const auto handle = reading("all");
    EXPECT_EQ(toString(handle->readUpTo(0, std::numeric_limits<std::uint64_t>::max())), "all");
}

TEST_F(Handle, ReadsNothingForALengthOfZero) {
    EXPECT_TRUE(reading("all")->readUpTo(0, 0).empty());
}

TEST_F(Handle, ReportsTheEnd) {
    const auto handle = reading("0123456789");
    EXPECT_EQ(handle->size(), 10U);
    EXPECT_EQ(handle->seekToEnd(), 10U);
    EXPECT_EQ(handle->position(), 10U);
}

TEST_F(Handle, SeeksPastTheEndAndReadsNothingThere) {
    const auto handle = reading("0123456789");
    EXPECT_EQ(handle->seek(100), 100U);
    EXPECT_TRUE(handle->readUpTo(100, 1).empty());
}

TEST_F(Handle, RefusesAPositionThatNoFileHas) {
    const auto handle = reading("x");
    for (const std::uint64_t position : {std::uint64_t{1} << 63U, std::numeric_limits<std::uint64_t>::max()})
        EXPECT_THAT(reasonOf([&] { handle->seek(position); }),
                    StartsWith("Cannot seek in " + path("file") + ": "));
    EXPECT_EQ(handle->position(), 0U);
}

TEST_F(Handle, WritesWhereItIsAndPastTheEnd) {
    const auto handle = updating("0123456789");
    handle->seek(4);
    handle->write(asBytes("abc"));
    EXPECT_EQ(handle->position(), 7U);
    handle->seekToEnd();
    handle->write(asBytes("end"));
    handle->synchronize();
    EXPECT_EQ(readFile(path("file")), "0123abc789end");
}

TEST_F(Handle, TruncatesAndKeepsItsPosition) {
    const auto handle = updating("0123456789");
    handle->seek(7);
    handle->truncate(5);
    EXPECT_EQ(handle->position(), 7U);
    EXPECT_EQ(readFile(path("file")), "01234");
}

TEST_F(Handle, TruncatesToMoreWithZeroes) {
    updating("01")->truncate(4);
    EXPECT_EQ(readFile(path("file")), std::string("01\0\0", 4));
}

TEST_F(Handle, RefusesToTruncateToAnImpossibleLength) {
    const auto handle = updating("x");
    EXPECT_THAT(reasonOf([&] { handle->truncate(std::numeric_limits<std::uint64_t>::max()); }),
                StartsWith("Cannot truncate " + path("file") + ": "));
    EXPECT_EQ(readFile(path("file")), "x");
}

TEST_F(Handle, ForReadingDoesNotWrite) {
    const auto handle = reading("x");
    EXPECT_EQ(reasonOf([&] { handle->write(asBytes("y")); }),
              "Cannot write to " + path("file") + ": Bad file descriptor");
    EXPECT_THAT(reasonOf([&] { handle->truncate(0); }), HasSubstr(path("file")));
    EXPECT_EQ(readFile(path("file")), "x");
}

TEST_F(Handle, ReportsTheCauseOfAFailedWrite) {
    const auto handle = updating("");
    std::signal(SIGXFSZ, SIG_IGN);
    const std::string reason = [&] {
        const FileSizeLimit limit(4096);
        return reasonOf([&] { handle->write(asBytes(irregularBytes(10'000))); });
    }();
    std::signal(SIGXFSZ, SIG_DFL);
    EXPECT_EQ(reason, "Cannot write to " + path("file") + ": File too large");
}

TEST_F(Handle, ReservesRoomWithoutMakingTheFileLonger) {
    const auto handle = updating("contents");
    handle->seekToEnd();
    handle->reserve(100'000);
    EXPECT_EQ(readFile(path("file")), "contents");
    EXPECT_EQ(handle->position(), 8U);
    handle->write(asBytes("!"));
    EXPECT_EQ(readFile(path("file")), "contents!");
}

TEST_F(Handle, ReservesNoRoomOnAFullVolume) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    writeFile(volume / "file", "contents");
    const auto handle = manager->openForUpdating(files::URL::fileURLWithPath(volume / "file"));
    ASSERT_THAT(handle, Succeeds());
    EXPECT_EQ(reasonOf([&] { (*handle)->reserve(2U << 20U); }),
              "Cannot reserve room in " + (volume / "file") + ": No space left on device");
    EXPECT_EQ(readFile(volume / "file"), "contents");
}

TEST_F(Handle, ReservesNoRoomOverTheFileSizeLimit) {
    const auto handle = updating("contents");
    const FileSizeLimit limit(4096);
    handle->reserve(4096);
    handle->seek(1);
    EXPECT_EQ(reasonOf([&] { handle->reserve(4096); }),
              "Cannot reserve room in " + path("file") + ": File too large");
}

TEST_F(Handle, ClosesOnceAndIsOfNoUseAfterwards) {
    const auto handle = updating("x");
    const std::size_t before = openFileCount();
    handle->close();
    EXPECT_EQ(openFileCount(), before - 1);
    EXPECT_NO_THROW(handle->close());
    EXPECT_THAT(reasonOf([&] { handle->readUpTo(0, 1); }), EndsWith("Bad file descriptor"));
    EXPECT_THAT(reasonOf([&] { handle->write(asBytes("y")); }), EndsWith("Bad file descriptor"));
    EXPECT_THAT(reasonOf([&] { handle->seek(0); }), EndsWith("Bad file descriptor"));
    EXPECT_THAT(reasonOf([&] { handle->position(); }), EndsWith("Bad file descriptor"));
    EXPECT_THAT(reasonOf([&] { handle->seekToEnd(); }), EndsWith("Bad file descriptor"));
    EXPECT_THAT(reasonOf([&] { handle->truncate(0); }), EndsWith("Bad file descriptor"));
    EXPECT_THAT(reasonOf([&] { handle->synchronize(); }), EndsWith("Bad file descriptor"));
}

TEST_F(Handle, ClosesWhenItIsDropped) {
    writeFile(path("file"), "x");
    const std::size_t before = openFileCount();
    auto opened = manager->openForReading(url("file"));
    ASSERT_THAT(opened, Succeeds());
    EXPECT_EQ(openFileCount(), before + 1);
    opened->reset();
    EXPECT_EQ(openFileCount(), before);
}

TEST_F(Handle, OpensRegularFilesAlone) {
    writeFile(path("file"), "x");
    makeDirectory(path("folder"));
    makeLink("file", path("link"));
    makeFifo(path("fifo"));
    for (const auto& [name, reason] :
         {std::pair{"folder", EISDIR}, {"link", ELOOP}, {"fifo", EINVAL}, {"none", ENOENT}}) {
        EXPECT_THAT(manager->openForReading(url(name)), FailsWith(reason, path(name)));
        EXPECT_THAT(manager->openForUpdating(url(name)), FailsWith(reason, path(name)));
    }
    EXPECT_FALSE(exists(path("none")));
}

TEST_F(Handle, IsNotHadForUpdatingAReadOnlyFile) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("file"), "x");
    setMode(path("file"), 0400);
    EXPECT_THAT(manager->openForUpdating(url("file")), FailsWith(EACCES, path("file")));
    EXPECT_THAT(manager->openForReading(url("file")), Succeeds());
}

TEST_F(Handle, IsNotHadWhenThereAreTooManyOpenFiles) {
    writeFile(path("file"), "x");
    rlimit before{};
    getrlimit(RLIMIT_NOFILE, &before);
    const rlimit none{0, before.rlim_max};
    setrlimit(RLIMIT_NOFILE, &none);
    const auto opened = manager->openForReading(url("file"));
    setrlimit(RLIMIT_NOFILE, &before);
    EXPECT_THAT(opened, FailsWith(EMFILE, path("file")));
}

}  // namespace
}  // namespace pinwell::test
