// Damaged tickets and damaged places: the fault is reported, and the rest is shown.
#include "formats/tm_ticket.h"
#include "inspect/gather_ticket.h"
#include "inspect_fixture.h"
#include "src/DownloadDelegate.h"
#include "support/disk_image_builder.h"
#include "support/package_builder.h"

namespace pinwell::test {
namespace {

using inspect::Fault;
using inspect::gatherTicket;
using inspect::SuperblobPlace;
using inspect::Ticket;
using inspect::TrailerPlace;
using testing::AnyOf;
using testing::HasSubstr;
using testing::SizeIs;

class DamagedTicket : public InspectTest {
  protected:
    DamagedTicket() : bytes(sealed(TicketPayloadBuilder().entry(2, bundleHash).entry(1, hashOf(7)))) {}

    Ticket gather(const Data& container) {
        return gatherTicket(container, 1000, inspect::Holder{inspect::Hash{2, bundleHash}}, services().trust);
    }
    bool toolAccepts(const Data& container) {
        tm_ticket* ticket = nullptr;
        const bool accepted = satchel_get_validated_tm_ticket(container.data(), container.size(), &ticket,
                                                              services().trust) == 0;
        const TicketPointer owner(ticket);
        return accepted;
    }
    Data flipped(std::size_t at, std::byte bits) const {
        Data copy = bytes;
        copy[at] ^= bits;
        return copy;
    }
    Fault faultOf(const Data& container) { return gather(container).refusal.value().fault; }

