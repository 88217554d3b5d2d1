#include "fixture.h"

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <ostream>

#include "base/text.h"

namespace pinwell::test {

using testing::AllOf;
using testing::ElementsAreArray;
using testing::Field;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Matcher;
using testing::Optional;
using testing::Property;
using testing::StartsWith;

void PrintTo(const ProcessResult& result, std::ostream* out) {
    if (result.exitStatus)
        *out << "a run that ended with status " << *result.exitStatus;
    else
        *out << "a run that was ended by signal " << result.signal;
    *out << "\n--- standard output\n" << result.output << "--- standard error\n" << result.errors << "---";
}

Matcher<const ProcessResult&> Ended(int status, const Matcher<std::vector<std::string>>& lines) {
    return AllOf(Field("exit status", &ProcessResult::exitStatus, Optional(status)),
                 Property("lines of standard output", &ProcessResult::outputLines, lines),
                 Field("standard error", &ProcessResult::errors, IsEmpty()));
}

Response answer(std::string body) {
    return {.headers = {{"Content-Type", "application/json"}, {"X-Ostrel-Request-UUID", "REQUEST"}},
            .body = std::move(body)};
}

std::string inlineRecord(const Data& ticket) {
    return R"({"records":[{"recordName":"any","fields":{"signedTicket":{"type":"BYTES","value":")" +
           base::encodeBase64(ticket) + R"("}}}]})";
}

std::string assetRecord(const std::string& urlTemplate, const std::string& size) {
    return R"({"records":[{"fields":{"signedTicketAsset":{"value":{"downloadURL":")" + urlTemplate + '"' +
           (size.empty() ? "" : ",\"size\":" + size) + "}}}}]}";
}

std::string assetRecord(const std::string& urlTemplate, std::size_t size) {
    return assetRecord(urlTemplate, std::to_string(size));
}

EndToEndTest::EndToEndTest() : bundle(directory / "builds/Sample.app") {
    const Data codeDirectory = CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
    hash = codeHashOf(2, codeDirectory);
    BundleBuilder()
        .executable(
            ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(codeDirectory).build()).build())
        .write(bundle);

    for (const char* name : {"home", "tmp", "platform"}) std::filesystem::create_directory(directory / name);
    environment = {
        {"HOME", directory / "home"},
        {"XDG_CONFIG_HOME", directory / "home/config"},
        {"XDG_DATA_HOME", directory / "home/data"},
        {"XDG_CACHE_HOME", directory / "home/cache"},
        {"TMPDIR", directory / "tmp"},
        {"LC_ALL", "C"},
        {"PINWELL_PLATFORM", directory / "platform"},
    };
    trust(ticketChain.root);
}

Command EndToEndTest::command(std::vector<std::string> arguments) const {
    return {.executable = PINWELL_PROGRAM,
            .arguments = std::move(arguments),
            .environment = environment,
            .workingDirectory = directory / "builds"};
}

ProcessResult EndToEndTest::pinwell(std::vector<std::string> arguments) const {
    return runProcess(command(std::move(arguments)));
}

Matcher<const ProcessResult&> EndToEndTest::FailedOnTheWay(
    int code, std::vector<Matcher<std::string>> linesBefore) const {
    std::vector<Matcher<std::string>> lines{processing()};
    lines.insert(lines.end(), linesBefore.begin(), linesBefore.end());
    const std::string number = code == kAnyCode ? std::string() : std::to_string(code) + " \"";
    lines.emplace_back(StartsWith("error is Error Domain=URLErrorDomain Code=" + number));
    lines.emplace_back("Lumora's response is inconsistent with expections: (null)");
    lines.emplace_back(stapleFailed(68));
    return Ended(68, ElementsAreArray(lines));
}

void EndToEndTest::expectParked(const Matcher<std::string>& line) const {
    RunningProcess run(command({"staple", bundle}));
    const auto said = run.waitForLine("Large ticket for ");
    ASSERT_TRUE(said.has_value()) << run.resultSoFar().output << run.resultSoFar().errors;
    EXPECT_THAT(*said, line);
    EXPECT_TRUE(run.isRunning());
    run.sendSignal(SIGTERM);
    const ProcessResult result = run.wait();
    EXPECT_EQ(result.signal, SIGTERM);
    EXPECT_EQ(result.errors, "");
    EXPECT_EQ(result.outputLines().back(), *said);
    EXPECT_EQ(stapled(), std::nullopt);
}

Matcher<std::string> EndToEndTest::DownloadFailed(const std::string& reason) const {
    return AllOf(StartsWith("Large ticket for " + bundle + " failed to download. "), HasSubstr(reason));
}

void EndToEndTest::trust(const IssuedCertificate& certificate, const std::string& store) {
    const std::string name = base::toHex(codeDigest(2, certificate.der)) + ".pem";
    writeFile(directory / ("platform/" + store + "/" + name), certificate.pem());
}

void EndToEndTest::writePlatformSettings(std::string_view json) {
    writeFile(directory / "platform/platform.json", json);
}

void EndToEndTest::contact(const std::string& host) {
    writePlatformSettings(R"({"lumora":{"host":")" + host + R"("}})");
}

HostileServer& EndToEndTest::service() {
    if (!service_) {
        trust(serverChain.root);
        startService(identityOf(serverChain));
    }
    return *service_;
}

HostileServer& EndToEndTest::startService(const ServerIdentity& identity, const std::string& host,
                                          HostileServerOptions options) {
    service_ = std::make_unique<HostileServer>(identity, std::move(options));
    contact(host + ":" + std::to_string(service_->port()));
    return *service_;
}

void EndToEndTest::serve(Response response) {
    service().setHandler([response](const RecordedRequest&) { return response; });
}

void EndToEndTest::serveAsset(const std::string& record, const Response& asset) {
    service().setHandler([record, asset](const RecordedRequest& request) {
        return request.method == "POST" ? answer(record) : asset;
    });
}

void EndToEndTest::serveAsset(const Data& ticket) {
    serveAsset(assetRecord(service().url("/assets/${f}"), ticket.size()), {.body = base::toString(ticket)});
}

TicketPayloadBuilder EndToEndTest::payload() const {
    return TicketPayloadBuilder().entry(2, hash);
}

Data EndToEndTest::sealed(const TicketPayloadBuilder& payload) const {
    return SatchelBuilder::of(ticketChain, payload.build()).build();
}

std::optional<Data> EndToEndTest::stapled() const {
    if (!std::filesystem::is_regular_file(std::filesystem::symlink_status(ticketPath()))) return std::nullopt;
    return base::toData(readFile(ticketPath()));
}

std::vector<std::string> EndToEndTest::namesBelow(const std::string& path) {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path))
        names.push_back(entry.path().lexically_relative(path).native());
    std::sort(names.begin(), names.end());
    return names;
}

}  // namespace pinwell::test
