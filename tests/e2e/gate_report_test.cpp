// The reports of pinwell-gate for other programs: their schemas, their XML, and the place of their files.
#include <sys/stat.h>

#include <filesystem>
#include <map>

#include "gate_fixture.h"
#include "schema_validation.h"
#include "support/file_properties.h"
#include "values/json.h"
#include "values/value.h"
#include "values/xml_parser.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;
using values::Value;

class GateReport : public GateRun {
  protected:
    std::string reportIn(const std::string& format, const std::vector<std::string>& paths) const {
        const ProcessResult result = gate({"--format", format, "--offline"}, paths);
        EXPECT_THAT(result.errors, IsEmpty()) << format;
        return result.output;
    }

    /// Altered images with names that are special in a terminal, in XML, HTML, a URI or a message.
    std::vector<std::string> oddlyNamed() const {
        std::vector<std::string> paths;
        for (const char* const name :
             {"a<&\"'>.dmg", "new\nline.dmg", "\x1b[31mred\x7f.dmg", "\x01\xff\xc3\x28.dmg", "100%41 ?#:.dmg",
              "[link](https:example) {0} \\.dmg", "\xe2\x80\xaegmd.dmg", "\xef\xbf\xbe\xef\xbf\xbf.dmg",
              "<script>document.title='run'</script>.dmg"}) {
            paths.push_back(directory / ("odd/" + std::string(name)));
            std::filesystem::create_directories(std::filesystem::path(paths.back()).parent_path());
            std::filesystem::copy_file(image(), paths.back());
            flip(paths.back(), 0);
        }
        return paths;
    }

    /// Samples of every verdict of an offline run.
    std::vector<std::string> mixed() const {
        flip(application() + "/Contents/Resources/ReadMe.txt", 0);
        std::vector<std::string> paths = samples;
        paths.push_back(directory / "missing");
        return paths;
    }
};

const Value parsed(const std::string& text) {
    const auto document = values::parseJSON(base::asBytes(text));
    EXPECT_TRUE(document.has_value()) << text;
    return document ? *document : Value();
}

std::size_t countOf(const Value& list) {
    return list.array() == nullptr ? 0 : list.array()->size();
}

TEST_F(GateReport, ReportsInJson) {
    flip(application() + "/Contents/Resources/ReadMe.txt", 0);
    const ProcessResult result = gate({"--format", "json", "--offline"}, {image(), application()});
    EXPECT_EQ(result.exitStatus, 65);
    const auto document = values::parseJSON(base::asBytes(result.output));
    ASSERT_TRUE(document.has_value()) << result.output;
    EXPECT_EQ((*document)["version"].unsignedIntegerValue(), 1U);
    const auto* const results = (*document)["results"].array();
    ASSERT_NE(results, nullptr);
    ASSERT_EQ(results->size(), 2U);
    const auto text = [](const Value& value) {
        const std::string* const found = value.string();
        return found == nullptr ? std::string("no text") : *found;
    };
    EXPECT_EQ(text(results->at(0)["path"]), image());
    EXPECT_EQ(text(results->at(0)["verdict"]), "good");
    EXPECT_EQ(results->at(0)["exitStatus"].unsignedIntegerValue(), 0U);
    EXPECT_EQ(text(results->at(1)["path"]), application());
    EXPECT_EQ(text(results->at(1)["verdict"]), "altered");
    EXPECT_EQ(results->at(1)["exitStatus"].unsignedIntegerValue(), 65U);
    bool isNamed = false;
    for (const Value& one : *results) {
        const auto* const checks = one["checks"].array();
        ASSERT_NE(checks, nullptr);
        EXPECT_FALSE(checks->empty());
        for (const Value& check : *checks) {
            EXPECT_NE(check["name"].string(), nullptr);
            isNamed = isNamed || (text(check["name"]) == "sealed-file" &&
                                  text(check["place"]) == "Contents/Resources/ReadMe.txt" &&
                                  text(check["outcome"]) == "failed");
        }
    }
    EXPECT_TRUE(isNamed) << result.output;
}

