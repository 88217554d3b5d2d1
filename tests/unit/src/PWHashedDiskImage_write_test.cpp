// Writing a ticket into an image, and removing it.
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <fstream>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "disk_image_fixture.h"
#include "runtime/process.h"
#include "support/resident_memory.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell {
namespace {

using base::ByteWriter;
using base::Data;
using test::DiskImageBuilder;
using test::Lines;
using test::makeBlob;
using test::MessageCapture;
using test::SuperBlobBuilder;
using test::ticketBlob;

SuperBlobBuilder stapled(std::string_view ticket) {
    return SuperBlobBuilder().blob(0x10002, ticketBlob(ticket));
}

SuperBlobBuilder signedAndStapled(std::string_view ticket) {
    return DiskImageBuilder::signature().blob(0x10002, ticketBlob(ticket));
}

class DiskImageWriting : public test::DiskImageTest {
  protected:
    // One call of the hook on the image of `builder`.
    bool write(const DiskImageBuilder& builder, std::string_view ticket) {
        test::writeFile(directory / "new.ticket", ticket);
        return run(builder, source, false);
    }
    bool erase(const DiskImageBuilder& builder) { return run(builder, std::nullopt, true); }

    bool run(const DiskImageBuilder& builder, const std::optional<URL>& from, bool deleteExisting) {
        put(builder);
        auto image = open();
        image.setAppropriateExitCode(1);
        const MessageCapture output(kVerbosityVerbose);
        const bool done = image._writeNewTicketDataFromURL(from, url, deleteExisting, &error);
        lines = output.lines();
        exitCode = image.appropriateExitCode();
        header = base::toData(image.dmgHeader().bytes());
        return done;
    }

    std::vector<std::string> debugCopies() const {
        std::vector<std::string> paths;
        for (const auto& entry : std::filesystem::directory_iterator(directory / "tmp"))
            paths.push_back(entry.path().string());
        return paths;
    }
    bool printedTruncation() const {
        return std::any_of(lines.begin(), lines.end(),
                           [](const std::string& line) { return line.find("Truncating ") == 0; });
    }
    void expectFailedWith73AndUntouched(const DiskImageBuilder& before) const {
        EXPECT_EQ(exitCode, 73);
        EXPECT_EQ(contents(), contentsOf(before));
        EXPECT_TRUE(platform.files.changes().empty());
    }

    const URL source = directory.url("new.ticket");
    std::optional<Error> error = Error::osStatus(1);  // the caller's earlier value
    Lines lines;
    std::int32_t exitCode = 0;
    Data header;
};

TEST_F(DiskImageWriting, AddsATicketToMoreBlobsThan16BitsCount) {
    SuperBlobBuilder superblob = DiskImageBuilder::signature();
    for (std::uint32_t i = 3; i < 70'000; ++i) superblob.blob(0x20000 + i, makeBlob(0xFADE7171, {}));
    ASSERT_TRUE(write(DiskImageBuilder().superblob(superblob), "TICKET"));
    EXPECT_TRUE(contents() ==
                contentsOf(DiskImageBuilder().superblob(superblob.blob(0x10002, ticketBlob("TICKET")))));
}

// An image of 1000 bytes of data, this superblob with zeros after it up to `length`, and the trailer.
class LargeDiskImageWriting : public DiskImageWriting {
  protected:
    void putSparse(std::uint64_t length, const SuperBlobBuilder& superblob) {
        Data start(1000, std::byte{0xDA});
        base::append(start, superblob.build());
        test::writeFile(path, base::ByteView(start));
        std::filesystem::resize_file(path, 1000 + length);
        std::ofstream(path, std::ios::binary | std::ios::app)
            << base::toString(DiskImageBuilder().codeSignOffset(1000).codeSignLength(length).trailer());
        test::writeFile(source.path(), std::string_view("TICKET"));
    }
    static SuperBlobBuilder signatureThatEndsIn(std::uint32_t slot, std::uint32_t length) {
        const auto before = static_cast<std::uint32_t>(DiskImageBuilder::signature().build().size() + 8);
        return DiskImageBuilder::signature()
            .blob(slot, ByteWriter().be32(0xFADE7171).be32(length - before).data())
            .length(length);
    }
};

TEST_F(LargeDiskImageWriting, AddsATicketToASuperblobOf200Mebibytes) {
    constexpr std::uint32_t kLength = 200U * 1024 * 1024;
    putSparse(kLength, signatureThatEndsIn(0x20000, kLength));
    const std::size_t before = test::residentMemory();
    auto image = open();
    EXPECT_TRUE(image._writeNewTicketDataFromURL(source, url, false, &error));
    // A sanitizer needs its own memory for the bytes read.
    if (!runtime::kSanitized) {
        EXPECT_LE(test::residentMemory(), before + test::kLittleMemory);
    }
    EXPECT_EQ(std::filesystem::file_size(path), 1000 + kLength + 8 + 8 + 6 + 512);
    auto again = open();
    EXPECT_EQ(again.appropriateExitCode(), 0);
    EXPECT_EQ(again.blobs().size(), 5U);
    EXPECT_EQ(again._ticketData(), base::toData("TICKET"));
}

TEST_F(LargeDiskImageWriting, ReplacesAStaleTicketOf200Mebibytes) {
    constexpr std::uint32_t kLength = 200U * 1024 * 1024;
    putSparse(kLength, signatureThatEndsIn(0x10002, kLength));
    EXPECT_TRUE(open()._writeNewTicketDataFromURL(source, url, false, &error));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(signedAndStapled("TICKET"))));
}

