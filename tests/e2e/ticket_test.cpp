// Runs of pinwell-ticket: tickets into files, from files to artefacts, and back.
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <filesystem>

#include "batch_fixture.h"
#include "schema_validation.h"
#include "support/package_builder.h"
#include "values/json.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::AnyOf;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

class TicketTool : public BatchTest {
  protected:
    static std::string fileNameOf(const Artefact& artefact) {
        std::string name = recordNameOf(artefact) + ".ticket";
        std::replace(name.begin(), name.end(), '/', '-');
        return name;
    }
    /// One of each kind.
    std::vector<Artefact> writeEveryKind() {
        std::vector<Artefact> artefacts;
        for (const Artefact& one : {signedImage(), unsignedImage(), signedPackage(), signedBundle()}) {
            artefacts.push_back(writeArtefact(one, directory / ("builds/" + one.name)));
            records[recordNameOf(artefacts.back())] = ticketOf(artefacts.back());
        }
        return artefacts;
    }
    /// The command followed by the paths.
    ProcessResult tool(std::vector<std::string> arguments, const std::vector<Artefact>& artefacts) const {
        for (const Artefact& one : artefacts) arguments.push_back(one.path);
        return ticketTool(std::move(arguments));
    }
    /// A directory as fetch leaves it.
    void keepTickets(const std::vector<Artefact>& artefacts) const {
        for (const Artefact& one : artefacts)
            writeFile(tickets + "/" + fileNameOf(one), *records.at(recordNameOf(one)));
    }
    static void expectValid(const ProcessResult& result) { BatchTest::expectValid(result, TICKET_SCHEMA); }
    void expectIndexValid() const { expectConforms(readFile(tickets + "/index.json"), TICKET_INDEX_SCHEMA); }
    Value indexEntries() const {
        const auto index = values::parseJSON(base::asBytes(readFile(tickets + "/index.json")));
        return index ? (*index)["tickets"] : Value();
    }

    const std::string tickets = directory / "builds/tickets";
};

// Hashes.

TEST_F(TicketTool, HashPrintsRecordNamesWithoutANetwork) {
    const auto artefacts = writeEveryKind();
    serveRecords();
    const ProcessResult result = tool({"hash"}, artefacts);
    std::vector<std::string> lines;
    for (const Artefact& one : artefacts) lines.push_back(recordNameOf(one) + "  " + one.path);
    EXPECT_THAT(result, Ended(0, testing::ElementsAreArray(lines)));
    EXPECT_THAT(service().connections(), IsEmpty());
}

TEST_F(TicketTool, HashReportsArtefactsWithoutAHash) {
    const auto images = writeImages(1);
    BundleBuilder().executable(base::toData("#!/bin/sh\n")).write(directory / "builds/Unsigned.app");
    writeFile(directory / "builds/plain.txt", "text");
    const ProcessResult result =
        ticketTool({"hash", "--json", images[0].path, directory / "builds/Unsigned.app",
                    directory / "builds/missing", directory / "builds/plain.txt"});
    EXPECT_EQ(result.exitStatus, 66);
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("worked", 0), Reports("notSigned", 66),
                                               Reports("notReadable", 66), Reports("unsupported", 66)));
    expectValid(result);
    const ProcessResult plain = ticketTool({"hash", images[0].path, directory / "builds/missing"});
    EXPECT_EQ(plain.exitStatus, 66);
    EXPECT_THAT(plain.outputLines(), ElementsAre(StartsWith(recordNameOf(images[0]))));
    EXPECT_THAT(linesOf(plain.errors), ElementsAre(HasSubstr("missing")));
}

// Fetching.

TEST_F(TicketTool, FetchKeepsTicketsByRecordNameAndByPath) {
    const auto artefacts = writeEveryKind();
    serveRecords();
    const ProcessResult result = ticketTool({"fetch", "--json", "--out", tickets, recordNameOf(artefacts[0]),
                                             artefacts[1].path, artefacts[2].path, artefacts[3].path});
    EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(4), Each(Reports("worked", 0))));
    expectValid(result);
    expectIndexValid();
    EXPECT_THAT(*indexEntries().array(), SizeIs(4));
    for (const Artefact& one : artefacts) {
        EXPECT_EQ(base::toData(readFile(tickets + "/" + fileNameOf(one))), issuedFor(one));
        EXPECT_EQ(readFile(one.file()), one.contents);
    }
    EXPECT_THAT(groupSizes(), ElementsAre(4U));
}

