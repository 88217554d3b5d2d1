// Chains that must not be trusted, under the policies that the tool makes.
#include <gtest/gtest.h>

#include "chain_faults.h"
#include "formats/satchel.h"
#include "result_table.h"
#include "src/messages.h"
#include "support/controller_run.h"
#include "support/message_capture.h"

namespace pinwell {
namespace {

using test::ChainCase;
using test::ChainPolicy;
using trust::Scene;
using trust::Verdict;

/// The chain of one case, issued and arranged.
Scene makeScene(const ChainCase& one) {
    test::ChainFields fields = one.policy == ChainPolicy::ticket
                                   ? test::ChainFields(test::TicketChain())
                                   : test::ChainFields(test::ServerChain(trust::kHost));
    if (one.fields) one.fields(fields);
    Scene scene(fields);
    if (one.arrangement) one.arrangement(scene, fields);
    return scene;
}

trust::PolicyRef makePolicy(const ChainCase& one, trust::TrustService& service) {
    trust::PolicyRef policy;
    switch (one.policy) {
        case ChainPolicy::ticket:
            EXPECT_EQ(_satchel_create_cert_policy(&policy, service), satchel_status::kSuccess);
            break;
        case ChainPolicy::pinned:
            return trust::pinnedServerPolicy(one.host);
        case ChainPolicy::compatibility:
            return trust::compatibilityServerPolicy(one.host);
    }
    return policy;
}

/// Returns `nullopt` if one of them cannot be read.
std::optional<std::vector<trust::CertificateRef>> parse(const std::vector<base::Data>& list,
                                                        trust::TrustService& service) {
    std::vector<trust::CertificateRef> certificates;
    for (const base::Data& der : list) {
        certificates.push_back(service.parseCertificate(der));
        if (certificates.back() == nullptr) return std::nullopt;
    }
    return certificates;
}

/// As the tables write it.
char judge(const ChainCase& one, std::string& reason) {
    const Scene scene = makeScene(one);
    const auto service = scene.service();
    const auto certificates = parse(scene.list, *service);
    if (!certificates) return 'x';
    const trust::PolicyRef policy = makePolicy(one, *service);
    const auto object = service->makeTrust(*certificates, policy);
    if (!object) {
        EXPECT_EQ(object.error().code(), trust::kParameterError);
        return 'p';
    }
    const auto verdict = (*object)->evaluate();
    EXPECT_TRUE(verdict);
    if (!verdict) return 'e';
    reason = (*object)->failureDescription().value_or("no failure");
    return static_cast<char>('0' + static_cast<int>(*verdict));
}

/// Trust by the user alone is enough for a server, but not for a ticket.
bool isGood(ChainPolicy policy, char verdict) {
    return verdict == '4' || (verdict == '1' && policy != ChainPolicy::ticket);
}

class ChainTable : public testing::TestWithParam<ChainCase> {};

TEST_P(ChainTable, HasItsVerdict) {
    const ChainCase& one = GetParam();
    std::string reason;
    const char got = judge(one, reason);
    EXPECT_EQ(got, one.expected) << one.wrong << "\n" << reason;
    test::recordResult({"chains", one.name, one.wrong, std::string(1, one.expected), std::string(1, got),
                        !isGood(one.policy, one.expected)});
}

std::string nameOf(const testing::TestParamInfo<ChainCase>& info) {
    return info.param.name;
}

INSTANTIATE_TEST_SUITE_P(MustFail, ChainTable, testing::ValuesIn(test::chainCases()), nameOf);

std::vector<ChainCase> casesWith(ChainPolicy policy) {
    std::vector<ChainCase> cases = test::chainCases();
    std::erase_if(cases, [&](const ChainCase& one) { return one.policy != policy; });
    return cases;
}

/// The outcome of a ticket whose chain has the verdict: only 4 counts.
class SignerTable : public testing::TestWithParam<ChainCase> {};

TEST_P(SignerTable, IsAcceptedForVerdict4Only) {
    const ChainCase& one = GetParam();
    const Scene scene = makeScene(one);
    const auto service = scene.service();
    const auto certificates = parse(scene.list, *service);
    ASSERT_EQ(!certificates, one.expected == 'x');
    if (!certificates) return;
    std::shared_ptr<trust::Trust> evaluated;
    const trust::Status status =
        _satchel_create_trust(*certificates, makePolicy(one, *service), &evaluated, *service);
    EXPECT_EQ(status == satchel_status::kSuccess, one.expected == '4') << one.wrong;
    EXPECT_EQ(evaluated != nullptr, one.expected == '4') << one.wrong;
}

INSTANTIATE_TEST_SUITE_P(MustFail, SignerTable, testing::ValuesIn(casesWith(ChainPolicy::ticket)), nameOf);

/// A server's chain before the two policies that the controller tries.
struct ServerCase {
    ChainCase pinned;
    char compatibility;

    friend void PrintTo(const ServerCase& one, std::ostream* out) { *out << one.pinned.wrong; }

    bool isAccepted() const {
        return isGood(ChainPolicy::pinned, pinned.expected) ||
               isGood(ChainPolicy::compatibility, compatibility);
    }
};

std::vector<ServerCase> serverCases() {
    const std::vector<ChainCase> pinned = casesWith(ChainPolicy::pinned);
    const std::vector<ChainCase> compatibility = casesWith(ChainPolicy::compatibility);
    std::vector<ServerCase> cases;
    for (std::size_t i = 0; i < pinned.size(); ++i) {
        cases.push_back({pinned.at(i), compatibility.at(i).expected});
        std::string& name = cases.back().pinned.name;
        name.resize(name.rfind('_'));
    }
    return cases;
}

/// The controller's decision on a server with that chain. A chain that makes no trust object causes no
/// challenge.
bool letsIn(const Scene& scene, trust::TrustService& service, const ChainCase& one) {
    const auto certificates = parse(scene.list, service);
    if (!certificates) return false;
    const auto object = service.makeTrust(*certificates, makePolicy(one, service));
    if (!object) return false;
    test::ControllerRun run;
    const test::MessageCapture output(kVerbosityNormal);
    const auto session = *run.platform.https.ephemeralSession(run.controller);
    std::optional<https::Disposition> given;
    run.controller.didReceiveChallenge(*session,
                                       {one.host, https::AuthenticationMethod::serverTrust, *object},
                                       [&](https::Disposition disposition,
                                           const std::optional<https::Credential>&) { given = disposition; });
    EXPECT_TRUE(given == https::Disposition::useCredential || given == https::Disposition::cancelChallenge);
    return given == https::Disposition::useCredential;
}

class ServerTable : public testing::TestWithParam<ServerCase> {};

TEST_P(ServerTable, IsLetInByEitherPolicyOrNotAtAll) {
    const ServerCase& one = GetParam();
    const Scene scene = makeScene(one.pinned);
    const auto service = scene.service();
    const bool isLetIn = letsIn(scene, *service, one.pinned);
    EXPECT_EQ(isLetIn, one.isAccepted()) << one.pinned.wrong;
    const auto text = [](bool accepted) { return std::string(accepted ? "accepted" : "refused"); };
    test::recordResult({"servers", one.pinned.name, one.pinned.wrong, text(one.isAccepted()), text(isLetIn),
                        !one.isAccepted()});
}

INSTANTIATE_TEST_SUITE_P(MustFail, ServerTable, testing::ValuesIn(serverCases()),
                         [](const auto& tested) { return tested.param.pinned.name; });

}  // namespace
}  // namespace pinwell