TEST_F(LargeDiskImageWriting, AddsNoTicketThatMakesTheSuperblobsLengthOverflow) {
    putSparse(0xFFFFFFFF, signatureThatEndsIn(0x20000, 0xFFFFFFFF));
    auto image = open();
    EXPECT_FALSE(image._writeNewTicketDataFromURL(source, url, false, &error));
    EXPECT_EQ(image.appropriateExitCode(), 73);
    EXPECT_TRUE(platform.files.changes().empty());
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), EFBIG);
}

TEST_F(DiskImageWriting, PutsASuperblobOf28BytesAndTheTicketInFrontOfAnUnsignedImagesTrailer) {
    ASSERT_TRUE(write(DiskImageBuilder(), "TICKET"));
    const Data superblob = ByteWriter()
                               .be32(0xFADE0CC0)
                               .be32(34)
                               .be32(1)
                               .be32(0x10002)
                               .be32(20)
                               .be32(0xFADE0B01)
                               .be32(14)
                               .text("TICKET")
                               .data();
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(superblob)));
    EXPECT_EQ(contents().size(), 1000U + 34 + 512);
    EXPECT_EQ(header, DiskImageBuilder().codeSignOffset(1000).codeSignLength(34).trailer());
    EXPECT_EQ(exitCode, 0);
    EXPECT_EQ(error, Error::osStatus(1));
    EXPECT_FALSE(printedTruncation());
}

TEST_F(DiskImageWriting, AppendsTheTicketToASignedImagesBlobsWhichMoveBy8) {
    const Data before = DiskImageBuilder::signature().build();
    ASSERT_TRUE(write(DiskImageBuilder().superblob(before), "TICKET"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(signedAndStapled("TICKET"))));
    EXPECT_EQ(contents().size(), 1000 + before.size() + 8 + 14 + 512);
    EXPECT_EQ(open().blobs().back().slotType, 0x10002U);
    EXPECT_EQ(open().blobs()[0].at("offset"), values::Value(44U));
    EXPECT_FALSE(printedTruncation());
}

// The superblob is then at offset 0. In a trailer this means that there is none: the read-back of a staple
// notices it.
TEST_F(DiskImageWriting, OfATrailerAloneSucceedsThoughTheTicketIsNotFoundAgain) {
    ASSERT_TRUE(write(DiskImageBuilder().data({}), "TICKET"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().data({}).superblob(stapled("TICKET"))));
    EXPECT_EQ(exitCode, 0);
    auto image = open();
    EXPECT_EQ(image.appropriateExitCode(), 0);
    EXPECT_EQ(image.ticketData(), std::nullopt);
}

TEST_F(DiskImageWriting, TakesATicketOf1Byte) {
    ASSERT_TRUE(write(DiskImageBuilder(), "T"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled("T"))));
    EXPECT_EQ(lines[0], "Adding 1 blobs to superblob. What about Blob?");
    EXPECT_EQ(lines[1], "Length of new ticket blob is 9");
}

TEST_F(DiskImageWriting, ReplacesATicketByALongerOneWithoutTruncating) {
    ASSERT_TRUE(write(DiskImageBuilder().superblob(signedAndStapled("OLD")), "A LONGER ONE"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(signedAndStapled("A LONGER ONE"))));
    EXPECT_FALSE(printedTruncation());
}