TEST_F(TicketTool, FetchReadsItsNamesFromAList) {
    const auto images = writeImages(3);
    serveRecords();
    const std::string list = directory / "builds/names";
    writeFile(list, recordNameOf(images[0]) + "\n\n" + recordNameOf(images[1]));
    EXPECT_EQ(ticketTool({"fetch", "-q", "-o", tickets, "--from", list}).exitStatus, 0);
    writeFile(list, images[2].path + std::string(1, '\0') + recordNameOf(images[2]) + std::string(1, '\0'));
    const ProcessResult result = ticketTool({"fetch", "--json", "-o", tickets, "-0", "--from", list});
    // The same record: fetched once.
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("worked", 0)));
    EXPECT_THAT(*indexEntries().array(), SizeIs(3));
}

TEST_F(TicketTool, FetchKeepsATicketThatRevokesAndEndsWith77) {
    const auto images = writeImages(2);
    records[recordNameOf(images[1])] = sealed(images[1].payload().revoked());
    serveRecords();
    const ProcessResult result = tool({"fetch", "--json", "--out", tickets}, images);
    EXPECT_EQ(result.exitStatus, 77);
    expectValid(result);
    expectIndexValid();
    std::size_t revoked = 0;
    const Value entries = indexEntries();
    for (const Value& entry : *entries.array()) revoked += entry["revoked"].boolValue() ? 1U : 0U;
    EXPECT_EQ(revoked, 1U);
    EXPECT_EQ(base::toData(readFile(tickets + "/" + fileNameOf(images[1]))),
              records.at(recordNameOf(images[1])));
}

TEST_F(TicketTool, FetchTakesTheEntryOfATicketThatIsRevokedLater) {
    const auto images = writeImages(1);
    serveRecords();
    ASSERT_EQ(tool({"fetch", "-q", "--out", tickets}, images).exitStatus, 0);
    records[recordNameOf(images[0])] = sealed(images[0].payload().revoked());
    EXPECT_EQ(tool({"fetch", "-q", "--out", tickets}, images).exitStatus, 77);
    ASSERT_THAT(*indexEntries().array(), SizeIs(1));
    EXPECT_TRUE(indexEntries()[0]["revoked"].boolValue());
}

TEST_F(TicketTool, FetchSaysWhyThereIsNoTicket) {
    const auto images = writeImages(3);
    records[recordNameOf(images[0])] = std::nullopt;
    records[recordNameOf(images[1])] = ticketForOthers();
    serveRecords();
    const ProcessResult result = ticketTool({"fetch", "--json", "--out", tickets, recordNameOf(images[0]),
                                             recordNameOf(images[1]), images[2].path, "missing.dmg"});
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(reportsOf(result),
                testing::UnorderedElementsAre(Reports("notIssued", 65), Reports("notAcceptable", 65),
                                              Reports("worked", 0), Reports("notReadable", 66)));
    expectValid(result);
    EXPECT_THAT(*indexEntries().array(), SizeIs(1));
}

TEST_F(TicketTool, FetchDistinguishesAnUntrustedServerFromAnUnreachableOne) {
    const auto images = writeImages(2);
    service().setHandler([](const RecordedRequest&) { return Response{.status = 503}; });
    const ProcessResult busy =
        tool({"fetch", "--json", "--out", tickets, "--retries", "2", "--retry-delay", "0"}, images);
    EXPECT_EQ(busy.exitStatus, 68);
    EXPECT_THAT(reportsOf(busy), AllOf(SizeIs(2), Each(Reports("unreachable", 68))));
    EXPECT_THAT(service().requests(), SizeIs(3));
    startService(identityOf(ServerChain("somebody.example").issue()));
    const ProcessResult strange = tool({"fetch", "--json", "--out", tickets, "--retry-delay", "0"}, images);
    EXPECT_EQ(strange.exitStatus, 68);
    EXPECT_THAT(reportsOf(strange), AllOf(SizeIs(2), Each(Reports("untrusted", 68))));
    EXPECT_THAT(service().connections(), SizeIs(1));
    expectValid(busy);
    expectValid(strange);
}

