// Runs of pinwell-inspect: its output for stapled artefacts, its exit status, its JSON, and that it changes
// nothing and sends no request.
#include <sys/stat.h>

#include <filesystem>

#include "artefacts.h"
#include "fixture.h"
#include "schema_validation.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;
using testing::StartsWith;

constexpr const char* kGood = "  The ticket is genuine, lists this file, and is not marked revoked.";

class Inspect : public EndToEndTest {
  protected:
    Command inspectCommand(std::vector<std::string> arguments) const {
        Command made = command(std::move(arguments));
        made.executable = PINWELL_INSPECT_PROGRAM;
        return made;
    }
    ProcessResult inspect(std::vector<std::string> arguments) const {
        return runProcess(inspectCommand(std::move(arguments)));
    }

    /// Artefacts of every kind, written and stapled, or not.
    std::vector<std::string> artefacts(bool stapled) {
        std::vector<std::string> paths{bundle};
        if (stapled) stapleByHand(ticket());
        for (const Artefact& one : {signedImage(), unsignedImage(), signedPackage()}) {
            paths.push_back(directory / ("builds/" + one.name));
            writeFile(paths.back(), stapled ? one.stapledWith(sealed(one.payload())) : one.contents);
        }
        return paths;
    }
};

TEST_F(Inspect, FindsNoFaultInStapledArtefacts) {
    for (const Artefact& one : {signedImage(), unsignedImage(), signedPackage()}) {
        const Artefact written = writeArtefact(one, directory / ("builds/" + one.name));
        serveTicket(sealed(written.payload()));
        ASSERT_EQ(pinwell({"staple", written.path}).exitStatus, 0);
        EXPECT_THAT(inspect({written.path}),
                    Ended(0, AllOf(Contains(written.path), Contains(kGood),
                                   Contains("  Record        2/" + written.prettyHash()))));
    }
    serveTicket(ticket());
    ASSERT_EQ(staple().exitStatus, 0);
    EXPECT_THAT(inspect({bundle}), Ended(0, Contains(kGood)));
    EXPECT_THAT(inspect({ticketPath()}),
                Ended(0, Contains("  The ticket is genuine and is not marked revoked.")));
}

TEST_F(Inspect, ReadsTheSameFileWithAnySlashesAndDotsAfterItsName) {
    const std::vector<std::string> paths = artefacts(true);
    for (const std::string& path : paths)
        for (const char* ending : {"/", "//", "/.", "/./"})
            EXPECT_EQ(inspect({path + ending}).exitStatus, 0) << path << ending;
}

TEST_F(Inspect, EndsWith65WithoutAGoodTicket) {
    for (const std::string& path : artefacts(false))
        EXPECT_THAT(inspect({path}), Ended(65, Contains("  No ticket is stapled to this file.")));
    stapleByHand(revokedTicket());
    EXPECT_THAT(inspect({bundle}),
                Ended(65, Contains("  The ticket is genuine, and it marks the software as revoked.")));
    stapleByHand(ticketForOthers());
    EXPECT_THAT(inspect({bundle}),
                Ended(65, Contains("  The ticket is genuine, but it does not list this file.")));
}

TEST_F(Inspect, EndsWith66IfTheFileCannotBeInspected) {
    EXPECT_THAT(inspect({directory / "builds/missing"}),
                Ended(66, Contains(StartsWith("  The path cannot be read"))));
    EXPECT_THAT(inspect({directory / "builds"}),
                Ended(66, Contains("  This is nothing that carries a ticket.")));
}

TEST_F(Inspect, OfSeveralPathsTheWorstDecides) {
    stapleByHand(ticket());
    const Artefact image = writeArtefact(signedImage(), directory / "builds/Signed.dmg");
    const std::string missing = directory / "builds/missing";
    EXPECT_EQ(inspect({bundle, bundle}).exitStatus, 0);
    EXPECT_EQ(inspect({image.path, bundle}).exitStatus, 65);
    EXPECT_EQ(inspect({missing, image.path, bundle}).exitStatus, 66);
    EXPECT_THAT(inspect({bundle, missing, image.path}).outputLines(),
                AllOf(Contains(bundle), Contains(missing), Contains(image.path)));
}

TEST_F(Inspect, WrongUsageHasItsOwnStatus) {
    for (const std::vector<std::string>& arguments :
         {std::vector<std::string>{}, {"--nonsense"}, {"--json"}, {"--nonsense", bundle}}) {
        const ProcessResult result = inspect(arguments);
        EXPECT_EQ(result.exitStatus, 64);
        EXPECT_THAT(result.output, IsEmpty());
        EXPECT_THAT(result.errors, StartsWith("pinwell-inspect: "));
    }
    EXPECT_THAT(inspect({"--help"}), Ended(0, Contains(HasSubstr("--json"))));
    EXPECT_THAT(
        inspect({"--version"}),
        Ended(0,
              Contains(testing::MatchesRegex("pinwell-inspect 34.0 \\(commit .+, OpenSSL 3.+, curl .+\\)"))));
}

