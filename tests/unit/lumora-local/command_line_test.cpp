#include <gtest/gtest.h>

#include <filesystem>

#include "running_service.h"
#include "support/environment.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::readFile;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using test::Outcome;
using test::runProgram;

/// One line, with the program's name, and an empty standard output.
void expectFailure(const Outcome& outcome, int exitStatus) {
    EXPECT_EQ(outcome.exitStatus, exitStatus) << outcome.err;
    EXPECT_EQ(outcome.out, "");
    EXPECT_TRUE(outcome.err.starts_with("lumora-local: ")) << outcome.err;
    EXPECT_EQ(outcome.err.find('\n'), outcome.err.size() - 1) << outcome.err;
}

class CommandLine : public testing::Test {
  protected:
    const TemporaryDirectory directory_;
    const std::string service_ = directory_ / "service";
};

TEST_F(CommandLine, ShowsHelpAndVersion) {
    EXPECT_EQ(runProgram({"--help"}).exitStatus, 0);
    EXPECT_NE(runProgram({"--help"}).out.find("issue"), std::string::npos);
    EXPECT_NE(runProgram({"serve", "--help"}).out.find("--ready-file"), std::string::npos);
    const Outcome version = runProgram({"--version"});
    EXPECT_EQ(version.exitStatus, 0);
    EXPECT_TRUE(version.out.starts_with("lumora-local ")) << version.out;
}

TEST_F(CommandLine, RefusesUnknownWords) {
    for (const std::vector<std::string>& arguments : {std::vector<std::string>{},
                                                      {"dance"},
                                                      {"init"},
                                                      {"init", service_, "--color"},
                                                      {"issue", service_},
                                                      {"revoke", service_},
                                                      {"issue", service_, "a", "--reinstate"},
                                                      {"issue", service_, "a", "--label", "b"},
                                                      {"revoke", service_, "a", "--reason", "boredom"},
                                                      {"log", service_, "--since", "yesterday"},
                                                      {"log", service_, "--head", std::string(64, '0')},
                                                      {"log", service_, "--verify", "--head", "abc"},
                                                      {"init", service_, "--port", "0"},
                                                      {"init", service_, "--port", "65536"},
                                                      {"init", service_, "--port", "x"},
                                                      {"init", service_, "--host", "a b"},
                                                      {"init", service_, "--host", "0.0.0.0"},
                                                      {"list", service_, "--environment", "staging"},
                                                      {"serve", service_, "--listen", "nowhere:x"}}) {
        expectFailure(runProgram(arguments), 64);
    }
    EXPECT_FALSE(std::filesystem::exists(service_));
}

TEST_F(CommandLine, SuggestsTheNearestCommandOrOption) {
    EXPECT_EQ(runProgram({"isue", service_}).err,
              "lumora-local: unknown command isue; did you mean issue?\n");
    EXPECT_EQ(runProgram({"issue", service_, "a", "--asett"}).err,
              "lumora-local: unknown option --asett; did you mean --asset?\n");
    EXPECT_EQ(runProgram({"frobnicate"}).err, "lumora-local: unknown command frobnicate\n");
    EXPECT_EQ(runProgram({"list", service_, "more"}).err, "lumora-local: unexpected argument more\n");
}

TEST_F(CommandLine, EscapesRepeatedInput) {
    const Outcome outcome = runProgram({"init", service_, "--host", "a\x1b[31m\nb"});
    expectFailure(outcome, 64);
    EXPECT_EQ(outcome.err.find('\x1b'), std::string::npos);
}

TEST_F(CommandLine, RefusesToMakeAServiceTwice) {
    const Outcome made =
        runProgram({"init", service_, "--host", "tickets.example", "--host", "::1", "--port", "99"});
    EXPECT_EQ(made.exitStatus, 0) << made.err;
    EXPECT_NE(made.out.find("PINWELL_PLATFORM=" + service_ + "/platform"), std::string::npos) << made.out;
    EXPECT_EQ(readFile(service_ + "/platform/platform.json"),
              "{\"lumora\":{\"host\":\"tickets.example:99\"}}\n");
    expectFailure(runProgram({"init", service_}), 73);
}

/// A service with one record, which a test can issue and revoke without an artefact.
class RecordCommands : public CommandLine {
  protected:
    RecordCommands() { EXPECT_EQ(runProgram({"init", service_}).exitStatus, 0); }

    Outcome issueRecord(std::vector<std::string> options = {}) {
        options.insert(options.begin(), {"issue", service_, "--record", record_, "--label", "huge.dmg"});
        return runProgram(options);
    }

    const std::string record_ = "2/2/00112233445566778899aabbccddeeff00112233";
};

TEST_F(RecordCommands, IssueForARemoteArtefact) {
    const Outcome issued = issueRecord({"--json"});
    ASSERT_EQ(issued.exitStatus, 0) << issued.err;
    const auto document = values::parseJSON(base::asBytes(issued.out));
    ASSERT_TRUE(document) << issued.out;
    EXPECT_EQ(*(*document)["records"][0]["recordName"].string(), record_);
    EXPECT_EQ(*(*document)["records"][0]["label"].string(), "huge.dmg");
}

