#include "base/byte_source.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <filesystem>
#include <limits>
#include <optional>
#include <set>
#include <string>
#include <utility>

#include "support/file_properties.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using base::Data;
using base::FileDescriptor;
using base::FileSource;
using base::kReadAheadPieces;
using base::kReadAheadPieceSize;
using base::MemorySource;
using base::Places;
using base::ReadAhead;
using base::ReadFailure;
using base::toString;

constexpr std::uint64_t kNever = ~std::uint64_t{0};

/// Any number of pieces, each filled with its number; reading the one numbered `failing` fails.
class NumberedPieces final : public base::ByteSource {
  public:
    explicit NumberedPieces(std::uint64_t count, std::uint64_t failing = kNever)
        : count_(count), failing_(failing) {}

    std::uint64_t size() const override { return count_ * kReadAheadPieceSize; }
    std::uint64_t piecesRead() const { return read_; }
    const std::set<std::thread::id>& readers() const { return readers_; }  // once reading is over

    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override {
        const std::uint64_t number = offset / kReadAheadPieceSize;
        if (number == failing_) throw ReadFailure(ReadFailure::Kind::unreadable, "bad sector", offset, EIO);
        readers_.insert(std::this_thread::get_id());
        std::fill(buffer.begin(), buffer.end(), static_cast<std::byte>(number));
        ++read_;
        return buffer.size();
    }

  private:
    std::uint64_t count_;
    std::uint64_t failing_;
    mutable std::atomic<std::uint64_t> read_ = 0;
    mutable std::set<std::thread::id> readers_;
};

bool isFilledWith(ByteView bytes, std::uint64_t number) {
    return bytes.size() == kReadAheadPieceSize &&
           std::all_of(bytes.begin(), bytes.end(),
                       [&](std::byte byte) { return byte == static_cast<std::byte>(number); });
}

Data allOf(ReadAhead& pieces) {
    Data bytes;
    for (ByteView piece = pieces.next(); !piece.empty(); piece = pieces.next()) base::append(bytes, piece);
    return bytes;
}

// How a read failed.
struct Failed {
    ReadFailure::Kind kind;
    std::uint64_t offset;
    int number;

    bool operator==(const Failed&) const = default;
};

template <class Read>
std::optional<Failed> failureOf(Read read) {
    try {
        read();
        return std::nullopt;
    } catch (const ReadFailure& failure) {
        return Failed{failure.kind(), failure.offset(), failure.number()};
    }
}

TEST(ByteSource, ReadsExactlyTheRangeOrFailsPastItsEnd) {
    const MemorySource source(base::toData("0123456789"));
    EXPECT_EQ(toString(source.read(4, 6)), "456789");
    EXPECT_EQ(toString(source.readShared(4, 6)), "456789");
    EXPECT_TRUE(source.read(10, 0).empty());
    for (const auto& range : {std::pair<std::uint64_t, std::size_t>{4, 7}, {11, 0}, {~0ULL, 1}}) {
        const auto offset = range.first;
        const auto length = range.second;
        const Failed pastEnd{ReadFailure::Kind::pastEnd, offset, 0};
        EXPECT_EQ(failureOf([&] { source.read(offset, length); }), pastEnd);
        EXPECT_EQ(failureOf([&] { source.readShared(offset, length); }), pastEnd);
    }
}

TEST(ByteSource, ReadsUpToALengthAndLessOnlyAtTheEnd) {
    const MemorySource source(base::toData("0123456789"));
    EXPECT_EQ(toString(source.readUpTo(4, 3)), "456");
    EXPECT_EQ(toString(source.readUpTo(4, std::numeric_limits<std::uint64_t>::max())), "456789");
    EXPECT_EQ(toString(source.readSharedUpTo(4, 100)), "456789");
    EXPECT_TRUE(source.readUpTo(1'000'000, 10).empty());
}

class OpenedFile : public testing::Test {
  protected:
    std::string path(const std::string& name) const { return scratch_ / name; }

    FileDescriptor opened(const std::string& contents) {
        writeFile(path("file"), contents);
        return FileDescriptor(open(path("file").c_str(), O_RDONLY | O_CLOEXEC));
    }

    static std::int64_t refusalOf(int descriptor) {
        const auto source = FileSource::borrow(descriptor);
        return source ? 0 : source.error().code();
    }

  private:
    TemporaryDirectory scratch_;
};

TEST_F(OpenedFile, ReadsAPathFromAnyPosition) {
    writeFile(path("file"), "0123456789");
    const auto source = FileSource::open(Places(), path("file"));
    ASSERT_TRUE(source);
    EXPECT_EQ(source->size(), 10U);
    EXPECT_EQ(toString(source->read(4, 3)), "456");
    EXPECT_FALSE(source->hasExecuteBit());
}

TEST_F(OpenedFile, RefusesAPathThatIsALink) {
    writeFile(path("file"), "x");
    ASSERT_EQ(symlink("file", path("link").c_str()), 0);
    const auto source = FileSource::open(Places(), path("link"));
    ASSERT_FALSE(source);
    EXPECT_EQ(source.error().code(), ELOOP);
}

