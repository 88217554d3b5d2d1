// The real programs, with foreign code in the middle of a parser: its attempts fail, and the run ends
// normally. Also kernels that cannot confine the programs, and parsers that run away.
#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <map>
#include <sstream>
#include <string>

#include "local_service.h"
#include "support/file_properties.h"
#include "support/process.h"

namespace pinwell::test {
namespace {

using testing::AnyOf;
using testing::Contains;
using testing::Not;
using Attempts = std::map<std::string, int>;  // by name, with the errno of each

class Intruded : public LocalServiceTest {
  protected:
    void SetUp() override {
        if (programsAreSanitized()) GTEST_SKIP() << "a sanitized program takes no library before its own";
        if (syscall(SYS_landlock_create_ruleset, nullptr, 0, 1) < 4)
            GTEST_SKIP() << "this kernel has no Landlock that knows TCP";
        writeFile(secret, kSecret);
        writeFile(secret + ".old", kSecret);
        writeFile(log, "");
    }

    // The same run with the intruder in it.
    Command intruded(Command run, const std::string& does) const {
        run.environment["LD_PRELOAD"] = INTRUDER_LIBRARY;
        run.environment["INTRUDER_DOES"] = does;
        run.environment["INTRUDER_LOG"] = log;
        run.environment["INTRUDER_SECRET"] = secret;
        return run;
    }

    Command program(const char* executable, std::vector<std::string> arguments) const {
        Command run = command(std::move(arguments));
        run.executable = executable;
        return run;
    }

    Attempts attempts() const {
        Attempts found;
        std::istringstream lines(readFile(log));
        std::string name;
        for (int reason = 0; lines >> name >> reason;) found[name] = reason;
        return found;
    }

    Attempts attemptsIn(const Command& run) const {
        const ProcessResult result = runProcess(intruded(run, "attempts"));
        EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
        return attempts();
    }

    void expectHarmless(const Attempts& attempts) const {
        ASSERT_EQ(attempts.size(), 10U);
        for (const char* const file : {"read", "write", "make", "remove"})
            EXPECT_THAT(attempts.at(file), AnyOf(EACCES, EPERM, ENOSYS)) << file;
        for (const char* const call : {"exec", "ptrace", "mount", "kill", "packets"})
            EXPECT_THAT(attempts.at(call), AnyOf(EPERM, ENOSYS)) << call;
        EXPECT_EQ(readFile(secret), kSecret);
        EXPECT_EQ(readFile(secret + ".old"), kSecret);
        EXPECT_FALSE(std::filesystem::exists(secret + ".new"));
    }

    void expectHarmlessWithoutNetwork(const Attempts& attempts) const {
        expectHarmless(attempts);
        EXPECT_THAT(attempts.at("udp"), AnyOf(EPERM, ENOSYS));
    }

    const std::string& application() const { return samples.front(); }

    void issueAndServe() {
        record("issue", {application()});
        serveRecords();
    }
    void staple() const {
        const ProcessResult result = pinwell({"staple", application()});
        ASSERT_EQ(result.exitStatus, 0) << result.output;
    }

