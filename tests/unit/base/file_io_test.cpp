#include "base/file_io.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <vector>

#include "support/temporary_directory.h"

namespace pinwell::base {
namespace {

using test::TemporaryDirectory;

// The errno value with which the read fails, 0 when it does not.
std::int64_t failure(const std::string& path, std::size_t limit = 100) {
    const auto result = readSmallFile(path, limit);
    if (result) return 0;
    EXPECT_EQ(result.error().domain(), kPOSIXErrorDomain);
    EXPECT_EQ(result.error().path(), path);
    return result.error().code();
}

TEST(SmallFile, IsReadWhole) {
    const TemporaryDirectory directory;
    const std::string contents(100'000, 'x');
    test::writeFile(directory / "f", contents);
    const auto result = readSmallFile(directory / "f", 1'000'000);
    ASSERT_TRUE(result);
    EXPECT_EQ(toString(*result), contents);
}

TEST(SmallFile, MayBeEmpty) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "");
    const auto result = readSmallFile(directory / "f", 0);
    ASSERT_TRUE(result);
    EXPECT_TRUE(result->empty());
}

TEST(SmallFile, MayBeAsLongAsTheLimitAndNotAByteLonger) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", std::string(100, 'x'));
    EXPECT_EQ(failure(directory / "f", 100), 0);
    EXPECT_EQ(failure(directory / "f", 99), EFBIG);
}

TEST(SmallFile, IsFoundThroughALink) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "x");
    std::filesystem::create_symlink("f", directory / "link");
    EXPECT_EQ(failure(directory / "link"), 0);
}

TEST(SmallFile, DoesNotClaimMemoryForASparseGiant) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "x");
    std::filesystem::resize_file(directory / "f", std::uintmax_t{1} << 40U);
    EXPECT_EQ(failure(directory / "f", 1000), EFBIG);
}

TEST(SmallFile, IsMissing) {
    const TemporaryDirectory directory;
    EXPECT_EQ(failure(directory / "nothing"), ENOENT);
    EXPECT_FALSE(readSmallFile("", 100));
}

TEST(SmallFile, IsNeitherDirectoryNorDevice) {
    const TemporaryDirectory directory;
    EXPECT_EQ(failure(directory.path()), EISDIR);
    EXPECT_EQ(failure("/dev/zero"), EINVAL);
}

TEST(SmallFile, IsNoPipeAndDoesNotWaitForOne) {
    const TemporaryDirectory directory;
    ASSERT_EQ(mkfifo((directory / "pipe").c_str(), 0600), 0);
    EXPECT_EQ(failure(directory / "pipe"), EINVAL);
}

TEST(SmallFile, IsNoSocket) {
    const TemporaryDirectory directory;
    const FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string path = directory / "s";
    ASSERT_LT(path.size(), sizeof address.sun_path);
    path.copy(address.sun_path, path.size());
    ASSERT_EQ(bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    EXPECT_EQ(failure(path), EINVAL);
}

TEST(SmallFile, IsNotNamedByTheTextBeforeAZeroByte) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "x");
    EXPECT_EQ(failure((directory / "f") + std::string("\0g", 2)), EINVAL);
}

// The errno value with which opening fails, 0 if it succeeds.
std::int64_t refusal(const std::string& path, int flags) {
    const auto file = openRegularFile(path, flags, 0600);
    return file ? 0 : file.error().code();
}

TEST(RegularFile, HasItsStatusAtOpening) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "four");
    const auto file = openRegularFile(directory / "f", O_RDONLY);
    ASSERT_TRUE(file);
    EXPECT_EQ(file->status.st_size, 4);
    EXPECT_NE(fcntl(file->descriptor.get(), F_GETFD) & FD_CLOEXEC, 0);
}

TEST(RegularFile, IsFoundThroughALinkUnlessTheCallerRefusesLinks) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "x");
    std::filesystem::create_symlink("f", directory / "link");
    std::filesystem::create_symlink("/dev/zero", directory / "device");
    EXPECT_EQ(refusal(directory / "link", O_RDONLY), 0);
    EXPECT_EQ(refusal(directory / "link", O_RDONLY | O_NOFOLLOW), ELOOP);
    EXPECT_EQ(refusal(directory / "device", O_RDONLY), EINVAL);
}

