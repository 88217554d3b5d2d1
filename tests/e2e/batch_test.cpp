// Runs of pinwell-batch: lists, output and exit status.
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>

#include "batch_fixture.h"
#include "schema_validation.h"
#include "support/process.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Lt;
using testing::Not;
using testing::SizeIs;
using testing::StartsWith;

class Batch : public BatchTest {
  protected:
    std::string list(const std::string& contents) const {
        const std::string path = directory / "builds/list";
        writeFile(path, contents);
        return path;
    }
    static std::string joined(const std::vector<std::string>& lines, char end) {
        std::string text;
        for (const std::string& line : lines) text += line + end;
        return text;
    }
};

// The effects of a run.

TEST_F(Batch, StaplesEveryKindOfArtefact) {
    std::vector<Artefact> artefacts;
    for (const Artefact& one : {signedImage(), unsignedImage(), signedPackage(), signedBundle()}) {
        artefacts.push_back(writeArtefact(one, directory / ("builds/" + one.name)));
        records[recordNameOf(artefacts.back())] = ticketOf(artefacts.back());
    }
    serveRecords();
    const ProcessResult result = batch({"staple", "--json"}, artefacts);
    EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(4), Each(Reports("worked", 0))));
    EXPECT_EQ(countStapled(artefacts), 4U);
}

TEST_F(Batch, ValidatesItsStapledArtefacts) {
    const auto images = writeImages(5);
    serveRecords();
    ASSERT_EQ(batch({"staple"}, images).exitStatus, 0);
    const ProcessResult result = batch({"validate", "--json"}, images);
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_THAT(reportsOf(result), AllOf(SizeIs(5), Each(Reports("worked", 0))));
}

TEST_F(Batch, LooksUpTwoHundredNamesAtMostInOneRequest) {
    const auto images = writeImages(450);
    serveRecords();
    EXPECT_EQ(batch({"staple", "-q"}, images).exitStatus, 0);
    EXPECT_EQ(countStapled(images), 450U);
    const auto sizes = groupSizes();
    EXPECT_THAT(sizes, Each(testing::Le(200U)));
    EXPECT_THAT(sizes, SizeIs(Lt(100U)));
}

// Causes and the exit status.

TEST_F(Batch, ReportsTheCauseOfEachOutcome) {
    const auto expected = writeEveryOutcome();
    serveRecords();
    std::vector<std::string> arguments{"staple", "--json", "--jobs", "1"};
    for (const auto& [path, cause] : expected) arguments.push_back(path);
    const ProcessResult result = batch(arguments);
    EXPECT_EQ(result.exitStatus, 77);
    std::map<std::string, std::string> causes;
    for (const Value& report : reportsOf(result))
        causes[*report["path"].string()] = *report["cause"].string();
    EXPECT_EQ(causes, expected);
    const Value summary = summaryOf(result);
    EXPECT_EQ(summary["total"].unsignedIntegerValue(), expected.size());
    EXPECT_EQ(summary["worked"].unsignedIntegerValue(), 1U);
    EXPECT_EQ(summary["exitStatus"].unsignedIntegerValue(), 77U);
}