    static constexpr const char* kSecret = "a file that nobody gave to the program";
    const std::string secret = directory / "elsewhere/secret";
    const std::string log = directory / "log/attempts";
};

using ConfinedParser = Intruded;

// Without confinement, the attempts succeed.
TEST_F(ConfinedParser, IsTheReasonWhyTheIntruderFails) {
    issueAndServe();
    Command run = intruded(command({"staple", application()}), "attempts");
    run.environment["LD_PRELOAD"] += std::string(":") + KERNEL_WITHOUT_LIBRARY;
    run.environment["KERNEL_WITHOUT"] = "landlock seccomp";
    EXPECT_EQ(runProcess(run).exitStatus, 0);
    const Attempts found = attempts();
    ASSERT_EQ(found.size(), 10U);
    for (const char* const attempt : {"read", "write", "make", "remove", "kill", "udp"})
        EXPECT_EQ(found.at(attempt), 0) << attempt;
    EXPECT_EQ(found.at("exec"), ENOENT);
    EXPECT_EQ(found.at("ptrace"), ESRCH);
}

TEST_F(ConfinedParser, OfAStapleDoesNoHarm) {
    issueAndServe();
    expectHarmless(attemptsIn(command({"staple", application()})));
    EXPECT_EQ(pinwell({"validate", application()}).exitStatus, 0);
}

TEST_F(ConfinedParser, OfAValidationDoesNoHarm) {
    issueAndServe();
    staple();
    expectHarmless(attemptsIn(command({"validate", application()})));
}

TEST_F(ConfinedParser, OfAnInspectionDoesNoHarmAndHasNoNetwork) {
    issueAndServe();
    staple();
    expectHarmlessWithoutNetwork(attemptsIn(program(PINWELL_INSPECT_PROGRAM, {application()})));
}

TEST_F(ConfinedParser, OfTheGateDoesNoHarm) {
    issueAndServe();
    staple();
    expectHarmless(attemptsIn(program(PINWELL_GATE_PROGRAM, {application()})));
    writeFile(log, "");
    expectHarmlessWithoutNetwork(attemptsIn(program(PINWELL_GATE_PROGRAM, {"--offline", application()})));
}

TEST_F(ConfinedParser, OfABatchDoesNoHarm) {
    issueAndServe();
    expectHarmless(attemptsIn(program(PINWELL_BATCH_PROGRAM, {"staple", application()})));
}

TEST_F(ConfinedParser, OfABatchOverAListStartsNothingAndLooksIntoNoProcess) {
    issueAndServe();
    writeFile(directory / "list", application() + "\n");
    const Attempts found =
        attemptsIn(program(PINWELL_BATCH_PROGRAM, {"staple", "--from", directory / "list"}));
    for (const char* const call : {"exec", "ptrace", "mount", "kill", "packets"})
        EXPECT_THAT(found.at(call), AnyOf(EPERM, ENOSYS)) << call;
}

TEST_F(ConfinedParser, OfTicketFilesDoesNoHarm) {
    issueAndServe();
    staple();
    expectHarmlessWithoutNetwork(attemptsIn(program(PINWELL_TICKET_PROGRAM, {"hash", application()})));
    writeFile(log, "");
    expectHarmlessWithoutNetwork(attemptsIn(
        program(PINWELL_TICKET_PROGRAM, {"extract", application(), "-o", directory / "tmp/one.ticket"})));
    writeFile(log, "");
    expectHarmlessWithoutNetwork(attemptsIn(program(
        PINWELL_TICKET_PROGRAM, {"attach", "--ticket", directory / "tmp/one.ticket", application()})));
    writeFile(log, "");
    expectHarmless(attemptsIn(
        program(PINWELL_TICKET_PROGRAM, {"fetch", "--out", directory / "tmp/tickets", application()})));
}

TEST_F(ConfinedParser, OfARequestDoesNoHarm) {
    record("client-certificate", {"ci.example", "--out", directory / "client"});
    // Nobody listens on port 1: the program reads artefacts first.
    const ProcessResult result = runProcess(
        intruded(program(PINWELL_TICKET_PROGRAM,
                         {"request", "--url", "https://127.0.0.1:1", "--cert",
                          directory / "client/client.pem", "--key", directory / "client/client.key", "--out",
                          directory / "tmp/tickets", "--retries", "0", application()}),
                 "attempts"));
    EXPECT_EQ(result.exitStatus, 68) << result.output << result.errors;
    expectHarmless(attempts());
}

TEST_F(ConfinedParser, OfAnIssueDoesNoHarmAndHasNoNetwork) {
    expectHarmlessWithoutNetwork(attemptsIn(lumoraCommand({"issue", serviceDirectory, application()})));
    expectHarmlessWithoutNetwork(attemptsIn(lumoraCommand({"revoke", serviceDirectory, application()})));
}

TEST_F(ConfinedParser, OfTheServiceDoesNoHarmAndOpensNoConnection) {
    record("issue", {application()});
    Command serve =
        intruded(lumoraCommand({"serve", serviceDirectory, "--listen", "127.0.0.1:0", "--update-platform"}),
                 "attempts");
    serve.environment["INTRUDER_READS_TLS"] = "1";
    serving = std::make_unique<RunningProcess>(serve);
    ASSERT_TRUE(serving->waitForLine("ready at https://127.0.0.1:"));
    staple();
    expectHarmlessWithoutNetwork(attempts());
}

// A renewal writes new files beside the old ones, and links to them.
TEST_F(LocalServiceTest, ReadsACertificateAgainWhoseLinksLeadElsewhereByThen) {
    namespace fs = std::filesystem;
    fs::create_directories(directory / "archive");
    fs::create_directories(directory / "live");
    const auto renew = [&](const std::string& number) {
        for (const std::string name : {"server.pem", "server.key"}) {
            const std::string link = directory / ("live/" + name);
            fs::remove(link);
            fs::create_symlink("../archive/" + number + name, link);
        }
    };
    for (const std::string name : {"server.pem", "server.key"}) {
        const std::string file = serviceDirectory + "/service/" + name;
        fs::copy_file(file, directory / ("archive/1" + name));
        fs::remove(file);
        fs::create_symlink(directory / ("live/" + name), file);
    }
    renew("1");
    serveRecords();
    for (const std::string name : {"server.pem", "server.key"})
        fs::copy_file(directory / ("archive/1" + name), directory / ("archive/2" + name));
    renew("2");
    for (const std::string name : {"1server.pem", "1server.key"}) fs::remove(directory / ("archive/" + name));
    serving->sendSignal(SIGHUP);
    EXPECT_TRUE(serving->waitForLine("read the certificate and the key again"))
        << serving->resultSoFar().errors;
}

class KernelWithoutConfinement : public Intruded {
  protected:
    ProcessResult runWithout(const std::string& missing, Command run) const {
        run.environment["LD_PRELOAD"] = KERNEL_WITHOUT_LIBRARY;
        run.environment["KERNEL_WITHOUT"] = missing;
        return runProcess(run);
    }

