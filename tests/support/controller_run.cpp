#include "support/controller_run.h"

#include <filesystem>
#include <stdexcept>

#include "base/text.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/run.h"

namespace pinwell::test {
namespace {

std::shared_ptr<PWHashedFile> makeSignedBundle(TestPlatform& platform) {
    writeFile(platform.directory / "App.app/Contents/MacOS/App", std::string_view("code"));
    std::filesystem::create_directory(platform.directory / "tmp");
    platform.codeSigning.information.emplace();
    platform.codeSigning.information->unique = ControllerRun::fileHash();
    platform.codeSigning.information->digestAlgorithm = 2;
    return std::make_shared<PWHashedBundle>(platform.directory.url("App.app"), platform.services());
}

}  // namespace

int statusOfRun(std::uint8_t operation, const values::URL& path, TestPlatform& platform,
                const Platform& services, std::string_view answer, const std::function<void()>& meanwhile) {
    const auto answerLookup = [&] {
        if (meanwhile) meanwhile();
        const https::HTTPResponse response{*values::URL::fromString("https://api.lumora.example/"),
                                           200,
                                           {{"X-Ostrel-Request-UUID", "REQUEST"}}};
        const auto completion = platform.https.sessions.back()->completions.at(0);
        completion(base::toData(answer), response, std::nullopt);
    };
    int status = kExitNothingRecorded;
    const auto ended =
        platform.exitStatusOf([&] { status = runOperation(operation, path, services, answerLookup); });
    return ended.value_or(status);
}

ControllerRun::ControllerRun() : file(makeSignedBundle(platform)), controller(file, platform.services()) {}

const https::Request& ControllerRun::request() const {
    return platform.https.sessions.at(0)->dataTasks.at(0)->request;
}

std::optional<int> ControllerRun::answer(std::string_view body, https::Headers headers, int status) {
    https::HTTPResponse response{*values::URL::fromString("https://api.lumora.example/"), status,
                                 std::move(headers)};
    const auto completion = platform.https.sessions.at(0)->completions.at(0);
    return platform.exitStatusOf([&] { completion(base::toData(body), response, std::nullopt); });
}

std::optional<int> ControllerRun::fail(const base::Error& error) {
    const auto completion = platform.https.sessions.at(0)->completions.at(0);
    return platform.exitStatusOf([&] { completion(std::nullopt, std::nullopt, error); });
}

std::string ControllerRun::inlineAnswer(const base::Data& ticket) {
    return R"({"records":[{"fields":{"signedTicket":{"value":")" + base::encodeBase64(ticket) + R"("}}}]})";
}

}  // namespace pinwell::test
