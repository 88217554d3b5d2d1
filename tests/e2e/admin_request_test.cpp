// pinwell-ticket request against the real service: tickets, refusals and the log.
#include <csignal>
#include <stdexcept>

#include "admin_service.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::SizeIs;
using values::Value;

class AdminRequest : public AdminServiceTest {
  protected:
    AdminRequest() {
        admit("ci.example", R"("issue", "read")");
        admit("release.example", R"("issue", "revoke")");
        admit("reader.example", R"("read")");
        serve();
    }

    /// The output of a command as JSON.
    Value json(const std::string& command) const {
        const std::string text = lumora({command, serviceDirectory, "--json"}).output;
        const auto document = values::parseJSON(base::asBytes(text));
        if (!document) throw std::runtime_error(command + " printed no JSON: " + text);
        return *document;
    }

    /// The log's actions, with their actors.
    std::vector<std::string> log() const {
        const Value document = json("log");
        std::vector<std::string> lines;
        for (const Value& event : *document["events"].array())
            lines.push_back(*event["actor"].string() + " " + *event["action"].string());
        return lines;
    }

    /// The hashes of each record, in the order of the records.
    std::string hashes() const {
        const Value list = json("list");
        std::string all;
        for (const Value& record : *list["records"].array()) {
            all += *record["recordName"].string() + ":";
            for (const Value& one : *record["hashes"].array()) all += " " + *one["hash"].string();
            all += "\n";
        }
        return all;
    }
    std::vector<std::string> withSamples(std::vector<std::string> arguments) const {
        arguments.insert(arguments.end(), samples.begin(), samples.end());
        return arguments;
    }
};

TEST_F(AdminRequest, GetsTicketsThatStapleAndValidate) {
    const ProcessResult result = request("ci.example", samples);
    EXPECT_EQ(result.exitStatus, 0) << result.output << result.errors;
    EXPECT_THAT(result.outputLines(), AllOf(SizeIs(samples.size()), Each(HasSubstr("has been written to"))));
    EXPECT_EQ(ticketTool(withSamples({"attach", "--tickets", tickets})).exitStatus, 0);
    for (const std::string& sample : samples)
        EXPECT_EQ(pinwell({"validate", sample}).exitStatus, 0) << sample;
    EXPECT_THAT(log(), AllOf(SizeIs(samples.size()), Each(std::string("ci.example issued"))));
    EXPECT_THAT(request("ci.example", {"--json", samples[0]}).output, HasSubstr(R"("action":"reissued")"));
}

TEST_F(AdminRequest, RequestsTheHashesThatIssuingFinds) {
    ASSERT_EQ(request("ci.example", samples).exitStatus, 0);
    const std::string requested = hashes();
    record("issue", samples);
    EXPECT_EQ(hashes(), requested);
    EXPECT_EQ(linesOf(requested).size(), samples.size());
}

TEST_F(AdminRequest, IsRefusedAndLoggedForAClientWithoutTheRole) {
    const ProcessResult result = request("reader.example", {samples[0]});
    EXPECT_EQ(result.exitStatus, 65);
    EXPECT_THAT(result.output, HasSubstr("403 (forbidden): access.toml does not give reader.example the role "
                                         "issue (notIssued)"));
    EXPECT_THAT(log(), ElementsAre("reader.example refused"));
}

TEST_F(AdminRequest, ReinstatesARevokedRecordOnlyForAClientThatMayRevoke) {
    ASSERT_EQ(request("ci.example", {samples[0]}).exitStatus, 0);
    record("revoke", {samples[0]});
    const ProcessResult plain = request("ci.example", {samples[0]});
    EXPECT_EQ(plain.exitStatus, 77);
    EXPECT_THAT(plain.output, HasSubstr("409 (conflict)"));
    const std::vector<std::string> reinstate{"--reinstate", "--comment", "a false alarm", samples[0]};
    EXPECT_EQ(request("ci.example", reinstate).exitStatus, 65);
    EXPECT_EQ(pinwell({"staple", samples[0]}).exitStatus, 77);
    EXPECT_EQ(request("release.example", reinstate).exitStatus, 0);
    EXPECT_EQ(pinwell({"staple", samples[0]}).exitStatus, 0);
    EXPECT_EQ(log().back(), "release.example reinstated");
}

TEST_F(AdminRequest, EndsWith68ForAClientOfAnotherAuthority) {
    ChainFields fields = ServerChain("ci.example");
    fields.leaf.subject = commonName("ci.example");
    fields.leaf.extendedKeyUsage = "clientAuth";
    const IssuedChain stranger = fields.issue();
    writeFile(clientFile("ci.example", "client.pem"), stranger.serverPem());
    writeFile(clientFile("ci.example", "client.key"), stranger.leaf.key.pem());
    const ProcessResult result = request("ci.example", {"--retries", "1", samples[0]});
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(log(), testing::IsEmpty());
}

TEST_F(AdminRequest, EndsWith68IfTheServiceIsDown) {
    serving->sendSignal(SIGTERM);
    serving->wait();
    const ProcessResult result = request("ci.example", withSamples({"--json", "--retries", "1"}));
    EXPECT_EQ(result.exitStatus, 68);
    EXPECT_THAT(result.outputLines(),
                AllOf(SizeIs(samples.size()), Each(HasSubstr(R"("cause":"unreachable")"))));
    EXPECT_THAT(result.outputLines().front(), HasSubstr(R"("attempts":2)"));
    EXPECT_THAT(result.outputLines().back(), HasSubstr(R"("attempts":0)"));
}

}  // namespace
}  // namespace pinwell::test