TEST_F(DiskImageWriting, ReplacesATicketByOneOfTheSameLengthWithoutTruncating) {
    ASSERT_TRUE(write(DiskImageBuilder().superblob(stapled("OLD")), "NEW"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled("NEW"))));
    EXPECT_FALSE(printedTruncation());
}

TEST_F(DiskImageWriting, ReplacesATicketByAShorterOneAndSaysThatItTruncates) {
    ASSERT_TRUE(write(DiskImageBuilder().superblob(stapled("A LONG OLD ONE")), "NEW"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled("NEW"))));
    EXPECT_EQ(lines.back(), "Truncating image.dmg from to 1554 bytes to 1543 bytes.");
}

TEST_F(DiskImageWriting, DropsBothOfTwoTickets) {
    ASSERT_TRUE(write(DiskImageBuilder().superblob(stapled("ONE").blob(0x10002, ticketBlob("TWO"))), "NEW"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled("NEW"))));
}

TEST_F(DiskImageWriting, PutsATicketThatStoodFirstLast) {
    const Data requirements = test::emptyRequirements();
    ASSERT_TRUE(write(DiskImageBuilder().superblob(stapled("OLD").blob(2, requirements)), "NEW"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(
                              SuperBlobBuilder().blob(2, requirements).blob(0x10002, ticketBlob("NEW")))));
}

TEST_F(DiskImageWriting, PrintsItsSteps) {
    ASSERT_TRUE(
        write(DiskImageBuilder().superblob(stapled("OLDER").blob(2, test::emptyRequirements())), "NEW"));
    ASSERT_EQ(debugCopies().size(), 1U);
    EXPECT_EQ(lines, (Lines{"Adding 2 blobs to superblob. What about Blob?",
                            "Adding blob of size 12 to offset 28.", "Length of new ticket blob is 11",
                            "A copy of the new disk image blobs and headers has been saved to " +
                                debugCopies()[0] + ". Enjoy.",
                            "Truncating image.dmg from to 1565 bytes to 1563 bytes."}));
}

TEST_F(DiskImageWriting, TouchesTheImageWithOneSeekAndOneWriteAndFlushesIt) {
    ASSERT_TRUE(write(DiskImageBuilder().superblob(stapled("A LONG OLD ONE")), "NEW"));
    const auto names = platform.files.names();
    const auto opened = std::find(names.begin(), names.end(), "openForUpdating");
    EXPECT_EQ(Lines(opened, names.end()),
              (Lines{"openForUpdating", "handle.seek", "handle.write", "handle.position", "handle.truncate",
                     "handle.synchronize", "handle.close"}));
}

TEST_F(DiskImageWriting, ReservesTheAdditionalSpaceBeforeItOverwritesAnything) {
    ASSERT_TRUE(write(DiskImageBuilder(), "TICKET"));
    const auto names = platform.files.names();
    const auto opened = std::find(names.begin(), names.end(), "openForUpdating");
    EXPECT_EQ(Lines(opened, names.end()),
              (Lines{"openForUpdating", "handle.seek", "handle.reserve", "handle.write", "handle.position",
                     "handle.synchronize", "handle.close"}));
}

TEST_F(DiskImageWriting, OnAVolumeWithoutRoomLeavesTheImageUntouched) {
    platform.files.fail("handle.reserve", ENOSPC);
    EXPECT_FALSE(write(DiskImageBuilder(), "TICKET"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder()));
    EXPECT_EQ(exitCode, 73);
}

TEST_F(DiskImageWriting, KeepsDescribingTheFileAsItWasRead) {
    put(DiskImageBuilder().superblob(stapled("OLD")));
    test::writeFile(directory / "new.ticket", std::string_view("NEWER"));
    auto image = open();
    EXPECT_EQ(image.ticketData(), base::toData("OLD"));
    ASSERT_TRUE(image._writeNewTicketDataFromURL(source, url, false, nullptr));
    EXPECT_EQ(image.superblob(), stapled("OLD").build());
    EXPECT_EQ(image.csLength(), 31U);
    EXPECT_EQ(image.ticketData(), base::toData("OLD"));
    EXPECT_EQ(open().ticketData(), base::toData("NEWER"));
}