TEST_F(GateReport, ReportsInTheFormsOfOthers) {
    flip(application() + "/Contents/Resources/ReadMe.txt", 0);
    const std::vector<std::pair<std::string, std::string>> forms{
        {"sarif", "\"2.1.0\""}, {"junit", "<testsuites"}, {"html", "<html"}};
    for (const auto& [form, part] : forms) {
        const ProcessResult result = gate({"--format", form, "--offline"}, samples);
        EXPECT_EQ(result.exitStatus, 65) << form;
        EXPECT_THAT(result.output, AllOf(HasSubstr(part), HasSubstr("Contents/Resources/ReadMe.txt")))
            << form;
        EXPECT_THAT(result.errors, IsEmpty()) << form;
    }
}

TEST_F(GateReport, ConformsToItsSchemaInJson) {
    for (const auto& paths : {mixed(), oddlyNamed()}) {
        const std::string report = reportIn("json", paths);
        expectConforms(report, GATE_SCHEMA);
        EXPECT_EQ(countOf(parsed(report)["results"]), paths.size());
    }
}

// tests/e2e/sarif.schema.json is our own wording of the standard. For the objects that pinwell-gate writes,
// it covers the required members, types, enumerations and limits. It does not cover other objects, nor the
// standard's rules in prose about the form of messages. There is no packaged validator for SARIF.
TEST_F(GateReport, ConformsToTheStandardInSarif) {
    for (const auto& paths : {mixed(), oddlyNamed()}) {
        const std::string report = reportIn("sarif", paths);
        expectConforms(report, SARIF_SCHEMA);
        EXPECT_GT(countOf(parsed(report)["runs"].array()->front()["results"]), 0U);
    }
}

TEST_F(GateReport, IsRefusedInSarifIfItDoesNotConform) {
    const std::string report = reportIn("sarif", mixed());
    const std::vector<std::pair<std::string, std::string>> changes{
        {"\"2.1.0\"", "\"2.0.0\""},
        {"\"level\": \"error\"", "\"level\": \"bad\""},
        {"\"driver\"", "\"drivers\""},
        {"\"name\": \"pinwell-gate\"", "\"name\": 1"},
        {"\"executionSuccessful\": true", "\"executionSuccessful\": \"true\""},
        {"\"exitCode\": 66", "\"exitCode\": 66.5"},
        {"\"exitCode\": 65", "\"exitCode\": 65.5"},
        {"\"ruleId\"", "\"rule\""},
        {"\"message\"", "\"messages\""},
        {"\"text\": \"", "\"text\": \"{0} "},
        {"\"uri\": \"", "\"uri\": \" "},
        {"utf16CodeUnits", "utf8"}};
    std::map<std::string, std::string> documents{{"unchanged", report}};
    for (std::size_t i = 0; i < changes.size(); ++i) {
        const auto& [from, to] = changes[i];
        const std::size_t at = report.find(from);
        if (at == std::string::npos) continue;
        std::string& document = documents["changed-" + std::to_string(i)] = report;
        document.replace(at, from.size(), to);
    }
    // Of the two exit codes, one; and the report as it is.
    EXPECT_EQ(documents.size(), changes.size());
    const std::string refusals = refusalsOf(documents, SARIF_SCHEMA);
    for (const auto& [name, document] : documents)
        EXPECT_EQ(refusals.find(refusalOf(name)) == std::string::npos, name == "unchanged") << name;
}

TEST_F(GateReport, NamesPathsInSarifByPercentEncoding) {
    const std::string report = reportIn("sarif", oddlyNamed());
    EXPECT_THAT(report,
                AllOf(HasSubstr("file://"), HasSubstr("/odd/new%0Aline.dmg\""),
                      HasSubstr("/odd/%01%FF%C3%28.dmg\""), HasSubstr("/odd/100%2541%20%3F%23%3A.dmg\"")));
}

TEST_F(GateReport, IsWellFormedXmlInJUnit) {
    const std::vector<std::string> paths = oddlyNamed();
    struct Suites : values::XMLEvents {
        void begin(std::string_view name, const values::XMLAttributes&) override {
            suites += name == "testsuite" ? 1U : 0U;
        }
        void end(std::string_view) override {}
        void text(std::string_view) override {}
        std::size_t suites = 0;
    } events;
    const std::string report = reportIn("junit", paths);
    values::XMLParser parser(events, values::XMLParser::DocumentType::refused);
    EXPECT_NO_THROW({
        parser.feed(base::asBytes(report));
        parser.finish();
    }) << report;
    EXPECT_EQ(events.suites, paths.size());
}