TEST_F(RecordCommands, DoNotReinstateByDefault) {
    issueRecord();
    EXPECT_EQ(runProgram({"revoke", service_, record_, "--reason", "compromised"}).exitStatus, 0);
    const Outcome refused = issueRecord();
    expectFailure(refused, 65);
    EXPECT_NE(refused.err.find(record_), std::string::npos) << refused.err;
    EXPECT_TRUE(runProgram({"list", service_}).out.starts_with("revoked\t"));
    EXPECT_EQ(issueRecord({"--reinstate", "--comment", "a false alarm"}).exitStatus, 0);
    EXPECT_TRUE(runProgram({"list", service_}).out.starts_with("valid\t"));
}

TEST_F(RecordCommands, AreLogged) {
    issueRecord();
    runProgram({"revoke", service_, record_, "--reason", "compromised", "--comment", "key lost"});
    const Outcome log = runProgram({"log", service_});
    EXPECT_NE(log.out.find("\tissued\t" + record_), std::string::npos) << log.out;
    EXPECT_NE(log.out.find("\tcompromised\tkey lost\n"), std::string::npos) << log.out;
    const Outcome head = runProgram({"log", "--head", service_});
    EXPECT_EQ(head.out.size(), 65U) << head.out;
    const std::string hash = head.out.substr(0, 64);
    EXPECT_EQ(runProgram({"log", service_, "--verify", "--head", hash}).exitStatus, 0);
    const Outcome other = runProgram({"log", service_, "--verify", "--head", std::string(64, 'a')});
    expectFailure(other, 78);
    EXPECT_EQ(runProgram({"log", service_, "--since", "2100-01-01"}).out, "");
    EXPECT_EQ(runProgram({"log", service_, "--record", "2/2/other", "--json"}).out, "{\"events\":[]}\n");
}

TEST_F(RecordCommands, FindTheServiceInTheEnvironment) {
    const pinwell::test::ScopedVariable directory("LUMORA_DIR", service_);
    EXPECT_EQ(runProgram({"issue", "--record", record_}).exitStatus, 0);
    EXPECT_EQ(runProgram({"revoke", record_}).exitStatus, 0);
    EXPECT_TRUE(runProgram({"list"}).out.starts_with("revoked\t"));
    EXPECT_TRUE(runProgram({"list", service_}).out.starts_with("revoked\t"));
    EXPECT_EQ(runProgram({"revoke", service_, record_}).exitStatus, 0);
}

TEST_F(CommandLine, RequiresAService) {
    expectFailure(runProgram({"list", service_}), 66);
    expectFailure(runProgram({"serve", service_}), 66);
    expectFailure(runProgram({"issue", service_, "a"}), 66);
    expectFailure(runProgram({"revoke", service_, "a"}), 66);
}

TEST_F(CommandLine, NamesArtefactsThatCannotBeIssued) {
    ASSERT_EQ(runProgram({"init", service_}).exitStatus, 0);
    writeFile(directory_ / "notes.txt", "nothing to sign");
    expectFailure(runProgram({"issue", service_, directory_ / "missing.app"}), 66);
    expectFailure(runProgram({"issue", service_, directory_ / "notes.txt"}), 65);
    EXPECT_EQ(runProgram({"list", service_}).out, "");
}

TEST_F(CommandLine, TakesANewcomerFromNothingToARevokedTicket) {
    ASSERT_EQ(runProgram({"init", service_}).exitStatus, 0);
    const Outcome sample = runProgram({"sample", directory_.path()});
    ASSERT_EQ(sample.exitStatus, 0) << sample.err;
    const std::string application = directory_ / "Sample.app";
    EXPECT_NE(sample.out.find(application + "\n"), std::string::npos) << sample.out;

    const Outcome issued = runProgram({"issue", service_, application});
    ASSERT_EQ(issued.exitStatus, 0) << issued.err;
    EXPECT_TRUE(issued.out.starts_with("valid\t2/2/")) << issued.out;
    EXPECT_TRUE(issued.out.ends_with("\t6\tSample.app\n")) << issued.out;  // two slices, thrice

    const Outcome revoked = runProgram({"revoke", service_, application});
    ASSERT_EQ(revoked.exitStatus, 0) << revoked.err;
    EXPECT_TRUE(revoked.out.starts_with("revoked\t2/2/")) << revoked.out;

    const Outcome list = runProgram({"list", service_, "--json"});
    const auto document = values::parseJSON(base::asBytes(list.out));
    ASSERT_TRUE(document) << list.out;
    EXPECT_EQ((*document)["records"].array()->size(), 1U);
    EXPECT_TRUE((*document)["records"][0]["revoked"].boolValue());
    expectFailure(runProgram({"sample", directory_.path()}), 73);
}

}  // namespace
}  // namespace pinwell::lumora
