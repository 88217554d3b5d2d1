// Interrupted and resumed runs of pinwell-batch: journals, signals, two runs at once.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <set>

#include "base/handle.h"
#include "batch_fixture.h"
#include "support/volume.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

class BatchResume : public BatchTest {
  protected:
    std::string journal = directory / "builds/staple.journal";

    std::vector<std::string> resuming(const std::vector<Artefact>& artefacts,
                                      const std::string& operation = "staple") const {
        std::vector<std::string> arguments{operation, "--json", "--retry-delay", "0", "--resume", journal};
        for (const Artefact& one : artefacts) arguments.push_back(one.path);
        return arguments;
    }
    ProcessResult resume(const std::vector<Artefact>& artefacts, const std::string& operation = "staple") {
        return batch(resuming(artefacts, operation));
    }
    /// The names in lookups since the last call.
    std::vector<std::string> askedFor() {
        std::vector<std::string> names;
        const auto requests = service().requests();
        for (; seen_ < requests.size(); ++seen_)
            for (std::string& name : namesIn(requests[seen_])) names.push_back(std::move(name));
        return names;
    }
    /// Responds to lookups of that record only.
    void serveOnly(const std::string& name) {
        service().setHandler([this, name](const RecordedRequest& request) {
            return namesIn(request) == std::vector{name} ? answer(bodyFor({name}))
                   : namesIn(request).size() == 1        ? Response{.status = 503}
                                                         : answer(R"({"records":[]})");
        });
    }
    /// No file of this run can exceed 4 KiB. Tickets are smaller.
    Command withShortFiles(const std::vector<std::string>& arguments) const {
        Command limited = batchCommand({"-c", "ulimit -f 4; exec \"$0\" \"$@\"", PINWELL_BATCH_PROGRAM});
        limited.executable = "/bin/bash";
        limited.arguments.insert(limited.arguments.end(), arguments.begin(), arguments.end());
        return limited;
    }
    /// Until there is no room left on its volume.
    static void fill(const std::string& path) {
        const base::FileDescriptor file(::open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
        const std::string block(4096, 'b');
        while (::write(file.get(), block.data(), block.size()) > 0) continue;
        ASSERT_EQ(errno, ENOSPC);
    }
    static std::string wholeLinesOf(const std::string& output) {
        return output.substr(0, output.rfind('\n') + 1);
    }
    std::uint64_t resumedOf(const ProcessResult& result) const {
        return summaryOf(result)["resumed"].unsignedIntegerValue();
    }
    /// Changes a byte in a file, but not its length and time of modification.
    static void changeUnseen(const std::string& path, std::size_t offset) {
        const auto time = std::filesystem::last_write_time(path);
        std::string contents = readFile(path);
        contents.at(offset) = static_cast<char>(contents.at(offset) ^ 1);
        writeFile(path, contents);
        std::filesystem::last_write_time(path, time);
    }
    /// Bundles, whose ticket is a separate file: no other file of them is written, at whatever time the
    /// process dies.
    std::vector<Artefact> writeBundles(std::size_t count) {
        std::vector<Artefact> bundles;
        for (std::size_t i = 0; i < count; ++i) {
            Artefact one = signedBundle();
            const Data codeDirectory = CodeDirectoryBuilder()
                                           .covers(2, emptyRequirements())
                                           .identifier("com.example.n" + std::to_string(i))
                                           .build();
            one.hash = codeHashOf(2, codeDirectory);
            one.executable =
                ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(codeDirectory).build()).build();
            bundles.push_back(
                writeArtefact(one, directory / ("builds/many/Bundle" + std::to_string(i) + ".app")));
            records[recordNameOf(bundles.back())] = ticketOf(bundles.back());
        }
        return bundles;
    }

  private:
    std::size_t seen_ = 0;
};

// Completed artefacts, and artefacts that are done again.

TEST_F(BatchResume, ADoneArtefactIsNotDoneAgain) {
    const auto images = writeImages(5);
    serveRecords();
    EXPECT_EQ(resume(images).exitStatus, 0);
    EXPECT_THAT(askedFor(), SizeIs(5));
    const ProcessResult again = resume(images);
    EXPECT_EQ(again.exitStatus, 0);
    EXPECT_THAT(reportsOf(again), IsEmpty());
    EXPECT_EQ(resumedOf(again), 5U);
    EXPECT_THAT(askedFor(), IsEmpty());
}