TEST_F(OpenedFile, RefusesAPathWithAZeroByteInIt) {
    writeFile(path("file"), "x");
    const auto source = FileSource::open(Places(), path("file") + std::string(1, '\0') + "more");
    ASSERT_FALSE(source);
    EXPECT_EQ(source.error().code(), EINVAL);
}

TEST_F(OpenedFile, ReadsADescriptorWithoutMovingIt) {
    const FileDescriptor descriptor = opened(irregularBytes(3 * base::kReadAtOnce));
    ASSERT_EQ(lseek(descriptor.get(), 2, SEEK_SET), 2);
    const auto source = FileSource::borrow(descriptor.get());
    ASSERT_TRUE(source);
    EXPECT_EQ(source->size(), 3 * base::kReadAtOnce);
    EXPECT_EQ(source->readUpTo(3 * base::kReadAtOnce - 4, 100).size(), 4U);
    EXPECT_TRUE(toString(source->readShared(0, source->size())) == irregularBytes(3 * base::kReadAtOnce));
    EXPECT_EQ(lseek(descriptor.get(), 0, SEEK_CUR), 2);
}

TEST_F(OpenedFile, LeavesTheDescriptorOpen) {
    const FileDescriptor descriptor = opened("0123456789");
    { ASSERT_TRUE(FileSource::borrow(descriptor.get())); }
    EXPECT_NE(fcntl(descriptor.get(), F_GETFD), -1);
}

TEST_F(OpenedFile, ReadsNothingAfterTheEnd) {
    const FileDescriptor descriptor = opened("0123456789");
    const auto source = FileSource::borrow(descriptor.get());
    ASSERT_TRUE(source);
    EXPECT_TRUE(source->readUpTo(1'000'000, 10).empty());
}

TEST_F(OpenedFile, FailsAtAPositionThatNoFileHas) {
    const FileDescriptor descriptor = opened("0123456789");
    const auto source = FileSource::borrow(descriptor.get());
    ASSERT_TRUE(source);
    constexpr std::uint64_t kNowhere = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(failureOf([&] { source->readUpTo(kNowhere, 1); }),
              (Failed{ReadFailure::Kind::unreadable, kNowhere, EOVERFLOW}));
}

TEST_F(OpenedFile, ThatBecameShorterFails) {
    writeFile(path("file"), irregularBytes(2 * base::kReadAtOnce));
    const auto source = FileSource::open(Places(), path("file"));
    ASSERT_TRUE(source);
    std::filesystem::resize_file(path("file"), 100);
    const Failed cutShort{ReadFailure::Kind::cutShort, 0, 0};
    EXPECT_EQ(failureOf([&] { source->read(0, 101); }), cutShort);
    EXPECT_EQ(failureOf([&] { source->readShared(0, source->size()); }), cutShort);
    EXPECT_EQ(source->readUpTo(0, 101).size(), 100U);
}

TEST_F(OpenedFile, RefusesDescriptorsThatCannotBeReadFrom) {
    writeFile(path("file"), "0123456789");
    for (const int access : {O_WRONLY, O_PATH}) {
        const FileDescriptor descriptor(open(path("file").c_str(), access | O_CLOEXEC));
        EXPECT_EQ(refusalOf(descriptor.get()), EBADF);
    }
}