TEST_F(GateReport, HasNoControlCharactersInTextAndTheFormatsOfMarkup) {
    const std::vector<std::string> paths = oddlyNamed();
    for (const char* const format : {"text", "junit", "html"}) {
        const std::string report = reportIn(format, paths);
        for (const char c : report) {
            const auto byte = static_cast<unsigned char>(c);
            EXPECT_TRUE(c == '\n' || (byte >= 0x20 && byte != 0x7F)) << format << int{byte};
        }
        EXPECT_THAT(report, Not(HasSubstr("\nline.dmg"))) << format;
    }
    EXPECT_THAT(reportIn("html", paths), AllOf(Not(HasSubstr("<script")), Not(HasSubstr("\xe2\x80\xae"))));
}

// Files.

TEST_F(GateReport, GoesToAFile) {
    const std::string file = directory / "report.txt";
    EXPECT_THAT(gate({"--offline", "-o", file, image()}), Ended(0, IsEmpty()));
    EXPECT_EQ(readFile(file), gate({"--offline", image()}).output);
    // A shorter report replaces it.
    EXPECT_THAT(gate({"--offline", "-o", file, application(), image(), package()}), Ended(0, IsEmpty()));
    EXPECT_THAT(gate({"--offline", "-o", file, image()}), Ended(0, IsEmpty()));
    EXPECT_EQ(readFile(file), gate({"--offline", image()}).output);
    EXPECT_THAT(gate({"--offline", "-o", "-", image()}), Ended(0, testing::SizeIs(1)));
    const ProcessResult impossible = gate({"--offline", "-o", directory / "none/report", image()});
    EXPECT_EQ(impossible.exitStatus, 73);
    EXPECT_THAT(impossible.errors,
                AllOf(StartsWith("pinwell-gate: "), HasSubstr("No such file or directory")));
    EXPECT_EQ(gate({"--offline", "-o", directory.path(), image()}).exitStatus, 73);
}

TEST_F(GateReport, NeverReplacesAnArtefact) {
    const std::string before = readFile(image());
    makeLink(image(), directory / "link");
    std::filesystem::create_hard_link(image(), directory / "other name");
    for (const char* const option : {"-o", "--attest"}) {
        for (const std::string& file : {image(), directory / "link", directory / "other name"}) {
            const ProcessResult result = gate({"--offline", option, file, unsignedImage(), image()});
            EXPECT_EQ(result.exitStatus, 64) << option << file;
            EXPECT_THAT(result.errors, HasSubstr("would replace " + image())) << option << file;
            EXPECT_EQ(readFile(image()), before) << option << file;
        }
        EXPECT_EQ(gate({"--offline", "-r", option, image(), directory / "samples"}).exitStatus, 64) << option;
        EXPECT_EQ(readFile(image()), before) << option;
    }
}

TEST_F(GateReport, DoesNotGoIntoABundleThatIsJudged) {
    const std::string file = application() + "/Contents/report";
    const ProcessResult result = gate({"--offline", "-o", file, application()});
    EXPECT_EQ(result.exitStatus, 64);
    EXPECT_THAT(result.errors, HasSubstr("which is to be judged"));
    EXPECT_FALSE(std::filesystem::exists(file));
    EXPECT_EQ(gate({"--offline", application()}).exitStatus, 0);
}

TEST_F(GateReport, IsNotTheStatementAsWell) {
    const std::string file = directory / "both";
    EXPECT_EQ(gate({"--offline", "-o", file, "--attest", file, image()}).exitStatus, 64);
    EXPECT_EQ(gate({"--offline", "-o", "/dev/null", "--attest", "/dev/null", image()}).exitStatus, 0);
}

TEST_F(GateReport, KeepsTheEarlierReportUntilThereIsANewOne) {
    const std::string file = directory / "report";
    writeFile(file, std::string_view("the one before\n"));
    EXPECT_EQ(gate({"--tickets", directory / "none", "-o", file, image()}).exitStatus, 66);
    EXPECT_EQ(readFile(file), "the one before\n");
}

TEST_F(GateReport, ThatCannotBeWrittenEndsWith74) {
    Command full = gateCommand({"--offline", image()});
    full.output = Output::full;
    const ProcessResult result = runProcess(full);
    EXPECT_EQ(result.exitStatus, 74);
    EXPECT_THAT(result.errors, HasSubstr("cannot write to standard output"));
    EXPECT_EQ(gate({"--offline", "-o", "/dev/full", image()}).exitStatus, 74);
    EXPECT_EQ(gate({"--offline", "--attest", "/dev/full", image()}).exitStatus, 74);
}

