// The tool against the real record service: a user's steps from the first sample to a revocation.
#include <csignal>
#include <filesystem>

#include "local_service.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;

class LocalService : public LocalServiceTest {
  protected:
    LocalService() { bundle = samples.at(0); }

    ProcessResult stapleAt(const std::string& path) const { return pinwell({"staple", path}); }

    testing::Matcher<const ProcessResult&> Stapled() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
    testing::Matcher<const ProcessResult&> Validated() const {
        return Ended(0, ElementsAre(processing(), kValidated));
    }
    testing::Matcher<const ProcessResult&> RefusedAsRevoked() const {
        return Ended(
            77, ElementsAre(
                    processing(), "Could not validate ticket for " + bundle,
                    "The ticket for Sample.app has been revoked. Tollmark will prevent it from running."));
    }
    /// For a bundle with a hash unknown to this test.
    testing::Matcher<const ProcessResult&> NotFound(const std::string& path) const {
        return Ended(65, ElementsAre("Processing: " + path,
                                     AllOf(StartsWith("Lumora query for "),
                                           testing::EndsWith("failed due to \"Record not found\".")),
                                     StartsWith("Could not find base64 encoded ticket in response for 2/"),
                                     stapleFailed(65)));
    }
};

TEST_F(LocalService, IssuesStaplesAndRevokesASample) {
    record("issue", {bundle});
    serveRecords();
    EXPECT_THAT(validate(),
                Ended(65, ElementsAre(processing(), "Sample.app does not have a ticket stapled to it.")));
    EXPECT_THAT(staple(), Stapled());
    EXPECT_THAT(validate(), Validated());
    EXPECT_THAT(staple(), Stapled());
    record("revoke", {bundle});
    const auto kept = stapled();
    EXPECT_THAT(validate(), RefusedAsRevoked());
    EXPECT_THAT(staple(), RefusedAsRevoked());
    EXPECT_EQ(stapled(), kept);
}

TEST_F(LocalService, ReinstatesARevokedArtefact) {
    serveRecords();
    record("issue", {bundle});
    record("revoke", {bundle});
    EXPECT_THAT(staple(), RefusedAsRevoked());
    record("issue", {bundle, "--reinstate", "--comment", "a false alarm"});
    EXPECT_THAT(staple(), Stapled());
    EXPECT_THAT(validate(), Validated());
}

TEST_F(LocalService, DeliversTicketsAsAssets) {
    record("issue", {bundle, "--asset"});
    serveRecords();
    EXPECT_THAT(pinwell({"staple", "-v", bundle}),
                Ended(0, AllOf(Contains(AllOf(StartsWith("URL of large ticket asset: https://127.0.0.1:"),
                                              HasSubstr("lmasset.ticket"))),
                               Contains(StartsWith("Downloaded large ticket size is ")), Contains(kWorked))));
    EXPECT_THAT(validate(), Validated());
    record("revoke", {bundle});
    EXPECT_THAT(validate(), RefusedAsRevoked());
}

TEST_F(LocalService, HasNoRecordWithoutAnIssue) {
    serveRecords();
    EXPECT_THAT(staple(), NotFound(bundle));
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(LocalService, IssuesForSeveralArtefactsAtOnce) {
    std::vector<std::string> bundles{bundle};
    for (const char* identifier : {"com.example.one", "com.example.two"}) {
        const Data directoryBlob =
            CodeDirectoryBuilder().identifier(identifier).covers(2, emptyRequirements()).build();
        bundles.push_back(directory / ("builds/" + std::string(identifier) + ".app"));
        BundleBuilder()
            .executable(
                ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(directoryBlob).build()).build())
            .write(bundles.back());
    }
    record("issue", bundles);
    serveRecords();
    for (const std::string& path : bundles)
        EXPECT_THAT(stapleAt(path),
                    Ended(0, ElementsAre("Processing: " + path, "Processing: " + path, kWorked)));
    // Each has its own: one of another's is refused.
    std::filesystem::copy_file(bundles[1] + "/Contents/CodeResources", bundles[2] + "/Contents/CodeResources",
                               std::filesystem::copy_options::overwrite_existing);
    EXPECT_THAT(pinwell({"validate", bundles[2]}), Ended(65, ElementsAre("Processing: " + bundles[2])));
    record("revoke", {bundles[1]});
    EXPECT_EQ(pinwell({"validate", bundles[1]}).exitStatus, 77);
    EXPECT_THAT(validate(), Validated());
}

TEST_F(LocalService, IssuesForAPlainExecutableThatHasNoPlaceForTheTicket) {
    const std::string tool = directory / "builds/tool";
    std::filesystem::copy_file(bundle + "/Contents/Programs/Sample", tool);
    record("issue", {bundle});
    serveRecords();
    EXPECT_THAT(stapleAt(tool), Ended(73, ElementsAre("Processing: " + tool, stapleFailed(73))));
}

TEST_F(LocalService, KeepsItsEnvironmentsApart) {
    record("issue", {bundle, "--environment", "development"});
    serveRecords();
    EXPECT_THAT(staple(), NotFound(bundle));
    writeFile(serviceDirectory + "/platform/internal-security-policies", std::string_view());
    writeFile(directory / "home/config/com.ostrel.tm.pinwell.json",
              std::string_view(R"({"lm-production":false})"));
    EXPECT_THAT(staple(), Stapled());
}

TEST_F(LocalService, IsNotTrustedByAnotherPlatform) {
    record("issue", {bundle});
    serveRecords();
    std::filesystem::remove_all(serviceDirectory + "/platform/roots");
    EXPECT_THAT(staple(), Ended(68, Contains("Could not establish secure connection to 127.0.0.1")));
}

TEST_F(LocalService, IsUnreachableAfterItsStop) {
    record("issue", {bundle});
    serveRecords();
    EXPECT_THAT(staple(), Stapled());
    serving->sendSignal(SIGTERM);
    const ProcessResult stopped = serving->wait();
    EXPECT_EQ(stopped.exitStatus, 0);
    EXPECT_EQ(stopped.errors, "");
    EXPECT_THAT(stopped.outputLines(), Contains("stopped"));
    EXPECT_THAT(validate(), Ended(68, ElementsAre(processing(),
                                                  StartsWith("error is Error Domain=URLErrorDomain Code=4 "),
                                                  "Lumora's response is inconsistent with expections: (null)",
                                                  validateFailed(68))));
}

TEST_F(LocalService, ServesManyRunsAtOnce) {
    record("issue", {bundle});
    serveRecords();
    ASSERT_THAT(staple(), Stapled());
    std::vector<std::unique_ptr<RunningProcess>> runs;
    for (int i = 0; i < 8; ++i)
        runs.push_back(std::make_unique<RunningProcess>(command({"validate", bundle})));
    for (const auto& run : runs) EXPECT_THAT(run->wait(), Validated());
}

}  // namespace
}  // namespace pinwell::test
