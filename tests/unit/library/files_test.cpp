// Tickets found in disk images and flat packages through the public interface.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <pinwell/ticket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "foundation/file_io.h"
#include "support/disk_image_builder.h"
#include "support/package_builder.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using foundation::asBytes;
using foundation::FileDescriptor;
using foundation::toData;
using ticket::DiskImage;
using ticket::FlatPackage;

class FindingATicket : public testing::Test {
  protected:
    template <class Builder>
    void put(const Builder& builder) {
        const auto bytes = builder.build();
        size = bytes.size();
        writeFile(path, bytes);
    }

    /// By path; the same is expected by descriptor.
    DiskImage image() const {
        const FileDescriptor descriptor(open(path.c_str(), O_RDONLY | O_CLOEXEC));
        const auto byDescriptor = ticket::readDiskImage(descriptor.get());
        const auto byPath = ticket::readDiskImage(path);
        EXPECT_EQ(byDescriptor.index(), byPath.index());
        EXPECT_TRUE(std::holds_alternative<DiskImage>(byPath)) << std::get<ticket::Error>(byPath).message;
        return std::get<DiskImage>(byPath);
    }
    ticket::Error imageRefusal() const { return std::get<ticket::Error>(ticket::readDiskImage(path)); }
    FlatPackage package() const { return std::get<FlatPackage>(ticket::readFlatPackage(path)); }
    ticket::Error packageRefusal() const { return std::get<ticket::Error>(ticket::readFlatPackage(path)); }

    TemporaryDirectory directory;
    const std::string path = directory / "artefact";
    std::uint64_t size = 0;
};

TEST_F(FindingATicket, ReadsTheSlotsOfASignedImage) {
    put(DiskImageBuilder().superblob(
        DiskImageBuilder::signature().blob(kSampleTicketSlot, ticketBlob("the ticket"))));
    const DiskImage found = image();
    EXPECT_EQ(found.fileSize, size);
    EXPECT_EQ(found.trailer.offset, size - 512);
    ASSERT_TRUE(found.superblob);
    EXPECT_EQ(found.superblob->offset, 1000U);
    EXPECT_EQ(found.superblob->offset + found.superblob->length, found.trailer.offset);
    ASSERT_EQ(found.slots.size(), 4U);
    EXPECT_EQ(found.slots[0].name, "code directory");
    EXPECT_EQ(found.slots[0].magic, 0xFADE0C02U);
    EXPECT_EQ(found.slots[0].range.offset, 1000U + 12U + 4U * 8U);
    EXPECT_EQ(found.slots[3].type, kSampleTicketSlot);
    EXPECT_EQ(found.slots[3].name, "ticket");
    EXPECT_EQ(found.slots[3].range.length, 8U + 10U);
    EXPECT_EQ(found.slots[3].range.offset + found.slots[3].range.length, found.trailer.offset);
    ASSERT_TRUE(found.ticket);
    EXPECT_EQ(found.ticket->bytes, toData(asBytes("the ticket")));
    EXPECT_EQ(found.ticket->range.offset, found.trailer.offset - 10);
    EXPECT_EQ(found.ticket->range.length, 10U);
}

TEST_F(FindingATicket, FindsNoneInASignedImageWithoutOne) {
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    EXPECT_EQ(image().slots.size(), 3U);
    EXPECT_FALSE(image().ticket);
}

TEST_F(FindingATicket, FindsNoSuperblobInAnUnsignedImage) {
    put(DiskImageBuilder());
    EXPECT_FALSE(image().superblob);
    EXPECT_TRUE(image().slots.empty());
    EXPECT_FALSE(image().ticket);
}

TEST_F(FindingATicket, TakesTheLastOfTwoTicketsInAnImage) {
    put(DiskImageBuilder().superblob(SuperBlobBuilder()
                                         .blob(kSampleTicketSlot, ticketBlob("first"))
                                         .blob(kSampleTicketSlot, ticketBlob("second"))));
    EXPECT_EQ(image().ticket->bytes, toData(asBytes("second")));
}

TEST_F(FindingATicket, RefusesOtherFilesThanImagesWithRuleAndOffset) {
    put(DiskImageBuilder().magic("kolx"));
    EXPECT_EQ(imageRefusal().code, ticket::ErrorCode::malformed);
    EXPECT_EQ(imageRefusal().offset, size - 512);
    EXPECT_EQ(imageRefusal().message, "the file does not end in a disk image's trailer");
    put(DiskImageBuilder().version(5));
    EXPECT_EQ(imageRefusal().offset, size - 512 + 4);
    writeFile(path, std::string_view("short"));
    EXPECT_EQ(imageRefusal().message, "the file is too small for a disk image's trailer");
}

TEST_F(FindingATicket, RefusesASuperblobThatItsTrailerPutsElsewhere) {
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()).codeSignOffset(999));
    EXPECT_EQ(imageRefusal().message, "the signature does not end where the trailer begins");
    put(DiskImageBuilder()
            .superblob(DiskImageBuilder::signature())
            .codeSignOffset(~0ULL)
            .codeSignLength(~0ULL));
    EXPECT_EQ(imageRefusal().message, "the signature's offset and length are out of range");
}

