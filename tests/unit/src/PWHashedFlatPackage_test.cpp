// The walk along a package's trailers.
#include "src/PWHashedFile/PWHashedFlatPackage.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <filesystem>

#include "formats/tm_ticket.h"
#include "package_fixture.h"
#include "runtime/process.h"
#include "support/archive_builder.h"
#include "support/resident_memory.h"

namespace pinwell {
namespace {

using base::toData;
using test::ArchiveBuilder;
using test::MessageCapture;
using test::PackageBuilder;
using test::TrailerFields;
using testing::ElementsAre;
using testing::StartsWith;

using FlatPackage = test::FlatPackageTest;

TEST_F(FlatPackage, IsMadeForPackagesAndArchivesThatAreFilesWithoutReadingThem) {
    for (const char* name : {"A.pkg", "A.mpkg", "A.xar", "A.vexa"}) {
        test::writeFile(platform.directory / name, std::string_view("contents"));
        const auto file = PWHashedFile::initWithFileURL(platform.directory.url(name), platform.services());
        EXPECT_NE(dynamic_cast<PWHashedFlatPackage*>(file.get()), nullptr) << name;
        EXPECT_EQ(file->appropriateExitCode(), 0) << name;
    }
    EXPECT_EQ(platform.files.count("openForReading"), 0U);
}

TEST_F(FlatPackage, NeverStapledHasNoTicketAndNoTrailers) {
    put(PackageBuilder());
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_FALSE(package.hasTrailers());
    EXPECT_EQ(package.ticketStart(), 0U);
    EXPECT_EQ(package.ticketLength(), 0U);
    EXPECT_EQ(package.origEOL(), std::filesystem::file_size(path));
    EXPECT_EQ(package.appropriateExitCode(), 0);
    EXPECT_THAT(output.lines(), ElementsAre(StartsWith("We do not know how to deal with trailer version ")));
}

TEST_F(FlatPackage, ThatEndsInTheRightVersionByChanceFailsByItsMagic) {
    TrailerFields fields;
    fields.magic = "data";
    put(PackageBuilder().trailer(fields));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_THAT(output.lines(), ElementsAre("Expected Magic t8lr for trailer but found data"));
}

TEST_F(FlatPackage, StapledReturnsItsTicketAndReportsTheSearch) {
    const PackageBuilder stapled = PackageBuilder().terminator().ticket("TICKET");
    put(stapled);
    const std::size_t start = stapled.archiveSize() + 16;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_EQ(package.ticketStart(), start);
    EXPECT_EQ(package.ticketLength(), 6U);
    EXPECT_FALSE(package.hasTrailers()) << "the walk stops at the ticket and never meets the terminator";
    EXPECT_EQ(package.dataToAppend(), std::nullopt);
    EXPECT_THAT(output.lines(),
                ElementsAre("Terminator Trailer size must be 0, not 6",
                            "{magic: t8lr, version: 1, type: 2, length: 6}",
                            "Found expected ticket at " + std::to_string(start) + " with length of 6"));
}

TEST_F(FlatPackage, TicketMayHoldAnyBytes) {
    const std::string bytes("t8lr\0\xFF\n t8lr\1\0\1\0", 17);
    put(PackageBuilder().terminator().ticket(bytes));
    EXPECT_EQ(package.ticketData(), toData(bytes));
}

TEST_F(FlatPackage, TheLastOfTwoTicketsIsTheTicket) {
    put(PackageBuilder().terminator().ticket("FIRST").ticket("SECOND"));
    EXPECT_EQ(package.ticketData(), toData("SECOND"));
}

TEST_F(FlatPackage, ATicketAtTheStartOfTheFileIsOne) {
    put(PackageBuilder().archive({}).ticket("TICKET"));
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_EQ(package.ticketStart(), 0U);
    EXPECT_EQ(package.ticketLength(), 6U);
}

TEST_F(FlatPackage, ATicketRecordWithoutDataIsNoTicketThoughItHasAPlace) {
    const PackageBuilder stapled = PackageBuilder().terminator().ticket("");
    put(stapled);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_EQ(package.ticketStart(), stapled.archiveSize() + 16);
    EXPECT_EQ(package.ticketLength(), 0U);
}

TEST_F(FlatPackage, OfZeroBytesHasNoTicketAndPrintsNothing) {
    put("");
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_EQ(package.origEOL(), 0U);
    EXPECT_EQ(output.text(), "");
}

TEST_F(FlatPackage, ShorterThanARecordHasNoTicketAndPrintsNothing) {
    for (std::size_t length = 1; length < 16; ++length) {
        put(std::string(length, 't'));
        PWHashedFlatPackage file{url, platform.services()};
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_EQ(file.ticketData(), std::nullopt);
        EXPECT_EQ(file.origEOL(), length);
        EXPECT_EQ(output.text(), "");
    }
}

TEST_F(FlatPackage, ATerminatorAloneIsAChainWithoutATicket) {
    const PackageBuilder chain = PackageBuilder().terminator();
    put(chain);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_TRUE(package.hasTrailers());
    EXPECT_THAT(output.lines(), ElementsAre("Found Terminator at " + std::to_string(chain.archiveSize())));
}

TEST_F(FlatPackage, ATerminatorWhoseLengthIs4294967296EndsTheChain) {
    TrailerFields fields;
    fields.type = 1;
    fields.upperLength = 1;
    put(PackageBuilder().trailer(fields));
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_TRUE(package.hasTrailers());
}

TEST_F(FlatPackage, OfATicketsLengthOnlyTheLowHalfCounts) {
    TrailerFields fields;
    fields.type = 2;
    fields.upperLength = 0xFFFFFFFF;
    put(PackageBuilder().terminator().trailer(fields, toData("TICKET")));
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_EQ(package.ticketLength(), 6U);
}

TEST_F(FlatPackage, UnknownTrailersAfterTheTicketAreCollectedInFileOrder) {
    put(PackageBuilder().terminator().ticket("TICKET").unknown("one", 7).unknown("two", 8));
    const std::string expected = PackageBuilder().archive({}).unknown("one", 7).unknown("two", 8).build();
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_TRUE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend(), toData(expected));
    EXPECT_TRUE(output.contains("{magic: t8lr, version: 1, type: 8, length: 3}"));
    EXPECT_TRUE(output.contains("Found unknown trailer type 8. Adding 19 bytes to append."));
    EXPECT_TRUE(output.contains("Found unknown trailer type 7. Adding 19 bytes to append."));
}

TEST_F(FlatPackage, UnknownTrailersBeforeTheTicketAreNotLookedAt) {
    put(PackageBuilder().terminator().unknown("before").ticket("TICKET"));
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_FALSE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend(), std::nullopt);
}