TEST_F(DiskImageWriting, DeletesTheTicketOfASignedImage) {
    const Data before = signedAndStapled("TICKET").build();
    ASSERT_TRUE(erase(DiskImageBuilder().superblob(before)));
    const Data after = DiskImageBuilder::signature().build();
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(after)));
    EXPECT_EQ(before.size() - after.size(), 14U + 8);
    EXPECT_EQ(lines[1].substr(lines[1].find(" to offset")), " to offset 36.");
    EXPECT_EQ(lines.back(), values::format("Truncating image.dmg from to %tu bytes to %tu bytes.",
                                           1000 + before.size() + 512, 1000 + after.size() + 512));
    EXPECT_EQ(exitCode, 0);
}

TEST_F(DiskImageWriting, DeletesNothingWhenTheTicketIsTheOnlyBlobAndSucceeds) {
    const auto image = DiskImageBuilder().superblob(stapled("TICKET"));
    EXPECT_TRUE(erase(image));
    EXPECT_EQ(contents(), contentsOf(image));
    EXPECT_TRUE(platform.files.changes().empty());
    EXPECT_EQ(lines, Lines{"Adding 0 blobs to superblob. What about Blob?"});
    EXPECT_EQ(header, image.trailer());
    EXPECT_EQ(exitCode, 0);
}

TEST_F(DiskImageWriting, RefusesToDeleteATicketThatIsNotThere) {
    const auto image = DiskImageBuilder().superblob(DiskImageBuilder::signature());
    EXPECT_FALSE(erase(image));
    EXPECT_EQ(lines, Lines{"Cannot delete an existing ticket in image.dmg that doesn't exist."});
    EXPECT_EQ(error, std::nullopt);
    expectFailedWith73AndUntouched(image);
}

TEST_F(DiskImageWriting, RefusesToDeleteATicketWithoutAnyBytes) {
    const auto image =
        DiskImageBuilder().superblob(DiskImageBuilder::signature().blob(0x10002, ticketBlob("")));
    EXPECT_FALSE(erase(image));
    EXPECT_EQ(lines, Lines{"Cannot delete an existing ticket in image.dmg that doesn't exist."});
    expectFailedWith73AndUntouched(image);
}

TEST_F(DiskImageWriting, RefusesATicketFileThatCannotBeRead) {
    platform.files.fail("contentsOfFile", EACCES);
    EXPECT_FALSE(write(DiskImageBuilder(), "TICKET"));
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].find("Cannot add a new ticket to image.dmg. Error Domain=POSIXErrorDomain Code=13 "),
              0U);
    ASSERT_TRUE(error.has_value());
    EXPECT_EQ(error->code(), EACCES);
    expectFailedWith73AndUntouched(DiskImageBuilder());
}

TEST_F(DiskImageWriting, RefusesAnEmptyTicket) {
    EXPECT_FALSE(write(DiskImageBuilder(), ""));
    EXPECT_EQ(lines, Lines{"Cannot add a new ticket to image.dmg. (null)"});
    EXPECT_EQ(error, std::nullopt);
    expectFailedWith73AndUntouched(DiskImageBuilder());
}

TEST_F(DiskImageWriting, RefusesToWriteWithoutASource) {
    EXPECT_FALSE(run(DiskImageBuilder(), std::nullopt, false));
    EXPECT_EQ(lines, Lines{"Cannot add a new ticket to image.dmg. (null)"});
    EXPECT_EQ(error, std::nullopt);
    expectFailedWith73AndUntouched(DiskImageBuilder());
}

TEST_F(DiskImageWriting, RefusesATicketOf4GiB) {
    test::writeFile(directory / "huge.ticket", std::string_view());
    std::filesystem::resize_file(directory / "huge.ticket", 1ULL << 32);
    EXPECT_FALSE(run(DiskImageBuilder(), directory.url("huge.ticket"), false));
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].find("Cannot add a new ticket to image.dmg. "), 0U);
    expectFailedWith73AndUntouched(DiskImageBuilder());
}

