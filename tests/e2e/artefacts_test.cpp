// The life of a ticket on each kind of file.
#include "artefacts.h"

#include "fixture.h"
#include "support/archive_builder.h"
#include "support/file_properties.h"
#include "support/package_builder.h"

namespace pinwell::test {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::EndsWith;
using testing::IsEmpty;

constexpr std::size_t kDataSize = 100'000;

class FileArtefact : public EndToEndTest, public testing::WithParamInterface<Artefact (*)(const Data&)> {
  protected:
    Artefact artefact = [this] {
        Artefact made = GetParam()(irregularData(kDataSize));
        return writeArtefact(made, directory / ("builds/" + made.name));
    }();

    ProcessResult staple() const { return pinwell({"staple", artefact.path}); }
    ProcessResult validate() const { return pinwell({"validate", artefact.path}); }

    std::string processing() const { return "Processing: " + artefact.path; }
    std::string refusal() const { return "Could not validate ticket for " + artefact.path; }
    std::string revokedLine() const {
        return "The ticket for " + artefact.name +
               " has been revoked. Tollmark will prevent it from running.";
    }
    testing::Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }

    Data ticketOf(const TicketPayloadBuilder& payload) const { return sealed(payload); }
    /// Lists much other software as well.
    TicketPayloadBuilder longPayload() const {
        TicketPayloadBuilder payload = artefact.payload();
        for (std::uint8_t i = 0; i < 200; ++i) payload.entry(2, hashOf(i));
        return payload;
    }

    /// After each staple the file is the same as if it had never had another ticket.
    void staplesInTurn(const std::vector<Data>& tickets) {
        for (const Data& ticket : tickets) {
            serveTicket(ticket);
            EXPECT_THAT(staple(), Worked());
            EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
            EXPECT_THAT(validate(), Ended(0, ElementsAre(processing(), kValidated)));
        }
    }
};

TEST_P(FileArtefact, IsStapledAndValidated) {
    staplesInTurn({ticketOf(artefact.payload())});
}

TEST_P(FileArtefact, StapledByHandIsValid) {
    const Data ticket = ticketOf(artefact.payload());
    serveTicket(ticket);
    writeFile(artefact.path, artefact.stapledWith(ticket));
    EXPECT_THAT(validate(), Ended(0, ElementsAre(processing(), kValidated)));
}

TEST_P(FileArtefact, LeavesTheTicketAmongTheTemporaryFilesAndWhatAnImageCanBeRepairedWith) {
    serveTicket(ticketOf(artefact.payload()));
    ASSERT_THAT(staple(), Worked());
    std::vector<std::string> left = temporaryFiles();
    ASSERT_THAT(left, Contains("REQUEST.ticket"));
    std::erase(left, "REQUEST.ticket");
    if (artefact.name == "Signed.pkg") {
        EXPECT_THAT(left, IsEmpty());
        return;
    }
    ASSERT_THAT(left, ElementsAre(EndsWith(".dmgData")));
    EXPECT_EQ(readFile(temporaryPath(left.front())), readFile(artefact.path).substr(kDataSize));
    EXPECT_EQ(permissionsOf(temporaryPath(left.front())), 0600U);
}

// Stapled again.

TEST_P(FileArtefact, TakesALongerTicketInPlaceOfTheOldOne) {
    staplesInTurn({ticketOf(artefact.payload()), ticketOf(longPayload())});
}

TEST_P(FileArtefact, TakesAShorterTicketInPlaceOfTheOldOne) {
    staplesInTurn({ticketOf(longPayload()), ticketOf(artefact.payload())});
}

TEST_P(FileArtefact, TakesTheSameTicketAgainAndIsAsItWas) {
    const Data ticket = ticketOf(artefact.payload());
    staplesInTurn({ticket, ticket});
}

TEST_P(FileArtefact, TakesATicketThatIsDownloadedAsAFileOfItsOwn) {
    const Data ticket = ticketOf(longPayload());
    serveAsset(ticket);
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
    EXPECT_EQ(service().requests().size(), 2U);
}

// Refused.

TEST_P(FileArtefact, WithoutATicketDoesNotValidate) {
    serveTicket(ticketOf(artefact.payload()));
    EXPECT_THAT(validate(), Ended(65, ElementsAre(processing(),
                                                  artefact.name + " does not have a ticket stapled to it.")));
    EXPECT_EQ(readFile(artefact.path), artefact.contents);
}

TEST_P(FileArtefact, IsLeftAloneWhenTheTicketIsForOthers) {
    serveTicket(ticketForOthers());
    EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), refusal(), stapleFailed(65))));
    EXPECT_EQ(readFile(artefact.path), artefact.contents);
}

TEST_P(FileArtefact, IsLeftAloneWhenTheTicketRevokesIt) {
    serveTicket(ticketOf(artefact.payload().revoked()));
    EXPECT_THAT(staple(), Ended(77, ElementsAre(processing(), refusal(), revokedLine())));
    EXPECT_EQ(readFile(artefact.path), artefact.contents);
}

