// A batch from its list to its last report, with fakes for the network and the signatures.
#include "batch/coordinator.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <filesystem>
#include <map>

#include "base/text.h"
#include "batch/selection.h"
#include "retrieval/ticket_fetch.h"
#include "src/DownloadDelegate.h"
#include "support/answering_sessions.h"
#include "support/hash_by_executable.h"
#include "support/test_platform.h"

namespace pinwell::test {
namespace {

using batch::Coordinator;
using batch::Report;
using batch::Seconds;
using batch::Settings;
using retrieval::Cause;
using testing::AllOf;
using testing::Each;
using testing::ElementsAre;
using testing::Field;
using testing::IsEmpty;
using testing::SizeIs;
using testing::UnorderedElementsAreArray;

using Names = std::vector<std::string>;
using Reply = AnsweringSessions::Reply;

constexpr Seconds kFarTooLong{600};

Reply ticketsFor(const Names& names) {
    std::string records;
    for (const std::string& name : names) {
        const auto hash = retrieval::hashInRecordName(name);
        records += (records.empty() ? "" : ",") + (R"({"recordName":")" + name) +
                   R"(","fields":{"signedTicket":{"value":")" + base::encodeBase64(unsignedTicket({*hash})) +
                   R"("}}})";
    }
    return {.body = R"({"records":[)" + records + "]}"};
}

Reply ticketsForAll(const https::Request& request) {
    return ticketsFor(AnsweringSessions::namesIn(request));
}

testing::Matcher<const Report&> Ended(Cause cause, int exitStatus, unsigned attempts) {
    return AllOf(Field("cause", &Report::cause, cause), Field("exit status", &Report::exitStatus, exitStatus),
                 Field("attempts", &Report::attempts, attempts));
}

/// Bundles that the service has a ticket for, worked on by one thread: the fakes are not for more.
class Coordination : public testing::Test {
  protected:
    Coordination() {
        std::filesystem::create_directory(platform.directory / "tmp");
        settings.operation = kOperationStaple;
        settings.retry.firstDelay = Seconds(0);
        std::array<int, 2> ends{};
        if (::pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) != 0)
            throw std::system_error(errno, std::generic_category(), "pipe2");
        signals = base::FileDescriptor(ends[0]);
        signalsEnd = base::FileDescriptor(ends[1]);
    }

    void sendSignal(int number) const {
        signalfd_siginfo info{};
        info.ssi_signo = static_cast<std::uint32_t>(number);
        ASSERT_EQ(::write(signalsEnd.get(), &info, sizeof info), static_cast<ssize_t>(sizeof info));
    }
    std::string pathOf(std::size_t number) const {
        return platform.directory / ("App" + std::to_string(number) + ".app");
    }
    static std::string hashTextOf(std::size_t number) { return "bundle " + std::to_string(number); }
    Names writeBundles(std::size_t count) const {
        Names paths;
        for (std::size_t i = 0; i < count; ++i) {
            paths.push_back(pathOf(i));
            writeBundle(paths.back(), hashTextOf(i));
        }
        return paths;
    }
    static base::Data hashOf(std::size_t number) {
        std::string hash = hashTextOf(number);
        hash.resize(kBundleHashLength, '.');
        return base::toData(hash);
    }
    bool carriesItsTicket(std::size_t number) const {
        return readFile(pathOf(number) + "/Contents/CodeResources") ==
               base::toString(unsignedTicket({hashOf(number)}));
    }

    /// Fills `reports`, in the order of their ends. Returns the signal that ended it.
    std::optional<int> run(const Names& paths) {
        auto list = companion::PathList::open(paths, std::nullopt, false);
        Coordinator coordinator(settings, platformWith(platform.servicesWith(codeSigning), sessions), *list,
                                signals,
                                {.isWanted = isWanted,
                                 .ended =
                                     [this](const Report& report, const std::string& filesState) {
                                         reports.push_back(report);
                                         filesStates[report.path] = filesState;
                                     },
                                 .isDoneBefore = isDoneBefore,
                                 .wasDoneBefore = [this] { ++doneBefore; },
                                 .turned = [](std::size_t) {}});
        return coordinator.run();
    }

    TestPlatform platform;
    HashByExecutable codeSigning;
    AnsweringSessions sessions{&ticketsForAll};
    Settings settings;
    base::FileDescriptor signals;
    base::FileDescriptor signalsEnd;
    std::function<bool(const std::string&)> isWanted = [](const std::string&) { return true; };
    std::function<bool(const std::string&, const retrieval::ArtefactRun&)> isDoneBefore =
        [](const std::string&, const retrieval::ArtefactRun&) { return false; };

    std::vector<Report> reports;
    std::map<std::string, std::string> filesStates;
    std::size_t doneBefore = 0;
};