TEST_F(FlatPackage, UnknownTrailersUpToTheTerminatorAreCollectedWithoutATicket) {
    put(PackageBuilder().terminator().unknown("one"));
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_TRUE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend(), toData(PackageBuilder().archive({}).unknown("one").build()));
}

TEST_F(FlatPackage, UnknownTrailersAfterBytesThatAreNoRecordAreCollected) {
    put(PackageBuilder().unknown("one"));
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_TRUE(package.hasTrailers());
    EXPECT_TRUE(package.dataToAppend().has_value());
}

TEST_F(FlatPackage, ATerminatorsTypeWithDataIsAnUnknownTrailer) {
    TrailerFields fields;
    fields.type = 1;
    put(PackageBuilder().terminator().trailer(fields, toData("data")));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_TRUE(output.contains("Found unknown trailer type 1. Adding 20 bytes to append."));
}

TEST_F(FlatPackage, ATrailerThatWouldBeginBeforeTheFileEndsTheWalkAndDropsTheCollection) {
    TrailerFields fields;
    fields.length = 5;  // of 4 that are there
    put(PackageBuilder().archive({}).bytes("four").trailer(fields).unknown("kept?"));
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_FALSE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend(), std::nullopt);
}

TEST_F(FlatPackage, ATicketThatWouldBeginBeforeTheFileIsNone) {
    TrailerFields fields;
    fields.type = 2;
    fields.length = 0xFFFFFFFF;
    put(PackageBuilder().trailer(fields));
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_EQ(package.ticketStart(), 0U);
    EXPECT_EQ(package.ticketLength(), 0U);
}

TEST_F(FlatPackage, RunningOutOfBytesDropsTheCollection) {
    put(PackageBuilder().archive({}).bytes("fifteen bytes..").unknown("one"));
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_FALSE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend(), std::nullopt);
}

