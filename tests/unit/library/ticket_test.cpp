// Tickets taken apart, and found in disk images and flat packages, through the public interface.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <pinwell/ticket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <limits>

#include "base/handle.h"
#include "support/disk_image_builder.h"
#include "support/package_builder.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using base::Data;
using base::FileDescriptor;
using base::toData;
using ticket::ByteView;
using ticket::DiskImage;
using ticket::FlatPackage;
using ticket::TrailerType;

Data dataOf(ByteView bytes) {
    return {bytes.begin(), bytes.end()};
}

Data samplePayload() {
    return TicketPayloadBuilder()
        .flags(6)
        .signatureTime(1'700'000'000)
        .entry(2, hashOf(7))
        .entry(1, hashOf(9))
        .build();
}

/// The error of a refusal; a failure of the test when there is none.
template <class T>
ticket::Error refusalOf(const ticket::Result<T>& result) {
    EXPECT_FALSE(result.has_value()) << "not refused";
    return result ? ticket::Error{} : result.error();
}

TEST(TicketLibrary, IsTheVersionThatItsHeaderIs) {
    EXPECT_EQ(ticket::version(), static_cast<std::uint32_t>(PINWELL_TICKET_VERSION));
}

ticket::Result<std::string> refusedText() {
    return ticket::Error{ticket::ErrorCode::malformed, 7, 0, "the rule"};
}

TEST(TicketLibraryResult, HoldsAValue) {
    ticket::Result<std::string> result = std::string("value");
    EXPECT_TRUE(result);
    EXPECT_TRUE(result.has_value());
    EXPECT_EQ(*result, "value");
    EXPECT_EQ(result->size(), 5U);
    EXPECT_EQ(result.value(), "value");
    EXPECT_EQ(result.value_or("other"), "value");
    const std::string moved = *std::move(result);
    EXPECT_EQ(moved, "value");
}

TEST(TicketLibraryResult, HoldsAnErrorInsteadOfAValue) {
    const auto result = refusedText();
    EXPECT_FALSE(result);
    EXPECT_FALSE(result.has_value());
    EXPECT_EQ(result.error().code, ticket::ErrorCode::malformed);
    EXPECT_EQ(result.error().message, "the rule");
    EXPECT_EQ(result.value_or("other"), "other");
    EXPECT_EQ(refusedText().value_or("other"), "other");
}

TEST(TicketLibraryResult, ThrowsItsErrorWhereAValueIsRequired) {
    const auto result = refusedText();
    try {
        static_cast<void>(result.value());
        FAIL() << "a value";
    } catch (const ticket::BadResultAccess& thrown) {
        EXPECT_STREQ(thrown.what(), "the rule");
        EXPECT_EQ(thrown.error().offset, 7U);
    }
    EXPECT_THROW(static_cast<void>(refusedText().value()), ticket::BadResultAccess);
}

TEST(TicketLibraryResult, MovesAValueThatCannotBeCopied) {
    ticket::Result<std::unique_ptr<int>> result = std::make_unique<int>(5);
    EXPECT_EQ(**result, 5);
    const std::unique_ptr<int> moved = std::move(result).value();
    EXPECT_EQ(*moved, 5);
}

TEST(TicketLibraryContainer, IsLocatedInTheCallersBytes) {
    const IssuedChain chain = TicketChain().issue();
    const Data bytes = SatchelBuilder::of(chain, samplePayload()).reserved(77).build();
    const auto container = ticket::decodeContainer(bytes);
    ASSERT_TRUE(container);
    EXPECT_EQ(container->version, 1);
    EXPECT_EQ(container->reserved, 77);
    ASSERT_EQ(container->certificates.size(), 3U);
    EXPECT_EQ(dataOf(container->certificates[0]), chain.leaf.der);
    EXPECT_EQ(dataOf(container->certificates[2]), chain.root.der);
    EXPECT_EQ(dataOf(container->payload), samplePayload());
    EXPECT_EQ(container->signedBytes.data(), bytes.data());
    EXPECT_EQ(container->signedBytes.size(), bytes.size() - 72);
    EXPECT_EQ(container->signature.data(), bytes.data() + bytes.size() - 72);
    EXPECT_EQ(container->signature.size(), 72U);
}

TEST(TicketLibraryContainer, IsRefusedWithRuleAndOffset) {
    const SatchelBuilder sound = SatchelBuilder::of(TicketChain().issue(), samplePayload());
    const auto refusal = [](SatchelBuilder builder) {
        return refusalOf(ticket::decodeContainer(builder.build()));
    };

    const ticket::Error magic = refusal(SatchelBuilder(sound).magic("s8ck"));
    EXPECT_EQ(magic.code, ticket::ErrorCode::malformed);
    EXPECT_EQ(magic.offset, 0U);
    EXPECT_EQ(magic.message, "the container does not begin with its magic, \"s8ch\"");
    EXPECT_EQ(refusal(SatchelBuilder(sound).version(2)).offset, 4U);
    EXPECT_EQ(refusal(SatchelBuilder(sound).payloadLength(1)).offset, 8U);
}

TEST(TicketLibraryContainer, CountsACertificatesOffsetFromTheStartOfTheTicket) {
    const auto refusal =
        refusalOf(ticket::decodeContainer(SatchelBuilder()
                                              .certificates(std::vector<Data>(4, derElementOfSize(100)))
                                              .payload(samplePayload())
                                              .build()));
    EXPECT_EQ(refusal.message, "there are more than three certificates");
    EXPECT_EQ(refusal.offset, 16U + 4U + 3U * 100U);
}

TEST(TicketLibraryContainer, IsRefusedAtEveryLengthButItsOwn) {
    Data bytes = SatchelBuilder::of(TicketChain().issue(), samplePayload()).build();
    for (std::size_t length = 0; length < bytes.size(); ++length)
        EXPECT_FALSE(refusalOf(ticket::decodeContainer(ByteView(bytes).first(length))).message.empty());
    bytes.push_back(std::byte{0});
    EXPECT_EQ(refusalOf(ticket::decodeContainer(bytes)).offset, 8U);
}

TEST(TicketLibraryPayload, HasItsFieldsAndItsEntries) {
    const Data bytes = samplePayload();
    const auto payload = ticket::decodePayload(bytes);
    ASSERT_TRUE(payload);
    EXPECT_EQ(payload->version, 2);
    EXPECT_EQ(payload->hashLength, 20);
    EXPECT_EQ(payload->entryCount, 2U);
    EXPECT_EQ(payload->flags, 6U);
    EXPECT_EQ(payload->signatureTime, 1'700'000'000U);
    EXPECT_FALSE(payload->isMarkedRevoked());
    const auto second = ticket::entryAt(*payload, 1);
    ASSERT_TRUE(second);
    EXPECT_EQ(second->algorithm, 1U);
    EXPECT_EQ(second->hash, hashOf(9));
}

TEST(TicketLibraryPayload, HasNoEntryAfterTheLast) {
    const Data bytes = samplePayload();
    const auto payload = ticket::decodePayload(bytes).value();
    EXPECT_FALSE(ticket::entryAt(payload, 2));
    EXPECT_FALSE(ticket::entryAt(payload, std::numeric_limits<std::uint64_t>::max()));
}

TEST(TicketLibraryPayload, HasNoEntryWhereTheAlgorithmIsUnknownOrTooLong) {
    const Data bytes =
        TicketPayloadBuilder().entry(5, hashOf(1)).entry(4, hashOf(2)).entry(3, hashOf(3)).build();
    const auto payload = ticket::decodePayload(bytes).value();
    EXPECT_EQ(payload.entryCount, 3U);
    EXPECT_FALSE(ticket::entryAt(payload, 0));
    EXPECT_FALSE(ticket::entryAt(payload, 1));
    EXPECT_TRUE(ticket::entryAt(payload, 2));
}

TEST(TicketLibraryPayload, HasNoEntriesWhenItWasNeverDecoded) {
    EXPECT_FALSE(ticket::entryAt(ticket::Payload{}, 0));
}

TEST(TicketLibraryPayload, SaysThatItIsMarkedRevoked) {
    const Data bytes = TicketPayloadBuilder().revoked().build();
    EXPECT_TRUE(ticket::decodePayload(bytes).value().isMarkedRevoked());
}

TEST(TicketLibraryPayload, IsRefusedWithRuleAndOffset) {
    const auto refusal = [](const TicketPayloadBuilder& builder) {
        return refusalOf(ticket::decodePayload(builder.build()));
    };
    EXPECT_EQ(refusal(TicketPayloadBuilder().magic("m8tx")).offset, 0U);
    EXPECT_EQ(refusal(TicketPayloadBuilder().version(3)).offset, 4U);
    EXPECT_EQ(refusal(TicketPayloadBuilder().hashLength(32)).offset, 6U);
    EXPECT_EQ(refusal(TicketPayloadBuilder().count(1)).offset, 8U);
    EXPECT_EQ(refusalOf(ticket::decodePayload({})).message, "the payload ends inside its header");
}

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
        EXPECT_EQ(byDescriptor.has_value(), byPath.has_value());
        return byPath.value();
    }
    ticket::Error imageRefusal() const { return refusalOf(ticket::readDiskImage(path)); }
    FlatPackage package() const { return ticket::readFlatPackage(path).value(); }
    ticket::Error packageRefusal() const { return refusalOf(ticket::readFlatPackage(path)); }

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
    EXPECT_EQ(found.trailers[0].type, TrailerType{9});
    EXPECT_EQ(found.trailers[0].recordOffset, size - 16);
    EXPECT_EQ(found.trailers[0].data.length, 3U);
    EXPECT_EQ(found.trailers[1].type, TrailerType::ticket);
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
    EXPECT_TRUE(ticket::readFlatPackage(descriptor.get()).value().ticket);
    EXPECT_EQ(lseek(descriptor.get(), 0, SEEK_CUR), 0);
}

TEST_F(FindingATicket, RefusesASpecialFileWithItsErrno) {
    const auto errorOf = [](const std::string& item) {
        const auto error = refusalOf(ticket::readDiskImage(item));
        EXPECT_EQ(error.code, ticket::ErrorCode::unreadable);
        return error.systemError;
    };
    EXPECT_EQ(errorOf(directory / "missing"), ENOENT);
    EXPECT_EQ(errorOf(directory.path()), EISDIR);
    EXPECT_EQ(errorOf("/dev/null"), EINVAL);
    ASSERT_EQ(mkfifo((directory / "fifo").c_str(), 0600), 0);
    EXPECT_EQ(errorOf(directory / "fifo"), EINVAL);
    EXPECT_EQ(refusalOf(ticket::readFlatPackage(-1)).systemError, EBADF);
}

}  // namespace
}  // namespace pinwell::test