TEST_F(BatchResume, ADoneArtefactIsKnownByAnyNameOfItsPath) {
    const auto images = writeImages(1);
    std::filesystem::create_directory_symlink(directory / "builds/many", directory / "builds/link");
    serveRecords();
    EXPECT_EQ(resume(images).exitStatus, 0);
    EXPECT_EQ(resumedOf(batch({"staple", "--json", "--resume", journal, "link/Image0.dmg"})), 1U);
    EXPECT_EQ(resumedOf(batch({"staple", "--json", "--resume", journal, "./many/../many/Image0.dmg"})), 1U);
}

TEST_F(BatchResume, ARebuiltArtefactIsDoneAgain) {
    auto images = writeImages(3);
    serveRecords();
    ASSERT_EQ(resume(images).exitStatus, 0);
    askedFor();
    images[1] = writeArtefact(unsignedImage(base::toData("built anew")), images[1].path);
    records[recordNameOf(images[1])] = ticketOf(images[1]);
    const ProcessResult again = resume(images);
    EXPECT_EQ(again.exitStatus, 0);
    EXPECT_EQ(resumedOf(again), 2U);
    EXPECT_THAT(askedFor(), ElementsAre(recordNameOf(images[1])));
    EXPECT_TRUE(isStapled(images[1], issuedFor(images[1])));
}

TEST_F(BatchResume, AnArtefactRebuiltWithTheSameLengthAndTimeIsDoneAgain) {
    auto images = writeImages(1);
    serveRecords();
    ASSERT_EQ(resume(images).exitStatus, 0);
    const auto time = std::filesystem::last_write_time(images[0].path);
    const auto length = std::filesystem::file_size(images[0].path);
    const Artefact other = unsignedImage(base::toData("image builds/manyX"));
    records[recordNameOf(other)] = ticketOf(other);
    writeFile(images[0].path, other.stapledWith(issuedFor(other)));
    ASSERT_EQ(std::filesystem::file_size(images[0].path), length);
    std::filesystem::last_write_time(images[0].path, time);
    askedFor();
    EXPECT_EQ(resumedOf(resume(images)), 0U);
    EXPECT_THAT(askedFor(), ElementsAre(recordNameOf(other)));
}

// The hash that a signature states does not cover all of the artefact.
TEST_F(BatchResume, AnArtefactChangedWithTheSameLengthTimeAndStatedHashIsDoneAgain) {
    std::vector<Artefact> artefacts;
    for (const Artefact& one : {signedImage(), signedPackage(), signedBundle()}) {
        artefacts.push_back(writeArtefact(one, directory / ("builds/" + one.name)));
        records[recordNameOf(artefacts.back())] = ticketOf(artefacts.back());
    }
    serveRecords();
    for (const char* operation : {"staple", "validate"})
        ASSERT_EQ(resume(artefacts, operation).exitStatus, 0);
    ASSERT_EQ(resumedOf(resume(artefacts)), 3U);
    const std::string uuid(16, '\x11');  // of the bundle's executable
    changeUnseen(artefacts[0].path, 100);
    changeUnseen(artefacts[1].path, artefacts[1].contents.size() - 1);
    const std::string executable = artefacts[2].path + "/Contents/Programs/Sample";
    changeUnseen(executable, readFile(executable).find(uuid));
    askedFor();
    EXPECT_EQ(resumedOf(resume(artefacts)), 0U);
    EXPECT_THAT(askedFor(), SizeIs(3));
}

TEST_F(BatchResume, ABundleWhoseTicketIsGoneIsDoneAgain) {
    const auto bundles = writeBundles(2);
    serveRecords();
    ASSERT_EQ(resume(bundles).exitStatus, 0);
    std::filesystem::remove(bundles[0].file());
    EXPECT_EQ(resumedOf(resume(bundles)), 1U);
    EXPECT_EQ(countStapled(bundles), 2U);
}

TEST_F(BatchResume, AFailedArtefactIsDoneAgain) {
    const auto images = writeImages(4);
    auto ticket = std::exchange(records[recordNameOf(images[2])], std::nullopt);
    serveRecords();
    EXPECT_EQ(resume(images).exitStatus, 65);
    askedFor();
    records[recordNameOf(images[2])] = ticket;
    EXPECT_EQ(resume(images).exitStatus, 0);
    EXPECT_THAT(askedFor(), ElementsAre(recordNameOf(images[2])));
    EXPECT_EQ(resumedOf(resume(images)), 4U);
}