TEST(RegularFile, IsNeitherDirectoryNorDeviceNorPipe) {
    const TemporaryDirectory directory;
    ASSERT_EQ(mkfifo((directory / "pipe").c_str(), 0600), 0);
    for (const int access : {O_RDONLY, O_WRONLY, O_RDWR, O_RDWR | O_CREAT}) {
        EXPECT_EQ(refusal(directory.path(), access), EISDIR);
        EXPECT_EQ(refusal("/dev/null", access), EINVAL);
        EXPECT_EQ(refusal(directory / "pipe", access), EINVAL);
    }
}

TEST(RegularFile, IsMadeOnRequestOnly) {
    const TemporaryDirectory directory;
    EXPECT_EQ(refusal(directory / "f", O_WRONLY), ENOENT);
    EXPECT_EQ(refusal(directory / "none/f", O_WRONLY | O_CREAT), ENOENT);
    EXPECT_EQ(refusal(directory / "f", O_WRONLY | O_CREAT), 0);
    EXPECT_EQ(refusal(directory / "f", O_WRONLY), 0);
}

TEST(RegularFile, IsOpenedInADirectoryAndNamedInErrorsAsTheCallerSays) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "f", "x");
    const FileDescriptor folder(open(directory.path().c_str(), O_PATH | O_CLOEXEC));
    EXPECT_TRUE(openRegularFile(folder.get(), "f", O_RDONLY, "the file"));
    const auto missing = openRegularFile(folder.get(), "g", O_RDONLY, "the file");
    ASSERT_FALSE(missing);
    EXPECT_EQ(missing.error().path(), "the file");
}

bool isOpen(int number) {
    return fcntl(number, F_GETFD) >= 0;
}

TEST(FileDescriptor, ClosesItsDescriptor) {
    int number = -1;
    {
        const FileDescriptor file(open("/dev/null", O_RDONLY | O_CLOEXEC));
        ASSERT_TRUE(file);
        number = file.get();
    }
    EXPECT_FALSE(isOpen(number));
}

TEST(FileDescriptor, PassesOwnershipOn) {
    FileDescriptor first(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const int number = first.get();
    FileDescriptor second(std::move(first));
    EXPECT_EQ(second.get(), number);
    FileDescriptor third(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const int replaced = third.get();
    third = std::move(second);
    EXPECT_EQ(third.get(), number);
    EXPECT_FALSE(isOpen(replaced));
    EXPECT_EQ(third.release(), number);
    EXPECT_FALSE(third);
    EXPECT_TRUE(isOpen(number));
    close(number);
}

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

TEST(SafeFileName, IsOneNameOfTheFileSystem) {
    EXPECT_TRUE(isSafeFileName("a"));
    EXPECT_TRUE(isSafeFileName("..."));
    EXPECT_TRUE(isSafeFileName(".hidden"));
    EXPECT_TRUE(isSafeFileName("a b\xC3\xA9"));
    EXPECT_TRUE(isSafeFileName(std::string(200, 'x')));
}

TEST(SafeFileName, IsNotEmptyNorTooLongNorADirectory) {
    EXPECT_FALSE(isSafeFileName(""));
    EXPECT_FALSE(isSafeFileName("."));
    EXPECT_FALSE(isSafeFileName(".."));
    EXPECT_FALSE(isSafeFileName(std::string(201, 'x')));
}

TEST(SafeFileName, HoldsNeitherSlashNorControlCharacter) {
    EXPECT_FALSE(isSafeFileName("a/b"));
    EXPECT_FALSE(isSafeFileName("/"));
    for (char control = 1; control < 0x20; ++control)
        EXPECT_FALSE(isSafeFileName("a" + std::string(1, control) + "b")) << int{control};
    EXPECT_FALSE(isSafeFileName("a\n"));
    EXPECT_FALSE(isSafeFileName("\x1B"));
    EXPECT_FALSE(isSafeFileName("\x7F"));
    EXPECT_FALSE(isSafeFileName("a\xC2\x9B"));
    EXPECT_FALSE(isSafeFileName(std::string_view("a\0b", 3)));
}

}  // namespace
}  // namespace pinwell::base
