// Tickets that are delivered by download.
#include <csignal>
#include <filesystem>

#include "fixture.h"
#include "support/file_size_limit.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Matcher;
using testing::StartsWith;

class LargeTicket : public EndToEndTest {
  protected:
    Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
    std::string sizeLine(const std::string& expected, std::size_t got) const {
        return "We were expecting a ticket size of " + expected + " but download a ticket of size " +
               std::to_string(got);
    }

    const Data genuine = ticket();
};

TEST_F(LargeTicket, IsFetchedAndStapled) {
    serveAsset(genuine);
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(stapled(), genuine);
    EXPECT_THAT(temporaryFiles(), ElementsAre("REQUEST.ticket"));
    const auto requests = service().requests();
    ASSERT_EQ(requests.size(), 2U);
    EXPECT_EQ(requests[1].method, "GET");
    EXPECT_EQ(requests[1].target, "/assets/lmasset.ticket");
    EXPECT_EQ(requests[1].body, "");
    EXPECT_EQ(requests[1].header("Content-Type"), std::nullopt);
}

TEST_F(LargeTicket, MayBeLarge) {
    TicketPayloadBuilder many = payload();
    for (std::uint32_t i = 0; i < 100000; ++i) many.entry(2, hashOf(static_cast<std::uint8_t>(i)));
    const Data large = sealed(many);
    ASSERT_GT(large.size(), 2000000U);
    serveAsset(large);
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(stapled(), large);
}

TEST_F(LargeTicket, SaysWhatItFetchesInVerboseMode) {
    serveAsset(genuine);
    EXPECT_THAT(
        pinwell({"staple", "-v", bundle}),
        Ended(0, AllOf(Contains("URL of large ticket asset: " + service().url("/assets/lmasset.ticket")),
                       Contains(StartsWith("Big ticket response is { URL: ")),
                       Contains("Downloaded large ticket size is 1 KB"),
                       Contains("Domain is 127.0.0.1").Times(2))));
}

TEST_F(LargeTicket, CompletesAValidation) {
    stapleByHand(genuine);
    serveAsset(ticket());
    EXPECT_THAT(validate(), Ended(0, ElementsAre(processing(), kValidated)));
    EXPECT_EQ(stapled(), genuine);
}

// The template.

TEST_F(LargeTicket, EveryTokenOfTheTemplateIsReplaced) {
    const Response asset{.body = base::toString(genuine)};
    serveAsset(assetRecord(service().url("/${f}/x/${f}?n=${f}"), genuine.size()), asset);
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().requests().back().target, "/lmasset.ticket/x/lmasset.ticket?n=lmasset.ticket");
}

TEST_F(LargeTicket, ATemplateWithoutTheTokenIsUsedAsItIs) {
    const Response asset{.body = base::toString(genuine)};
    serveAsset(assetRecord(service().url("/plain?a=$f"), genuine.size()), asset);
    EXPECT_THAT(staple(), Worked());
    EXPECT_EQ(service().requests().back().target, "/plain?a=$f");
}

TEST_F(LargeTicket, ATemplateThatMakesNoURLIsReportedAndNoTicketIsFound) {
    for (const char* text : {"not a URL", "https://", "${f}", "https://host/%zz", "https://host/a b"}) {
        serveAsset(assetRecord(text, 7), {});
        EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(),
                                                    "Large ticket was requested from an invalid URL: (null)",
                                                    noTicketLine(), stapleFailed(65))))
            << text;
    }
}

// Size, then status.

TEST_F(LargeTicket, OfAnotherSizeThanAnnouncedIsRefused) {
    const Response asset{.body = base::toString(genuine)};
    for (const std::size_t announced : {genuine.size() - 1, genuine.size() + 1, std::size_t{0}}) {
        serveAsset(assetRecord(service().url("/${f}"), announced), asset);
        EXPECT_THAT(staple(),
                    Ended(65, ElementsAre(processing(), sizeLine(std::to_string(announced), genuine.size()),
                                          stapleFailed(65))));
    }
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(LargeTicket, WithoutAnAnnouncedSizeIsRefused) {
    serveAsset(assetRecord(service().url("/${f}"), ""), {.body = base::toString(genuine)});
    EXPECT_THAT(staple(),
                Ended(65, ElementsAre(processing(), sizeLine("(null)", genuine.size()), stapleFailed(65))));
}

TEST_F(LargeTicket, ASizeThatIsNoNumberIsRefused) {
    const std::size_t got = genuine.size();
    const Response asset{.body = base::toString(genuine)};
    serveAsset(assetRecord(service().url("/${f}"), "-1"), asset);
    EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), sizeLine("-1", got), stapleFailed(65))));
    serveAsset(assetRecord(service().url("/${f}"), "1e300"), asset);
    EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), testing::_, stapleFailed(65))));
    serveAsset(assetRecord(service().url("/${f}"), "18446744073709551616"), asset);
    EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), testing::_, stapleFailed(65))));
}

TEST_F(LargeTicket, AMissingAssetOfAnotherSizeIsAMatterOfSize) {
    serveAsset(assetRecord(service().url("/${f}"), genuine.size()), {.status = 404, .body = "Not found"});
    EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), sizeLine(std::to_string(genuine.size()), 9),
                                                stapleFailed(65))));
}

