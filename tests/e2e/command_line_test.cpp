// Words and options: their meaning, the tool's output for wrong ones, and its verbosity.
#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::Field;
using testing::IsEmpty;
using testing::Not;
using testing::Optional;
using testing::StartsWith;

std::string usage(const std::string& program = "pinwell") {
    return "Usage: " + program +
           " staple [-q] [-v] path\n"
           "        Retrieves a ticket and attaches it to the supported file\n"
           "        format at path.\n"
           "\n"
           "Usage: " +
           program +
           " validate [-q] [-v] path\n"
           "        Validates an existing stapled ticket.\n"
           "\n"
           "Supported file formats are: UDIF disk images, code-signed executable\n"
           "bundles, and signed \"flat\" installer packages.\n";
}

/// Status 64, this text on standard error, an empty standard output.
testing::Matcher<const ProcessResult&> RefusedWithUsage(const std::string& text = usage()) {
    return AllOf(Field(&ProcessResult::exitStatus, Optional(64)), Field(&ProcessResult::output, IsEmpty()),
                 Field(&ProcessResult::errors, text));
}

class CommandLine : public EndToEndTest {
  protected:
    CommandLine() { serveTicket(ticket()); }
    std::string missing(const std::string& name = "missing") const { return directory / ("builds/" + name); }
};

TEST_F(CommandLine, WithoutArgumentsPrintsTheUsage) {
    EXPECT_THAT(pinwell({}), RefusedWithUsage());
}

TEST_F(CommandLine, ACommandWordAlonePrintsTheUsage) {
    EXPECT_THAT(pinwell({"staple"}), RefusedWithUsage());
    EXPECT_THAT(pinwell({"validate"}), RefusedWithUsage());
}

TEST_F(CommandLine, ALoneOptionIsNotScanned) {
    // The scan would print its own usage text for either.
    EXPECT_THAT(pinwell({"--help"}), RefusedWithUsage());
    EXPECT_THAT(pinwell({"--nonsense"}), RefusedWithUsage());
}

TEST_F(CommandLine, AnOptionBeforeTheCommandWordPrintsTheUsage) {
    EXPECT_THAT(pinwell({"-v", "staple", bundle}), RefusedWithUsage());
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(CommandLine, TheCommandWordIsExact) {
    for (const char* word : {"Staple", "VALIDATE", "stapler", "valid", "staple ", ""})
        EXPECT_THAT(pinwell({word, bundle}), RefusedWithUsage()) << '"' << word << '"';
    EXPECT_EQ(stapled(), std::nullopt);
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(CommandLine, AWrongCommandWordAndAWrongOptionAreTwoUsageTexts) {
    EXPECT_THAT(pinwell({"remove", "--nonsense", bundle}), RefusedWithUsage(usage() + usage()));
}

TEST_F(CommandLine, TheUsageNamesTheProgramAsItWasStarted) {
    const std::string name = directory / "builds/stamp-it";
    std::filesystem::create_symlink(PINWELL_PROGRAM, name);
    Command renamed = command({"staple"});
    renamed.executable = name;
    EXPECT_THAT(runProcess(renamed), RefusedWithUsage(usage("stamp-it")));
}

TEST_F(CommandLine, AProgramNameWithControlCharactersIsEscapedInTheUsage) {
    const std::string name = directory / "builds/\x1b[31mred";
    std::filesystem::create_symlink(PINWELL_PROGRAM, name);
    Command renamed = command({});
    renamed.executable = name;
    EXPECT_THAT(runProcess(renamed), RefusedWithUsage(usage("\\x1b[31mred")));
}

TEST_F(CommandLine, HelpPrintsTheUsageAndTheRunGoesOn) {
    stapleByHand(ticket());
    const ProcessResult result = pinwell({"validate", "--help", bundle});
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.errors, usage());
    EXPECT_THAT(result.outputLines(), ElementsAre(processing(), kValidated));
}

TEST_F(CommandLine, EveryUnknownOptionPrintsTheUsageOnceAndTheRunGoesOn) {
    const ProcessResult result = pinwell({"staple", "-z", "--nonsense", "-?", bundle});
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.errors, usage() + usage() + usage());
    EXPECT_THAT(result.outputLines(), ElementsAre(processing(), processing(), kWorked));
}

TEST_F(CommandLine, AnArgumentToAnOptionThatTakesNoneIsAnUnknownOption) {
    const ProcessResult result = pinwell({"staple", "--quiet=yes", bundle});
    EXPECT_EQ(result.errors, usage());
    EXPECT_THAT(result.outputLines(), ElementsAre(processing(), processing(), kWorked));
}

TEST_F(CommandLine, QuietSaysNothingAtAll) {
    for (const char* option : {"-q", "--quiet"}) {
        EXPECT_THAT(pinwell({"staple", option, bundle}), Ended(0, IsEmpty())) << option;
        EXPECT_THAT(pinwell({"staple", option, missing()}), Ended(66, IsEmpty())) << option;
    }
    EXPECT_EQ(stapled(), base::toData(readFile(temporaryPath("REQUEST.ticket"))));
}

TEST_F(CommandLine, OptionsAfterThePathCountInEveryEnvironment) {
    environment["POSIXLY_CORRECT"] = "1";
    const ProcessResult result = pinwell({"staple", bundle, "-q", bundle});
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.output, "");
    EXPECT_EQ(result.errors, "");
}

TEST_F(CommandLine, TheUsageIsPrintedInQuietModeToo) {
    const ProcessResult result = pinwell({"staple", "-q", "--help", bundle});
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.errors, usage());
    EXPECT_EQ(result.output, "");
}

