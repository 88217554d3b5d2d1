#include "codesign/byte_source.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <filesystem>
#include <set>

#include "codesign/code_error.h"
#include "support/file_properties.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using base::Data;
using codesign::CodeError;
using codesign::kReadAheadPieces;
using codesign::kReadAheadPieceSize;
using codesign::MemorySource;
using codesign::ReadAhead;

constexpr std::uint64_t kNever = ~std::uint64_t{0};

/// Any number of pieces, each filled with its number; reading the one numbered `failing` fails.
class NumberedPieces final : public codesign::ByteSource {
  public:
    explicit NumberedPieces(std::uint64_t count, std::uint64_t failing = kNever)
        : count_(count), failing_(failing) {}

    std::uint64_t size() const override { return count_ * kReadAheadPieceSize; }
    std::uint64_t piecesRead() const { return read_; }
    const std::set<std::thread::id>& readers() const { return readers_; }  // once reading is over

  private:
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override {
        const std::uint64_t number = offset / kReadAheadPieceSize;
        if (number == failing_) throw CodeError(codesign::kIOError, "bad sector");
        readers_.insert(std::this_thread::get_id());
        std::fill(buffer.begin(), buffer.end(), static_cast<std::byte>(number));
        ++read_;
        return buffer.size();
    }

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
        } catch (const CodeError& error) {
            EXPECT_EQ(error.status(), codesign::kIOError);
        }
    }
}

TEST(ReadAhead, OfAFileThatBecameShorterFails) {
    const TemporaryDirectory scratch;
    writeFile(scratch / "file", irregularBytes(3 * kReadAheadPieceSize));
    const codesign::FileSource source(base::Places{}, scratch / "file");
    std::filesystem::resize_file(scratch / "file", kReadAheadPieceSize + 1);
    ReadAhead pieces(source, source.size());
    EXPECT_EQ(pieces.next().size(), kReadAheadPieceSize);
    EXPECT_THROW(pieces.next(), CodeError);
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