TEST_F(Inspect, AnOutputThatCannotBeWrittenIsAnError) {
    Command full = inspectCommand({bundle});
    full.output = Output::full;
    EXPECT_EQ(runProcess(full).exitStatus, 74);
}

TEST_F(Inspect, SendsNoRequest) {
    const std::vector<std::string> paths = artefacts(true);
    service();
    EXPECT_EQ(inspect(paths).exitStatus, 0);
    EXPECT_THAT(service().requests(), IsEmpty());
    contact("dead.invalid");
    EXPECT_EQ(inspect(paths).exitStatus, 0);
    writePlatformSettings("this is no JSON");
    EXPECT_EQ(inspect(paths).exitStatus, 0);
}

TEST_F(Inspect, ChangesNothingAndNeedsNoRightToWrite) {
    for (const std::string& path : artefacts(true)) {
        const std::string file = path == bundle ? ticketPath() : path;
        setMode(file, 0444);
        const struct stat before = statusOf(file);
        const std::string contents = readFile(file);
        EXPECT_THAT(inspect({path}), Ended(0, Contains(kGood)));
        const struct stat after = statusOf(file);
        EXPECT_EQ(readFile(file), contents);
        EXPECT_EQ(after.st_ino, before.st_ino);
        EXPECT_EQ(after.st_size, before.st_size);
        EXPECT_EQ(after.st_mode, before.st_mode);
        EXPECT_EQ(after.st_mtim.tv_sec, before.st_mtim.tv_sec);
        EXPECT_EQ(after.st_mtim.tv_nsec, before.st_mtim.tv_nsec);
        EXPECT_EQ(after.st_ctim.tv_sec, before.st_ctim.tv_sec);
        EXPECT_EQ(after.st_ctim.tv_nsec, before.st_ctim.tv_nsec);
    }
    EXPECT_THAT(temporaryFiles(), IsEmpty());
    EXPECT_THAT(namesBelow(directory / "home"), IsEmpty());
}

TEST_F(Inspect, ShowsTheRestOfADamagedTicket) {
    Data damaged = ticket();
    damaged[0] = std::byte{'S'};
    stapleByHand(damaged);
    EXPECT_THAT(inspect({bundle}),
                Ended(65, AllOf(Contains(HasSubstr("does not begin with its magic")),
                                Contains("  Chain         trusted"), Contains(HasSubstr("(this file)")),
                                Contains("  The first fault is at offset 0 of the ticket."))));
}

TEST_F(Inspect, JsonKeepsToItsSchemaOnEveryOutcome) {
    std::vector<std::string> paths = artefacts(true);
    paths.push_back(ticketPath());
    paths.push_back(directory / "builds/missing");
    paths.push_back(directory / "builds");
    Data damaged = ticketForOthers();
    damaged[9] ^= std::byte{1};
    paths.push_back(directory / "builds/damaged.ticket");
    writeFile(paths.back(), damaged);
    paths.push_back(directory / "builds/short.ticket");
    writeFile(paths.back(), "s8ch");
    paths.push_back(directory / "builds/Not.dmg");
    writeFile(paths.back(), std::string(700, 'x'));
    std::vector<std::string> arguments = paths;
    arguments.insert(arguments.begin(), "--json");
    const ProcessResult result = inspect(arguments);
    EXPECT_EQ(result.exitStatus, 66);
    ASSERT_THAT(result.outputLines(), SizeIs(paths.size()));
    for (const std::string& line : result.outputLines()) expectConforms(line, INSPECT_SCHEMA);
}

TEST_F(Inspect, TheSchemaRefusesOtherObjects) {
    const std::string refusals =
        refusalsOf({{"object", R"({"format":"pinwell-inspect","version":1})"}}, INSPECT_SCHEMA);
    EXPECT_THAT(refusals, testing::HasSubstr(refusalOf("object")));
}

TEST_F(Inspect, ColoursATerminalUnlessAskedNotTo) {
    stapleByHand(ticket());
    const auto onTerminal = [&](const std::string& options, const Environment& more) {
        Command made = command(
            {"-q", "-e", "-c", std::string(PINWELL_INSPECT_PROGRAM) + options + " " + bundle, "/dev/null"});
        made.executable = "/usr/bin/script";
        made.environment.insert(more.begin(), more.end());
        made.environment.insert({"SHELL", "/bin/sh"});
        const ProcessResult result = runProcess(made);
        EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
        std::string text;
        for (const char c : result.output)
            if (c != '\r') text += c;
        return text;
    };
    const std::string plain = inspect({bundle}).output;
    EXPECT_THAT(plain, Not(HasSubstr("\x1b")));
    EXPECT_THAT(onTerminal("", {{"TERM", "xterm"}}), HasSubstr("\x1b["));
    EXPECT_EQ(onTerminal("", {{"TERM", "xterm"}, {"NO_COLOR", "1"}}), plain);
    EXPECT_EQ(onTerminal("", {{"TERM", "dumb"}}), plain);
    EXPECT_EQ(onTerminal(" --json", {{"TERM", "xterm"}}), inspect({"--json", bundle}).output);
}

}  // namespace
}  // namespace pinwell::test
