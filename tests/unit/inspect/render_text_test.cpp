// The page for people: its contents, and forbidden contents.
#include "inspect/render_text.h"

#include <algorithm>

#include "base/text.h"
#include "inspect_fixture.h"
#include "support/package_builder.h"
#include "support/process.h"

namespace pinwell::test {
namespace {

using inspect::renderText;
using testing::AllOf;
using testing::Contains;
using testing::EndsWith;
using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using testing::StartsWith;

class Page : public InspectTest {
  protected:
    std::vector<std::string> linesFor(const std::string& path) {
        return linesOf(renderText(inspect(path), false));
    }
};

TEST_F(Page, BeginsWithThePathAndEndsWithTheConclusion) {
    const Artefact image = signedImage();
    const std::string path = stapled(image, ticketFor(image));
    const auto lines = linesFor(path);
    EXPECT_EQ(lines.front(), path);
    EXPECT_EQ(lines.back(), "  The ticket is genuine, lists this file, and is not marked revoked.");
    EXPECT_THAT(lines, Contains("  Kind          disk image (com.ostrel.disk-image-udif)"));
    EXPECT_THAT(lines, Contains("  Record        2/2/" + base::toHex(image.hash)));
    EXPECT_THAT(lines, Contains(AllOf(HasSubstr("slot 0x10002"), HasSubstr("ticket"))));
    EXPECT_THAT(lines,
                Contains("  Lists         * SHA-256     " + base::toHex(image.hash) + "  (this file)"));
    EXPECT_THAT(lines, Contains("  Chain         trusted"));
}

TEST_F(Page, PutsEveryValueIntoOneColumn) {
    const Artefact package = signedPackage();
    const auto lines = linesFor(stapled(package, ticketFor(package)));
    for (std::size_t i = 1; i + 1 < lines.size(); ++i) {
        if (lines[i].empty()) continue;
        ASSERT_GT(lines[i].size(), 16U) << lines[i];
        EXPECT_EQ(lines[i][15], ' ') << lines[i];
    }
}

TEST_F(Page, ShowsThePlaceOfTheFirstFault) {
    const Artefact image = unsignedImage();
    Data ticket = ticketFor(image);
    ticket[4] = std::byte{9};
    const auto lines = linesFor(stapled(image, ticket));
    const std::size_t offset = 100'000 + 20 + 8 + 4;
    EXPECT_EQ(lines.back(),
              "  The first fault is at offset 4 of the ticket (" + std::to_string(offset) + " of the file).");
    EXPECT_THAT(lines, Contains("  The ticket is not acceptable: the container's version is not 1."));
}

TEST_F(Page, ShowsAPlaceInTheFileForAFaultOutsideTheTicket) {
    const Artefact package = signedPackage();
    std::string contents = package.stapledWith(ticketFor(package));
    contents[contents.size() - 16] = 'x';
    const auto lines = linesFor(write(package.name, contents));
    const std::string place = " at offset " + std::to_string(contents.size() - 16) + " of the file";
    EXPECT_EQ(lines.back(), "  The first fault is" + place + ".");
    EXPECT_THAT(lines, Contains(EndsWith("! a trailer does not begin with its magic, \"t8lr\"," + place)));
}

TEST_F(Page, ShowsTheTrailersOfAPackage) {
    const Artefact package = signedPackage();
    EXPECT_THAT(linesFor(write(package.name, package.contents)), Contains("  Trailers      none"));

    const Data ticket = ticketFor(package);
    const std::size_t end = package.contents.size();
    const auto stapledLines = linesFor(stapled(package, ticket));
    const std::string record = std::to_string(end + 16 + ticket.size());
    EXPECT_THAT(stapledLines, Contains("  Trailers      type 2        ticket                    " +
                                       std::to_string(ticket.size()) + " bytes at offset " +
                                       std::to_string(end + 16) + ", record at " + record));
    EXPECT_THAT(stapledLines, Contains("                type 1        terminator                record at " +
                                       std::to_string(end)));

    const auto bare = PackageBuilder().archive({}).ticket(base::toString(ticket)).build();
    EXPECT_THAT(linesFor(write(package.name, package.contents + bare)),
                Contains("                no terminator was found"));
}

TEST_F(Page, MarksTheSliceThatStandsForTheWhole) {
    const std::string path = platform.directory / "Fat.app";
    BundleBuilder()
        .executable(UniversalImageBuilder()
                        .slice(7, ExecutableImageBuilder().cpuType(7).withoutSignature().build())
                        .slice(kSampleArm, ExecutableImageBuilder().build())
                        .build())
        .write(path);
    const auto lines = linesFor(path);
    EXPECT_THAT(lines, Contains(AllOf(StartsWith("  Slice         64-bit ARM, "),
                                      EndsWith(", stands for the whole"))));
    EXPECT_THAT(lines, Contains(AllOf(StartsWith("  Slice         CPU type 0x00000007, "),
                                      Not(HasSubstr("stands")))));
    EXPECT_THAT(lines, Contains("  Signature     none"));
}

TEST_F(Page, SaysThatTheHashOfAnUnsignedImageIsOfItsContents) {
    const Artefact image = unsignedImage();
    EXPECT_THAT(linesFor(write(image.name, image.contents)),
                Contains("  Code hash     SHA-256     " + base::toHex(image.hash) + "  (of the contents)"));
}

TEST_F(Page, SaysThatAnUnsignedBundleHasNoHash) {
    const std::string path = platform.directory / "Bare.app";
    BundleBuilder().executable(ExecutableImageBuilder().withoutSignature().build()).write(path);
    const auto lines = linesFor(path);
    EXPECT_THAT(lines, Contains("  Code hash     none"));
    EXPECT_THAT(lines, Not(Contains(StartsWith("  Record"))));
}

TEST_F(Page, SaysWhyASignatureIsNotValid) {
    const std::string path = platform.directory / "Broken.app";
    const Data broken = CodeDirectoryBuilder().version(0x10000).build();
    BundleBuilder()
        .executable(ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(broken).build()).build())
        .write(path);
    const auto lines = linesFor(path);
    EXPECT_THAT(lines, Contains(StartsWith("  Signature     not valid, ")));
    EXPECT_THAT(lines, Contains("                ! code directory: unsupported code directory version"));
}

TEST_F(Page, NamesTheFolderOfTheRootsIfAChainIsNotTrusted) {
    TicketChain fields;
    fields.root.subject = {{"CN", "Another Root"}};
    fields.root.key = SigningKey::cached(KeyKind::p256, "another root");
    const auto payload = TicketPayloadBuilder().entry(2, bundleHash);
    const auto lines = linesFor(bundle(SatchelBuilder::of(fields.issue(), payload.build()).build()));
    EXPECT_THAT(lines, Contains("  Chain         not trusted"));
    EXPECT_THAT(lines, Contains("                   trusted roots are those in " +
                                platform.platformDirectory.path() + "/roots"));
    EXPECT_THAT(lines, Contains(StartsWith("  Signature     verifies, 72 bytes at offset ")));
}

TEST_F(Page, TellsASignatureThatFailsFromOneThatCannotBeChecked) {
    const Data good = sealed(TicketPayloadBuilder().entry(2, bundleHash));
    Data failing = good;
    failing[failing.size() - 60] ^= std::byte{1};
    EXPECT_THAT(linesFor(bundle(failing)),
                Contains(StartsWith("  Signature     does not verify, 72 bytes at")));
    Data unreadable = good;
    unreadable[20] ^= std::byte{1};  // the signer's certificate
    const auto lines = linesFor(bundle(unreadable));
    EXPECT_THAT(lines, Contains(StartsWith("  Signature     could not be checked, 72 bytes at")));
    EXPECT_THAT(lines, Contains("                ! unreadable: " + std::to_string(chain.leaf.der.size()) +
                                " bytes at offset 20"));
}

TEST_F(Page, MarksAnEntryThatIsNotUsable) {
    const auto lines =
        linesFor(bundle(sealed(TicketPayloadBuilder().entry(9, hashOf(1)).entry(2, bundleHash))));
    EXPECT_THAT(lines, Contains("  Lists         ! entry 0 is not usable"));
    EXPECT_THAT(lines, Contains(AllOf(HasSubstr("* SHA-256"), EndsWith("  (this file)"))));
}

TEST_F(Page, OfABareTicketHasNoHashAndNoPlace) {
    const auto lines = linesFor(write("a.ticket", base::toString(sealed(TicketPayloadBuilder().revoked()))));
    EXPECT_THAT(lines, Not(Contains(StartsWith("  Code hash"))));
    EXPECT_THAT(lines, Not(Contains(StartsWith("  Ticket file"))));
    EXPECT_THAT(lines, Contains("  Flags         0x1 (revoked)"));
}

TEST_F(Page, CountsTheEntriesThatItDoesNotShow) {
    TicketPayloadBuilder payload;
    for (std::uint8_t i = 0; i < 100; ++i) payload.entry(2, hashOf(i));
    const auto lines = linesFor(bundle(sealed(payload.entry(2, bundleHash))));
    EXPECT_THAT(lines, Contains(EndsWith("... and 85 more")));
    EXPECT_THAT(lines, Contains(HasSubstr("(this file, entry 100)")));
}

TEST_F(Page, LetsNothingOfAFileDriveTheTerminal) {
    TicketChain fields;
    fields.leaf.subject = {{"CN", "evil\x1b[31m\nleaf"}};
    const IssuedChain evil = fields.issue();
    const Data ticket = SatchelBuilder::of(evil, TicketPayloadBuilder().build()).build();
    const std::string text = renderText(inspect(write("a\x1b[2Jb\n.ticket", base::toString(ticket))), false);
    EXPECT_TRUE(std::none_of(text.begin(), text.end(), [](char c) { return c == '\x1b'; })) << text;
    EXPECT_THAT(text, HasSubstr("a\\x1b[2Jb\\n.ticket"));
    EXPECT_THAT(linesOf(text), Not(Contains(StartsWith("leaf"))));
}

TEST_F(Page, InColourHasTheSameText) {
    const Report report = inspect(bundle());
    std::string coloured = renderText(report, true);
    EXPECT_NE(coloured, renderText(report, false));
    for (std::size_t at = 0; (at = coloured.find('\x1b')) != std::string::npos;)
        coloured.erase(at, coloured.find('m', at) - at + 1);
    EXPECT_EQ(coloured, renderText(report, false));
}

}  // namespace
}  // namespace pinwell::test