TEST_F(Coordination, ReportsEachArtefactOnceWithItsOwnTicket) {
    const Names paths = writeBundles(12);
    EXPECT_EQ(run(paths), std::nullopt);
    EXPECT_THAT(reports, AllOf(SizeIs(12), Each(Ended(Cause::worked, 0, 1))));
    Names reported;
    for (const Report& report : reports) reported.push_back(report.path);
    EXPECT_THAT(reported, UnorderedElementsAreArray(paths));
    for (std::size_t i = 0; i < paths.size(); ++i) EXPECT_TRUE(carriesItsTicket(i)) << i;
}

TEST_F(Coordination, AGroupInAnotherOrderGivesEachItsOwnTicket) {
    sessions.answerBy([](const https::Request& request) {
        Names names = AnsweringSessions::namesIn(request);
        std::reverse(names.begin(), names.end());
        return ticketsFor(names);
    });
    run(writeBundles(7));
    EXPECT_THAT(reports, AllOf(SizeIs(7), Each(Ended(Cause::worked, 0, 1))));
    for (std::size_t i = 0; i < 7; ++i) EXPECT_TRUE(carriesItsTicket(i)) << i;
}

TEST_F(Coordination, AnUnexpectedFailureDoesNotEndTheOthers) {
    Names paths = writeBundles(3);
    writeBundle(paths[1], HashByExecutable::kRaises);
    run(paths);
    EXPECT_THAT(reports, SizeIs(3));
    for (const Report& report : reports)
        EXPECT_THAT(report,
                    report.path == paths[1] ? Ended(Cause::notReadable, 66, 1) : Ended(Cause::worked, 0, 1));
}

TEST_F(Coordination, AnArtefactChangedDuringTheLookupIsLookedUpAgain) {
    const Names paths = writeBundles(1);
    std::size_t lookups = 0;
    sessions.answerBy([&](const https::Request& request) {
        if (++lookups == 1) writeBundle(paths[0], "built anew");
        return ticketsForAll(request);
    });
    run(paths);
    EXPECT_THAT(reports, ElementsAre(Ended(Cause::worked, 0, 2)));
    EXPECT_EQ(readFile(paths[0] + "/Contents/CodeResources"),
              base::toString(unsignedTicket({base::toData("built anew..........")})));
}

TEST_F(Coordination, TellsTheStateOfTheFilesAsTheRunLeftThem) {
    const Names paths = writeBundles(1);
    run(paths);
    const std::string left = filesStates.at(paths[0]);
    EXPECT_THAT(left, testing::MatchesRegex("[0-9,.]+\\+[0-9,.]+"));
    settings.operation = kOperationValidate;
    run(paths);
    EXPECT_EQ(filesStates.at(paths[0]), left);
}

// Artefacts that are left out.

TEST_F(Coordination, BeginsOnlyWantedArtefacts) {
    Names paths = writeBundles(2);
    paths.push_back(paths[0]);
    batch::Selection selection(1, 1);
    isWanted = [&](const std::string& path) {
        return selection.choose(path) == batch::Selection::Choice::wanted;
    };
    run(paths);
    EXPECT_THAT(reports, AllOf(SizeIs(2), Each(Ended(Cause::worked, 0, 1))));
    isWanted = [](const std::string&) { return false; };
    reports.clear();
    run(paths);
    EXPECT_THAT(reports, IsEmpty());
}

TEST_F(Coordination, LooksNothingUpForDoneArtefacts) {
    const Names paths = writeBundles(3);
    isDoneBefore = [&](const std::string& path, const retrieval::ArtefactRun& artefact) {
        EXPECT_THAT(artefact.recordName(), testing::StartsWith("2/2/"));
        return path != paths[2];
    };
    run(paths);
    EXPECT_EQ(doneBefore, 2U);
    EXPECT_THAT(reports, ElementsAre(Field(&Report::path, paths[2])));
    EXPECT_THAT(sessions.lookups(), ElementsAre(SizeIs(1)));
}