TEST_F(GateReport, OverTheCallersLimitOfAFileEndsWith74) {
    Command limited = gateCommand({"-c", "ulimit -f 0; exec \"$0\" \"$@\"", PINWELL_GATE_PROGRAM, "--offline",
                                   "-o", directory / "report", image()});
    limited.executable = "/bin/bash";
    const ProcessResult result = runProcess(limited);
    EXPECT_EQ(result.exitStatus, 74);
    EXPECT_THAT(result.errors, HasSubstr("cannot write to " + (directory / "report")));
}

// As with the other companions: a reader that closes the pipe gets no message, and the verdict stays.
TEST_F(GateReport, MayLoseItsReader) {
    flip(image(), 0);
    for (const Output output : {Output::brokenPipe, Output::closed}) {
        Command run = gateCommand({"--offline", image()});
        run.output = output;
        const ProcessResult result = runProcess(run);
        EXPECT_EQ(result.exitStatus, 65);
        EXPECT_THAT(result.errors, IsEmpty());
    }
}

// Statements.

class GateStatement : public GateReport {
  protected:
    std::string statementOf(std::vector<std::string> arguments) const {
        arguments.insert(arguments.begin(), {"--offline", "--attest", directory / "statement.json"});
        gate(arguments);
        return readFile(directory / "statement.json");
    }

    std::string digestOf(const std::string& file) const {
        Command sum;
        sum.executable = "/usr/bin/sha256sum";
        sum.arguments = {file};
        return runProcess(sum).output.substr(0, 64);
    }
};

// tests/e2e/verification_summary.schema.json has the members of both specifications.
TEST_F(GateStatement, ConformsToStatementAndSummary) {
    const std::vector<std::vector<std::string>> runs{
        {image()},
        {"--shallow", image()},
        mixed(),
        oddlyNamed(),
        {"--max-ticket-age", "90d", "--require-team", "A", "--require-identifier", "*", image()}};
    for (const std::vector<std::string>& run : runs) expectConforms(statementOf(run), SUMMARY_SCHEMA);
}

TEST_F(GateStatement, NamesFilesByTheirDigests) {
    const Value statement = parsed(statementOf({image(), unsignedImage(), package()}));
    const auto* const subjects = statement["subject"].array();
    ASSERT_NE(subjects, nullptr);
    ASSERT_EQ(subjects->size(), 3U);
    const std::vector<std::string> paths{image(), unsignedImage(), package()};
    for (std::size_t i = 0; i < paths.size(); ++i) {
        EXPECT_EQ(*(*subjects)[i]["name"].string(), paths[i]);
        EXPECT_EQ(*(*subjects)[i]["digest"]["sha256"].string(), digestOf(paths[i])) << paths[i];
    }
}

TEST_F(GateStatement, PassesOnlyIfEverythingIsGood) {
    EXPECT_THAT(statementOf({image(), package()}),
                AllOf(HasSubstr("\"PASSED\""), HasSubstr("\"PINWELL_DEEP\"")));
    EXPECT_THAT(
        statementOf({"--shallow", image()}),
        AllOf(HasSubstr("\"PASSED\""), HasSubstr("\"PINWELL_TICKET\""), Not(HasSubstr("PINWELL_DEEP"))));
    flip(image(), 0);
    EXPECT_THAT(statementOf({image(), package()}),
                AllOf(HasSubstr("\"FAILED\""), Not(HasSubstr("PASSED")), Not(HasSubstr("PINWELL_"))));
    EXPECT_THAT(statementOf({directory / "missing"}), HasSubstr("\"FAILED\""));
}

TEST_F(GateStatement, NamesItsResourceByAnAbsoluteUri) {
    Command run = gateCommand({"--offline", "--attest", directory / "statement.json", "Sample image.dmg"});
    run.workingDirectory = directory.path();
    std::filesystem::copy_file(image(), directory / "Sample image.dmg");
    EXPECT_EQ(runProcess(run).exitStatus, 0);
    const Value statement = parsed(readFile(directory / "statement.json"));
    EXPECT_EQ(*statement["predicate"]["resourceUri"].string(),
              "file://" + (directory / "Sample%20image.dmg"));
}

}  // namespace
}  // namespace pinwell::test