TEST_F(OpenedFile, RefusesDescriptorsOfAnythingButARegularFile) {
    const FileDescriptor folder(open(path(".").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    EXPECT_EQ(refusalOf(folder.get()), EISDIR);
    const FileDescriptor device(open("/dev/null", O_RDONLY | O_CLOEXEC));
    EXPECT_EQ(refusalOf(device.get()), EINVAL);
    EXPECT_EQ(refusalOf(-1), EBADF);
}

// Data, a hole, data in the middle of a piece, and a hole up to the end.
TEST_F(OpenedFile, ReadsTheHolesOfASparseFileAsZeros) {
    constexpr std::uint64_t kLength = 40ULL * 1024 * 1024;
    writeFile(path("file"), std::string(5000, 'a'));
    const FileDescriptor writer(open(path("file").c_str(), O_WRONLY | O_CLOEXEC));
    ASSERT_EQ(pwrite(writer.get(), "middle", 6, 20'000'000), 6);
    ASSERT_EQ(ftruncate(writer.get(), kLength), 0);
    std::string expected(kLength, '\0');
    expected.replace(0, 5000, 5000, 'a');
    expected.replace(20'000'000, 6, "middle");

    const auto source = FileSource::open(Places(), path("file"));
    ASSERT_TRUE(source);
    EXPECT_TRUE(toString(source->readShared(0, kLength)) == expected);
    EXPECT_TRUE(toString(source->readShared(3000, kLength - 4000)) == expected.substr(3000, kLength - 4000));
    EXPECT_TRUE(toString(source->readSharedUpTo(19'000'000, kLength)) == expected.substr(19'000'000))
        << "no more than there is";
}

TEST(ByteSource, HoldsNoMoreThanThereIsAddressSpaceFor) {
    const Failed noRoom{ReadFailure::Kind::noRoom, 0, 0};
    EXPECT_EQ(failureOf([] { base::makeBuffer(std::numeric_limits<std::uint64_t>::max() / 2); }), noRoom);
}

TEST(ReadAhead, GivesAllBytesInTheirOrder) {
    for (const std::size_t size :
         {std::size_t{0}, std::size_t{1}, kReadAheadPieceSize - 1, kReadAheadPieceSize,
          kReadAheadPieceSize + 1, 3 * kReadAheadPieceSize, 3 * kReadAheadPieces * kReadAheadPieceSize + 7}) {
        const Data bytes = base::toData(irregularBytes(size));
        const MemorySource source(bytes);
        ReadAhead pieces(source, size);
        EXPECT_TRUE(allOf(pieces) == bytes) << size;
        EXPECT_TRUE(pieces.next().empty()) << size;
    }
}

TEST(ReadAhead, StopsBeforeItsEnd) {
    const Data bytes = base::toData(irregularBytes(2 * kReadAheadPieceSize + 100));
    const MemorySource source(bytes);
    ReadAhead pieces(source, kReadAheadPieceSize + 50);
    EXPECT_TRUE(allOf(pieces) == base::toData(ByteView(bytes).first(kReadAheadPieceSize + 50)));
}

TEST(ReadAhead, ReadsManyPiecesOnAThreadOfItsOwn) {
    const NumberedPieces source(50);
    {
        ReadAhead pieces(source, source.size());
        for (std::uint64_t number = 0; number < 50; ++number)
            ASSERT_TRUE(isFilledWith(pieces.next(), number)) << number;
        EXPECT_TRUE(pieces.next().empty());
    }
    EXPECT_EQ(source.readers().size(), 1U);
    EXPECT_FALSE(source.readers().contains(std::this_thread::get_id()));
}

TEST(ReadAhead, ReadsASinglePieceOnTheCallersThread) {
    const NumberedPieces source(1);
    ReadAhead pieces(source, source.size());
    EXPECT_EQ(source.piecesRead(), 0U);
    EXPECT_TRUE(isFilledWith(pieces.next(), 0));
    EXPECT_TRUE(source.readers().contains(std::this_thread::get_id()));
}

TEST(ReadAhead, ReadsNoFurtherThanItsBuffersGo) {
    const NumberedPieces source(1000);
    {
        ReadAhead pieces(source, source.size());
        ASSERT_TRUE(isFilledWith(pieces.next(), 0));
        ASSERT_TRUE(isFilledWith(pieces.next(), 1));
    }
    EXPECT_GE(source.piecesRead(), 2U);
    EXPECT_LE(source.piecesRead(), 1 + kReadAheadPieces);
}

TEST(ReadAhead, CanBeDroppedBeforeAnythingWasAskedFor) {
    const NumberedPieces source(1000);
    { const ReadAhead pieces(source, source.size()); }
    EXPECT_LE(source.piecesRead(), kReadAheadPieces);
}

TEST(ReadAhead, RethrowsAReadersExceptionAfterThePiecesBeforeIt) {
    for (const std::uint64_t failing : {0U, 1U, 7U, 9U}) {
        const NumberedPieces source(10, failing);
        ReadAhead pieces(source, source.size());
        for (std::uint64_t number = 0; number < failing; ++number)
            ASSERT_TRUE(isFilledWith(pieces.next(), number)) << number;
        try {
            pieces.next();
            FAIL() << failing;
        } catch (const ReadFailure& failure) {
            EXPECT_STREQ(failure.what(), "bad sector");
        }
    }
}

TEST(ReadAhead, OfAFileThatBecameShorterFails) {
    const TemporaryDirectory scratch;
    writeFile(scratch / "file", irregularBytes(3 * kReadAheadPieceSize));
    const auto source = FileSource::open(Places(), scratch / "file");
    ASSERT_TRUE(source);
    std::filesystem::resize_file(scratch / "file", kReadAheadPieceSize + 1);
    ReadAhead pieces(*source, source->size());
    EXPECT_EQ(pieces.next().size(), kReadAheadPieceSize);
    EXPECT_THROW(pieces.next(), ReadFailure);
}

TEST(ReadAhead, WhereNoThreadIsToBeHadReadsOnTheCallers) {
    const auto check = [] {
        // The limit does not hold for the superuser.
        if (isSuperuser() && setresuid(kOrdinaryUser, kOrdinaryUser, kOrdinaryUser) != 0) _exit(2);
        constexpr rlimit kNoMore{0, 0};
        if (setrlimit(RLIMIT_NPROC, &kNoMore) != 0) _exit(3);
        const NumberedPieces source(10);
        ReadAhead pieces(source, source.size());
        for (std::uint64_t number = 0; number < 10; ++number)
            if (!isFilledWith(pieces.next(), number)) _exit(4);
        const bool here = source.readers() == std::set<std::thread::id>{std::this_thread::get_id()};
        _exit(here && pieces.next().empty() ? 0 : 5);
    };
    EXPECT_EXIT(check(), testing::ExitedWithCode(0), "");
}

}  // namespace
}  // namespace pinwell::test
