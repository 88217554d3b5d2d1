// Tickets that must be refused, on each kind of artefact and by each route.
#include <gtest/gtest.h>

#include "artefact_faults.h"
#include "base/text.h"
#include "result_table.h"
#include "support/controller_run.h"
#include "ticket_faults.h"

namespace pinwell::test {
namespace {

const IssuedChain& signers() {
    static const IssuedChain chain = TicketChain().issue();
    return chain;
}

std::string answerWith(const Data& ticket) {
    return ControllerRun::inlineAnswer(ticket);
}

/// The route of the ticket.
enum class Route {
    stapled,   // validate: the ticket on the artefact is at fault, the service's is good
    answered,  // validate: the ticket on the artefact is good, the service's is at fault
    stapling,  // staple: the service's is at fault
};

struct TicketCase {
    TicketFault fault;
    Subject subject;
    Route route;

    std::string name() const {
        static const char* const routes[] = {"stapled", "answered", "stapling"};
        return std::string(fault.name) + "_" + subject.name + "_" + routes[static_cast<std::size_t>(route)];
    }
    friend void PrintTo(const TicketCase& one, std::ostream* out) { *out << one.fault.wrong; }
};

std::vector<TicketCase> ticketCases() {
    std::vector<TicketCase> cases;
    for (const TicketFault& fault : ticketFaults())
        for (const Subject& subject : subjects())
            for (const Route route : {Route::stapled, Route::answered, Route::stapling})
                cases.push_back({fault, subject, route});
    return cases;
}

class TicketTable : public testing::TestWithParam<TicketCase> {};

TEST_P(TicketTable, EndsWithItsExitCode) {
    const TicketCase& one = GetParam();
    SignerAnchors anchors{{signers().root.der}, {}, {}, {}};
    if (one.fault.anchors) one.fault.anchors(anchors);
    ToolRun tool(anchors);
    const Data good = goodTicket(one.subject, signers());
    const Data bad = one.fault.ticket(one.subject, signers());
    const std::string path = tool.path(one.subject.fileName);
    switch (one.route) {
        case Route::stapled:
            one.subject.write(path, bad);
            break;
        case Route::answered:
            one.subject.write(path, good);
            break;
        case Route::stapling:
            one.subject.write(path, std::nullopt);
            break;
    }
    const std::string before = contentsOf(path);
    const int got = one.route == Route::stapling   ? tool.staple(path, answerWith(bad))
                    : one.route == Route::answered ? tool.validate(path, answerWith(bad))
                                                   : tool.validate(path, answerWith(good));
    EXPECT_EQ(got, one.fault.exit) << one.fault.wrong;
    EXPECT_NE(got, 0) << one.fault.wrong;
    EXPECT_EQ(contentsOf(path), before) << "a ticket that is refused changes nothing";
    recordResult(
        {"tickets", one.name(), one.fault.wrong, std::to_string(one.fault.exit), std::to_string(got)});
}

INSTANTIATE_TEST_SUITE_P(MustFail, TicketTable, testing::ValuesIn(ticketCases()),
                         [](const auto& tested) { return tested.param.name(); });

class ArtefactTable : public testing::TestWithParam<ArtefactFault> {};

TEST_P(ArtefactTable, EndsWithItsExitCode) {
    const ArtefactFault& fault = GetParam();
    const Subject& subject = subjectNamed(fault.subject);
    ToolRun tool({{signers().root.der}, {}, {}, {}});
    const std::string path = tool.path(subject.fileName);
    fault.write(path, signers());
    const std::string before = contentsOf(path);
    const int got = tool.validate(path, answerWith(goodTicket(subject, signers())));
    EXPECT_EQ(got, fault.exit) << fault.wrong;
    EXPECT_EQ(contentsOf(path), before);
    recordResult({"artefacts", fault.name, fault.wrong, std::to_string(fault.exit), std::to_string(got),
                  fault.exit != 0});
}

INSTANTIATE_TEST_SUITE_P(MustFail, ArtefactTable, testing::ValuesIn(artefactFaults()),
                         [](const auto& tested) { return tested.param.name; });

class AnswerTable : public testing::TestWithParam<AnswerFault> {};

TEST_P(AnswerTable, EndsWithItsExitCode) {
    const AnswerFault& fault = GetParam();
    const Subject subject = subjectNamed("package");
    ToolRun tool({{signers().root.der}, {}, {}, {}});
    const std::string path = tool.path(subject.fileName);
    subject.write(path, goodTicket(subject, signers()));
    const int got = tool.validate(path, fault.body);
    EXPECT_EQ(got, fault.exit) << fault.wrong;
    EXPECT_NE(got, 0) << fault.wrong;
    recordResult({"answers", fault.name, fault.wrong, std::to_string(fault.exit), std::to_string(got)});
}

std::string goodTicketInBase64() {
    return base::encodeBase64(goodTicket(subjectNamed("package"), signers()));
}

INSTANTIATE_TEST_SUITE_P(MustFail, AnswerTable, testing::ValuesIn(answerFaults(goodTicketInBase64())),
                         [](const auto& tested) { return tested.param.name; });

/// The precondition of the tables: without a fault, each kind is accepted on each route.
class GoodTicket : public testing::TestWithParam<Subject> {};

TEST_P(GoodTicket, IsTaken) {
    const Subject& subject = GetParam();
    ToolRun tool({{signers().root.der}, {}, {}, {}});
    const std::string path = tool.path(subject.fileName);
    const std::string answer = answerWith(goodTicket(subject, signers()));
    subject.write(path, std::nullopt);
    EXPECT_EQ(tool.validate(path, answer), 65) << "nothing is stapled to it yet";
    EXPECT_EQ(tool.staple(path, answer), 0);
    EXPECT_EQ(tool.validate(path, answer), 0);
}

TEST_P(GoodTicket, ThatIsPutBackAfterItsRevocationPassesOfflineAndNotOnline) {
    const Subject& subject = GetParam();
    ToolRun tool({{signers().root.der}, {}, {}, {}});
    const std::string path = tool.path(subject.fileName);
    const Data revoked = SatchelBuilder::of(signers(), subject.payload().revoked().build()).build();
    subject.write(path, revoked);
    EXPECT_FALSE(tool.passesOffline(path));
    EXPECT_EQ(tool.validate(path, answerWith(revoked)), 77);

    subject.write(path, goodTicket(subject, signers()));
    EXPECT_TRUE(tool.passesOffline(path));
    EXPECT_EQ(tool.validate(path, answerWith(revoked)), 77);
    EXPECT_EQ(tool.staple(path, answerWith(revoked)), 77);
}

INSTANTIATE_TEST_SUITE_P(MustFail, GoodTicket, testing::ValuesIn(subjects()),
                         [](const auto& tested) { return tested.param.name; });

}  // namespace
}  // namespace pinwell::test