TEST_F(DiskImageWriting, NamesTheTargetThatItWritesAndNotTheFileThatWasRead) {
    put(DiskImageBuilder().superblob(signedAndStapled("A MUCH LONGER TICKET")));
    auto image = open();
    std::filesystem::copy_file(url.path(), directory / "clone.dmg");
    const URL clone = directory.url("clone.dmg");
    const auto saidOf = [&](const std::optional<URL>& from, bool deleteExisting) {
        const MessageCapture output(kVerbosityVerbose);
        image._writeNewTicketDataFromURL(from, clone, deleteExisting, nullptr);
        return output.lines();
    };
    EXPECT_EQ(saidOf(std::nullopt, false), Lines{"Cannot add a new ticket to clone.dmg. (null)"});
    test::writeFile(source.path(), std::string_view("T"));
    EXPECT_EQ(saidOf(source, false).back().find("Truncating clone.dmg from to "), 0U);
    platform.files.fail("handle.write", EIO);
    EXPECT_EQ(
        saidOf(source, false).back().find("Fatal error while writing new ticket to " + clone.path() + ". "),
        0U);
    EXPECT_EQ(saidOf(std::nullopt, true)
                  .back()
                  .find("Fatal error while deleting existing ticket to " + clone.path() + ". "),
              0U);
    platform.files.fail("openForUpdating", EROFS);
    EXPECT_EQ(saidOf(source, false).back(), "All that work and I can't open clone.dmg for writing.");
}

TEST_F(DiskImageWriting, IgnoresTheSourceWhenDeleting) {
    EXPECT_TRUE(run(DiskImageBuilder().superblob(signedAndStapled("TICKET")), directory.url("none"), true));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(DiskImageBuilder::signature())));
}

TEST_F(DiskImageWriting, LeavesAPrivateCopyOfItsBytesEachTime) {
    ASSERT_TRUE(write(DiskImageBuilder(), "TICKET"));
    ASSERT_EQ(debugCopies().size(), 1U);
    const std::string copy = debugCopies()[0];
    EXPECT_TRUE(copy.ends_with(".dmgData"));
    EXPECT_EQ(test::readFile(copy), contents().substr(1000));
    struct stat status = {};
    ASSERT_EQ(stat(copy.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0600U);
    ASSERT_TRUE(write(DiskImageBuilder(), "TICKET"));
    EXPECT_EQ(debugCopies().size(), 2U);
}

TEST_F(DiskImageWriting, SavesTheCopyBeforeItOpensTheImage) {
    ASSERT_TRUE(write(DiskImageBuilder(), "TICKET"));
    const auto names = platform.files.names();
    EXPECT_LT(std::find(names.begin(), names.end(), "writeFile"),
              std::find(names.begin(), names.end(), "openForUpdating"));
}

TEST_F(DiskImageWriting, GoesOnInSilenceWhenTheCopyCannotBeSaved) {
    platform.files.fail("writeFile", ENOSPC);
    EXPECT_TRUE(write(DiskImageBuilder(), "TICKET"));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled("TICKET"))));
    EXPECT_EQ(lines.size(), 2U);
    EXPECT_EQ(exitCode, 0);
    EXPECT_EQ(error, Error::osStatus(1));
}

TEST_F(DiskImageWriting, HandsOutTheOpeningsErrorWhenTheImageCannotBeOpened) {
    platform.files.fail("writeFile", ENOSPC);
    platform.files.fail("openForUpdating", EROFS);
    EXPECT_FALSE(write(DiskImageBuilder(), "TICKET"));
    EXPECT_EQ(lines.back(), "All that work and I can't open image.dmg for writing.");
    ASSERT_TRUE(error.has_value());
    EXPECT_EQ(error->code(), EROFS);
    EXPECT_EQ(exitCode, 73);
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder()));
}

TEST_F(DiskImageWriting, MayBeCalledWithoutAPlaceForTheError) {
    put(DiskImageBuilder());
    auto image = open();
    EXPECT_FALSE(image._writeNewTicketDataFromURL(directory.url("none"), url, false, nullptr));
    EXPECT_EQ(image.appropriateExitCode(), 73);
}

// Each operation on the image being written, made to fail.
class FailingDiskImageWriting : public DiskImageWriting, public testing::WithParamInterface<const char*> {
  protected:
    FailingDiskImageWriting() {
        // Reading comes first and must succeed: five operations, none of them a seek.
        const std::string operation = GetParam();
        put(image);
        const auto before = platform.files.operations().size();
        test::writeFile(directory / "new.ticket", std::string_view("NEW"));
        opened.emplace(url, platform.services());
        platform.files.fail("handle." + operation, EIO);
        EXPECT_EQ(platform.files.operations().size() - before, 5U);
    }