    const Data bytes;
};

TEST_F(DamagedTicket, StillShowsTheRestWhicheverByteIsWrong) {
    for (std::size_t at = 0; at < bytes.size(); ++at) {
        SCOPED_TRACE(at);
        const Ticket ticket = gather(flipped(at, at % 2 == 0 ? std::byte{0x01} : std::byte{0x80}));
        EXPECT_TRUE(ticket.refusal);
        EXPECT_THAT(ticket.certificates, SizeIs(AnyOf(2, 3)));
        ASSERT_TRUE(ticket.payload && ticket.payload->hasHeader);
        EXPECT_EQ(ticket.payload->entryCount, 2U);
        std::size_t whole = 0;
        for (const auto& entry : ticket.payload->entries)
            if (entry.hash.bytes == bundleHash || entry.hash.bytes == hashOf(7)) ++whole;
        EXPECT_GE(whole, 1U);
    }
}

TEST_F(DamagedTicket, IsFaultyExactlyWhenTheToolRefusesIt) {
    EXPECT_FALSE(gather(bytes).refusal);
    EXPECT_TRUE(toolAccepts(bytes));
    for (std::size_t at = 0; at < bytes.size(); at += 7)
        EXPECT_EQ(!gather(flipped(at, std::byte{4})).refusal, toolAccepts(flipped(at, std::byte{4}))) << at;
    for (std::size_t size = 0; size < bytes.size(); size += 11) {
        const Data cut(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(size));
        EXPECT_EQ(!gather(cut).refusal, toolAccepts(cut)) << size;
    }
}

TEST_F(DamagedTicket, NamesTheFieldOfTheContainerThatIsWrong) {
    EXPECT_EQ(faultOf(flipped(0, std::byte{1})),
              (Fault{"the container does not begin with its magic, \"s8ch\"", 0, 1000}));
    EXPECT_EQ(faultOf(flipped(4, std::byte{2})), (Fault{"the container's version is not 1", 4, 1004}));
    EXPECT_EQ(faultOf(flipped(8, std::byte{1})).offset, 8U);
    EXPECT_EQ(faultOf(flipped(12, std::byte{1})).rule,
              "the lengths of the parts do not add up to the container's");
}

TEST_F(DamagedTicket, NamesTheCertificateThatCannotBeRead) {
    const std::size_t second = 20 + chain.leaf.der.size();
    const Fault fault = faultOf(flipped(second, std::byte{1}));
    EXPECT_EQ(fault.rule, "certificate 2 cannot be read");
    EXPECT_EQ(fault.offset, second);
}

TEST_F(DamagedTicket, NamesTheSignatureThatDoesNotVerify) {
    const Ticket ticket = gather(flipped(bytes.size() - 60, std::byte{1}));
    EXPECT_TRUE(ticket.chain.trusted);
    EXPECT_EQ(ticket.signature, inspect::Signature::fails);
    EXPECT_EQ(ticket.refusal->fault.offset, bytes.size() - 72);
}

TEST_F(DamagedTicket, NamesTheFieldOfASignedPayloadThatIsWrong) {
    const auto payload = [&] { return TicketPayloadBuilder().entry(2, bundleHash); };
    const auto offsetIn = [&](const TicketPayloadBuilder& builder) {
        const Ticket ticket = gather(sealed(builder));
        return *ticket.refusal->fault.offset - ticket.payload->range.offset;
    };
    EXPECT_EQ(offsetIn(payload().magic("nope")), 0U);
    EXPECT_EQ(offsetIn(payload().version(3)), 4U);
    EXPECT_EQ(offsetIn(payload().hashLength(32)), 6U);
    EXPECT_EQ(offsetIn(payload().count(2)), 8U);
}

TEST_F(DamagedTicket, MarksAnEntryThatIsNotUsable) {
    const Ticket ticket = gather(sealed(TicketPayloadBuilder().entry(9, hashOf(1)).entry(2, bundleHash)));
    EXPECT_FALSE(ticket.payload->entries[0].isUsable);
    EXPECT_TRUE(ticket.payload->entries[1].matches);
    EXPECT_FALSE(ticket.refusal);
}

TEST_F(DamagedTicket, OfNoLengthAtAllIsDescribed) {
    const Ticket ticket = gather({});
    EXPECT_FALSE(ticket.payload);
    EXPECT_EQ(ticket.refusal->fault.rule, "the container ends inside its header");
}

TEST_F(DamagedTicket, OfRandomBytesIsDescribedIfItsNameEndsInTicket) {
    const std::string noise = base::toString(irregularData(5000));
    const Report report = inspect(write("noise.ticket", noise));
    EXPECT_EQ(report.kind, Kind::ticket);
    EXPECT_EQ(report.outcome, Outcome::refused);
    EXPECT_EQ(inspect(write("noise", noise)).outcome, Outcome::unreadable);
}

TEST_F(DamagedTicket, WithoutItsMagicIsKnownByItsPayload) {
    const Report report = inspect(write("CodeResources", base::toString(flipped(1, std::byte{8}))));
    EXPECT_EQ(report.kind, Kind::ticket);
    EXPECT_EQ(report.outcome, Outcome::refused);
}

class DamagedPlace : public InspectTest {};

TEST_F(DamagedPlace, ASuperblobWithAWrongLengthStillShowsItsTableAndTheTicket) {
    const Artefact image = signedImage();
    std::string contents = image.stapledWith(ticketFor(image));
    contents[100'000 + 7] = static_cast<char>(contents[100'000 + 7] ^ 1);
    const Report report = inspect(write(image.name, contents));
    EXPECT_EQ(report.outcome, Outcome::unreadable);
    EXPECT_EQ(report.fault->rule, "the superblob's length is not the one in the trailer");
    EXPECT_EQ(report.fault->fileOffset, 100'004U);
    EXPECT_THAT(std::get<SuperblobPlace>(report.place).blobs, SizeIs(4));
    EXPECT_TRUE(report.ticket->chain.trusted);
}

TEST_F(DamagedPlace, ABlobThatReachesTooFarIsMarked) {
    const Artefact image = unsignedImage();
    std::string contents = image.stapledWith(ticketFor(image));
    contents[100'000 + 20 + 4] = 1;  // the blob's length
    const Report report = inspect(write(image.name, contents));
    EXPECT_EQ(std::get<SuperblobPlace>(report.place).blobs.at(0).problem, "reaches past the superblob");
    EXPECT_EQ(report.outcome, Outcome::unreadable);
    EXPECT_EQ(report.ticket->signature, inspect::Signature::verifies);
}

TEST_F(DamagedPlace, AnImageHasTheExitStatusOfTheTool) {
    const Artefact image = signedImage();
    const std::string whole = image.stapledWith(ticketFor(image));
    for (const std::size_t at : {whole.size() - 512, whole.size() - 512 + 303, std::size_t{100'000}}) {
        std::string contents = whole;
        contents[at] = static_cast<char>(contents[at] ^ 1);
        const std::string path = write(image.name, contents);
        const auto tool = PWHashedFile::initWithFileURL(values::URL::fileURLWithPath(path), services());
        EXPECT_EQ(tool->appropriateExitCode(), 66) << at;
        EXPECT_EQ(inspect::exitStatusOf(inspect(path).outcome), 66) << at;
    }
}

TEST_F(DamagedPlace, AnImageWithoutItsTrailerIsUnreadable) {
    const Report report = inspect(write("Cut.dmg", std::string(2000, 'x')));
    EXPECT_EQ(report.outcome, Outcome::unreadable);
    EXPECT_THAT(report.conclusion, HasSubstr("does not end in a disk image's trailer"));
    EXPECT_EQ(inspect(write("Empty.dmg", "")).outcome, Outcome::unreadable);
}

TEST_F(DamagedPlace, ADamagedTrailerRecordStillShowsTheTicketBeforeIt) {
    const Artefact package = signedPackage();
    for (const std::size_t fromEnd : {16U, 12U}) {  // magic, version
        std::string contents = package.stapledWith(ticketFor(package));
        char& byte = contents[contents.size() - fromEnd];
        byte = static_cast<char>(byte ^ 4);
        const Report report = inspect(write(package.name, contents));
        EXPECT_EQ(report.outcome, Outcome::refused);
        EXPECT_EQ(report.fault->rule, fromEnd == 16 ? "a trailer does not begin with its magic, \"t8lr\""
                                                    : "a trailer's version is not 1");
        EXPECT_EQ(report.fault->fileOffset, contents.size() - 16);
        EXPECT_TRUE(report.ticket && report.ticket->chain.trusted);
    }
}

TEST_F(DamagedPlace, ADamagedTerminatorIsShownAndDoesNotMatter) {
    const Artefact package = signedPackage();
    const Data ticket = ticketFor(package);
    std::string contents = package.stapledWith(ticket);
    char& byte = contents[contents.size() - 16 - ticket.size() - 16];
    byte = static_cast<char>(byte ^ 4);
    const Report report = inspect(write(package.name, contents));
    EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
    EXPECT_NE(std::get<TrailerPlace>(report.place).trailers.back().problem, "");
}

TEST_F(DamagedPlace, IsGoodExactlyWhenTheToolAcceptsTheStapledTicket) {
    const auto toolAccepts = [&](const std::string& path) {
        const auto file = PWHashedFile::initWithFileURL(values::URL::fileURLWithPath(path), services());
        return file->appropriateExitCode() == kExitOK &&
               DownloadDelegate(file, services()).isExistingTicketValid();
    };
    const Artefact package = signedPackage();
    const Artefact image = unsignedImage();
    const auto compare = [&](const Artefact& artefact, std::size_t begin, std::size_t end) {
        const std::string whole = artefact.stapledWith(ticketFor(artefact));
        for (std::size_t at = begin; at < end; ++at) {
            std::string contents = whole;
            contents[at] = static_cast<char>(contents[at] ^ 2);
            const std::string path = write(artefact.name, contents);
            EXPECT_EQ(inspect(path).outcome == Outcome::good, toolAccepts(path))
                << artefact.name << " at " << at;
        }
        const std::string path = write(artefact.name, whole);
        EXPECT_TRUE(toolAccepts(path));
        EXPECT_EQ(inspect(path).outcome, Outcome::good);
    };
    const std::size_t packageEnd = package.stapledWith(ticketFor(package)).size();
    compare(package, packageEnd - 16, packageEnd);
    compare(package, package.contents.size(), package.contents.size() + 16);
    const std::size_t imageEnd = image.stapledWith(ticketFor(image)).size();
    compare(image, 100'000, 100'000 + 28);
    compare(image, imageEnd - 512, imageEnd - 504);
    compare(image, imageEnd - 512 + 296, imageEnd - 512 + 312);
}

TEST_F(DamagedPlace, AnUnreadableCodeDirectoryIsReported) {
    const std::string path = platform.directory / "Broken.app";
    const Data broken = CodeDirectoryBuilder().version(0x10000).build();
    BundleBuilder()
        .executable(ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(broken).build()).build())
        .write(path);
    const Report report = inspect(path);
    const auto& signature = *report.code->preferredSlice()->signature;
    EXPECT_EQ(signature.validity, codesign::kInvalidSignature);
    EXPECT_EQ(signature.directories.at(0).problem, "unsupported code directory version");
    EXPECT_FALSE(report.codeHash);
}

}  // namespace
}  // namespace pinwell::test
