// --tickets DIR: tickets that were fetched elsewhere, beside the stapled one.
#include <gmock/gmock.h>

#include <filesystem>

#include "base/text.h"
#include "gate/run.h"
#include "gate_fixture.h"
#include "lumora-local/samples.h"
#include "verify/check.h"

namespace pinwell::test {
namespace {

using gate::TicketDirectory;
using verify::Check;
using verify::Outcome;

class FetchedTickets : public GateTest {
  protected:
    FetchedTickets()
        : image(stapled("Sample.dmg", lumora::makeDiskImage(lumora::ImageSignature::adHoc))),
          stapledResult(judge(image)) {
        writeFile(directory / "tickets/unrelated", "");
    }

    /// Writes these bytes to the path of the image's ticket.
    void fetch(ByteView ticket) const {
        writeFile(directory / ("tickets/2-2-" + base::toHex(stapledResult.codeHash) + ".ticket"), ticket);
    }
    Data ticketWith(const TicketPayloadBuilder& payload) const {
        return SatchelBuilder::of(chain, payload.build()).build();
    }
    TicketPayloadBuilder payload() const { return TicketPayloadBuilder().entry(2, stapledResult.codeHash); }

    /// Expects this result, with this outcome of the check of the fetched ticket.
    void expect(int exitStatus, std::string_view check, Outcome outcome) const {
        const auto tickets = TicketDirectory::open(directory / "tickets");
        ASSERT_TRUE(tickets);
        const Result result = judge(image, &*tickets);
        EXPECT_EQ(gate::exitStatusOf(result.verdict), exitStatus) << result.conclusion;
        std::vector<Outcome> outcomes;
        for (const Check& one : verify::flattened(result.checks))
            if (one.name == check && one.place.find("tickets/") != std::string::npos)
                outcomes.push_back(one.outcome);
        EXPECT_THAT(outcomes, testing::ElementsAre(outcome));
    }

    const std::string image;
    const Result stapledResult;
};

TEST_F(FetchedTickets, AdmitListedArtefacts) {
    fetch(ticketWith(payload()));
    expect(0, verify::kTicketCurrent, Outcome::passed);
}

TEST_F(FetchedTickets, LeaveTheDecisionToTheStapledOneWhereThereIsNone) {
    expect(0, verify::kTicketCurrent, Outcome::noted);
}

TEST_F(FetchedTickets, WinIfTheyRevoke) {
    fetch(ticketWith(payload().revoked()));
    expect(77, verify::kTicketRevoked, Outcome::failed);
}

TEST_F(FetchedTickets, AreRefusedIfTheyListAnother) {
    fetch(ticketWith(TicketPayloadBuilder().entry(2, hashOf(1))));
    expect(65, verify::kTicketLists, Outcome::failed);
}

TEST_F(FetchedTickets, AreRefusedIfTheyAreNoTickets) {
    fetch(base::asBytes("no ticket"));
    expect(65, verify::kTicketGenuine, Outcome::failed);
}

TEST_F(FetchedTickets, AreRefusedIfTheyCannotBeRead) {
    std::filesystem::create_directories(directory /
                                        ("tickets/2-2-" + base::toHex(stapledResult.codeHash) + ".ticket"));
    expect(65, verify::kTicketCurrent, Outcome::failed);
}

}  // namespace
}  // namespace pinwell::test
