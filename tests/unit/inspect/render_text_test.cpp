// The page for people: its contents, and forbidden contents.
#include "inspect/render_text.h"

#include <algorithm>

#include "base/text.h"
#include "inspect_fixture.h"
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