TEST_F(CommandLine, TheLastOfVerboseAndQuietWins) {
    EXPECT_THAT(pinwell({"staple", "-v", "-q", bundle}), Ended(0, IsEmpty()));
    EXPECT_THAT(pinwell({"staple", "-vq", bundle}), Ended(0, IsEmpty()));
    for (const auto& options : {std::vector<std::string>{"-q", "-v"}, {"-qv"}, {"--quiet", "--verbose"}}) {
        std::vector<std::string> arguments{"staple"};
        arguments.insert(arguments.end(), options.begin(), options.end());
        arguments.push_back(bundle);
        EXPECT_THAT(pinwell(arguments),
                    Ended(0, AllOf(Contains(StartsWith("Domain is ")), Contains(kWorked))));
    }
}

TEST_F(CommandLine, WithoutVerboseNoDiagnosticIsShown) {
    EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
}

TEST_F(CommandLine, ThePathIsTheLastWordWhateverIsBeforeIt) {
    EXPECT_THAT(pinwell({"staple", missing(), "another", bundle}),
                Ended(0, ElementsAre(processing(), processing(), kWorked)));
    EXPECT_THAT(pinwell({"staple", bundle, missing()}),
                Ended(66, ElementsAre(StartsWith("File " + missing() + " does not exist. "))));
}

TEST_F(CommandLine, AnOptionInTheLastPlaceIsThePathAsWell) {
    // Scanned as an option, and a path that is not there.
    EXPECT_THAT(pinwell({"staple", bundle, "-q"}), Ended(66, IsEmpty()));
    EXPECT_THAT(pinwell({"staple", bundle, "-v"}),
                Ended(66, ElementsAre(StartsWith("File " + missing("-v") + " does not exist. "))));
}

TEST_F(CommandLine, AfterADoubleDashNothingIsAnOption) {
    EXPECT_THAT(pinwell({"staple", "--", "-q", bundle}),
                Ended(0, ElementsAre(processing(), processing(), kWorked)));
}

TEST_F(CommandLine, ARelativePathIsTakenFromTheCurrentDirectory) {
    for (const char* path : {"Sample.app", "./Sample.app/", "../builds//Sample.app"}) {
        const ProcessResult result = pinwell({"staple", path});
        EXPECT_EQ(result.exitStatus, 0) << path;
        EXPECT_THAT(result.outputLines(), Contains(kWorked)) << path;
    }
}

TEST_F(CommandLine, ARelativePathFromADirectoryThatWasRemovedLeadsToNoOtherFile) {
    Command run =
        command({"-c", R"(mkdir gone && cd gone && rmdir ../gone && exec "$0" staple ../Sample.app)",
                 PINWELL_PROGRAM});
    run.executable = "/bin/sh";
    run.workingDirectory = std::filesystem::path(bundle).parent_path();
    ASSERT_EQ(std::filesystem::path(bundle).filename(), "Sample.app");
    EXPECT_THAT(runProcess(run), Ended(0, Contains(kWorked)));
    EXPECT_NE(stapled(), std::nullopt);
}

TEST_F(CommandLine, AMissingPathIsReportedOnce) {
    EXPECT_THAT(pinwell({"staple", missing()}),
                Ended(66, ElementsAre("File " + missing() +
                                      " does not exist. Error Domain=POSIXErrorDomain Code=2 "
                                      "\"No such file or directory\" UserInfo={FilePath=" +
                                      missing() + "}")));
    EXPECT_THAT(pinwell({"validate", missing()}), Ended(66, ElementsAre(StartsWith("File " + missing()))));
    EXPECT_THAT(service().requests(), IsEmpty());
}

TEST_F(CommandLine, APathBelowAFileDoesNotExist) {
    writeFile(missing("file"), std::string_view("text"));
    EXPECT_THAT(pinwell({"staple", missing("file/below")}),
                Ended(66, ElementsAre(StartsWith("File " + missing("file/below") + " does not exist. "))));
}

TEST_F(CommandLine, AnEmptyPathDoesNotExist) {
    EXPECT_THAT(pinwell({"staple", ""}), Ended(66, ElementsAre(StartsWith("File  does not exist. "))));
}

TEST_F(CommandLine, APathCannotDriveTheTerminal) {
    EXPECT_THAT(
        pinwell({"staple", missing("\x1b]0;title\x07\n")}),
        Ended(66, ElementsAre(StartsWith("File " + missing("\\x1b]0;title\\x07\\n") + " does not exist. "))));
}

TEST_F(CommandLine, TheExecutableContainsItsVersion) {
    EXPECT_THAT(readFile(PINWELL_PROGRAM), testing::HasSubstr("@(#)PROGRAM:pinwell  PROJECT:pinwell-34\n"));
}

TEST_F(CommandLine, AVerboseRunPrintsEveryStepInOrder) {
    const ProcessResult result = pinwell({"staple", "-v", bundle});
    ASSERT_EQ(result.exitStatus, 0);
    std::vector<std::string> steps;  // dictionaries take more than one line; their members are indented
    for (const std::string& line : result.outputLines())
        if (!line.starts_with("  ") && line != "}" && line != ")") steps.push_back(line);
    const std::string stored = values::URL::fileURLWithPath(temporaryPath("REQUEST.ticket")).absoluteString();
    const auto size = std::to_string(inlineRecord(ticket()).size());
    EXPECT_THAT(steps,
                ElementsAre(processing(), "Properties are {", "Props are {", "JSON Data is {", " Headers: {",
                            "Domain is 127.0.0.1", StartsWith("Response is { URL: https://127.0.0.1:"),
                            StartsWith("Size of data is "), "JSON Response is: {",
                            "Downloaded ticket has been stored at " + stored + ".", processing(),
                            "Properties are {", "Props are {", kWorked));
    EXPECT_EQ(result.errors, "");
}

}  // namespace
}  // namespace pinwell::test
