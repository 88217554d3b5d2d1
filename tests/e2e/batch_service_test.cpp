// pinwell-batch against a record service that is slow, busy, broken or hostile.
#include <algorithm>
#include <set>

#include "batch_fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

std::string messagesOf(const Value& report) {
    std::string text;
    for (const Value& message : *report["messages"].array()) text += *message.string() + "\n";
    return text;
}

std::uint64_t attemptsOf(const Value& report) {
    return report["attempts"].unsignedIntegerValue();
}

Script anyScript(const std::function<void(Script&)>& steps) {
    Script script;
    steps(script);
    return script;
}

// The number of artefacts in a lookup depends on how quickly they are read. So a test that counts lookups has
// one artefact.

// Connections that break.

struct BrokenConnection {
    std::string title;
    Script script;
};

class BatchOverABrokenConnection : public BatchTest, public testing::WithParamInterface<BrokenConnection> {};

TEST_P(BatchOverABrokenConnection, TriesAgainUntilItWorks) {
    const auto images = writeImages(1);
    for (int i = 0; i < 2; ++i) service().enqueue(GetParam().script);
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    const auto reports = reportsOf(result);
    EXPECT_THAT(reports, AllOf(SizeIs(1), Each(Reports("worked", 0))));
    for (const Value& report : reports) EXPECT_EQ(attemptsOf(report), 3U);
    EXPECT_EQ(countStapled(images), 1U);
}

TEST_P(BatchOverABrokenConnection, GivesUpAfterTheLastTry) {
    const auto images = writeImages(1);
    for (int i = 0; i < 3; ++i) service().enqueue(GetParam().script);
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--retries", "2", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    const auto reports = reportsOf(result);
    EXPECT_THAT(reports, AllOf(SizeIs(1), Each(Reports("unreachable", 68))));
    for (const Value& report : reports) EXPECT_EQ(attemptsOf(report), 3U);
    EXPECT_EQ(countStapled(images), 0U);
    EXPECT_THAT(service().connections(), SizeIs(3));
}

INSTANTIATE_TEST_SUITE_P(
    Which, BatchOverABrokenConnection,
    testing::Values(
        BrokenConnection{"ResetBeforeTheHandshake", anyScript([](Script& s) { s.reset(); })},
        BrokenConnection{"ResetAfterTheHandshake", anyScript([](Script& s) { s.handshake().reset(); })},
        BrokenConnection{"ResetAfterTheRequest", anyScript([](Script& s) { s.readRequest().reset(); })},
        BrokenConnection{"ClosedWithoutAnAnswer", anyScript([](Script& s) { s.readRequest().close(); })},
        BrokenConnection{"CutWithinTheHead",
                         anyScript([](Script& s) { s.readRequest().send("HTTP/1.1 200 OK\r\nX-").cut(); })},
        BrokenConnection{
            "CutWithinTheBody", anyScript([](Script& s) {
                s.readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 900\r\n\r\n{\"rec").cut();
            })},
        BrokenConnection{"NotTLS",
                         anyScript([](Script& s) { s.sendPlain("HTTP/1.1 200 OK\r\n\r\n").close(); })},
        BrokenConnection{"AnAnswerWithoutABody", anyScript([](Script& s) { s.respond({.status = 200}); })}),
    [](const auto& row) { return row.param.title; });

class BatchService : public BatchTest {
  protected:
    /// The response to the first `count` lookups; later lookups get records.
    void serveFirst(std::size_t count, const Response& first) {
        service().setHandler([this, first, left = count](const RecordedRequest& request) mutable {
            if (left == 0) return answer(bodyFor(namesIn(request)));
            --left;
            return first;
        });
    }
};

TEST_F(BatchService, APortWithoutAListenerIsUnreachable) {
    const auto images = writeImages(2);
    contact("127.0.0.1:1");
    const ProcessResult result = batch({"staple", "--json", "--retries", "1", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(2), Each(Reports("unreachable", 68))));
}

// A service that has too much to do.

class BatchAtABusyService : public BatchService, public testing::WithParamInterface<int> {};

TEST_P(BatchAtABusyService, TriesAgainUntilItWorks) {
    const auto images = writeImages(1);
    serveFirst(1, {.status = GetParam(), .body = "busy"});
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 0);
    for (const Value& report : reportsOf(result)) EXPECT_EQ(attemptsOf(report), 2U);
    EXPECT_EQ(countStapled(images), 1U);
}