TEST_F(FindingATicket, RefusesALongHoleInPlaceOfASuperblobByItsMagic) {
    const std::uint64_t length = 128ULL * 1024 * 1024 + 1;
    const auto trailer = DiskImageBuilder().codeSignOffset(1).codeSignLength(length).trailer();
    writeFile(path, std::string_view("x"));
    ASSERT_EQ(truncate(path.c_str(), static_cast<off_t>(1 + length)), 0);
    const FileDescriptor file(open(path.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC));
    ASSERT_EQ(write(file.get(), trailer.data(), trailer.size()), 512);
    EXPECT_EQ(imageRefusal().message, "the superblob does not begin with its magic");
}

TEST_F(FindingATicket, RefusesASuperblobThatIsNotBackToBack) {
    put(DiskImageBuilder().superblob(
        SuperBlobBuilder().blob(0, ticketBlob("a")).gap(1).blob(2, ticketBlob("b"))));
    EXPECT_EQ(imageRefusal().message, "the blobs do not fill the superblob back to back");
}

TEST_F(FindingATicket, ReadsTheTrailersOfAPackageUpToTheTicket) {
    const PackageBuilder builder = PackageBuilder().terminator().ticket("the ticket").unknown("abc", 9);
    put(builder);
    const FlatPackage found = package();
    EXPECT_EQ(found.fileSize, size);
    EXPECT_FALSE(found.hasTerminator);
    ASSERT_EQ(found.trailers.size(), 2U);
    EXPECT_EQ(found.trailers[0].type, 9);
    EXPECT_EQ(found.trailers[0].recordOffset, size - 16);
    EXPECT_EQ(found.trailers[0].data.length, 3U);
    EXPECT_EQ(found.trailers[1].type, ticket::kTrailerTicket);
    ASSERT_TRUE(found.ticket);
    EXPECT_EQ(found.ticket->bytes, toData(asBytes("the ticket")));
    EXPECT_EQ(found.ticket->range.offset, builder.archiveSize() + 16);
    EXPECT_EQ(found.ticket->range.offset, found.trailers[1].data.offset);
    EXPECT_EQ(found.ticket->range.length, 10U);
}

TEST_F(FindingATicket, WalksToTheTerminatorOfAPackageWithoutATicket) {
    put(PackageBuilder().terminator().unknown("abc"));
    EXPECT_TRUE(package().hasTerminator);
    EXPECT_EQ(package().trailers.size(), 2U);
    EXPECT_FALSE(package().ticket);
}

TEST_F(FindingATicket, FindsNoTrailersAfterABareArchiveOrInAnEmptyFile) {
    put(PackageBuilder());
    EXPECT_TRUE(package().trailers.empty());
    EXPECT_FALSE(package().hasTerminator);
    writeFile(path, std::string_view());
    EXPECT_EQ(package().fileSize, 0U);
    EXPECT_FALSE(package().ticket);
}

TEST_F(FindingATicket, RefusesATrailerWhoseDataWouldBeginBeforeTheFile) {
    put(PackageBuilder().trailer({.length = 0xFFFFFFFF}));
    EXPECT_EQ(packageRefusal().message, "a trailer's data would begin before the file");
    EXPECT_EQ(packageRefusal().offset, size - 16);
}

TEST_F(FindingATicket, RefusesADamagedTrailerBehindTheTicket) {
    TrailerFields damaged;
    damaged.version = 2;
    put(PackageBuilder().terminator().ticket("the ticket").trailer(damaged));
    EXPECT_EQ(packageRefusal().message, "a trailer's version is not 1");
    EXPECT_EQ(packageRefusal().offset, size - 16);
}

TEST_F(FindingATicket, ReadsNoTicketOfAPackageThatIsLongerThanAnyIs) {
    const std::uint64_t length = 64ULL * 1024 * 1024 + 1;
    const auto record = makeTrailer({.type = 2, .length = static_cast<std::uint32_t>(length)});
    writeFile(path, std::string_view("x"));
    ASSERT_EQ(truncate(path.c_str(), static_cast<off_t>(length)), 0);
    const FileDescriptor file(open(path.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC));
    ASSERT_EQ(write(file.get(), record.data(), record.size()), 16);
    EXPECT_EQ(packageRefusal().message, "the ticket is too long to be read");
}

TEST_F(FindingATicket, ReadsAPackageByDescriptorWithoutMovingIt) {
    put(PackageBuilder().terminator().ticket("the ticket"));
    const FileDescriptor descriptor(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    const auto result = ticket::readFlatPackage(descriptor.get());
    EXPECT_TRUE(std::get<FlatPackage>(result).ticket);
    EXPECT_EQ(lseek(descriptor.get(), 0, SEEK_CUR), 0);
}

TEST_F(FindingATicket, RefusesASpecialFileWithItsErrno) {
    const auto errorOf = [](const std::string& item) {
        const auto error = std::get<ticket::Error>(ticket::readDiskImage(item));
        EXPECT_EQ(error.code, ticket::ErrorCode::unreadable);
        return error.systemError;
    };
    EXPECT_EQ(errorOf(directory / "missing"), ENOENT);
    EXPECT_EQ(errorOf(directory.path()), EISDIR);
    EXPECT_EQ(errorOf("/dev/null"), EINVAL);
    ASSERT_EQ(mkfifo((directory / "fifo").c_str(), 0600), 0);
    EXPECT_EQ(errorOf(directory / "fifo"), EINVAL);
    EXPECT_EQ(std::get<ticket::Error>(ticket::readFlatPackage(-1)).systemError, EBADF);
}

}  // namespace
}  // namespace pinwell::test