// A staple reports its actions, not the present state: that is for validate.
TEST_F(BatchResume, AStapleThatIsDoneStaysDoneWhenItsTicketIsRevoked) {
    const auto images = writeImages(1);
    serveRecords();
    ASSERT_EQ(resume(images).exitStatus, 0);
    records[recordNameOf(images[0])] = sealed(images[0].payload().revoked());
    EXPECT_EQ(resumedOf(resume(images)), 1U);
    EXPECT_EQ(batch({"validate", "-q"}, images).exitStatus, 77);
}

TEST_F(BatchResume, AValidationThatHasEndedDoesNotHideARevocation) {
    const auto images = writeImages(2);
    serveRecords();
    ASSERT_EQ(batch({"staple", "-q"}, images).exitStatus, 0);
    ASSERT_EQ(resume(images, "validate").exitStatus, 0);
    records[recordNameOf(images[0])] = sealed(images[0].payload().revoked());
    const ProcessResult again = resume(images, "validate");
    EXPECT_EQ(again.exitStatus, 77);
    EXPECT_EQ(resumedOf(again), 0U);
    EXPECT_THAT(reportsOf(again),
                testing::UnorderedElementsAre(Reports("revoked", 77), Reports("worked", 0)));
}

// Otherwise an artefact that always fails would let the others keep an old result.
TEST_F(BatchResume, AValidationHasEndedWhateverItsVerdicts) {
    const auto images = writeImages(2);
    serveRecords();
    ASSERT_EQ(batch({"staple", "-q"}, {images[0]}).exitStatus, 0);
    ASSERT_EQ(resume(images, "validate").exitStatus, 65);
    records[recordNameOf(images[0])] = sealed(images[0].payload().revoked());
    EXPECT_EQ(resume(images, "validate").exitStatus, 77);
}

TEST_F(BatchResume, AValidationGoesOnWhileSomeWereNotLookedAt) {
    const auto images = writeImages(4);
    serveRecords();
    ASSERT_EQ(batch({"staple", "-q"}, images).exitStatus, 0);
    askedFor();
    // A part of the list, then one without a response, then one without any time.
    serveOnly(recordNameOf(images[0]));
    const std::vector<std::string> impatient{"validate", "--json", "--retries", "0", "--resume", journal};
    EXPECT_EQ(batch(impatient, images).exitStatus, 68);
    serveNoMore();
    EXPECT_EQ(resumedOf(batch(impatient, images)), 1U);
    std::vector<std::string> late = impatient;
    late.insert(late.end(), {"--deadline", "0"});
    EXPECT_EQ(batch(late, images).exitStatus, 68);
    serveRecords();
    const ProcessResult last = resume(images, "validate");
    EXPECT_EQ(last.exitStatus, 0);
    EXPECT_EQ(resumedOf(last), 1U);
    EXPECT_EQ(resumedOf(resume(images, "validate")), 0U) << "that one had ended";
}

TEST_F(BatchResume, AStapleIsNoValidation) {
    const auto images = writeImages(2);
    serveRecords();
    ASSERT_EQ(resume(images).exitStatus, 0);
    const ProcessResult validated = resume(images, "validate");
    EXPECT_THAT(reportsOf(validated), AllOf(SizeIs(2), Each(Reports("worked", 0))));
    EXPECT_EQ(resumedOf(resume(images)), 2U);
}

TEST_F(BatchResume, NamesOfAnyShapeAreKept) {
    std::vector<Artefact> images;
    for (const char* name :
         {"with blank.dmg", "with\nnewline.dmg", "with%20.dmg", "with\xff\xfe.dmg", "\xc3\xa4.dmg"}) {
        images.push_back(writeArtefact(unsignedImage(base::toData(name)),
                                       directory / ("builds/many/" + std::string(name))));
        records[recordNameOf(images.back())] = ticketOf(images.back());
    }
    serveRecords();
    EXPECT_EQ(resume(images).exitStatus, 0);
    EXPECT_EQ(resumedOf(resume(images)), images.size());
    EXPECT_THAT(linesOf(readFile(journal)), SizeIs(1 + images.size()));
}

// Journals that are none, or damaged.