TEST_P(BatchAtABusyService, IsUnreachableIfItStaysSo) {
    const auto images = writeImages(1);
    serve({.status = GetParam(), .body = inlineRecord(issuedFor(images[0]))});
    const ProcessResult result = batch({"staple", "--json", "--retries", "3", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    const auto reports = reportsOf(result);
    ASSERT_THAT(reports, ElementsAre(Reports("unreachable", 68)));
    EXPECT_EQ(attemptsOf(reports[0]), 4U);
    EXPECT_THAT(messagesOf(reports[0]), HasSubstr("answered with status " + std::to_string(GetParam())));
    EXPECT_EQ(countStapled(images), 0U);
}

INSTANTIATE_TEST_SUITE_P(Status, BatchAtABusyService, testing::Values(429, 502, 503, 504),
                         [](const auto& row) { return std::to_string(row.param); });

TEST_F(BatchService, RetriesAtTheTimeThatTheServiceGives) {
    // Its own delay would be longer than the deadline.
    const auto images = writeImages(2);
    serveFirst(1, {.status = 503, .headers = {{"Retry-After", "0"}}});
    const ProcessResult result =
        batch({"staple", "--json", "--retry-delay", "600", "--deadline", "60"}, images);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    EXPECT_EQ(countStapled(images), 2U);
}

TEST_F(BatchService, ComesBackAtADateThatHasPassed) {
    const auto images = writeImages(1);
    serveFirst(1, {.status = 429, .headers = {{"Retry-After", "Sun, 06 Nov 1994 08:49:37 GMT"}}});
    EXPECT_EQ(batch({"staple", "-q", "--retry-delay", "600", "--deadline", "60"}, images).exitStatus, 0);
}

TEST_F(BatchService, DoesNotRetryBeforeTheTimeThatTheServiceGives) {
    const auto images = writeImages(1);
    serveFirst(1, {.status = 503, .headers = {{"Retry-After", "500"}}});
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0", "--deadline", "1"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    const auto reports = reportsOf(result);
    EXPECT_THAT(reports, AllOf(SizeIs(1), Each(Reports("timedOut", 68))));
    for (const Value& report : reports)
        EXPECT_THAT(messagesOf(report), HasSubstr("answered with status 503"));
    EXPECT_THAT(service().requests(), SizeIs(1));
}

TEST_F(BatchService, ARetryAfterThatIsNeitherNumberNorDateCountsForNothing) {
    const auto images = writeImages(1);
    for (const char* value : {"soon", "-1", "1e9", "", "12 parsecs"}) {
        serveFirst(1, {.status = 503, .headers = {{"Retry-After", value}}});
        EXPECT_EQ(batch({"staple", "-q", "--retry-delay", "0", "--deadline", "60"}, images).exitStatus, 0)
            << value;
    }
}

TEST_F(BatchService, AnotherStatusIsAResponseAndNotRetried) {
    const auto images = writeImages(1);
    serve({.status = 400, .body = "{}"});
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(service().requests(), SizeIs(1));
}

// A server that is not the record service.

TEST_F(BatchService, AnUntrustedServerIsNotRetried) {
    const auto images = writeImages(1);
    startService(identityOf(ServerChain("127.0.0.1").issue()));
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    const auto reports = reportsOf(result);
    EXPECT_THAT(reports, AllOf(SizeIs(1), Each(Reports("untrusted", 68))));
    for (const Value& report : reports) {
        EXPECT_EQ(attemptsOf(report), 1U);
        EXPECT_THAT(messagesOf(report), HasSubstr("Could not establish secure connection to 127.0.0.1"));
    }
    EXPECT_THAT(service().connections(), SizeIs(1));
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(BatchService, AnAssetServerThatIsNotTrustedIsNotTriedAgain) {
    const auto images = writeImages(1);
    HostileServer stranger(identityOf(ServerChain("somebody.example").issue()));
    serve(answer(R"({"records":[{"recordName":")" + recordNameOf(images[0]) +
                 R"(","fields":{"signedTicketAsset":{"value":{"downloadURL":")" + stranger.url("/${f}") +
                 R"(","size":4}}}}]})"));
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("untrusted", 68)));
    EXPECT_THAT(stranger.connections(), SizeIs(1));
}

// Responses that differ from the requests.

struct Grouping {
    std::string title;
    /// Changes the names before the response.
    std::function<std::vector<std::string>(std::vector<std::string>)> change;
};

class BatchWithoutGroups : public BatchTest, public testing::WithParamInterface<Grouping> {};