TEST_F(LargeTicket, AnErrorOfTheAnnouncedSizeIsAMatterOfStatus) {
    serveAsset(assetRecord(service().url("/${f}"), genuine.size()),
               {.status = 500, .body = base::toString(genuine)});
    EXPECT_THAT(
        staple(),
        Ended(68,
              ElementsAre(processing(),
                          "Attempting to download larger ticket for Sample.app failed. internal server error",
                          stapleFailed(68))));
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(LargeTicket, AnEmptyAssetThatWasAnnouncedEmptyIsRefused) {
    serveAsset(assetRecord(service().url("/${f}"), 0), {});
    EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), "Could not validate ticket for " + bundle,
                                                stapleFailed(65))));
}

TEST_F(LargeTicket, OfTheRightSizeMustStillBeGenuine) {
    for (const Data& other : {ticketForOthers(), Data(genuine.size())}) {
        serveAsset(other);
        EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), "Could not validate ticket for " + bundle,
                                                    stapleFailed(65))));
    }
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(LargeTicket, ThatIsRevokedIsReported) {
    serveAsset(revokedTicket());
    EXPECT_THAT(
        staple(),
        Ended(77, ElementsAre(
                      processing(), "Could not validate ticket for " + bundle,
                      "The ticket for Sample.app has been revoked. Tollmark will prevent it from running.")));
}

// The source of the download.

TEST_F(LargeTicket, MayComeFromAnotherHostWithACertificateOfItsOwn) {
    HostileServer assets(identityOf(ServerChain("localhost").issue()));
    assets.setHandler([this](const RecordedRequest&) { return Response{.body = base::toString(genuine)}; });
    serveAsset(assetRecord(assets.url("/${f}", "localhost"), genuine.size()), {.status = 404});
    EXPECT_THAT(
        pinwell({"staple", "-v", bundle}),
        Ended(0, AllOf(Contains("Domain is 127.0.0.1"), Contains("Domain is localhost"), Contains(kWorked))));
    EXPECT_EQ(service().requests().size(), 1U);
}

TEST_F(LargeTicket, MayBeRedirected) {
    service().enqueue(Script().respond(answer(assetRecord(service().url("/${f}"), genuine.size()))));
    service().enqueue(
        Script().respond({.status = 302, .headers = {{"Location", "/there"}}, .body = "moved"}));
    service().enqueue(Script().respond({.body = base::toString(genuine)}));
    EXPECT_THAT(staple(), Worked());
}

// Failures, after which the run waits for ever.

TEST_F(LargeTicket, AHostThatIsNotTrustedParksTheRun) {
    HostileServer stranger(identityOf(ServerChain("localhost").issue()));
    serveAsset(assetRecord(stranger.url("/${f}"), genuine.size()),
               {});  // by its address, which it has no name for
    expectParked(DownloadFailed());
    EXPECT_THAT(stranger.requests(), IsEmpty());
}

TEST_F(LargeTicket, AHostThatDoesNotRespondParksTheRun) {
    std::string nobody;
    {
        const HostileServer gone(identityOf(serverChain));
        nobody = gone.url("/${f}");
    }
    serveAsset(assetRecord(nobody, genuine.size()), {});
    expectParked(DownloadFailed("could not be made"));
}

TEST_F(LargeTicket, AConnectionThatIsCutParksTheRun) {
    service().enqueue(Script().respond(answer(assetRecord(service().url("/${f}"), genuine.size()))));
    service().enqueue(
        Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 1000\r\n\r\nabc").cut());
    expectParked(DownloadFailed());
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(LargeTicket, AnAssetThatIsNotServedOverHTTPSParksTheRun) {
    for (const char* url : {"http://127.0.0.1:1/${f}", "file:///etc/hostname", "ftp://127.0.0.1/${f}"}) {
        serveAsset(assetRecord(url, genuine.size()), {});
        expectParked(DownloadFailed());
    }
}

TEST_F(LargeTicket, AnAssetBeyondMeasureParksTheRun) {
    constexpr std::size_t kTooMuch = 64UL * 1024 * 1024 + 1;
    service().enqueue(Script().respond(answer(assetRecord(service().url("/${f}"), kTooMuch))));
    service().enqueue(Script()
                          .readRequest()
                          .send("HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(kTooMuch) + "\r\n\r\n")
                          .drain());
    expectParked(DownloadFailed());
}

TEST_F(LargeTicket, ATemporaryDirectoryThatIsNotThereParksTheRun) {
    environment["TMPDIR"] = directory / "nowhere";
    serveAsset(genuine);
    expectParked(DownloadFailed());
}

TEST_F(LargeTicket, ADownloadThatCannotBeKeptParksTheRunAndNoSignalEndsIt) {
    serveAsset(genuine);
    {
        const FileSizeLimit limit(genuine.size() - 1);
        expectParked(DownloadFailed("could not be written"));
    }
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(LargeTicket, AParkedRunIsSilentInQuietMode) {
    HostileServer stranger(identityOf(ServerChain("localhost").issue()));
    serveAsset(assetRecord(stranger.url("/${f}"), genuine.size()), {});
    RunningProcess run(command({"staple", "-q", bundle}));
    ASSERT_TRUE(stranger.waitForEndedConnections(1));
    EXPECT_TRUE(run.isRunning());
    run.sendSignal(SIGTERM);
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.signal, SIGTERM);
    EXPECT_EQ(result.output + result.errors, "");
}

}  // namespace
}  // namespace pinwell::test