TEST_F(BatchResume, AFileThatIsNoJournalIsRefusedAndUnchanged) {
    const auto images = writeImages(1);
    serveRecords();
    for (const std::string& contents : {std::string("a text\n"), std::string("pinwell-batch journal 2\n"),
                                        std::string("pinwell-batch journal 10\n"), std::string(100'000, 'x'),
                                        std::string("\0\0\0", 3), std::string("\n")}) {
        writeFile(journal, contents);
        const ProcessResult result = resume(images);
        EXPECT_EQ(result.exitStatus, 73) << contents.substr(0, 40);
        EXPECT_THAT(linesOf(result.errors),
                    ElementsAre(StartsWith("pinwell-batch: the journal cannot be used: ")));
        EXPECT_EQ(readFile(journal), contents);
    }
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(BatchResume, AJournalMustBeARegularFile) {
    const auto images = writeImages(1);
    serveRecords();
    std::filesystem::create_directory(directory / "builds/folder");
    ASSERT_EQ(::mkfifo((directory / "builds/pipe").c_str(), 0600), 0);
    for (const std::string& path : {directory / "builds/folder", directory / "builds/pipe",
                                    std::string("/dev/full"), directory / "builds/missing/journal"}) {
        journal = path;
        EXPECT_EQ(resume(images).exitStatus, 73) << path;
    }
}

TEST_F(BatchResume, LinesThatAreDamagedCountForNothing) {
    const auto images = writeImages(3);
    serveRecords();
    ASSERT_EQ(resume(images).exitStatus, 0);
    std::vector<std::string> lines = linesOf(readFile(journal));
    ASSERT_THAT(lines, SizeIs(4));
    lines[1] = "0 worked staple";
    lines[2] += " and more";
    const std::string garbage = std::string(70'000, 'g') + "\n\n \n\0\xff\n0 worked staple 1 1.1 - /\n";
    writeFile(journal, lines[0] + "\n" + lines[1] + "\n" + lines[2] + "\n" + garbage + lines[3] + "\n");
    EXPECT_EQ(resumedOf(resume(images)), 1U);
    EXPECT_EQ(resumedOf(resume(images)), 3U);
}

TEST_F(BatchResume, ALineThatWasCutShortDoesNotSpoilTheNext) {
    const auto images = writeImages(3);
    serveRecords();
    ASSERT_EQ(resume(images).exitStatus, 0);
    const std::string whole = readFile(journal);
    for (std::size_t length = whole.size(); length-- > 0;) {
        if (length % 47 != 0) continue;  // two runs of the program each
        writeFile(journal, whole.substr(0, length));
        EXPECT_EQ(resume(images).exitStatus, 0) << length;
        EXPECT_EQ(resumedOf(resume(images)), 3U) << length;
    }
}

TEST_F(BatchResume, AnUnwritableJournalIsReportedOnce) {
    const auto images = writeImages(60);
    serveRecords();
    ASSERT_EQ(batch({"staple", "-q"}, images).exitStatus, 0);
    const ProcessResult result = runProcess(withShortFiles(resuming(images, "validate")));
    EXPECT_EQ(result.exitStatus, 74) << result.errors;
    EXPECT_THAT(linesOf(result.errors), ElementsAre(HasSubstr(journal)));
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(60), Each(Reports("worked", 0))));
    // The complete lines count, and the others are done again.
    const ProcessResult again = resume(images, "validate");
    EXPECT_EQ(again.exitStatus, 0);
    EXPECT_THAT(resumedOf(again), AllOf(testing::Ge(1U), testing::Lt(60U)));
    EXPECT_EQ(resumedOf(again) + reportsOf(again).size(), 60U);
}

TEST_F(BatchResume, AFullVolumeUnderTheJournalCostsTheJournalAndNothingElse) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    const auto images = writeImages(60);
    serveRecords();
    journal = volume / "staple.journal";
    const std::string ballast = volume / "ballast";
    writeFile(journal, "");
    fill(ballast);
    // Not even its first line fits.
    const ProcessResult none = resume(images);
    EXPECT_EQ(none.exitStatus, 73);
    EXPECT_THAT(
        linesOf(none.errors),
        ElementsAre(AllOf(StartsWith("pinwell-batch: the journal cannot be used: "), HasSubstr(journal))));
    EXPECT_EQ(countStapled(images), 0U);

    std::filesystem::remove(ballast);
    writeFile(journal, "pinwell-batch journal 1\n");  // has a page to grow in
    fill(ballast);
    const ProcessResult some = resume(images);
    EXPECT_EQ(some.exitStatus, 74);
    EXPECT_THAT(linesOf(some.errors), ElementsAre(AllOf(HasSubstr(journal), HasSubstr("No space left"))));
    EXPECT_THAT(reportsOf(some), AllOf(SizeIs(60), Each(Reports("worked", 0))));
    EXPECT_EQ(countStapled(images), 60U);

    std::filesystem::remove(ballast);
    askedFor();
    const ProcessResult rest = resume(images);
    EXPECT_EQ(rest.exitStatus, 0) << rest.errors;
    EXPECT_THAT(resumedOf(rest), AllOf(testing::Ge(1U), testing::Lt(60U)));
    EXPECT_THAT(askedFor(), SizeIs(60U - resumedOf(rest)));
    EXPECT_EQ(resumedOf(resume(images)), 60U);
}