TEST_F(TicketTool, FetchTriesAgainAndWaits) {
    const auto images = writeImages(2);
    auto later = std::exchange(records[recordNameOf(images[0])], std::nullopt);
    service().setHandler([&, lookups = 0](const RecordedRequest& request) mutable {
        ++lookups;
        if (lookups == 1) return Response{.status = 429, .headers = {{"Retry-After", "0"}}};
        if (lookups == 4) records[recordNameOf(images[0])] = later;
        return answer(bodyFor(namesIn(request)));
    });
    const ProcessResult result =
        tool({"fetch", "--json", "--out", tickets, "--wait", "60", "--retry-delay", "0"}, images);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    EXPECT_THAT(groupSizes(), ElementsAre(2U, 2U, 1U, 1U));
}

TEST_F(TicketTool, FetchEndsAtItsDeadline) {
    const auto images = writeImages(2);
    service().enqueue(Script().readRequest().waitFor(Gate()));
    serveRecords();
    const ProcessResult result = tool({"fetch", "--json", "--out", tickets, "--deadline", "0.3"}, images);
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(2), Each(Reports("timedOut", 68))));
    expectValid(result);
}

TEST_F(TicketTool, FetchEndsWithASignalAndKeepsItsIndex) {
    const auto images = writeImages(2);
    serveRecords();
    ASSERT_EQ(ticketTool({"fetch", "-q", "--out", tickets, images[0].path}).exitStatus, 0);
    for (const auto& [signal, status] :
         {std::pair(SIGINT, 130), std::pair(SIGTERM, 143), std::pair(SIGHUP, 129)}) {
        const Gate gate;
        service().enqueue(Script().readRequest().waitFor(gate));
        RunningProcess run(ticketCommand({"fetch", "--json", "--out", tickets, images[1].path}));
        ASSERT_TRUE(gate.waitUntilReached());
        run.sendSignal(signal);
        const ProcessResult result = run.wait();
        EXPECT_EQ(result.exitStatus, status);
        EXPECT_THAT(reportsOf(result), SizeIs(1));
        EXPECT_EQ(*reportsOf(result)[0]["cause"].string(), "interrupted");
        expectValid(result);
        EXPECT_THAT(*indexEntries().array(), SizeIs(1));
    }
}

TEST_F(TicketTool, FetchLooksEachRecordUpAloneIfGroupsGetNoResponse) {
    const auto images = writeImages(4);
    service().setHandler([this](const RecordedRequest& request) {
        auto names = namesIn(request);
        std::reverse(names.begin(), names.end());
        return answer(bodyFor(names));
    });
    EXPECT_EQ(tool({"fetch", "-q", "--out", tickets}, images).exitStatus, 0);
    EXPECT_THAT(groupSizes(), ElementsAre(4U, 1U, 1U, 1U, 1U));
    for (const Artefact& one : images)
        EXPECT_EQ(base::toData(readFile(tickets + "/" + fileNameOf(one))), issuedFor(one));
}

