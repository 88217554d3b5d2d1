#include "base/bytes.h"

#include <gtest/gtest.h>

#include <limits>
#include <new>
#include <stdexcept>

#include "support/resident_memory.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using base::Data;
using base::SharedBytes;
using base::SparseBuffer;

Data countedBytes(std::size_t length) {
    Data bytes(length);
    for (std::size_t i = 0; i < length; ++i) bytes[i] = static_cast<std::byte>(i * 7 + i / 251);
    return bytes;
}

TEST(SparseBuffer, BeginsAsZeros) {
    EXPECT_EQ(base::toData(SparseBuffer(10'000).view()), Data(10'000));
}

TEST(SparseBuffer, HasBytesWrittenAcrossItsPages) {
    const Data bytes = countedBytes(20'000);
    SparseBuffer buffer(30'000);
    buffer.put(4000, bytes);
    Data expected(30'000);
    std::copy(bytes.begin(), bytes.end(), expected.begin() + 4000);
    EXPECT_EQ(base::toData(buffer.view()), expected);
}

TEST(SparseBuffer, HasAPieceThatIsZeroExceptItsLastByte) {
    Data bytes(9000);
    bytes.back() = std::byte{1};
    SparseBuffer buffer(9000);
    buffer.put(0, bytes);
    EXPECT_EQ(base::toData(buffer.view()), bytes);
}

TEST(SparseBuffer, TakesMemoryOnlyForNonZeroBytes) {
    const std::size_t before = residentMemory();
    SparseBuffer buffer(std::size_t{1} << 32U);
    const Data zeros(1 << 20U);
    for (std::size_t at = 0; at < buffer.size(); at += std::size_t{64} << 20U) {
        buffer.put(at, zeros);
        buffer.put(at + zeros.size(), countedBytes(10));
    }
    EXPECT_LE(residentMemory(), before + kLittleMemory);
}

TEST(SparseBuffer, RefusesBytesThatDoNotFit) {
    SparseBuffer buffer(100);
    EXPECT_THROW(buffer.put(91, Data(10)), std::out_of_range);
    EXPECT_THROW(buffer.put(101, {}), std::out_of_range);
    EXPECT_THROW(buffer.put(std::numeric_limits<std::size_t>::max(), Data(2)), std::out_of_range);
    EXPECT_NO_THROW(buffer.put(90, Data(10)));
}

TEST(SparseBuffer, OfNoLengthIsEmpty) {
    SparseBuffer buffer(0);
    buffer.put(0, {});
    EXPECT_EQ(buffer.size(), 0U);
    EXPECT_TRUE(buffer.view().empty());
}

TEST(SparseBuffer, ThatNoAddressSpaceIsLeftForIsNotMade) {
    EXPECT_THROW(SparseBuffer(std::numeric_limits<std::size_t>::max() / 2), std::bad_alloc);
}

TEST(SharedBytes, LiveAsLongAsAnyPart) {
    SharedBytes part;
    {
        const SharedBytes whole = countedBytes(100);
        part = whole.share(whole.view().subspan(10, 5));
    }
    EXPECT_EQ(base::toData(part.view()), base::toData(ByteView(countedBytes(100)).subspan(10, 5)));
}

TEST(SharedBytes, OfABufferAreItsBytes) {
    SparseBuffer buffer(10);
    buffer.put(5, countedBytes(5));
    const SharedBytes bytes = std::move(buffer);
    EXPECT_EQ(bytes.size(), 10U);
    EXPECT_TRUE(bytes.share(bytes.view().last(5)) == countedBytes(5));
}

}  // namespace
}  // namespace pinwell::test