// Tries.

TEST_F(Coordination, RetriesAtTheTimeThatTheServiceGives) {
    settings.retry.firstDelay = kFarTooLong;
    std::size_t lookups = 0;
    sessions.answerBy([&](const https::Request& request) {
        return ++lookups == 1 ? Reply{.status = 503, .headers = {{"Retry-After", "0"}}}
                              : ticketsForAll(request);
    });
    run(writeBundles(1));
    EXPECT_THAT(reports, ElementsAre(Ended(Cause::worked, 0, 2)));
}

TEST_F(Coordination, GivesUpAfterTheLastTry) {
    settings.retry.retries = 3;
    sessions.answerBy([](const https::Request&) { return Reply{.status = 503}; });
    run(writeBundles(2));
    EXPECT_THAT(reports, AllOf(SizeIs(2), Each(Ended(Cause::unreachable, 68, 4))));
}

TEST_F(Coordination, DoesNotRetryAnUntrustedServer) {
    settings.retry.firstDelay = kFarTooLong;
    sessions.answerBy([](const https::Request&) { return Reply{.isByAStranger = true}; });
    run(writeBundles(2));
    EXPECT_THAT(reports, AllOf(SizeIs(2), Each(Ended(Cause::untrusted, 68, 1))));
}

TEST_F(Coordination, LooksUpAgainWhileNoTicketIsIssued) {
    settings.wait = kFarTooLong;
    std::size_t lookups = 0;
    sessions.answerBy([&](const https::Request& request) {
        if (++lookups > 2) return ticketsForAll(request);
        const std::string name = AnsweringSessions::namesIn(request).at(0);
        return Reply{.body = R"({"records":[{"recordName":")" + name + R"(","reason":"not yet"}]})"};
    });
    run(writeBundles(1));
    EXPECT_THAT(reports, ElementsAre(Ended(Cause::worked, 0, 3)));
}

// Ends before their time.

TEST_F(Coordination, TheDeadlineEndsWaitingAndUnbegunArtefacts) {
    settings.deadline = Seconds(0.05);
    sessions.answerBy([](const https::Request&) { return Reply{.neverComes = true}; });
    // Only the number of names counts: the batch begins no more than this.
    Names paths = writeBundles(2);
    paths.resize(2 + batch::kMostInWork, platform.directory / "missing.app");
    run(writeBundles(2));
    EXPECT_THAT(reports, AllOf(SizeIs(2), Each(Ended(Cause::timedOut, 68, 1))));
    reports.clear();
    settings.deadline = Seconds(0);
    run(paths);
    EXPECT_THAT(reports, AllOf(SizeIs(paths.size()), Each(Ended(Cause::timedOut, 68, 0))));
}

TEST_F(Coordination, TheTimeOfOneArtefactEndsThatOne) {
    settings.timeout = Seconds(0.05);
    settings.retry.firstDelay = kFarTooLong;
    sessions.answerBy([](const https::Request&) { return Reply{.status = 503}; });
    run(writeBundles(2));
    EXPECT_THAT(reports, AllOf(SizeIs(2), Each(Ended(Cause::timedOut, 68, 1))));
}

TEST_F(Coordination, ASignalEndsArtefactsThatWaitForTheService) {
    sessions.answerBy([this](const https::Request&) {
        sendSignal(SIGTERM);
        return Reply{.neverComes = true};
    });
    EXPECT_EQ(run(writeBundles(3)), SIGTERM);
    EXPECT_THAT(reports, AllOf(SizeIs(3), Each(AllOf(Field(&Report::cause, Cause::interrupted),
                                                     Field(&Report::exitStatus, 143)))));
    for (std::size_t i = 0; i < 3; ++i)
        EXPECT_FALSE(std::filesystem::exists(pathOf(i) + "/Contents/CodeResources"));
}

TEST_F(Coordination, ASignalThatCameFirstBeginsNothing) {
    sendSignal(SIGINT);
    EXPECT_EQ(run(writeBundles(3)), SIGINT);
    EXPECT_THAT(reports, AllOf(SizeIs(3), Each(Ended(Cause::interrupted, 130, 0))));
    EXPECT_THAT(sessions.requests(), IsEmpty());
}

}  // namespace
}  // namespace pinwell::test