TEST_F(TicketTool, FetchOverwritesNoIndexThatItCannotRead) {
    const auto images = writeImages(1);
    serveRecords();
    for (const std::string contents : {"garbage", "{}", "[]", R"({"version":2,"tickets":[]})",
                                       R"({"version":1,"tickets":[{"recordName":1}]})", ""}) {
        writeFile(tickets + "/index.json", contents);
        const ProcessResult result = tool({"fetch", "--out", tickets}, images);
        EXPECT_EQ(result.exitStatus, 73) << contents;
        EXPECT_THAT(linesOf(result.errors),
                    ElementsAre(StartsWith("pinwell-ticket: the index cannot be used: ")));
        EXPECT_EQ(readFile(tickets + "/index.json"), contents);
    }
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(TicketTool, FetchNeedsADirectoryThatItCanWrite) {
    const auto images = writeImages(1);
    serveRecords();
    writeFile(directory / "builds/file", "x");
    for (const std::string& path : {directory / "builds/file", directory / "builds/no/such"}) {
        const ProcessResult result = tool({"fetch", "--out", path}, images);
        EXPECT_EQ(result.exitStatus, 73) << path;
        EXPECT_THAT(linesOf(result.errors), SizeIs(1)) << result.errors;
    }
}

TEST_F(TicketTool, FetchNeverWritesThroughALink) {
    const auto images = writeImages(1);
    serveRecords();
    writeFile(directory / "builds/precious", "precious");
    std::filesystem::create_directory(tickets);
    std::filesystem::create_symlink("../precious", tickets + "/" + fileNameOf(images[0]));
    std::filesystem::create_symlink("../precious", tickets + "/index.json.tmp");
    EXPECT_EQ(tool({"fetch", "-q", "--out", tickets}, images).exitStatus, 0);
    EXPECT_EQ(readFile(directory / "builds/precious"), "precious");
    EXPECT_EQ(base::toData(readFile(tickets + "/" + fileNameOf(images[0]))), issuedFor(images[0]));
}

// Attaching.

TEST_F(TicketTool, AttachStaplesFromADirectoryWithoutANetwork) {
    const auto artefacts = writeEveryKind();
    keepTickets(artefacts);
    serveRecords();
    const ProcessResult result = tool({"attach", "--json", "--tickets", tickets}, artefacts);
    EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(4), Each(Reports("worked", 0))));
    expectValid(result);
    EXPECT_EQ(countStapled(artefacts), 4U);
    EXPECT_THAT(service().connections(), IsEmpty());
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(TicketTool, AttachTakesOneFileForAllThatItLists) {
    const auto images = writeImages(2);
    const Data both = sealed(TicketPayloadBuilder().entry(2, images[0].hash).entry(2, images[1].hash));
    writeFile(directory / "builds/both.ticket", both);
    EXPECT_EQ(tool({"attach", "--ticket", directory / "builds/both.ticket"}, images).exitStatus, 0);
    for (const Artefact& image : images) EXPECT_TRUE(isStapled(image, both));
}

TEST_F(TicketTool, AttachJudgesEachTicket) {
    const auto images = writeImages(6);
    records[recordNameOf(images[1])] = ticketForOthers();
    records[recordNameOf(images[2])] = sealed(images[2].payload().revoked());
    Data spoilt = ticketOf(images[3]);
    spoilt.back() ^= std::byte{1};
    records[recordNameOf(images[3])] = spoilt;
    records[recordNameOf(images[4])] = Data();
    keepTickets(images);
    std::filesystem::remove(tickets + "/" + fileNameOf(images[5]));
    const ProcessResult result = tool({"attach", "--json", "--tickets", tickets}, images);
    EXPECT_EQ(result.exitStatus, 77);
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("worked", 0), Reports("notAcceptable", 65),
                                               Reports("revoked", 77), Reports("notAcceptable", 65),
                                               Reports("notAcceptable", 65), Reports("notIssued", 65)));
    EXPECT_THAT(result.output,
                AllOf(HasSubstr("The ticket is not acceptable: the ticket does not list this artefact."),
                      HasSubstr("The ticket is not acceptable: the signature does not verify."),
                      HasSubstr("The ticket is not acceptable: the container ends inside its header.")));
    expectValid(result);
    for (std::size_t i = 1; i < images.size(); ++i) EXPECT_EQ(readFile(images[i].path), images[i].contents);
}

TEST_F(TicketTool, AttachReportsUnreadableAndUnwritableArtefacts) {
    const auto images = writeImages(1);
    keepTickets(images);
    EXPECT_EQ(ticketTool({"attach", "--tickets", tickets, "missing.dmg"}).exitStatus, 66);
    EXPECT_EQ(tool({"attach", "--ticket", directory / "builds/missing.ticket"}, images).exitStatus, 66);
    EXPECT_EQ(tool({"attach", "--ticket", tickets}, images).exitStatus, 66);
    EXPECT_EQ(tool({"attach", "--tickets", directory / "builds/nowhere"}, images).exitStatus, 65);
    std::filesystem::remove(tickets + "/" + fileNameOf(images[0]));
    std::filesystem::create_directory(tickets + "/" + fileNameOf(images[0]));
    EXPECT_EQ(tool({"attach", "--tickets", tickets}, images).exitStatus, 66);
    EXPECT_EQ(readFile(images[0].path), images[0].contents);
}

