#include "foundation/secret_file.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <memory>
#include <vector>

#include "foundation/bytes.h"
#include "support/temporary_directory.h"

namespace pinwell::foundation {
namespace {

class SecretFile : public ::testing::Test {
  protected:
    Result<std::size_t> readInto(std::size_t room, std::string_view contents) {
        test::writeFile(path, contents);
        room_.resize(room);
        return readSecretFile(path, room_);
    }
    std::string text(std::size_t length) const { return toString(ByteView(room_).first(length)); }

    const test::TemporaryDirectory directory;
    const std::string path = directory / "secret";
    std::vector<std::byte> room_;
};

TEST_F(SecretFile, IsReadWhole) {
    const auto length = readInto(16, "correct horse");
    ASSERT_TRUE(length);
    EXPECT_EQ(text(*length), "correct horse");
}

TEST_F(SecretFile, IsRefusedIfItFillsTheRoom) {
    EXPECT_TRUE(readInto(5, "four"));
    const auto length = readInto(5, "five.");
    ASSERT_FALSE(length);
    EXPECT_EQ(length.error().code(), EFBIG);
    EXPECT_NE(length.error().localizedDescription().find(path), std::string::npos);
}

TEST_F(SecretFile, IsNamedIfItCannotBeRead) {
    for (const std::string& place : {directory / "missing", directory.path()}) {
        room_.resize(16);
        const auto length = readSecretFile(place, room_);
        ASSERT_FALSE(length) << place;
        EXPECT_NE(length.error().localizedDescription().find(place), std::string::npos);
    }
}

TEST_F(SecretFile, IsNotWaitedForAtTheOtherEndOfAPipe) {
    ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
    room_.resize(16);
    const auto length = readSecretFile(path, room_);
    EXPECT_TRUE(length && *length == 0U);
}

TEST(WipedRoom, IsOverwrittenWhenItGoes) {
    alignas(WipedRoom<8>) std::array<std::byte, sizeof(WipedRoom<8>)> place{};
    auto* const room = new (place.data()) WipedRoom<8>();
    for (std::byte& byte : room->bytes()) byte = std::byte{0x5A};
    ASSERT_EQ(place.front(), std::byte{0x5A});
    std::destroy_at(room);
    for (const std::byte byte : place) EXPECT_EQ(byte, std::byte{0});
}

}  // namespace
}  // namespace pinwell::foundation