TEST_F(FlatPackage, CutAnywhereIsReadWithoutHarm) {
    const std::string whole =
        PackageBuilder().archive(toData("archive")).terminator().ticket("TICKET").unknown("one").build();
    for (std::size_t length = 0; length < whole.size(); ++length) {
        put(whole.substr(0, length));
        PWHashedFlatPackage file{url, platform.services()};
        const bool endsBehindTicket = length == whole.size() - 19;
        EXPECT_EQ(file.ticketData().has_value(), endsBehindTicket) << length;
    }
}

TEST_F(FlatPackage, WithAHundredThousandEmptyTrailersIsReadInOnePass) {
    constexpr std::size_t kCount = 100'000;
    std::string chain = PackageBuilder().archive({}).terminator().ticket("TICKET").build();
    const std::string one = PackageBuilder().archive({}).unknown("").build();
    for (std::size_t i = 0; i < kCount; ++i) chain += one;
    put(chain);
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_EQ(package.dataToAppend()->size(), kCount * 16);
}

TEST_F(FlatPackage, ThatIsMissingHasNoTicket) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_THAT(
        output.lines(),
        ElementsAre(StartsWith("Could not create file handle to " + url.absoluteString() + ". Error Domain="),
                    StartsWith("Could not get ticket for " + path + ". Error Domain=")));
    EXPECT_EQ(package.appropriateExitCode(), 0);
}

TEST_F(FlatPackage, WhoseSizeCannotBeHadHasNoTicketAndIsReadNoFurther) {
    put(PackageBuilder().terminator().ticket("TICKET"));
    platform.files.fail("handle.size", EIO);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_THAT(output.lines(),
                ElementsAre(StartsWith("Could not get file size of Sample.pkg. This should not have "
                                       "happened. Cannot size ")));
    EXPECT_EQ(platform.files.count("handle.read"), 0U);
}

// Data so long that a walk does not read it together with its record.
const std::string kLong(100'000, 'x');

// Operation numbers of a walk: 0 notes the file's state, 1 opens, 2 takes its size, 3 reads the last record,
// 4 its data, if these are long.
constexpr std::size_t kRecordRead = 3;
constexpr std::size_t kDataRead = 4;

TEST_F(FlatPackage, WhoseTicketCannotBeReadHasNone) {
    put(PackageBuilder().terminator().ticket(kLong));
    platform.files.failOperation(kDataRead, EIO);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_EQ(package.ticketStart(), 0U);
    EXPECT_EQ(package.ticketLength(), 0U);
    EXPECT_THAT(output.lines().back(),
                StartsWith("Couldn't read existing ticket of Sample.pkg. Cannot read "));
}

TEST_F(FlatPackage, WhoseTicketCannotBeReadDropsTheTrailersAfterIt) {
    put(PackageBuilder().terminator().ticket(kLong).unknown(kLong));
    platform.files.failOperation(kDataRead + 2, EIO);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_FALSE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend(), std::nullopt);
}

TEST_F(FlatPackage, WhoseUnknownTrailersCannotBeReadKeepsNone) {
    // The second one's data; then the record before it.
    for (const std::size_t failing : {kDataRead, kDataRead + 2, kRecordRead}) {
        test::TestPlatform fresh;
        test::writeFile(fresh.directory / "Sample.pkg",
                        PackageBuilder().terminator().unknown(kLong).unknown(kLong).build());
        fresh.files.failOperation(failing, EIO);
        PWHashedFlatPackage file{fresh.directory.url("Sample.pkg"), fresh.services()};
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_EQ(file.ticketData(), std::nullopt);
        EXPECT_FALSE(file.hasTrailers());
        EXPECT_EQ(file.dataToAppend(), std::nullopt);
        EXPECT_THAT(output.lines().back(),
                    StartsWith("Couldn't read existing package trailers of Sample.pkg. Cannot "));
    }
}

TEST_F(FlatPackage, WhoseUnknownTrailerIsShortKeepsTheReadBytesAndContinues) {
    put(PackageBuilder().terminator().ticket("TICKET").unknown(kLong));
    platform.files.cutRead(kDataRead, 10);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_EQ(package.dataToAppend()->size(), 10U);
    EXPECT_TRUE(output.contains("Data read for unknown trailer does not match expected size. 10 vs 100016."));
}