TEST_F(BatchResume, AnArtefactThatFailsWeighsMoreThanAJournalThatDoes) {
    const auto images = writeImages(60);
    records[recordNameOf(images[0])] = std::nullopt;
    serveRecords();
    const ProcessResult result = runProcess(withShortFiles(resuming(images)));
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(result.errors, HasSubstr(journal));
}

// Runs that are killed.

TEST_F(BatchResume, AKilledRunGoesOnWhereItWas) {
    const auto bundles = writeBundles(40);
    serveRecords();
    std::size_t said = 0;  // in runs that were killed: a line of each is in the journal, or was just to be
    for (const std::size_t last : {0U, 5U, 15U, 30U}) {
        RunningProcess run(batchCommand(resuming(bundles)));
        // A run that is quicker than the test ends by itself.
        if (last == 0) {
            ASSERT_TRUE(service().waitForRequests(1));
        } else {
            run.waitForLine("{\"path\":\"" + bundles[last].path + "\"");
        }
        ::kill(run.id(), SIGKILL);
        const ProcessResult result = run.wait();
        said +=
            reportsOf({.exitStatus = {}, .signal = 0, .output = wholeLinesOf(result.output), .errors = {}})
                .size();
        // The earlier file, a part of the ticket, or no file yet.
        for (const Artefact& one : bundles) {
            if (!std::filesystem::exists(one.file())) continue;
            const std::string there = readFile(one.file());
            EXPECT_TRUE(there == one.contents || one.stapledWith(issuedFor(one)).starts_with(there))
                << one.path;
        }
    }
    askedFor();
    const ProcessResult last = resume(bundles);
    EXPECT_EQ(last.exitStatus, 0) << last.output;
    const auto resumed = resumedOf(last);
    EXPECT_GE(resumed, said);
    EXPECT_GE(said, 1U);
    EXPECT_EQ(resumed + reportsOf(last).size(), 40U);
    EXPECT_THAT(askedFor(), SizeIs(40U - resumed));
    EXPECT_EQ(countStapled(bundles), 40U);
    EXPECT_EQ(resumedOf(resume(bundles)), 40U);
}

// Signals.

class BatchSignal : public BatchResume, public testing::WithParamInterface<std::pair<int, int>> {
  protected:
    int signal() const { return GetParam().first; }
    int status() const { return GetParam().second; }
};

TEST_P(BatchSignal, EndsArtefactsThatWaitForTheService) {
    const auto images = writeImages(10);
    const Gate gate;
    for (int i = 0; i < 4; ++i) service().enqueue(Script().readRequest().waitFor(gate));
    serveRecords();
    RunningProcess run(batchCommand(resuming(images)));
    ASSERT_TRUE(gate.waitUntilReached());
    run.sendSignal(signal());
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.exitStatus, status());
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(10), Each(Reports("interrupted", status()))));
    EXPECT_EQ(summaryOf(result)["exitStatus"].unsignedIntegerValue(), static_cast<std::uint64_t>(status()));
    for (const Artefact& image : images) EXPECT_EQ(readFile(image.path), image.contents);
    gate.open();
    EXPECT_EQ(resume(images).exitStatus, 0);
    EXPECT_EQ(countStapled(images), 10U);
}