TEST_P(BatchWithoutGroups, LooksEachRecordUpAlone) {
    const auto images = writeImages(8);
    records[recordNameOf(images[5])] = std::nullopt;
    service().setHandler([this](const RecordedRequest& request) {
        const auto names = namesIn(request);
        return answer(bodyFor(names.size() == 1 ? names : GetParam().change(names)));
    });
    const ProcessResult result = batch({"staple", "--json"}, images);
    EXPECT_EQ(result.exitStatus, 65);
    std::size_t worked = 0;
    for (const Value& report : reportsOf(result)) {
        const bool hasTicket = *report["path"].string() != images[5].path;
        EXPECT_THAT(report, hasTicket ? Reports("worked", 0) : Reports("notIssued", 65));
        worked += hasTicket ? 1U : 0U;
    }
    EXPECT_EQ(worked, 7U);
    for (std::size_t i = 0; i < images.size(); ++i)
        EXPECT_EQ(readFile(images[i].path),
                  i == 5 ? images[i].contents : images[i].stapledWith(issuedFor(images[i])));
    // One group was tried. Its size depends on how quickly the artefacts were read.
    const auto sizes = groupSizes();
    EXPECT_LE(std::count_if(sizes.begin(), sizes.end(), [](std::size_t size) { return size > 1; }), 1);
    EXPECT_GE(std::count(sizes.begin(), sizes.end(), 1U), 8);
}

using Names = std::vector<std::string>;
INSTANTIATE_TEST_SUITE_P(Answered, BatchWithoutGroups,
                         testing::Values(Grouping{"Backwards",
                                                  [](Names n) { return Names(n.rbegin(), n.rend()); }},
                                         Grouping{"WithTwoExchanged",
                                                  [](Names n) {
                                                      std::swap(n.front(), n.back());
                                                      return n;
                                                  }},
                                         Grouping{"Short",
                                                  [](Names n) {
                                                      n.pop_back();
                                                      return n;
                                                  }},
                                         Grouping{"Empty", [](const Names&) { return Names(); }},
                                         Grouping{"WithOneAlone", [](const Names& n) { return Names{n[0]}; }},
                                         Grouping{"Long",
                                                  [](Names n) {
                                                      n.push_back("2/2/" + std::string(40, 'a'));
                                                      return n;
                                                  }},
                                         Grouping{"Twice",
                                                  [](Names n) {
                                                      const Names once = n;
                                                      n.insert(n.end(), once.begin(), once.end());
                                                      return n;
                                                  }},
                                         Grouping{"WithOneTwiceInThePlaceOfAnother",
                                                  [](Names n) {
                                                      n.back() = n.front();
                                                      return n;
                                                  }},
                                         Grouping{"WithAnothersName",
                                                  [](Names n) {
                                                      n.back() = "2/2/" + std::string(40, 'b');
                                                      return n;
                                                  }}),
                         [](const auto& row) { return row.param.title; });

TEST_F(BatchService, AServiceThatRefusesGroupsGetsALookupForEachRecord) {
    const auto images = writeImages(6);
    for (const char* refusal : {"{}", "not JSON", R"({"records":7})", R"({"records":[1,2,3,4,5,6]})",
                                R"({"serverErrorCode":"BAD_REQUEST","reason":"one at a time"})"}) {
        service().setHandler([&](const RecordedRequest& request) {
            const auto names = namesIn(request);
            return names.size() == 1 ? answer(bodyFor(names)) : Response{.status = 400, .body = refusal};
        });
        const ProcessResult result = batch({"staple", "--json"}, images);
        EXPECT_EQ(result.exitStatus, 0) << refusal << result.output;
    }
    EXPECT_EQ(countStapled(images), 6U);
}

TEST_F(BatchService, ATicketOfAnotherRecordIsNotAcceptable) {
    const auto images = writeImages(2);
    std::swap(records[recordNameOf(images[0])], records[recordNameOf(images[1])]);
    serveRecords();
    const ProcessResult result = batch({"staple", "--json"}, images);
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(2), Each(Reports("notAcceptable", 65))));
    for (const Artefact& image : images) EXPECT_EQ(readFile(image.path), image.contents);
}

// Large tickets, in separate files.

class BatchAssets : public BatchService {
  protected:
    /// Names an asset instead of each ticket. `asset` is the response to its download.
    void serveAssets(std::function<Response(const std::string& recordName)> asset) {
        const std::string assets = service().url("/asset/");
        service().setHandler([this, asset = std::move(asset), assets](const RecordedRequest& request) {
            const std::lock_guard order(serving);
            if (request.method != "POST") return asset(nameIn(request.target));
            std::string body;
            for (const std::string& name : namesIn(request)) {
                const Data& ticket = *records.at(name);
                body += (body.empty() ? "" : ",") + (R"({"recordName":")" + name) +
                        R"(","fields":{"signedTicketAsset":{"value":{"downloadURL":")" + assets + name +
                        R"(/${f}","size":)" + std::to_string(ticket.size()) + "}}}}";
            }
            return answer(R"({"records":[)" + body + "]}");
        });
    }
    static std::string nameIn(const std::string& target) {
        constexpr std::size_t kPrefix = std::string_view("/asset/").size();
        return target.substr(kPrefix, target.rfind('/') - kPrefix);
    }
    Response assetOf(const std::string& recordName) {
        return {.body = base::toString(*records.at(recordName))};
    }
};