TEST_F(Batch, AnUnsignedBundleHasNoHash) {
    std::filesystem::remove_all(bundle + "/Contents/MacOS");
    BundleBuilder().executable(base::toData("#!/bin/sh\n")).write(directory / "builds/Unsigned.app");
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", directory / "builds/Unsigned.app"});
    EXPECT_EQ(result.exitStatus, 66);
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("notSigned", 66)));
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(Batch, AValidationWithoutATicketSendsNoRequest) {
    const auto images = writeImages(2);
    serveRecords();
    const ProcessResult result = batch({"validate", "--json"}, images);
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(reportsOf(result), Each(Reports("notStapled", 65)));
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(Batch, TheWorstArtefactDecidesInTheOrderOfTheTable) {
    const auto images = writeImages(3);
    const std::string missing = directory / "builds/missing.dmg";
    records[recordNameOf(images[1])] = std::nullopt;
    serveRecords();
    EXPECT_EQ(batch({"staple", "-q", images[0].path}).exitStatus, 0);
    EXPECT_EQ(batch({"staple", "-q", images[0].path, missing}).exitStatus, 66);
    EXPECT_EQ(batch({"staple", "-q", missing, images[1].path}).exitStatus, 65);
    std::filesystem::permissions(directory / "builds/many", std::filesystem::perms::all);
    serveNoMore();
    EXPECT_EQ(batch({"staple", "-q", "--retries", "0", images[0].path}).exitStatus, 68);
    EXPECT_EQ(batch({"staple", "-q", "--retries", "0", images[0].path, missing}).exitStatus, 66);
}

TEST_F(Batch, SpeaksInTheWordsOfTheTool) {
    const auto images = writeImages(2);
    records[recordNameOf(images[1])] = std::nullopt;
    serveRecords();
    const ProcessResult result = batch({"staple", "--jobs", "1"}, images);
    EXPECT_THAT(result.outputLines(),
                ElementsAre(images[0].path + ": The staple and validate action worked!",
                            images[1].path + ": The staple and validate action failed! Error 65. (notIssued)",
                            StartsWith("2 artefacts: 1 worked, 1 notIssued; ")));
    EXPECT_THAT(result.errors, AllOf(StartsWith("pinwell-batch: tickets and copies are kept in "),
                                     HasSubstr(directory / "tmp")));
}

TEST_F(Batch, AReportHoldsTheMembersOfItsSchemaInTheirOrder) {
    const auto images = writeImages(1);
    serveRecords();
    const ProcessResult result = batch({"staple", "--json"}, images);
    EXPECT_THAT(
        result.outputLines().front(),
        testing::MatchesRegex(
            "\\{\"path\":\"[^\"]*\",\"operation\":\"staple\",\"kind\":\"diskImage\",\"recordName\":\"2/2/"
            "[0-9a-f]{40}\",\"exitStatus\":0,\"cause\":\"worked\",\"attempts\":1,\"seconds\":[0-9.e-]+,"
            "\"messages\":\\[\"Processing: [^\"]*\",\"Processing: [^\"]*\",\"The staple and validate action "
            "worked!\"\\]\\}"));
    EXPECT_THAT(result.outputLines().back(), StartsWith(R"({"summary":{"version":1,)"));
    EXPECT_EQ(result.errors, "");
}

TEST_F(Batch, JsonKeepsToItsSchemaOnEveryOutcome) {
    std::vector<std::string> paths{"odd\n\xff\"name.dmg"};
    for (const auto& [path, cause] : writeEveryOutcome()) paths.push_back(path);
    serveRecords();
    const auto run = [&](std::vector<std::string> arguments) {
        arguments.insert(arguments.end(), paths.begin(), paths.end());
        return batch(std::move(arguments));
    };
    for (const char* operation : {"staple", "validate"}) {
        const ProcessResult result = run({operation, "--json", "-v"});
        EXPECT_EQ(result.exitStatus, std::string_view(operation) == "staple" ? 77 : 65);
        EXPECT_THAT(result.outputLines(), SizeIs(paths.size() + 1));
        expectValid(result, BATCH_SCHEMA);
    }
    serveNoMore();
    expectValid(run({"staple", "--json", "--retries", "0"}), BATCH_SCHEMA);
    expectValid(run({"staple", "--json", "--deadline", "0"}), BATCH_SCHEMA);
}

TEST_F(Batch, TheSchemaRefusesOtherLines) {
    const std::map<std::string, std::string> lines{{"nothing", "{}"},
                                                   {"summary", R"({"summary":{}})"},
                                                   {"artefact", R"({"path":"a","cause":"worked"})"},
                                                   {"list", "[]"}};
    for (const char* const schema : {BATCH_SCHEMA, TICKET_SCHEMA}) {
        const std::string refusals = refusalsOf(lines, schema);
        for (const auto& [name, line] : lines)
            EXPECT_THAT(refusals, testing::HasSubstr(refusalOf(name))) << line << schema;
    }
}

TEST_F(Batch, VerboseRunsPrintAllMessagesOfTheTool) {
    const auto images = writeImages(1);
    serveRecords();
    const ProcessResult result = batch({"staple", "-v"}, images);
    EXPECT_THAT(result.outputLines(), AllOf(Contains(StartsWith("  JSON Data is ")),
                                            Contains(StartsWith("  Downloaded ticket has been stored at ")),
                                            Contains(EndsWith("The staple and validate action worked!"))));
}

TEST_F(Batch, QuietRunsSayNothing) {
    const auto images = writeImages(1);
    serveRecords();
    const ProcessResult result = batch({"staple", "-q", directory / "missing"}, images);
    EXPECT_EQ(result.exitStatus, 66);
    EXPECT_EQ(result.output + result.errors, "");
}

TEST_F(Batch, AReaderThatHasGoneAwayStopsNothing) {
    const auto images = writeImages(3);
    serveRecords();
    std::vector<std::string> arguments{"staple"};
    for (const Artefact& image : images) arguments.push_back(image.path);
    for (const Output output : {Output::brokenPipe, Output::closed}) {
        Command made = batchCommand(arguments);
        made.output = output;
        const ProcessResult result = runProcess(made);
        EXPECT_EQ(result.exitStatus, 0);
        EXPECT_EQ(result.errors, "");
    }
    EXPECT_EQ(countStapled(images), 3U);
}

TEST_F(Batch, AnOutputThatIsFullIsAnError) {
    const auto images = writeImages(1);
    serveRecords();
    Command made = batchCommand({"staple", images[0].path});
    made.output = Output::full;
    EXPECT_EQ(runProcess(made).exitStatus, 74);
    EXPECT_EQ(countStapled(images), 1U);
}

// Lists.

TEST_F(Batch, ReadsItsListFromAFile) {
    const auto images = writeImages(3);
    serveRecords();
    const std::string file = list(joined(pathsOf(images), '\n'));
    EXPECT_THAT(reportsOf(batch({"staple", "--json", "--from", file})),
                AllOf(SizeIs(3), Each(Reports("worked", 0))));
}

TEST_F(Batch, TheLastLineOfAListNeedsNoEndAndEmptyOnesAreNone) {
    const auto images = writeImages(2);
    serveRecords();
    const std::string file = list("\n\n" + images[0].path + "\n\n" + images[1].path);
    EXPECT_THAT(reportsOf(batch({"staple", "--json", "--from", file})),
                AllOf(SizeIs(2), Each(Reports("worked", 0))));
}

TEST_F(Batch, PathsOfTheCommandLineComeBeforePathsOfTheList) {
    const auto images = writeImages(2);
    serveRecords();
    const ProcessResult result =
        batch({"staple", "--jobs", "1", "--from", list(images[1].path), images[0].path});
    EXPECT_THAT(result.outputLines(),
                ElementsAre(StartsWith(images[0].path), StartsWith(images[1].path), testing::_));
}

TEST_F(Batch, ZeroBytesEndPathsThatHoldNewlines) {
    const Artefact image =
        writeArtefact(unsignedImage(base::toData("odd")), directory / "builds/many/odd\nname.dmg");
    records[recordNameOf(image)] = ticketOf(image);
    serveRecords();
    const ProcessResult result = batch({"staple", "-0", "--from", list(image.path + std::string(1, '\0'))});
    EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
    EXPECT_THAT(result.outputLines().front(), HasSubstr("odd\\nname.dmg"));
}

TEST_F(Batch, AListOfZeroBytesThatIsReadAsLinesNamesNothing) {
    const auto images = writeImages(2);
    serveRecords();
    const std::string file = list(joined(pathsOf(images), '\0'));
    const ProcessResult result = batch({"staple", "--json", "--from", file});
    EXPECT_EQ(result.exitStatus, 66);
    const auto reports = reportsOf(result);
    ASSERT_THAT(reports, ElementsAre(Reports("notReadable", 66)));
    EXPECT_THAT(*reports[0]["messages"][0].string(), HasSubstr("zero byte"));
    EXPECT_EQ(countStapled(images), 0U);
}

TEST_F(Batch, PathsThatNameNoArtefactEndOneByOne) {
    const auto images = writeImages(1);
    serveRecords();
    ASSERT_EQ(::mkfifo((directory / "builds/pipe.dmg").c_str(), 0600), 0);
    std::filesystem::create_symlink("nowhere", directory / "builds/broken.dmg");
    std::filesystem::create_symlink("loop.dmg", directory / "builds/loop.dmg");
    std::filesystem::create_symlink(images[0].path, directory / "builds/link.dmg");
    const std::string file =
        list(joined({"pipe.dmg", "broken.dmg", "loop.dmg", "link.dmg", "/dev/null", "/dev/zero", "/", ".",
                     "..", " ", std::string(5000, 'x'), "many/Image0.dmg/below", "\xff", images[0].path},
                    '\n'));
    const ProcessResult result = batch({"staple", "--json", "--from", file});
    EXPECT_EQ(result.exitStatus, 66);
    const auto reports = reportsOf(result);
    EXPECT_THAT(reports, SizeIs(14));
    EXPECT_THAT(reports, Contains(Reports("worked", 0)).Times(1));
    EXPECT_TRUE(std::filesystem::is_symlink(directory / "builds/link.dmg"));
    EXPECT_EQ(countStapled(images), 1U);
}

TEST_F(Batch, ALongListNeedsNoMoreMemory) {
    if (programsAreSanitized()) GTEST_SKIP() << "a sanitizer keeps what was freed";
    // In KiB, of a run over so many paths of 4,000 bytes each.
    const auto memoryFor = [&](int count) {
        std::string folders;
        for (int i = 0; i < 20; ++i) folders += "/" + std::string(190, 'x');
        std::string paths;
        for (int i = 0; i < count; ++i) paths += folders + "/" + std::to_string(i) + ".dmg\n";
        Command measured = batchCommand({});
        measured.executable = "/usr/bin/python3";
        measured.arguments = {"-c",
                              "import resource, subprocess, sys\n"
                              "status = subprocess.run(sys.argv[1:]).returncode\n"
                              "print(resource.getrusage(resource.RUSAGE_CHILDREN).ru_maxrss)\n"
                              "sys.exit(status)",
                              PINWELL_BATCH_PROGRAM,
                              "staple",
                              "-q",
                              "--from",
                              list(paths)};
        const ProcessResult result = runProcess(measured);
        EXPECT_EQ(result.exitStatus, 66) << result.errors;
        return std::stoul(result.output);
    };
    const auto few = memoryFor(500);
    EXPECT_LE(memoryFor(6000), few + 16 * 1024) << "22 MB of list";
}

TEST_F(Batch, TheProgressLineFitsATerminalOfAnyWidth) {
    const auto images = writeImages(60);
    serveRecords();
    const std::string file = list(joined(pathsOf(images), '\n'));
    Command made = command({"-q", "-e", "-c",
                            "stty cols 20; " + std::string(PINWELL_BATCH_PROGRAM) + " staple --json --from " +
                                file + " > /dev/null",
                            "/dev/null"});
    made.executable = "/usr/bin/script";
    made.environment.insert({"SHELL", "/bin/sh"});
    made.environment.insert({"PATH", "/usr/bin:/bin"});
    const ProcessResult result = runProcess(made);
    EXPECT_EQ(result.exitStatus, 0) << result.output;
    EXPECT_THAT(result.output, HasSubstr("0 done"));
    std::string line;
    for (const char c : result.output) {
        line = c == '\r' ? "" : line + c;
        EXPECT_LT(line.size(), 20U + std::string_view("\x1b[K").size()) << line;
    }
}

TEST_F(Batch, AFileThatIsNamedTwiceIsDoneOnce) {
    const auto images = writeImages(1);
    std::filesystem::create_directory_symlink(directory / "builds/many", directory / "builds/link");
    serveRecords();
    const ProcessResult result = batch({"staple", "--json", images[0].path, images[0].path, "many/Image0.dmg",
                                        "./many//Image0.dmg", "many/../many/Image0.dmg", "link/Image0.dmg"});
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("worked", 0)));
    EXPECT_EQ(summaryOf(result)["duplicates"].unsignedIntegerValue(), 5U);
}