TEST_F(TicketTool, AttachDoesNotWaitForATicketThatIsAPipe) {
    const auto images = writeImages(1);
    ASSERT_EQ(::mkfifo((directory / "builds/pipe.ticket").c_str(), 0600), 0);
    EXPECT_EQ(tool({"attach", "--ticket", directory / "builds/pipe.ticket"}, images).exitStatus, 66);
    std::filesystem::create_directory(tickets);
    ASSERT_EQ(::mkfifo((tickets + "/" + fileNameOf(images[0])).c_str(), 0600), 0);
    EXPECT_EQ(tool({"attach", "--tickets", tickets}, images).exitStatus, 66);
}

// Extracting.

TEST_F(TicketTool, ExtractWritesTheTicketOfEveryKind) {
    auto artefacts = writeEveryKind();
    keepTickets(artefacts);
    ASSERT_EQ(tool({"attach", "-q", "--tickets", tickets}, artefacts).exitStatus, 0);
    for (const Artefact& one : artefacts) {
        const ProcessResult result = ticketTool({"extract", "--json", one.path});
        EXPECT_EQ(result.exitStatus, 0) << result.output;
        EXPECT_THAT(reportsOf(result), ElementsAre(Reports("worked", 0)));
        EXPECT_EQ(*reportsOf(result)[0]["file"].string(), fileNameOf(one));
        expectValid(result);
        EXPECT_EQ(base::toData(readFile(directory / ("builds/" + fileNameOf(one)))), issuedFor(one));
    }
}

TEST_F(TicketTool, ExtractNeverOverwrites) {
    const auto images = writeImages(1);
    keepTickets(images);
    ASSERT_EQ(tool({"attach", "-q", "--tickets", tickets}, images).exitStatus, 0);
    const std::string output = directory / "builds/mine";
    writeFile(output, "mine");
    const ProcessResult result = tool({"extract", "--json", "-o", output}, images);
    EXPECT_EQ(result.exitStatus, 73);
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("notWritable", 73)));
    expectValid(result);
    EXPECT_EQ(readFile(output), "mine");
    // A link that leads nowhere is there as well.
    std::filesystem::create_symlink("nowhere", directory / "builds/link");
    EXPECT_EQ(tool({"extract", "-o", directory / "builds/link"}, images).exitStatus, 73);
    EXPECT_FALSE(std::filesystem::exists(directory / "builds/nowhere"));
    EXPECT_EQ(tool({"extract", "-o", directory / "builds/no/such"}, images).exitStatus, 73);
    EXPECT_EQ(tool({"extract", "-o", directory / "builds"}, images).exitStatus, 73);
}

TEST_F(TicketTool, ExtractReportsAnArtefactWithoutATicket) {
    const auto images = writeImages(1);
    EXPECT_THAT(reportsOf(tool({"extract", "--json"}, images)), ElementsAre(Reports("notStapled", 65)));
    EXPECT_EQ(tool({"extract"}, images).exitStatus, 65);
    EXPECT_EQ(ticketTool({"extract", "missing.dmg"}).exitStatus, 66);
    EXPECT_EQ(ticketTool({"extract", "/dev/null"}).exitStatus, 66);
    EXPECT_THAT(namesBelow(directory / "builds/many"), ElementsAre("Image0.dmg"));
}

// Removing.

TEST_F(TicketTool, RemoveTakesTheTicketOfEveryKind) {
    const auto artefacts = writeEveryKind();
    keepTickets(artefacts);
    ASSERT_EQ(tool({"attach", "-q", "--tickets", tickets}, artefacts).exitStatus, 0);
    const ProcessResult result = tool({"remove", "--json"}, artefacts);
    EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(4), Each(Reports("worked", 0))));
    expectValid(result);
    for (const Artefact& one : artefacts) {
        const bool stays = one.name == "Unsigned.dmg";
        EXPECT_EQ(ticketTool({"extract", "-q", "-o", directory / ("builds/" + one.name + ".out"), one.path})
                      .exitStatus,
                  stays ? 0 : 65)
            << one.name;
    }
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(TicketTool, APackageIsAsBeforeItsFirstStapleAfterARemove) {
    const Artefact package = writeArtefact(signedPackage(), directory / "builds/Signed.pkg");
    records[recordNameOf(package)] = ticketOf(package);
    keepTickets({package});
    for (int round = 0; round < 2; ++round) {
        ASSERT_EQ(tool({"attach", "-q", "--tickets", tickets}, {package}).exitStatus, 0) << round;
        ASSERT_EQ(readFile(package.path), package.stapledWith(issuedFor(package))) << round;
        EXPECT_EQ(tool({"remove"}, {package}).exitStatus, 0) << round;
        EXPECT_EQ(readFile(package.path), package.contents) << round;
    }
}