TEST_F(FlatPackage, WhoseRecordComesUpShortEndsTheChainThere) {
    put(PackageBuilder().terminator().ticket(kLong).unknown(kLong));
    platform.files.cutRead(kRecordRead + 2, 2047);  // of the 2048 up to the end of the record
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.ticketData(), std::nullopt);
    EXPECT_TRUE(package.dataToAppend().has_value());
    EXPECT_EQ(output.lines().back(), "Length 15 does not equal expected size of 16");
}

// A file of `size` bytes that takes up next to no room, and ends in these trailers.
void putSparse(const std::string& path, std::uintmax_t size, const std::string& trailers) {
    test::writeFile(path, std::string_view(""));
    std::filesystem::resize_file(path, size);
    std::FILE* const file = std::fopen(path.c_str(), "ab");
    ASSERT_NE(file, nullptr);
    EXPECT_EQ(std::fwrite(trailers.data(), 1, trailers.size(), file), trailers.size());
    EXPECT_EQ(std::fclose(file), 0);
}

// No ticket of this length is ever accepted: only enough of it is kept to show this.
TEST_F(FlatPackage, HasTheBeginningOfATicketThatIsLongerThanAny) {
    TrailerFields fields;
    fields.type = 2;
    fields.length = 0xFFFFFFFF;
    constexpr std::uintmax_t kSize = std::uintmax_t{1} << 40U;
    putSparse(path, kSize, PackageBuilder().archive({}).trailer(fields).unknown("one").build());
    const auto ticket = package.ticketData();
    ASSERT_TRUE(ticket.has_value());
    EXPECT_EQ(ticket->size(), kLongestTicketHeld);
    EXPECT_EQ(package.ticketStart(), kSize - 0xFFFFFFFF);
    EXPECT_EQ(package.ticketLength(), 0xFFFFFFFF);
    EXPECT_EQ(package.dataToAppend()->size(), 19U);
}

TEST_F(FlatPackage, WithAnEmptyTrailerOfFourGibibytesTakesMemoryForItsExistingBytes) {
    if (runtime::kSanitized) GTEST_SKIP() << "a sanitizer has memory of its own for what is not there";
    TrailerFields fields;
    fields.length = 0xFFFFFFF0;
    constexpr std::uintmax_t kSize = std::uintmax_t{1} << 40U;
    putSparse(path, kSize, PackageBuilder().archive({}).trailer(fields).unknown("one").build());
    const std::size_t before = test::residentMemory();
    EXPECT_EQ(package.ticketData(), std::nullopt);
    ASSERT_TRUE(package.hasTrailers());
    EXPECT_EQ(package.dataToAppend()->size(), std::uint64_t{0xFFFFFFF0} + 16 + 19);
    const std::string tail = PackageBuilder().archive({}).trailer(fields).unknown("one").build();
    EXPECT_TRUE(std::ranges::equal(package.dataToAppend()->view().last(tail.size()), base::asBytes(tail)));
    EXPECT_LE(test::residentMemory(), before + test::kLittleMemory);
}

TEST_F(FlatPackage, WithShortAndLongTrailersInTurnHasThemInFileOrder) {
    PackageBuilder chain;
    chain.archive({});
    for (std::uint16_t type = 3; type < 12; ++type) chain.unknown(type % 3 == 0 ? kLong : "short", type);
    put(PackageBuilder().terminator().ticket("TICKET").bytes(chain.build()));
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_TRUE(package.dataToAppend() == toData(chain.build()));
}

TEST_F(FlatPackage, TheTrailersAreReadOncePerObject) {
    put(PackageBuilder().terminator().ticket("TICKET"));
    package.ticketData();
    put(PackageBuilder().terminator().ticket("ANOTHER"));
    EXPECT_EQ(package.ticketData(), toData("TICKET"));
    EXPECT_EQ(platform.files.count("openForReading"), 1U);
}

TEST_F(FlatPackage, IsNeverChangedByReading) {
    put(PackageBuilder().terminator().ticket("TICKET").unknown("one"));
    package.ticketData();
    EXPECT_THAT(platform.files.changes(), ElementsAre());
}

}  // namespace
}  // namespace pinwell
