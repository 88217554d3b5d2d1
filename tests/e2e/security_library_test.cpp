// A platform security library beside the tool: its ticket-signing policy judges the tickets.
#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;

class SecurityLibrary : public EndToEndTest {
  protected:
    void install(const std::string& libraryDirectory) { environment["LD_LIBRARY_PATH"] = libraryDirectory; }
    ProcessResult stapleTicket(const Data& offered) {
        serveTicket(offered);
        return staple();
    }
    testing::Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
    testing::Matcher<const ProcessResult&> Refused() const {
        return Ended(65,
                     ElementsAre(processing(), "Could not validate ticket for " + bundle, stapleFailed(65)));
    }
    /// The tool's own policy requires basic constraints; the library's does not.
    Data ticketOfNoAuthority() {
        TicketChain chain;
        chain.intermediate.basicConstraints = BasicConstraints{false};
        return SatchelBuilder::of(chain.issue(), payload().build()).build();
    }
};

TEST_F(SecurityLibrary, WithoutOneTheToolsOwnPolicyDecides) {
    EXPECT_THAT(stapleTicket(ticketOfNoAuthority()), Refused());
    EXPECT_THAT(stapleTicket(ticket()), Worked());
}

TEST_F(SecurityLibrary, ItsPolicyDecidesInsteadOfTheToolsOwn) {
    install(SECURITY_LIBRARY_GOOD);
    EXPECT_THAT(stapleTicket(ticketOfNoAuthority()), Worked());
    TicketChain unmarked;
    unmarked.leaf.markers.clear();
    EXPECT_THAT(stapleTicket(SatchelBuilder::of(unmarked.issue(), payload().build()).build()), Refused());
}

TEST_F(SecurityLibrary, ThatRefusesToMakeAPolicyRefusesEveryTicket) {
    install(SECURITY_LIBRARY_REFUSING);
    EXPECT_THAT(stapleTicket(ticket()), Refused());
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(SecurityLibrary, ThatDoesNotKnowThePolicyLeavesItToTheTool) {
    install(SECURITY_LIBRARY_NAMELESS);
    EXPECT_THAT(stapleTicket(ticketOfNoAuthority()), Refused());
    EXPECT_THAT(stapleTicket(ticket()), Worked());
}

}  // namespace
}  // namespace pinwell::test