TEST_F(BatchAssets, AreFetchedWithTheirRecords) {
    const auto images = writeImages(10);
    serveAssets([this](const std::string& name) { return assetOf(name); });
    const ProcessResult result = batch({"staple", "--json"}, images);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    EXPECT_EQ(countStapled(images), 10U);
}

TEST_F(BatchAssets, ThatAreOutOfReachAreTriedAgainWithTheirRecords) {
    const auto images = writeImages(4);
    std::set<std::string> seen;
    serveAssets([&](const std::string& name) {
        return seen.insert(name).second ? Response{.status = 503, .headers = {{"Retry-After", "0"}}}
                                        : assetOf(name);
    });
    const ProcessResult result = batch({"staple", "--json", "--deadline", "60"}, images);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    for (const Value& report : reportsOf(result)) EXPECT_EQ(attemptsOf(report), 2U);
    EXPECT_EQ(countStapled(images), 4U);
}

TEST_F(BatchAssets, OfAnotherSizeThanAnnouncedAreNotAcceptable) {
    const auto images = writeImages(1);
    serveAssets([this](const std::string& name) {
        return Response{.body = base::toString(*records.at(name)) + "x"};
    });
    const ProcessResult result = batch({"staple", "--json", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_EQ(countStapled(images), 0U);
}

// A silent service.

TEST_F(BatchService, AnArtefactTimesOutIfTheServiceIsSilent) {
    const auto images = writeImages(3);
    service().enqueue(Script().readRequest().waitFor(Gate()));
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--timeout", "0.5"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(3), Contains(Reports("timedOut", 68))));
}

TEST_F(BatchService, AGroupWithoutAResponseDoesNotDelayOthers) {
    const auto images = writeImages(250);
    const Gate gate;
    service().enqueue(Script().readRequest().waitFor(gate).close());
    serveRecords();
    std::vector<std::string> arguments{"staple", "--json", "--retry-delay", "0"};
    for (const Artefact& image : images) arguments.push_back(image.path);
    RunningProcess run(batchCommand(arguments));
    // Another group gets its response before the first, and its artefacts are done.
    ASSERT_TRUE(gate.waitUntilReached());
    EXPECT_TRUE(run.waitForLine("{\"path\"").has_value());
    gate.open();
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(countStapled(images), 250U);
}

TEST_F(BatchService, TheDeadlineEndsWaitingAndUnbegunArtefacts) {
    const auto images = writeImages(30);
    for (int i = 0; i < 4; ++i) service().enqueue(Script().readRequest().waitFor(Gate()));
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--deadline", "0.5"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(30), Each(Reports("timedOut", 68))));
    EXPECT_EQ(countStapled(images), 0U);
}

TEST_F(BatchService, ADeadlineOfZeroBeginsNothing) {
    const auto images = writeImages(3);
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--deadline", "0"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(3), Each(Reports("timedOut", 68))));
    for (const Artefact& image : images) EXPECT_EQ(readFile(image.path), image.contents);
}

// Tickets that are not issued yet.

TEST_F(BatchService, WaitsUntilTheTicketIsIssued) {
    const auto images = writeImages(2);
    auto issuedLater = std::exchange(records[recordNameOf(images[1])], std::nullopt);
    service().setHandler([&, lookups = 0](const RecordedRequest& request) mutable {
        if (++lookups == 3) records[recordNameOf(images[1])] = issuedLater;
        return answer(bodyFor(namesIn(request)));
    });
    const ProcessResult result = batch({"staple", "--json", "--wait", "60", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(2), Each(Reports("worked", 0))));
    EXPECT_EQ(countStapled(images), 2U);
    // An issued ticket is not requested again.
    std::size_t asked = 0;
    for (const RecordedRequest& request : service().requests()) {
        const auto names = namesIn(request);
        asked += static_cast<std::size_t>(std::count(names.begin(), names.end(), recordNameOf(images[0])));
    }
    EXPECT_EQ(asked, 1U);
}

TEST_F(BatchService, WaitsNoLongerThanTheGivenTime) {
    const auto images = writeImages(1);
    records[recordNameOf(images[0])] = std::nullopt;
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--wait", "0.3", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("notIssued", 65)));
    EXPECT_THAT(service().requests(), SizeIs(testing::Ge(2U)));
}

TEST_F(BatchService, DoesNotWaitForARevokedRecord) {
    const auto images = writeImages(1);
    records[recordNameOf(images[0])] = sealed(images[0].payload().revoked());
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", "--wait", "60"}, images);
    EXPECT_EQ(result.exitStatus, 77);
    EXPECT_THAT(service().requests(), SizeIs(1));
}

}  // namespace
}  // namespace pinwell::test