    bool run(bool deleteExisting) {
        const MessageCapture output(kVerbosityVerbose);
        const bool done = opened->_writeNewTicketDataFromURL(source, url, deleteExisting, &error);
        lines = output.lines();
        return done;
    }
    void expectFatalErrorWhile(const std::string& what) const {
        ASSERT_FALSE(lines.empty());
        const std::string start =
            "Fatal error while " + what + " ticket to " + path + ". Cannot " + GetParam() + " ";
        EXPECT_EQ(lines.back().substr(0, start.size()), start);
        EXPECT_EQ(lines.back().back(), '.');
        EXPECT_EQ(opened->appropriateExitCode(), 73);
    }

    const DiskImageBuilder image = DiskImageBuilder().superblob(signedAndStapled("A LONG OLD TICKET"));
    std::optional<PWHashedDiskImage> opened;
};

INSTANTIATE_TEST_SUITE_P(AtEachOperation, FailingDiskImageWriting,
                         testing::Values("seek", "write", "position", "truncate", "synchronize", "close"),
                         [](const auto& test) { return std::string(test.param); });

TEST_P(FailingDiskImageWriting, IsAFatalErrorOfWritingWithoutAnErrorToHandOut) {
    EXPECT_FALSE(run(false));
    expectFatalErrorWhile("writing new");
    EXPECT_EQ(error, std::nullopt);
}

TEST_P(FailingDiskImageWriting, IsAFatalErrorOfDeleting) {
    EXPECT_FALSE(run(true));
    expectFatalErrorWhile("deleting existing");
}

TEST_P(FailingDiskImageWriting, HandsOutTheErrorOfTheCopyWhenThatFailedBefore) {
    platform.files.fail("writeFile", ENOSPC);
    EXPECT_FALSE(run(false));
    expectFatalErrorWhile("writing new");
    ASSERT_TRUE(error.has_value());
    EXPECT_EQ(error->code(), ENOSPC);
}

TEST_P(FailingDiskImageWriting, LeavesAClonedImageAsItWas) {
    platform.files.answerCloning(true);
    EXPECT_FALSE(opened->writeNewTicketDataFromURL(source, &error));
    EXPECT_EQ(opened->appropriateExitCode(), 73);
    EXPECT_EQ(contents(), contentsOf(image));
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
    EXPECT_EQ(error, Error::osStatus(1));
}

class DiskImageReplacement : public DiskImageWriting, public testing::WithParamInterface<bool> {
  protected:
    DiskImageReplacement() {
        platform.files.answerCloning(GetParam());
        test::writeFile(directory / "new.ticket", std::string_view("NEW"));
    }

    std::size_t swaps() const { return platform.files.count("replaceItem"); }
    static std::size_t expectedSwaps() { return GetParam() ? 1U : 0U; }
};

INSTANTIATE_TEST_SUITE_P(Cloning, DiskImageReplacement, testing::Bool(),
                         [](const auto& test) { return test.param ? "On" : "Off"; });

TEST_P(DiskImageReplacement, StaplesThroughTheDriver) {
    put(DiskImageBuilder().superblob(signedAndStapled("A LONG OLD ONE")));
    EXPECT_TRUE(open().writeNewTicketDataFromURL(source, nullptr));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(signedAndStapled("NEW"))));
    EXPECT_EQ(swaps(), expectedSwaps());
}

TEST_P(DiskImageReplacement, DeletesThroughTheDriver) {
    put(DiskImageBuilder().superblob(signedAndStapled("OLD")));
    EXPECT_TRUE(open()._deleteExistingTicket(nullptr));
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(DiskImageBuilder::signature())));
    EXPECT_EQ(swaps(), expectedSwaps());
}

TEST_P(DiskImageReplacement, DeletingTheOnlyBlobThroughTheDriverKeepsIt) {
    put(DiskImageBuilder().superblob(stapled("OLD")));
    auto image = open();
    EXPECT_TRUE(image._deleteExistingTicket(nullptr));
    EXPECT_EQ(image.appropriateExitCode(), 0);
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled("OLD"))));
}

TEST_P(DiskImageReplacement, DeletingAMissingTicketThroughTheDriverFails) {
    put(DiskImageBuilder());
    auto image = open();
    EXPECT_FALSE(image._deleteExistingTicket(nullptr));
    EXPECT_EQ(image.appropriateExitCode(), 73);
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder()));
}