TEST_F(TicketTool, TrailersOfOthersOutliveARemoveAndKeepATicketOut) {
    const Artefact package = signedPackage();
    const std::string ticket = base::toString(ticketOf(package));
    const auto bare = [&] { return PackageBuilder().archive(base::toData(package.contents)).terminator(); };
    writeFile(directory / "builds/Signed.pkg", bare().unknown("others").ticket(ticket).build());
    const ProcessResult removed = ticketTool({"remove", "Signed.pkg"});
    EXPECT_EQ(removed.exitStatus, 0);
    EXPECT_THAT(removed.output,
                HasSubstr("Trailers of other types stay: pinwell would write another ticket over "
                          "its first bytes."));
    const std::string left = bare().unknown("others").build();
    EXPECT_EQ(readFile(directory / "builds/Signed.pkg"), left);

    writeFile(directory / "ticket", ticket);
    serveTicket(base::toData(ticket));
    for (const std::string& contents : {left, bare().build()}) {
        writeFile(directory / "builds/Signed.pkg", contents);
        const ProcessResult attached = ticketTool({"attach", "--ticket", directory / "ticket", "Signed.pkg"});
        EXPECT_EQ(attached.exitStatus, 73);
        EXPECT_THAT(attached.output, HasSubstr("has trailers and no ticket among them"));
        EXPECT_THAT(reportsOf(batch({"staple", "--json", "Signed.pkg"})),
                    ElementsAre(Reports("notWritable", 73)));
        EXPECT_EQ(readFile(directory / "builds/Signed.pkg"), contents);
    }
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(TicketTool, RemoveReportsThatATicketStaysIfItIsTheWholeSignature) {
    const auto images = writeImages(1);
    keepTickets(images);
    ASSERT_EQ(tool({"attach", "-q", "--tickets", tickets}, images).exitStatus, 0);
    const ProcessResult result = tool({"remove"}, images);
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_THAT(result.output, HasSubstr("is all that its signature holds: it stays in place."));
}

TEST_F(TicketTool, RemoveEndsWith65WhereNoTicketIs) {
    const auto artefacts = writeEveryKind();
    std::filesystem::remove(artefacts[3].file());
    const ProcessResult result = tool({"remove", "--json"}, artefacts);
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(4), Each(Reports("notStapled", 65))));
    expectValid(result);
    EXPECT_EQ(ticketTool({"remove", "missing.dmg"}).exitStatus, 66);
    for (std::size_t i = 0; i < 3; ++i) EXPECT_EQ(readFile(artefacts[i].file()), artefacts[i].contents);
}

TEST_F(TicketTool, AttachAndRemoveLeaveSpecialFilesAlone) {
    ASSERT_EQ(::mkfifo((directory / "builds/pipe.dmg").c_str(), 0600), 0);
    std::filesystem::create_symlink("pipe.dmg", directory / "builds/link.dmg");
    std::filesystem::create_directory(tickets);
    for (const char* name : {"pipe.dmg", "link.dmg", "/dev/null", "/dev/full", "/", "."}) {
        EXPECT_EQ(ticketTool({"attach", "--tickets", tickets, name}).exitStatus, 66) << name;
        EXPECT_EQ(ticketTool({"remove", name}).exitStatus, 66) << name;
        EXPECT_EQ(ticketTool({"hash", name}).exitStatus, 66) << name;
    }
}

// Without a network.