TEST_P(FileArtefact, RevokedSinceItWasStapledDoesNotValidate) {
    serveTicket(ticketOf(artefact.payload()));
    ASSERT_THAT(staple(), Worked());
    const std::string stapled = readFile(artefact.path);
    serveTicket(ticketOf(artefact.payload().revoked()));
    EXPECT_THAT(validate(), Ended(77, ElementsAre(processing(), refusal(), revokedLine())));
    EXPECT_EQ(readFile(artefact.path), stapled);
}

TEST_P(FileArtefact, ThatCarriesARevokedTicketDoesNotValidateWhateverTheServiceSays) {
    writeFile(artefact.path, artefact.stapledWith(ticketOf(artefact.payload().revoked())));
    serveTicket(ticketOf(artefact.payload()));
    EXPECT_THAT(validate(), Ended(77, Contains(revokedLine())));
}

TEST_P(FileArtefact, ThatCarriesADamagedTicketIsPutRightByStaplingIt) {
    const Data ticket = ticketOf(artefact.payload());
    Data damaged = ticket;
    damaged.back() ^= std::byte{1};
    damaged[damaged.size() / 2] ^= std::byte{1};
    writeFile(artefact.path, artefact.stapledWith(damaged));
    serveTicket(ticket);
    EXPECT_THAT(validate(), Ended(65, ElementsAre(processing())));
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
    EXPECT_THAT(validate(), Ended(0, ElementsAre(processing(), kValidated)));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, FileArtefact,
                         testing::Values(&signedImage, &unsignedImage, &signedPackage),
                         [](const auto& kind) { return kind.param({}).kind(); });

// Packages: other bytes after the archive.

class Package : public EndToEndTest {
  protected:
    const ArchiveBuilder archive = ArchiveBuilder().signature("CMS").afterChecksum(irregularData(kDataSize));
    const Data ticket = sealed(TicketPayloadBuilder().entry(1, archive.rightChecksum()));
    const std::string path = directory / "builds/Sample.pkg";

    PackageBuilder package() const { return PackageBuilder().archive(archive.build()); }
    static std::string text(const Data& bytes) { return base::toString(bytes); }

    /// The package after stapling `ticket`.
    std::string stapled(const PackageBuilder& package) {
        writeFile(path, package.build());
        serveTicket(ticket);
        const std::string processing = "Processing: " + path;
        EXPECT_THAT(pinwell({"staple", path}), Ended(0, ElementsAre(processing, processing, kWorked)));
        EXPECT_THAT(pinwell({"validate", path}), Ended(0, ElementsAre(processing, kValidated)));
        return readFile(path);
    }
};

TEST_F(Package, KeepsAnUnknownTrailerInFrontOfTheTicket) {
    EXPECT_EQ(stapled(package().terminator().unknown("ABC").ticket("THE OLD TICKET")),
              package().terminator().unknown("ABC").ticket(text(ticket)).build());
}

TEST_F(Package, MovesAnUnknownTrailerFromAfterTheTicketToBeforeIt) {
    EXPECT_EQ(stapled(package().terminator().ticket("THE OLD TICKET").unknown("ABC")),
              package().terminator().unknown("ABC").ticket(text(ticket)).build());
}

TEST_F(Package, KeepsUnknownTrailersOnBothSidesInTheirOrder) {
    EXPECT_EQ(
        stapled(package().terminator().unknown("A").ticket("THE OLD TICKET").unknown("B", 8).unknown("C", 9)),
        package().terminator().unknown("A").unknown("B", 8).unknown("C", 9).ticket(text(ticket)).build());
}

TEST_F(Package, WhoseChecksumIsSHA256IsRefused) {
    // The archive's digest is taken whole, 32 bytes; a ticket's entries have 20, so that none is its own.
    const ArchiveBuilder other = ArchiveBuilder().digest("sha256").signature("CMS");
    const std::string contents = PackageBuilder().archive(other.build()).build();
    Data entry = other.rightChecksum();
    entry.resize(20);
    writeFile(path, contents);
    serveTicket(sealed(TicketPayloadBuilder().entry(2, entry)));
    EXPECT_THAT(pinwell({"staple", path}),
                Ended(65, ElementsAre("Processing: " + path, "Could not validate ticket for " + path,
                                      stapleFailed(65))));
    EXPECT_EQ(readFile(path), contents);
}

TEST_F(Package, ThatIsNotSignedCarriesNoTicket) {
    const std::string contents = PackageBuilder().archive(ArchiveBuilder().build()).build();
    writeFile(path, contents);
    serveTicket(ticket);
    EXPECT_THAT(pinwell({"staple", path}), Ended(66, Contains("Processing: " + path)));
    EXPECT_EQ(readFile(path), contents);
    EXPECT_EQ(service().requests().size(), 0U);
}

}  // namespace
}  // namespace pinwell::test