    static constexpr const char* kNoLandlock = "Landlock is not in force: Function not implemented";
    static constexpr const char* kNoSeccomp = "seccomp is not in force: the kernel refuses it";
};

TEST_F(KernelWithoutConfinement, RunsNormallyAndReportsItIfVerbose) {
    issueAndServe();
    const auto noisy = runWithout("landlock seccomp", command({"staple", "-v", application()}));
    EXPECT_EQ(noisy.exitStatus, 0);
    EXPECT_THAT(noisy.outputLines(), Contains(std::string(kNoLandlock) + "."));
    EXPECT_THAT(noisy.outputLines(), Contains(std::string(kNoSeccomp) + "."));

    const auto quiet = runWithout("landlock seccomp", command({"validate", application()}));
    EXPECT_EQ(quiet.exitStatus, 0);
    EXPECT_THAT(quiet.output, Not(testing::HasSubstr("in force")));
}

TEST_F(KernelWithoutConfinement, NamesTheMissingFacility) {
    issueAndServe();
    const auto files = runWithout("landlock", command({"staple", "-v", application()}));
    EXPECT_EQ(files.exitStatus, 0);
    EXPECT_THAT(files.outputLines(), Contains(std::string(kNoLandlock) + "."));
    EXPECT_THAT(files.output, Not(testing::HasSubstr("seccomp")));
    const auto calls = runWithout("seccomp", command({"validate", "-v", application()}));
    EXPECT_EQ(calls.exitStatus, 0);
    EXPECT_THAT(calls.outputLines(), Contains(std::string(kNoSeccomp) + "."));
    EXPECT_THAT(calls.output, Not(testing::HasSubstr("Landlock")));
}

TEST_F(KernelWithoutConfinement, LetsTheOtherProgramsRunToo) {
    issueAndServe();
    staple();
    for (const Command& run :
         {program(PINWELL_INSPECT_PROGRAM, {application()}), program(PINWELL_GATE_PROGRAM, {application()}),
          program(PINWELL_BATCH_PROGRAM, {"validate", application()}),
          program(PINWELL_TICKET_PROGRAM, {"hash", application()}),
          lumoraCommand({"issue", serviceDirectory, application()})}) {
        const ProcessResult result = runWithout("landlock seccomp", run);
        EXPECT_EQ(result.exitStatus, 0) << run.executable << result.errors;
        EXPECT_EQ(result.errors, "") << run.executable;
    }
    const auto batch =
        runWithout("landlock", program(PINWELL_BATCH_PROGRAM, {"validate", "-v", application()}));
    EXPECT_THAT(batch.errors, testing::HasSubstr(kNoLandlock));
}

TEST_F(KernelWithoutConfinement, IsNamedByTheServiceOnce) {
    Command serve = lumoraCommand({"serve", serviceDirectory, "--listen", "127.0.0.1:0"});
    serve.environment["LD_PRELOAD"] = KERNEL_WITHOUT_LIBRARY;
    serve.environment["KERNEL_WITHOUT"] = "landlock";
    RunningProcess run(serve);
    ASSERT_TRUE(run.waitForLine("ready at "));
    run.sendSignal(SIGTERM);
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_EQ(result.errors, "lumora-local: " + std::string(kNoLandlock) + "\n");
}

class RunawayParser : public Intruded {
  protected:
    ProcessResult runaway(const Command& run, const std::string& does) const {
        Command with = intruded(run, does);
        with.environment.erase("INTRUDER_LOG");
        return runProcess(with);
    }
    std::string processing() const { return "Processing: " + application(); }
};

TEST_F(RunawayParser, OfTheToolEndsWithOneLineWhenItsProcessorTimeIsUsedUp) {
    const std::string line = "Gave up on " + application() + ": it takes too much processor time.";
    EXPECT_THAT(runaway(command({"staple", application()}), "work"),
                Ended(66, testing::ElementsAre(processing(), line)));
    EXPECT_THAT(runaway(command({"validate", "-q", application()}), "work"),
                Ended(66, testing::ElementsAre()));
}

TEST_F(RunawayParser, OfTheToolEndsWithOneLineWhenItsStackIsUsedUp) {
    const std::string line = "Gave up on " + application() + ": it is nested too deeply.";
    EXPECT_THAT(runaway(command({"staple", application()}), "fall"),
                Ended(66, testing::ElementsAre(processing(), line)));
}

TEST_F(RunawayParser, OfAStapledArtefactIsNoApproval) {
    issueAndServe();
    staple();
    EXPECT_THAT(runaway(command({"validate", application()}), "fall").exitStatus, AnyOf(65, 66));
}

TEST_F(RunawayParser, OfAnInspectionEndsWithOneLine) {
    const Command inspection = program(PINWELL_INSPECT_PROGRAM, {application()});
    const ProcessResult time = runaway(inspection, "work");
    EXPECT_EQ(time.exitStatus, 66);
    EXPECT_EQ(time.errors, "pinwell-inspect: gave up: it takes too much processor time\n");
    const ProcessResult stack = runaway(inspection, "fall");
    EXPECT_EQ(stack.exitStatus, 66);
    EXPECT_EQ(stack.errors, "pinwell-inspect: gave up: something is nested too deeply\n");
}

}  // namespace
}  // namespace pinwell::test
