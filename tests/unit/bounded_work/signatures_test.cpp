#include <gtest/gtest.h>

#include "allocation_count.h"
#include "base/byte_io.h"
#include "codesign/cms_signature.h"
#include "codesign/code_directory.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "codesign/superblob.h"
#include "formats/superblob.h"
#include "support/code_directory_builder.h"
#include "support/executable_image_builder.h"

namespace pinwell::test {
namespace {

using base::ByteWriter;
using base::ShortRead;
using codesign::CodeError;

// Enough for an error message.
constexpr std::size_t kRefusal = 4 * kKibibyte;

// Bytes that count the reads, and the bytes read.
class CountingSource final : public base::ByteSource {
  public:
    explicit CountingSource(Data bytes, std::uint64_t size = 0)
        : bytes_(std::move(bytes)), size_(std::max<std::uint64_t>(size, bytes_.size())) {}

    std::uint64_t size() const override { return size_; }

    mutable std::size_t reads = 0;
    mutable std::size_t bytesRead = 0;
    mutable std::size_t largest = 0;  // of one read

  private:
    // After the bytes, up to the size, all is zero.
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override {
        ++reads;
        bytesRead += buffer.size();
        largest = std::max(largest, buffer.size());
        for (std::size_t i = 0; i < buffer.size(); ++i)
            buffer[i] =
                offset + i < bytes_.size() ? bytes_[static_cast<std::size_t>(offset + i)] : std::byte{};
        return buffer.size();
    }

