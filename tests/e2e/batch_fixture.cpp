#include "batch_fixture.h"

#include <algorithm>
#include <filesystem>

#include "base/text.h"
#include "schema_validation.h"
#include "values/json.h"

namespace pinwell::test {

using testing::AllOf;
using testing::ResultOf;

testing::Matcher<const Value&> Reports(const std::string& cause, int exitStatus) {
    return AllOf(
        ResultOf(
            "cause",
            [](const Value& line) {
                const std::string* const text = line["cause"].string();
                return text == nullptr ? std::string() : *text;
            },
            cause),
        ResultOf(
            "exit status", [](const Value& line) { return line["exitStatus"].unsignedIntegerValue(); },
            static_cast<std::uint64_t>(exitStatus)));
}

Command BatchTest::batchCommand(std::vector<std::string> arguments) const {
    orderWithService();
    Command made = command(std::move(arguments));
    made.executable = PINWELL_BATCH_PROGRAM;
    return made;
}

ProcessResult BatchTest::batch(std::vector<std::string> arguments) const {
    ProcessResult result = runProcess(batchCommand(std::move(arguments)));
    orderWithService();
    return result;
}

ProcessResult BatchTest::batch(std::vector<std::string> arguments,
                               const std::vector<Artefact>& images) const {
    for (const Artefact& image : images) arguments.push_back(image.path);
    return batch(std::move(arguments));
}

Command BatchTest::ticketCommand(std::vector<std::string> arguments) const {
    orderWithService();
    Command made = command(std::move(arguments));
    made.executable = PINWELL_TICKET_PROGRAM;
    return made;
}

ProcessResult BatchTest::ticketTool(std::vector<std::string> arguments) const {
    ProcessResult result = runProcess(ticketCommand(std::move(arguments)));
    orderWithService();
    return result;
}

std::vector<Artefact> BatchTest::writeImages(std::size_t count, const std::string& folder) {
    std::vector<Artefact> images;
    for (std::size_t i = 0; i < count; ++i) {
        const std::string number = std::to_string(i);
        images.push_back(writeArtefact(unsignedImage(base::toData("image " + folder + number)),
                                       directory / (folder + "/Image" + number + ".dmg")));
        records[recordNameOf(images.back())] = ticketOf(images.back());
    }
    return images;
}

std::map<std::string, std::string> BatchTest::writeEveryOutcome() {
    const auto images = writeImages(5);
    records[recordNameOf(images[1])] = std::nullopt;
    records[recordNameOf(images[2])] = sealed(images[2].payload().revoked());
    records[recordNameOf(images[3])] = ticketForOthers();
    writeFile(images[4].path, "no image");
    writeFile(directory / "builds/plain.txt", "text");
    return {{images[0].path, "worked"},
            {images[1].path, "notIssued"},
            {images[2].path, "revoked"},
            {images[3].path, "notAcceptable"},
            {images[4].path, "notReadable"},
            {directory / "builds/missing.dmg", "notReadable"},
            {directory / "builds/plain.txt", "unsupported"}};
}

std::vector<std::string> BatchTest::pathsOf(const std::vector<Artefact>& artefacts) {
    std::vector<std::string> paths;
    for (const Artefact& artefact : artefacts) paths.push_back(artefact.path);
    return paths;
}

std::vector<std::string> BatchTest::namesIn(const RecordedRequest& request) {
    std::vector<std::string> names;
    const auto body = values::parseJSON(base::asBytes(request.body));
    if (!body) return names;
    for (const Value& record : *(*body)["records"].array()) names.push_back(*record["recordName"].string());
    return names;
}

std::string BatchTest::bodyFor(const std::vector<std::string>& names) const {
    const std::lock_guard order(serving);
    std::string body;
    for (const std::string& name : names) {
        body += body.empty() ? "" : ",";
        const auto found = records.find(name);
        if (found == records.end() || !found->second)
            body += R"({"recordName":")" + name +
                    R"(","serverErrorCode":"NOT_FOUND","reason":"Record not found"})";
        else
            body += R"({"recordName":")" + name + R"(","fields":{"signedTicket":{"type":"BYTES","value":")" +
                    base::encodeBase64(*found->second) + R"("}}})";
    }
    return R"({"records":[)" + body + "]}";
}

void BatchTest::serveRecords() {
    service().setHandler(
        [this](const RecordedRequest& request) { return answer(bodyFor(namesIn(request))); });
}

std::vector<std::size_t> BatchTest::groupSizes() {
    std::vector<std::size_t> sizes;
    for (const RecordedRequest& request : service().requests()) sizes.push_back(namesIn(request).size());
    return sizes;
}

std::vector<Value> BatchTest::reportsOf(const ProcessResult& result) {
    std::vector<Value> reports;
    for (const std::string& line : result.outputLines()) {
        const auto document = values::parseJSON(base::asBytes(line));
        EXPECT_TRUE(document.has_value()) << line;
        if (document && (*document)["summary"].isNil()) reports.push_back(*document);
    }
    return reports;
}

Value BatchTest::summaryOf(const ProcessResult& result) {
    const std::vector<std::string> lines = result.outputLines();
    if (lines.empty()) return {};
    const auto document = values::parseJSON(base::asBytes(lines.back()));
    return document ? (*document)["summary"] : Value();
}

void BatchTest::expectWrongUsage(const std::string& program,
                                 const std::vector<std::vector<std::string>>& lines) const {
    for (const std::vector<std::string>& arguments : lines) {
        Command made = command(arguments);
        made.executable = program;
        const ProcessResult result = runProcess(made);
        const std::string name = std::filesystem::path(program).filename();
        EXPECT_EQ(result.exitStatus, 64) << testing::PrintToString(arguments);
        EXPECT_EQ(result.output, "");
        EXPECT_THAT(linesOf(result.errors), testing::ElementsAre(testing::StartsWith(name + ": ")))
            << testing::PrintToString(arguments);
    }
}

void BatchTest::expectValid(const ProcessResult& result, const std::string& schema) {
    for (const std::string& line : result.outputLines()) expectConforms(line, schema);
}

bool BatchTest::isStapled(const Artefact& artefact, const Data& ticket) {
    return readFile(artefact.file()) == artefact.stapledWith(ticket);
}

std::size_t BatchTest::countStapled(const std::vector<Artefact>& artefacts) const {
    return static_cast<std::size_t>(
        std::count_if(artefacts.begin(), artefacts.end(),
                      [&](const Artefact& one) { return isStapled(one, issuedFor(one)); }));
}

}  // namespace pinwell::test