TEST_P(BatchSignal, FinishesTheWritesUnderWay) {
    const auto images = writeImages(60);
    serveRecords();
    Command command = batchCommand(resuming(images));
    command.arguments.insert(command.arguments.end(), {"--jobs", "2"});
    RunningProcess run(command);
    ASSERT_TRUE(run.waitForLine("{\"path\"").has_value());
    ::kill(run.id(), signal());
    const ProcessResult result = run.wait();
    // It may have ended before the signal; otherwise each artefact has one of the two states, as reported.
    EXPECT_THAT(result.exitStatus, testing::Optional(testing::AnyOf(0, status())));
    const auto reports = reportsOf(result);
    EXPECT_THAT(reports, SizeIs(60));
    std::size_t worked = 0;
    for (const Value& report : reports) {
        const bool isDone = *report["cause"].string() == "worked";
        EXPECT_THAT(report, isDone ? Reports("worked", 0) : Reports("interrupted", status()));
        const auto image = std::find_if(images.begin(), images.end(), [&](const Artefact& one) {
            return one.path == *report["path"].string();
        });
        ASSERT_NE(image, images.end());
        EXPECT_EQ(readFile(image->path), isDone ? image->stapledWith(issuedFor(*image)) : image->contents);
        worked += isDone ? 1U : 0U;
    }
    EXPECT_GE(worked, 1U);
    askedFor();
    const ProcessResult rest = resume(images);
    EXPECT_EQ(resumedOf(rest), worked);
    EXPECT_THAT(askedFor(), SizeIs(60 - worked));
    EXPECT_EQ(countStapled(images), 60U);
}

TEST_P(BatchSignal, EndsARunThatWaitsForItsList) {
    const auto images = writeImages(1);
    serveRecords();
    const std::string list = directory / "builds/list";
    ASSERT_EQ(::mkfifo(list.c_str(), 0600), 0);
    RunningProcess run(batchCommand({"staple", "--json", "--from", list}));
    const base::FileDescriptor writer(::open(list.c_str(), O_WRONLY | O_CLOEXEC));
    const std::string line = images[0].path + "\n";
    ASSERT_EQ(::write(writer.get(), line.data(), line.size()), static_cast<ssize_t>(line.size()));
    ASSERT_TRUE(run.waitForLine("{\"path\"").has_value());
    run.sendSignal(signal());
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.exitStatus, status());
    EXPECT_EQ(summaryOf(result)["worked"].unsignedIntegerValue(), 1U);
}

TEST_P(BatchSignal, EndsARunWhoseListHasNoWriter) {
    const std::string list = directory / "builds/list";
    ASSERT_EQ(::mkfifo(list.c_str(), 0600), 0);
    RunningProcess run(batchCommand({"staple", "--from", list, directory / "builds/missing"}));
    ASSERT_TRUE(run.waitForLineWith("missing").has_value());
    run.sendSignal(signal());
    EXPECT_EQ(run.wait().exitStatus, status());
}

INSTANTIATE_TEST_SUITE_P(Which, BatchSignal,
                         testing::Values(std::pair(SIGINT, 130), std::pair(SIGTERM, 143),
                                         std::pair(SIGHUP, 129)),
                         [](const auto& row) { return "Ends" + std::to_string(row.param.second); });

// Two at once.

TEST_F(BatchResume, TwoRunsOverOneListStapleEachArtefactWhole) {
    const auto images = writeImages(30);
    const auto bundles = writeBundles(10);
    serveRecords();
    std::vector<std::string> arguments{"staple", "--json"};
    for (const auto& paths : {pathsOf(images), pathsOf(bundles)})
        arguments.insert(arguments.end(), paths.begin(), paths.end());
    RunningProcess first(batchCommand(arguments));
    RunningProcess second(batchCommand(arguments));
    for (RunningProcess* const run : {&first, &second}) {
        const ProcessResult result = run->wait();
        EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
        EXPECT_THAT(reportsOf(result), AllOf(SizeIs(40), Each(Reports("worked", 0))));
    }
    EXPECT_EQ(countStapled(images) + countStapled(bundles), 40U);
}

TEST_F(BatchResume, TwoRunsWithOneJournalKeepItWhole) {
    const auto images = writeImages(80);
    serveRecords();
    const std::vector<Artefact> half(images.begin(), images.begin() + 40);
    const std::vector<Artefact> other(images.begin() + 40, images.end());
    RunningProcess first(batchCommand(resuming(half)));
    RunningProcess second(batchCommand(resuming(other)));
    EXPECT_EQ(first.wait().exitStatus, 0);
    EXPECT_EQ(second.wait().exitStatus, 0);
    EXPECT_EQ(resumedOf(resume(images)), 80U);
}

TEST_F(BatchResume, ManyRunsThatMakeOneJournalMakeItOnce) {
    const auto images = writeImages(8);
    serveRecords();
    std::vector<std::unique_ptr<RunningProcess>> runs;
    for (const Artefact& image : images)
        runs.push_back(std::make_unique<RunningProcess>(batchCommand(resuming({image}))));
    for (const auto& run : runs) EXPECT_EQ(run->wait().exitStatus, 0);
    EXPECT_EQ(resumedOf(resume(images)), 8U);
}

}  // namespace
}  // namespace pinwell::test