TEST_F(TicketTool, NeedsNoNetworkInterface) {
    const auto artefacts = writeEveryKind();
    keepTickets(artefacts);
    const auto isolated = [&](std::vector<std::string> arguments) {
        Command made = ticketCommand({});
        made.executable = "/usr/bin/unshare";
        made.arguments = {"--user", "--map-root-user", "--net", PINWELL_TICKET_PROGRAM};
        made.arguments.insert(made.arguments.end(), arguments.begin(), arguments.end());
        return runProcess(made);
    };
    if (runProcess({.executable = "/usr/bin/unshare",
                    .arguments = {"--user", "--map-root-user", "--net", "/bin/true"}})
            .exitStatus != 0)
        GTEST_SKIP() << "no network namespace may be made here";
    std::vector<std::string> paths = pathsOf(artefacts);
    const auto with = [&](std::vector<std::string> arguments) {
        arguments.insert(arguments.end(), paths.begin(), paths.end());
        return isolated(std::move(arguments));
    };
    EXPECT_EQ(with({"hash"}).exitStatus, 0);
    const ProcessResult attached = with({"attach", "--tickets", tickets});
    EXPECT_EQ(attached.exitStatus, 0) << attached.output << attached.errors;
    EXPECT_EQ(countStapled(artefacts), 4U);
    EXPECT_EQ(isolated({"extract", "-o", directory / "builds/out", paths[0]}).exitStatus, 0);
    EXPECT_EQ(with({"remove"}).exitStatus, 0);
    // Only this command sends a request.
    EXPECT_EQ(isolated({"fetch", "--retries", "0", "--out", tickets, paths[0]}).exitStatus, 68);
}

// Usage.

TEST_F(TicketTool, WrongUsageEndsWith64AndOneLine) {
    writeFile(directory / "builds/empty", "\n\n");
    expectWrongUsage(PINWELL_TICKET_PROGRAM, {{},
                                              {"attch", "x"},
                                              {"hash"},
                                              {"attach", "x"},
                                              {"attach", "--tickets", "d", "--ticket", "f", "x"},
                                              {"attach", "--tickets", "", "x"},
                                              {"attach", "--tickets", "d", "--tickets", "e", "x"},
                                              {"attach", "--tickets", "d"},
                                              {"extract"},
                                              {"extract", "x", "y"},
                                              {"remove"},
                                              {"fetch", "--out", tickets},
                                              {"fetch", recordNameOf(signedImage())},
                                              {"fetch", "--out", tickets, "--from", "empty"},
                                              {"fetch", "--out", tickets, "--retries", "x", "n"},
                                              {"fetch", "--out", tickets, "--deadline", "-1", "n"},
                                              {"hash", "--out", tickets, "x"},
                                              {"remove", "-Z", "x"}});
}

TEST_F(TicketTool, AnOutputThatIsFullIsAnErrorAndOneThatIsClosedIsNone) {
    const auto images = writeImages(1);
    for (const auto& [output, status] :
         {std::pair(Output::full, 74), std::pair(Output::closed, 0), std::pair(Output::brokenPipe, 0)}) {
        Command made = ticketCommand({"hash", images[0].path});
        made.output = output;
        EXPECT_EQ(runProcess(made).exitStatus, status);
    }
}

TEST_F(TicketTool, AMissingTemporaryDirectoryIsReported) {
    const auto images = writeImages(1);
    environment["TMPDIR"] = directory / "nowhere";
    for (const char* command : {"attach", "remove"}) {
        std::vector<std::string> arguments{command, images[0].path};
        if (std::string_view(command) == "attach")
            arguments.insert(arguments.begin() + 1, {"--tickets", tickets});
        const ProcessResult result = ticketTool(arguments);
        EXPECT_EQ(result.exitStatus, 73);
        EXPECT_THAT(linesOf(result.errors),
                    ElementsAre(StartsWith("pinwell-ticket: no temporary directory")));
    }
    EXPECT_EQ(tool({"hash"}, images).exitStatus, 0);
}

TEST_F(TicketTool, OddNamesArePrintedInOneLine) {
    const Artefact image =
        writeArtefact(unsignedImage(base::toData("odd")), directory / "builds/many/odd\n\x1b[31mname.dmg");
    const ProcessResult result = ticketTool({"hash", image.path});
    EXPECT_THAT(result.outputLines(),
                ElementsAre(AllOf(HasSubstr("odd\\n"), testing::Not(HasSubstr("\x1b")))));
}

}  // namespace
}  // namespace pinwell::test