    Data bytes_;
    std::uint64_t size_;
};

template <class Step>
bool isRefused(Step step) {
    try {
        step();
        return false;
    } catch (const CodeError&) {
        return true;
    } catch (const ShortRead&) {
        return true;
    }
}

// An index of that many entries, each with a blob that is only a header.
Data superblobOfHeaders(std::uint32_t count) {
    const std::uint32_t area = 12 + 8 * count;
    ByteWriter writer;
    writer.be32(0xFADE0CC0).be32(area + 8 * count).be32(count);
    for (std::uint32_t i = 0; i < count; ++i) writer.be32(i).be32(area + 8 * i);
    for (std::uint32_t i = 0; i < count; ++i) writer.be32(1).be32(8);
    return std::move(writer).take();
}

TEST(BoundedWork, SuperblobOfAMillionBlobsTakesAFixedAmountForEach) {
    constexpr std::uint32_t kBlobs = 1'000'000;
    const Data superblob = superblobOfHeaders(kBlobs);
    {
        const AllocationCount count;
        EXPECT_EQ(codesign::parseSuperBlob(superblob).size(), kBlobs);
        EXPECT_LE(count.bytes(), kBlobs * std::size_t{64});
        EXPECT_LE(count.blocks(), 64U);
    }
    const AllocationCount count;
    const auto blobs = orderedBlobSetForSuperBlob(superblob, kBlobs);
    ASSERT_TRUE(blobs);
    EXPECT_EQ(blobs->size(), kBlobs);
    EXPECT_LE(count.blocks(), 64U);
    EXPECT_LE(count.bytes(), kBlobs * std::size_t{64});
}

TEST(BoundedWork, SuperblobThatCountsBillionsOfBlobsIsRefusedByItsLength) {
    const Data superblob = SuperBlobBuilder().count(~0U).build();
    const AllocationCount count;
    EXPECT_TRUE(isRefused([&] { codesign::parseSuperBlob(superblob); }));
    EXPECT_EQ(orderedBlobSetForSuperBlob(superblob, ~0U), std::nullopt);
    EXPECT_LE(count.bytes(), kRefusal);
}

// Every entry leads to the same blob, which takes up the whole rest.
TEST(BoundedWork, SuperblobWhoseEntriesShareABlobDoesNotUnfold) {
    constexpr std::uint32_t kEntries = 1000;
    constexpr std::uint32_t kBlob = 12 + 8 * kEntries;
    ByteWriter writer;
    writer.be32(0xFADE0CC0).be32(kBlob + kMebibyte).be32(kEntries);
    for (std::uint32_t i = 0; i < kEntries; ++i) writer.be32(i).be32(kBlob);
    writer.be32(1).be32(kMebibyte).zeros(kMebibyte - 8);

    const AllocationCount count;
    EXPECT_TRUE(isRefused([&] { codesign::parseSuperBlob(writer.data()); }));
    EXPECT_EQ(orderedBlobSetForSuperBlob(writer.data(), kEntries), std::nullopt);
    EXPECT_LE(count.bytes(), 2 * kMebibyte);
}

TEST(BoundedWork, SuperblobThatClaimsMoreThanItsAreaIsNotRead) {
    const CountingSource source(SuperBlobBuilder::adHoc().length(~0U).build(), std::uint64_t{1} << 40U);
    EXPECT_TRUE(isRefused([&] { codesign::readSuperBlob(source, 0, 1ULL << 20U); }));
    EXPECT_LE(source.bytesRead, kRefusal);
}

TEST(BoundedWork, CodeDirectoryThatClaimsBillionsOfSlotsIsRefused) {
    const auto refuse = [](const CodeDirectoryBuilder& builder) {
        const Data directory = builder.build();
        const AllocationCount count;
        EXPECT_TRUE(isRefused([&] { codesign::CodeDirectory::parse(directory); }));
        EXPECT_LE(count.bytes(), kRefusal + directory.size());  // the copy that is handed over
    };
    refuse(CodeDirectoryBuilder().codeSlotCount(~0U));
    refuse(CodeDirectoryBuilder().specialSlotCount(~0U));
    refuse(CodeDirectoryBuilder().length(~0U));
}

TEST(BoundedWork, CodeDirectoryWithAnEndlessScatterVectorIsRefused) {
    const Data directory =
        CodeDirectoryBuilder().scatter(Data(16 * kMebibyte / 24 * 24, std::byte{1})).build();
    const AllocationCount count;
    static_cast<void>(isRefused([&] { codesign::CodeDirectory::parse(directory); }));
    EXPECT_LE(count.bytes(), kRefusal + 2 * directory.size());
}

TEST(BoundedWork, UniversalImageOfBillionsOfSlicesIsLeftAfterItsHeader) {
    const CountingSource source(UniversalImageBuilder().count(~0U).build(), std::uint64_t{1} << 40U);
    EXPECT_TRUE(isRefused([&] { codesign::readSlices(source); }));
    EXPECT_LE(source.reads, 3U);
    EXPECT_LE(source.bytesRead, 64 * kKibibyte);
}

// A claimed list of three gigabytes: the first missing entry ends it.
TEST(BoundedWork, ListOfSlicesOverAHoleIsLeftAtItsFirstEmptyEntry) {
    const CountingSource source(UniversalImageBuilder().count(150'000'000).build(), std::uint64_t{1} << 40U);
    const AllocationCount count;
    EXPECT_TRUE(isRefused([&] { codesign::readSlices(source); }));
    EXPECT_LE(source.bytesRead, 64 * kKibibyte);
    EXPECT_LE(count.bytes(), 64 * kKibibyte);
}

// The smallest load command there is, many times over.
TEST(BoundedWork, LoadCommandsAreReadOnceAndPieceByPiece) {
    constexpr std::uint32_t kCommands = 1'000'000;
    ByteWriter image;
    image.be32(0xFEEDFACF).be32(kSampleArm).be32(0).be32(2).be32(kCommands).be32(kCommands * 8).zeros(8);
    for (std::uint32_t i = 0; i < kCommands; ++i) image.be32(0x1B).be32(8);
    const CountingSource source(image.data());
    const auto slices = codesign::readSlices(source);
    ASSERT_EQ(slices.size(), 1U);
    EXPECT_EQ(codesign::findImageSignature(source, slices.front()), std::nullopt);
    EXPECT_LE(source.bytesRead, kCommands * 8 + kRefusal);
    EXPECT_LE(source.largest, 64 * kKibibyte);
}

TEST(BoundedWork, LoadCommandsOfNoLengthAreNotWalkedForEver) {
    ByteWriter image;
    image.be32(0xFEEDFACF).be32(kSampleArm).be32(0).be32(2).be32(~0U).be32(64).zeros(8);
    for (int i = 0; i < 8; ++i) image.be32(0x1B).be32(0);
    const CountingSource source(image.data());
    const auto slices = codesign::readSlices(source);
    EXPECT_TRUE(isRefused([&] { codesign::findImageSignature(source, slices.front()); }));
    EXPECT_LE(source.bytesRead, kRefusal);
}

TEST(BoundedWork, CmsMessageThatClaimsFourGibibytesIsRefused) {
    const Data message = base::toData(std::string_view("\x30\x84\xFF\xFF\xFF\xFF\x06\x09", 8));
    const AllocationCount count;
    EXPECT_TRUE(isRefused([&] { codesign::requireDetachedCms(message, {}); }));
    EXPECT_EQ(codesign::secureTimestamp(message), std::nullopt);
    EXPECT_LE(count.bytes(), kRefusal);
}

TEST(BoundedWork, CmsMessageOfMillionsOfLevelsIsRefused) {
    Data nested;  // indefinite lengths: two bytes a level
    for (std::size_t i = 0; i < 2 * kMebibyte; ++i) {
        nested.push_back(std::byte{0x30});
        nested.push_back(std::byte{0x80});
    }
    const AllocationCount count;
    EXPECT_TRUE(isRefused([&] { codesign::requireDetachedCms(nested, {}); }));
    EXPECT_EQ(codesign::secureTimestamp(nested), std::nullopt);
    EXPECT_LE(count.bytes(), 2 * kRefusal);
}

}  // namespace
}  // namespace pinwell::test