TEST_F(Batch, TwoNamesOfOneFileAreDoneOnce) {
    const auto images = writeImages(1);
    std::filesystem::create_hard_link(images[0].path, directory / "builds/many/Other.dmg");
    serveRecords();
    const ProcessResult result =
        batch({"staple", "--json", images[0].path, directory / "builds/many/Other.dmg"});
    EXPECT_THAT(reportsOf(result), ElementsAre(Reports("worked", 0)));
}

TEST_F(Batch, ShardsAreDisjointAndTogetherTheWholeList) {
    const auto images = writeImages(40);
    serveRecords();
    std::set<std::string> seen;
    std::size_t total = 0;
    for (const char* shard : {"1/3", "2/3", "3/3"}) {
        const auto reports = reportsOf(batch({"staple", "--json", "--shard", shard}, images));
        EXPECT_THAT(reports, AllOf(Not(IsEmpty()), SizeIs(Lt(40U))));
        total += reports.size();
        for (const Value& report : reports) seen.insert(*report["path"].string());
    }
    EXPECT_EQ(total, 40U);
    EXPECT_THAT(seen, SizeIs(40));
}

TEST_F(Batch, APartWithoutAPathIsNoError) {
    const auto images = writeImages(1);
    serveRecords();
    std::size_t reports = 0;
    for (const char* shard : {"1/2", "2/2"}) {
        const ProcessResult result = batch({"staple", "--json", "--shard", shard}, images);
        EXPECT_EQ(result.exitStatus, 0);
        reports += reportsOf(result).size();
    }
    EXPECT_EQ(reports, 1U);
}