// With the code-signing service of this machine.
class CodeSignedDiskImage : public DiskImageWriting {
  protected:
    std::optional<Data> staple(std::string_view ticket) {
        test::writeFile(directory / "new.ticket", ticket);
        EXPECT_TRUE(reopen()->writeNewTicketDataFromURL(source, nullptr));
        const auto image = reopen();
        EXPECT_EQ(image->ticketData(), base::toData(ticket));
        return image->cdHash();
    }
    std::shared_ptr<PWHashedFile> reopen() {
        return PWHashedFile::initWithFileURL(url, platform.servicesWith(*service));
    }

    std::unique_ptr<codesign::CodeSigningService> service = codesign::makeCodeSigningService();
};

TEST_F(CodeSignedDiskImage, KeepsItsSyntheticHashAndItsDataThroughEveryStaple) {
    put(DiskImageBuilder());
    const auto hash = reopen()->cdHash();
    ASSERT_TRUE(hash.has_value());
    EXPECT_EQ(hash->size(), 20U);
    for (const std::string_view ticket : {"TICKET", "A LONGER TICKET", "T"}) {
        EXPECT_EQ(staple(ticket), hash);
        EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(stapled(ticket))));
    }
    const auto image = reopen();
    EXPECT_EQ(image->cdHash(), hash);
    EXPECT_EQ(image->digestAlgorithm(), 2U);
}

TEST_F(CodeSignedDiskImage, KeepsItsSignaturesHashAndValidityThroughEveryStaple) {
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    const Data hash = test::codeHashOf(2, DiskImageBuilder::codeDirectory());
    EXPECT_EQ(reopen()->cdHash(), hash);
    for (const std::string_view ticket : {"TICKET", "A LONGER TICKET", "T"}) EXPECT_EQ(staple(ticket), hash);
    EXPECT_TRUE(reopen()->_deleteExistingTicket(nullptr));
    EXPECT_EQ(reopen()->cdHash(), hash);
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(DiskImageBuilder::signature())));
}

// The signature is not read from the ticket's slot, so the number of entries in that slot does not matter.
TEST_F(CodeSignedDiskImage, WithTwoTicketsKeepsItsSignaturesHashAndIsStapled) {
    put(DiskImageBuilder().superblob(signedAndStapled("ONE").blob(0x10002, ticketBlob("TWO"))));
    const Data hash = test::codeHashOf(2, DiskImageBuilder::codeDirectory());
    const auto image = reopen();
    EXPECT_EQ(image->appropriateExitCode(), 0);
    EXPECT_EQ(image->ticketData(), base::toData("TWO"));
    EXPECT_EQ(image->cdHash(), hash);

    EXPECT_EQ(staple("NEW"), hash);
    EXPECT_EQ(contents(), contentsOf(DiskImageBuilder().superblob(signedAndStapled("NEW"))));
}

// The synthetic hash is that of the image without its signature, which is not valid.
TEST_F(CodeSignedDiskImage, WithTwoCodeDirectoriesInOneSlotIsStapledByItsSyntheticHash) {
    put(DiskImageBuilder());
    const auto synthetic = reopen()->cdHash();
    ASSERT_TRUE(synthetic.has_value());
    const auto twice = DiskImageBuilder::signature().blob(0, DiskImageBuilder::codeDirectory());
    put(DiskImageBuilder().superblob(twice));
    EXPECT_EQ(reopen()->appropriateExitCode(), 0);
    EXPECT_EQ(reopen()->cdHash(), synthetic);
    EXPECT_EQ(reopen()->digestAlgorithm(), 0U) << "until the hash is asked for";
    EXPECT_EQ(staple("NEW"), synthetic);
    EXPECT_EQ(
        contents(),
        contentsOf(DiskImageBuilder().superblob(SuperBlobBuilder(twice).blob(0x10002, ticketBlob("NEW")))));
}

TEST_F(CodeSignedDiskImage, UnsignedWithTwoTicketsKeepsItsSyntheticHash) {
    put(DiskImageBuilder());
    const auto hash = reopen()->cdHash();
    put(DiskImageBuilder().superblob(stapled("ONE").blob(0x10002, ticketBlob("TWO"))));
    EXPECT_EQ(reopen()->ticketData(), base::toData("TWO"));
    EXPECT_EQ(reopen()->cdHash(), hash);
    EXPECT_EQ(staple("NEW"), hash);
}

}  // namespace
}  // namespace pinwell
