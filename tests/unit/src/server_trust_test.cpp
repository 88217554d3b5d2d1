// The servers that the controller accepts.
#include <gtest/gtest.h>

#include "src/messages.h"
#include "support/controller_run.h"
#include "support/message_capture.h"
#include "values/value.h"

namespace pinwell {
namespace {

using test::ControllerRun;
using test::MessageCapture;
using values::Dictionary;

class ServerTrust : public testing::Test {
  protected:
    void SetUp() override {
        const trust::PolicyRef initial = trust::pinnedServerPolicy("api.lumora.example");
        trust::CertificateRef certificate = run.platform.trust.parseCertificate(base::asBytes("server"));
        const auto made = run.platform.trust.makeTrust({certificate}, initial);
        ASSERT_TRUE(made);
        serverTrust = *made;
        run.platform.trust.policies.clear();
    }

    https::Disposition judge(const std::string& host = "api.lumora.example",
                             https::AuthenticationMethod method = https::AuthenticationMethod::serverTrust) {
        const auto session = *run.platform.https.ephemeralSession(run.controller);
        int calls = 0;
        auto given = https::Disposition::performDefaultHandling;
        run.controller.didReceiveChallenge(
            *session, {host, method, serverTrust},
            [&](https::Disposition disposition, std::optional<https::Credential> made) {
                ++calls;
                given = disposition;
                credential = std::move(made);
            });
        EXPECT_EQ(calls, 1) << "the completion must be called exactly once";
        return given;
    }

    void evaluations(std::vector<test::FakeTrustService::Evaluation> list) {
        run.platform.trust.evaluations = std::move(list);
    }

    ControllerRun run;
    std::shared_ptr<trust::Trust> serverTrust;
    std::optional<https::Credential> credential;
};

constexpr auto kRefused = trust::Verdict::recoverableFailure;

TEST_F(ServerTrust, AServerThatSatisfiesThePinnedPolicyIsAccepted) {
    EXPECT_EQ(judge(), https::Disposition::useCredential);
    EXPECT_EQ(credential->trust, serverTrust);
    ASSERT_EQ(run.platform.trust.policies.size(), 1U);
    EXPECT_EQ(run.platform.trust.policies[0]->options,
              trust::pinnedServerPolicy("api.lumora.example")->options);
}

TEST_F(ServerTrust, VerdictsProceedAndUnspecifiedBothCount) {
    evaluations({{.verdict = trust::Verdict::proceed}});
    EXPECT_EQ(judge(), https::Disposition::useCredential);
    evaluations({{.verdict = trust::Verdict::unspecified}});
    EXPECT_EQ(judge(), https::Disposition::useCredential);
}

TEST_F(ServerTrust, EveryOtherVerdictIsRefusedAndPrintedAsItsNumber) {
    for (const auto verdict :
         {trust::Verdict::invalid, trust::Verdict::deny, trust::Verdict::recoverableFailure,
          trust::Verdict::fatalFailure, trust::Verdict::otherError}) {
        evaluations({{.verdict = verdict}});
        const MessageCapture output(kVerbosityNormal);
        EXPECT_EQ(judge(), https::Disposition::cancelChallenge);
        EXPECT_FALSE(credential.has_value());
        EXPECT_EQ(output.lines()[0], values::format("Certificate trust evaluation did not return expected "
                                                    "result. (%d) ",
                                                    static_cast<std::uint32_t>(verdict)));
    }
}

TEST_F(ServerTrust, AServerThatFailsThePinnedPolicyMayPassTheCompatibilityPolicy) {
    evaluations({{.verdict = kRefused, .failureDescription = "marker missing"}, {}});
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(judge(), https::Disposition::useCredential);
    EXPECT_EQ(output.text(),
              "Certificate trust evaluation did not return expected result. (5) marker missing\n");
    ASSERT_EQ(run.platform.trust.policies.size(), 2U);
    EXPECT_EQ(run.platform.trust.policies[1]->options,
              trust::compatibilityServerPolicy("api.lumora.example")->options);
}

TEST_F(ServerTrust, AServerThatFailsBothIsReportedTwiceAndRefused) {
    const Error expired("TrustErrorDomain", 1, "expired");
    evaluations(
        {{.verdict = kRefused,
          .properties = {Dictionary{{"title", "leaf"}, {"error", expired}}, Dictionary{{"title", "root"}}},
          .failureDescription = "leaf: expired"}});
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(judge(), https::Disposition::cancelChallenge);
    const std::string first =
        "Certificate trust evaluation did not return expected result. (5) leaf: expired";
    for (const std::size_t at : {std::size_t{0}, std::size_t{2}}) {
        EXPECT_EQ(output.lines()[at], first);
        EXPECT_EQ(output.lines()[at + 1],
                  "Certificate trust evaluation for leaf did not return expected result. Error "
                  "Domain=TrustErrorDomain Code=1 \"expired\".");
    }
    EXPECT_EQ(output.lines().back(), "Could not establish secure connection to api.lumora.example");
    EXPECT_EQ(output.lines().size(), 5U);
}

TEST_F(ServerTrust, AMissingFailureDescriptionPrintsAsNothing) {
    evaluations({{.verdict = kRefused}});
    const MessageCapture output(kVerbosityNormal);
    judge();
    EXPECT_EQ(output.lines()[0], "Certificate trust evaluation did not return expected result. (5) ");
}

TEST_F(ServerTrust, AnEvaluationThatCannotRunIsReportedAndTheNextPolicyTried) {
    evaluations({{.status = -67585}, {}});
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(judge(), https::Disposition::useCredential);
    EXPECT_EQ(output.lines()[0].find("Certificate trust evaluation failed. Error Domain=OSStatusErrorDomain "
                                     "Code=-67585"),
              0U);
}

TEST_F(ServerTrust, APolicyThatCannotBeSetIsNotedAndTheNextOneTried) {
    run.platform.trust.setPolicyStatuses = {-50, trust::kSuccess};
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(judge(), https::Disposition::useCredential);
    EXPECT_EQ(output.lines()[1].find("Could not set trust policy. Error Domain=OSStatusErrorDomain Code=-50"),
              0U);
    EXPECT_EQ(run.platform.trust.evaluationCount, 1U);
}

TEST_F(ServerTrust, WithoutAnyPolicyTheServerIsRefusedInSilence) {
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(judge(""), https::Disposition::cancelChallenge);
    EXPECT_EQ(output.text(), "");
    EXPECT_EQ(run.platform.trust.evaluationCount, 0U);
}

TEST_F(ServerTrust, AnotherKindOfChallengeGetsDefaultHandlingAndOneLine) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(judge("api.lumora.example", https::AuthenticationMethod::clientCertificate),
              https::Disposition::performDefaultHandling);
    EXPECT_EQ(output.text(), "Domain is api.lumora.example\n");
    EXPECT_EQ(judge("api.lumora.example", https::AuthenticationMethod::password),
              https::Disposition::performDefaultHandling);
    EXPECT_EQ(run.platform.trust.evaluationCount, 0U);
}

}  // namespace
}  // namespace pinwell