// Usage.

TEST_F(Batch, WrongUsageEndsWith64AndOneLine) {
    const std::string empty = list("\n\n");
    expectWrongUsage(PINWELL_BATCH_PROGRAM, {{},
                                             {"stapel", "x"},
                                             {"--json", "staple", "x"},
                                             {"staple"},
                                             {"staple", "--from", empty},
                                             {"staple", "--from", empty, "--from", empty, "x"},
                                             {"staple", "--from", "/dev/null"},
                                             {"staple", "--jbos", "2", "x"},
                                             {"staple", "--jobs", "0", "x"},
                                             {"staple", "--jobs", "-1", "x"},
                                             {"staple", "--jobs", "two", "x"},
                                             {"staple", "--jobs"},
                                             {"staple", "--retries", "1.5", "x"},
                                             {"staple", "--retry-delay", "-1", "x"},
                                             {"staple", "--retry-delay", "nan", "x"},
                                             {"staple", "--timeout", "", "x"},
                                             {"staple", "--shard", "3/2", "x"},
                                             {"staple", "--shard", "0/2", "x"},
                                             {"staple", "--shard", "1", "x"},
                                             {"staple", "--color", "sometimes", "x"},
                                             {"staple", "--json=1", "x"},
                                             {"staple", "-Z", "x"}});
}

