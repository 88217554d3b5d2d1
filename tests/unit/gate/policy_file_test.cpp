// Policy files with their authors' mistakes.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <filesystem>

#include "gate/policy.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using gate::Policy;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

class PolicyFile : public testing::Test {
  protected:
    Policy read(std::string_view text) const {
        writeFile(path, text);
        return *gate::readPolicyFile(path);
    }

    /// The complaint about the file; empty if it can be read.
    std::string fault() const {
        const auto policy = gate::readPolicyFile(path);
        return policy ? std::string() : policy.error().localizedFailureReason();
    }
    std::string faultOf(std::string_view text) const {
        writeFile(path, text);
        return fault();
    }
    testing::Matcher<std::string> atLine(int line, const std::string& what) const {
        return AllOf(StartsWith(path + ":" + std::to_string(line) + ": "), HasSubstr(what));
    }

    const TemporaryDirectory directory;
    const std::string path = directory / "policy.toml";
};

TEST_F(PolicyFile, RequiresNothingIfItIsEmpty) {
    for (const char* const text : {"", "\n\n", "# a remark\n", "\xEF\xBB\xBF"}) {
        const Policy policy = read(text);
        EXPECT_FALSE(policy.maximumTicketAge);
        EXPECT_THAT(policy.teams, IsEmpty());
        EXPECT_THAT(policy.identifiers, IsEmpty());
        EXPECT_FALSE(policy.requiresSecureTimestamp);
    }
}

TEST_F(PolicyFile, HasAKeyForEachOption) {
    const Policy policy = read(
        "max-ticket-age = \"90d\"\r\nrequire-team = \"A\"\nrequire-identifier = ['com.*', \"org.*\"]\n"
        "require-secure-timestamp = true\n");
    EXPECT_EQ(policy.maximumTicketAge, 90 * 86'400);
    EXPECT_THAT(policy.teams, ElementsAre("A"));
    EXPECT_THAT(policy.identifiers, ElementsAre("com.*", "org.*"));
    EXPECT_TRUE(policy.requiresSecureTimestamp);
}

TEST_F(PolicyFile, IsRefusedForUnknownKeys) {
    for (const char* const key :
         {"max-age = \"4d\"", "Max-Ticket-Age = \"4d\"", "[policy]\nrequire-team = \"A\"", "[[require-team]]",
          "max-ticket-age.x = \"4d\"", "\"\" = 1"})
        EXPECT_THAT(faultOf("\n" + std::string(key) + "\n"), StartsWith(path + ":2: ")) << key;
    EXPECT_THAT(faultOf("\nmax-age = \"4d\"\n"), atLine(2, "unknown key \"max-age\""));
}

TEST_F(PolicyFile, IsRefusedForValuesOfAnotherType) {
    for (const char* const value : {"90", "90.0", "true", "[\"90d\"]", "{}", "2026-11-22", "\"\"", "\"90\"",
                                    "\"-1d\"", "\" 90d\"", "\"1.5d\"", "\"99999999999999999999d\"", "inf"})
        EXPECT_THAT(faultOf("\n\nmax-ticket-age = " + std::string(value) + "\n"),
                    atLine(3, "must be an age in quotes"))
            << value;
    for (const char* const value :
         {"1", "\"\"", "[1]", "[[\"A\"]]", "[\"A\", \"\"]", "[]", "{ a = \"A\" }", "false"}) {
        EXPECT_THAT(faultOf("require-team = " + std::string(value) + "\n"), atLine(1, "require-team must "))
            << value;
        EXPECT_THAT(faultOf("require-identifier = " + std::string(value) + "\n"),
                    atLine(1, "require-identifier must "))
            << value;
    }
    for (const char* const value : {"1", "\"true\"", "[true]", "0.0"})
        EXPECT_THAT(faultOf("require-secure-timestamp = " + std::string(value) + "\n"),
                    atLine(1, "require-secure-timestamp must be true or false"))
            << value;
}

TEST_F(PolicyFile, IsRefusedForAKeyThatIsThereTwice) {
    EXPECT_THAT(faultOf("require-team = \"A\"\nrequire-team = \"B\"\n"), atLine(2, "require-team"));
}

TEST_F(PolicyFile, IsRefusedIfItIsNoToml) {
    for (const char* const text :
         {"{\"require-team\": \"A\"}", "require-team", "require-team = \"A", "require-team = \xFF",
          "\"\xC3\x28\" = 1", "require-team = \"\x01\"", "require-team = \"A\" require-identifier = \"B\""})
        EXPECT_THAT(faultOf(text), StartsWith(path + ":1: ")) << text;
    EXPECT_THAT(faultOf(std::string_view("require-team = \"A\"\n\0", 20)), StartsWith(path + ":2: "));
}

TEST_F(PolicyFile, ReportsOneLineForAnyName) {
    const std::string said = faultOf("\"a\\nb\\u001b\" = 1\n");
    EXPECT_THAT(said, testing::Not(HasSubstr("\n")));
    EXPECT_THAT(said, testing::Not(HasSubstr("\x1b")));
}

TEST_F(PolicyFile, IsRefusedIfItCannotBeRead) {
    EXPECT_THAT(fault(), AllOf(StartsWith(path + ": "), HasSubstr("No such file")));
    std::filesystem::create_directory(path);
    EXPECT_THAT(fault(), AllOf(StartsWith(path + ": "), HasSubstr("directory")));
    std::filesystem::remove(path);
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    EXPECT_THAT(fault(), StartsWith(path + ": "));
}

// The parser makes a table for each part of a dotted key, and frees them by recursion.
TEST_F(PolicyFile, IsRefusedIfItIsHugeOrDeep) {
    EXPECT_THAT(faultOf(std::string(gate::kMaximumPolicyFile, '\n')), IsEmpty());
    EXPECT_THAT(faultOf(std::string(gate::kMaximumPolicyFile + 1, '\n')), StartsWith(path + ": "));
    std::string dotted = "a";
    while (dotted.size() + 16 < gate::kMaximumPolicyFile) dotted += ".a";
    EXPECT_THAT(faultOf(dotted + " = 1\n"), StartsWith(path + ":1: "));
    EXPECT_THAT(faultOf("[" + dotted + "]\n"), StartsWith(path + ":1: "));
    EXPECT_THAT(faultOf("a = {" + dotted + " = 1}\n"), StartsWith(path + ":1: "));
    EXPECT_THAT(faultOf("a = " + std::string(gate::kMaximumPolicyFile - 5, '[') + "\n"),
                StartsWith(path + ":1: "));
    // The deepest possible form: inline tables of keys with the highest number of parts.
    std::string tables;
    for (int i = 0; i < 300; ++i) tables += "{a.a.a.a = ";
    EXPECT_THAT(faultOf("a = " + tables + "\n"), StartsWith(path + ":1: "));
}

TEST_F(PolicyFile, MayHoldDotsInStringsAndRemarks) {
    const Policy policy = read(
        R"toml(# ..........
require-identifier = ["a.b.c.d.e.f", 'a.b.c.d.e\', """a.
.b\".c.d.e"""""] # .....
require-team = '''......'''
)toml");
    EXPECT_THAT(policy.identifiers, ElementsAre("a.b.c.d.e.f", "a.b.c.d.e\\", "a.\n.b\".c.d.e\"\""));
    EXPECT_THAT(policy.teams, ElementsAre("......"));
    EXPECT_THAT(faultOf("require-team = \"\"\"a\nb\"\"\"\na.a.a.a.a = 1\n"),
                atLine(3, "a key of more than 4 parts"));
}

}  // namespace
}  // namespace pinwell::test
