#include "files/file_reader.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <limits>

#include "base/handle.h"
#include "fixture.h"

namespace pinwell::test {
namespace {

using base::FileDescriptor;
using base::toString;
using files::FileHandleError;
using files::FileReader;

class Reader : public FilesTest {
  protected:
    FileDescriptor opened(const std::string& contents) {
        writeFile(path("file"), contents);
        return FileDescriptor(open(path("file").c_str(), O_RDONLY | O_CLOEXEC));
    }

    std::int64_t refusalOf(int descriptor) {
        const auto reader = files::readerOf(descriptor, "it");
        return reader ? 0 : reader.error().code();
    }
};

TEST_F(Reader, ReadsAPathFromAnyPosition) {
    writeFile(path("file"), "0123456789");
    const auto reader = files::openReader(path("file"));
    ASSERT_TRUE(reader);
    EXPECT_EQ((*reader)->seekToEnd(), 10U);
    EXPECT_EQ((*reader)->seek(4), 4U);
    EXPECT_EQ(toString((*reader)->read(3)), "456");
    EXPECT_EQ((*reader)->position(), 7U);
}

TEST_F(Reader, RefusesAPathThatIsALink) {
    writeFile(path("file"), "x");
    ASSERT_EQ(symlink("file", path("link").c_str()), 0);
    const auto reader = files::openReader(path("link"));
    ASSERT_FALSE(reader);
    EXPECT_EQ(reader.error().code(), ELOOP);
}

TEST_F(Reader, ReadsADescriptorWithoutMovingIt) {
    const FileDescriptor descriptor = opened("0123456789");
    ASSERT_EQ(lseek(descriptor.get(), 2, SEEK_SET), 2);
    const auto reader = files::readerOf(descriptor.get(), "it");
    ASSERT_TRUE(reader);
    EXPECT_EQ((*reader)->seekToEnd(), 10U);
    EXPECT_EQ((*reader)->seek(6), 6U);
    EXPECT_EQ(toString((*reader)->read(100)), "6789");
    EXPECT_EQ((*reader)->position(), 10U);
    EXPECT_EQ(lseek(descriptor.get(), 0, SEEK_CUR), 2);
}

TEST_F(Reader, LeavesTheDescriptorOpen) {
    const FileDescriptor descriptor = opened("0123456789");
    { ASSERT_TRUE(files::readerOf(descriptor.get(), "it")); }
    EXPECT_NE(fcntl(descriptor.get(), F_GETFD), -1);
}

TEST_F(Reader, ReadsNothingAfterTheEnd) {
    const FileDescriptor descriptor = opened("0123456789");
    const auto reader = files::readerOf(descriptor.get(), "it");
    ASSERT_TRUE(reader);
    (*reader)->seek(1'000'000);
    EXPECT_TRUE((*reader)->read(10).empty());
}

TEST_F(Reader, FailsAtAPositionThatNoFileHas) {
    const FileDescriptor descriptor = opened("0123456789");
    const auto reader = files::readerOf(descriptor.get(), "it");
    ASSERT_TRUE(reader);
    (*reader)->seek(std::numeric_limits<std::uint64_t>::max());
    EXPECT_THROW((*reader)->read(1), FileHandleError);
}

TEST_F(Reader, RefusesDescriptorsThatCannotBeReadFrom) {
    writeFile(path("file"), "0123456789");
    for (const int access : {O_WRONLY, O_PATH}) {
        const FileDescriptor descriptor(open(path("file").c_str(), access | O_CLOEXEC));
        EXPECT_EQ(refusalOf(descriptor.get()), EBADF);
    }
}

TEST_F(Reader, RefusesAPathWithAZeroByteInIt) {
    writeFile(path("file"), "x");
    const auto reader = files::openReader(path("file") + std::string(1, '\0') + "more");
    ASSERT_FALSE(reader);
    EXPECT_EQ(reader.error().code(), EINVAL);
}

TEST_F(Reader, RefusesDescriptorsOfAnythingButARegularFile) {
    const FileDescriptor folder(open(path(".").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    EXPECT_EQ(refusalOf(folder.get()), EISDIR);
    const FileDescriptor device(open("/dev/null", O_RDONLY | O_CLOEXEC));
    EXPECT_EQ(refusalOf(device.get()), EINVAL);
    EXPECT_EQ(refusalOf(-1), EBADF);
}

// Data, a hole, data in the middle of a piece, and a hole up to the end.
TEST_F(Reader, ReadsTheHolesOfASparseFileAsZeros) {
    constexpr std::uint64_t kLength = 40ULL * 1024 * 1024;
    writeFile(path("file"), std::string(5000, 'a'));
    const FileDescriptor writer(open(path("file").c_str(), O_WRONLY | O_CLOEXEC));
    ASSERT_EQ(pwrite(writer.get(), "middle", 6, 20'000'000), 6);
    ASSERT_EQ(ftruncate(writer.get(), kLength), 0);
    std::string expected(kLength, '\0');
    expected.replace(0, 5000, 5000, 'a');
    expected.replace(20'000'000, 6, "middle");

    const auto reader = files::openReader(path("file"));
    ASSERT_TRUE(reader);
    EXPECT_TRUE(toString(files::readShared(**reader, kLength)) == expected);
    (*reader)->seek(3000);
    EXPECT_TRUE(toString(files::readShared(**reader, kLength - 4000)) ==
                expected.substr(3000, kLength - 4000));
    (*reader)->seek(19'000'000);
    EXPECT_TRUE(toString(files::readShared(**reader, kLength)) == expected.substr(19'000'000))
        << "no more than there is";
}

TEST_F(Reader, HoldsNoMoreThanThereIsAddressSpaceFor) {
    EXPECT_THROW(files::makeBuffer(std::numeric_limits<std::uint64_t>::max() / 2), FileHandleError);
}

}  // namespace
}  // namespace pinwell::test