TEST_F(Batch, NamesTheNearestThatExists) {
    EXPECT_THAT(batch({"stapel", "x"}).errors, HasSubstr("did you mean staple?"));
    EXPECT_THAT(batch({"valdate", "x"}).errors, HasSubstr("did you mean validate?"));
    EXPECT_THAT(batch({"staple", "--jbos", "2", "x"}).errors, HasSubstr("did you mean --jobs?"));
    EXPECT_THAT(batch({"staple", "--retry-dealy=2", "x"}).errors, HasSubstr("did you mean --retry-delay?"));
    EXPECT_THAT(batch({"staple", "--nonsense", "x"}).errors, Not(HasSubstr("did you mean")));
}

TEST_F(Batch, HelpAndVersionGoToStandardOutput) {
    EXPECT_THAT(batch({"--help"}), Ended(0, Contains(HasSubstr("pinwell-batch validate"))));
    EXPECT_THAT(batch({"staple", "--help"}), Ended(0, Contains(HasSubstr("--retry-delay SECONDS"))));
    EXPECT_THAT(batch({"--version"}),
                Ended(0, ElementsAre(testing::StartsWith("pinwell-batch 34.0 (commit "))));
    EXPECT_THAT(batch({"validate", "--version"}),
                Ended(0, ElementsAre(testing::StartsWith("pinwell-batch 34.0 (commit "))));
}

TEST_F(Batch, EveryWordAfterTwoDashesIsAPath) {
    writeArtefact(unsignedImage(base::toData("dashed")), directory / "builds/--help.dmg");
    const Artefact image = unsignedImage(base::toData("dashed"));
    records[recordNameOf(image)] = ticketOf(image);
    serveRecords();
    EXPECT_EQ(batch({"staple", "--", "--help.dmg"}).exitStatus, 0);
    EXPECT_EQ(batch({"staple", "--json", "--", "-q"}).exitStatus, 66);
}

TEST_F(Batch, AListThatCannotBeReadIsNamed) {
    const ProcessResult missing = batch({"staple", "--from", directory / "nowhere"});
    EXPECT_EQ(missing.exitStatus, 66);
    EXPECT_THAT(missing.errors, HasSubstr("nowhere"));
    const ProcessResult folder = batch({"staple", "--from", directory / "builds"});
    EXPECT_EQ(folder.exitStatus, 66);
}

TEST_F(Batch, ColorsOnlyWhereItIsWanted) {
    const auto images = writeImages(1);
    serveRecords();
    EXPECT_THAT(batch({"staple", images[0].path}).output, Not(HasSubstr("\x1b")));
    EXPECT_THAT(batch({"staple", "--color", "always", images[0].path}).output, HasSubstr("\x1b["));
    environment["CLICOLOR_FORCE"] = "1";
    EXPECT_THAT(batch({"staple", images[0].path}).output, HasSubstr("\x1b["));
    EXPECT_THAT(batch({"staple", "--color=never", images[0].path}).output, Not(HasSubstr("\x1b")));
    environment["NO_COLOR"] = "1";
    EXPECT_THAT(batch({"staple", images[0].path}).output, Not(HasSubstr("\x1b")));
    EXPECT_THAT(batch({"staple", "--json", "--color", "always", images[0].path}).output,
                Not(HasSubstr("\x1b")));
}

// The temporary directory.

TEST_F(Batch, LeavesNothingInTheTemporaryDirectoryWhenAllWentWell) {
    const auto images = writeImages(3);
    serveRecords();
    EXPECT_EQ(batch({"staple"}, images).exitStatus, 0);
    EXPECT_THAT(temporaryFiles(), IsEmpty());
}

TEST_F(Batch, KeepsTicketsAndCopiesWhenAskedToOrWhenSomethingWentWrong) {
    const auto images = writeImages(2);
    serveRecords();
    EXPECT_EQ(batch({"staple", "--keep"}, images).exitStatus, 0);
    EXPECT_THAT(temporaryFiles(),
                AllOf(SizeIs(5), Contains(EndsWith(".ticket")), Contains(EndsWith(".dmgData"))));
    std::filesystem::remove_all(directory / "tmp");
    std::filesystem::create_directory(directory / "tmp");
    EXPECT_EQ(batch({"staple", directory / "missing"}, images).exitStatus, 66);
    EXPECT_THAT(temporaryFiles(), SizeIs(5));
}

TEST_F(Batch, AMissingTemporaryDirectoryIsReported) {
    environment["TMPDIR"] = directory / "nowhere";
    const ProcessResult result = batch({"staple", bundle});
    EXPECT_EQ(result.exitStatus, 73);
    EXPECT_THAT(linesOf(result.errors), ElementsAre(StartsWith("pinwell-batch: no temporary directory")));
}

// JUnit.

TEST_F(Batch, AJUnitReportTakesThePlaceOfNoDevice) {
    const auto images = writeImages(1);
    serveRecords();
    std::filesystem::create_symlink("/dev/null", directory / "builds/device");
    for (const std::string& path :
         {directory / "builds/device", directory / "builds", directory / "builds/no/such"}) {
        const ProcessResult result = batch({"staple", "--junit", path}, images);
        EXPECT_EQ(result.exitStatus, 73) << path;
        EXPECT_THAT(linesOf(result.errors),
                    ElementsAre(StartsWith("pinwell-batch: the report cannot be written: ")));
    }
    EXPECT_TRUE(std::filesystem::is_symlink(directory / "builds/device"));
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(Batch, AForgottenNameOfAReportCostsNoArtefact) {
    const auto images = writeImages(2);
    serveRecords();
    const ProcessResult result = batch({"staple", "--junit"}, images);
    EXPECT_EQ(result.exitStatus, 73);
    EXPECT_THAT(linesOf(result.errors), ElementsAre(EndsWith("is there already, and is no report.")));
    for (const Artefact& image : images) EXPECT_EQ(readFile(image.path), image.contents);
}

TEST_F(Batch, WritesAJUnitReport) {
    const auto images = writeImages(3);
    records[recordNameOf(images[1])] = std::nullopt;
    serveRecords();
    const std::string report = directory / "builds/report.xml";
    EXPECT_EQ(batch({"staple", "-q", "--junit", report}, images).exitStatus, 65);
    const std::string text = readFile(report);
    EXPECT_THAT(text, AllOf(HasSubstr("tests=\"3\" failures=\"1\" errors=\"0\""),
                            HasSubstr("<failure type=\"notIssued\""), HasSubstr("Record not found")));
    EXPECT_THAT(namesBelow(directory / "builds"), Contains("report.xml").Times(1));
    EXPECT_THAT(namesBelow(directory / "builds"), Not(Contains(HasSubstr("report.xml."))));
    const ProcessResult parsed = runProcess(
        {.executable = "/usr/bin/python3",
         .arguments = {
             "-c", "import sys, xml.etree.ElementTree as t; print(len(t.parse(sys.argv[1]).getroot()[0]))",
             report}});
    EXPECT_EQ(parsed.output, "3\n") << parsed.errors;
}

}  // namespace
}  // namespace pinwell::test
