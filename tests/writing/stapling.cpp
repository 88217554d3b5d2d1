#include "stapling.h"

#include <algorithm>
#include <cerrno>
#include <ostream>

#include "src/run.h"
#include "support/message_capture.h"

namespace pinwell::test {

bool Outcome::says(std::string_view beginning) const {
    return std::any_of(lines.begin(), lines.end(),
                       [&](const std::string& line) { return line.starts_with(beginning); });
}

void PrintTo(const Outcome& outcome, std::ostream* stream) {
    *stream << "a run that ended with " << outcome.status << " and said";
    // The end tells enough.
    const std::size_t first = outcome.lines.size() - std::min<std::size_t>(outcome.lines.size(), 5);
    for (std::size_t i = first; i < outcome.lines.size(); ++i) *stream << "\n  " << outcome.lines[i];
}

Stapling::Stapling(const std::string& temporary) : codeSigning_(codesign::makeCodeSigningService()) {
    platform_.files.answerTemporaryDirectory(URL::fileURLWithPath(temporary));
    platform_.files.fail("trashItem", ENOENT);  // a swap leaves nothing to trash
}

Outcome Stapling::staple(const std::string& path, const Data& ticket) {
    const MessageCapture output(kVerbosityVerbose);
    const int status = run(URL::fileURLWithPath(path), ticket);
    return {status, output.lines()};
}

int Stapling::run(const URL& path, const Data& ticket) {
    const Platform services = platform_.servicesWith(*codeSigning_);
    const https::HTTPResponse response{
        *URL::fromString("https://api.lumora.example/"), 200, {{"X-Ostrel-Request-UUID", "REQUEST"}}};
    const auto answerLookup = [&] {
        const auto completion = platform_.https.sessions.back()->completions.at(0);
        completion(foundation::toData(ControllerRun::inlineAnswer(ticket)), response, std::nullopt);
    };
    int status = kExitNothingRecorded;
    const auto ended = platform_.exitStatusOf(
        [&] { status = runOperation(kOperationStaple, path, services, answerLookup); });
    return ended.value_or(status);
}

Outcome Stapling::erase(const std::string& path) {
    const MessageCapture output(kVerbosityVerbose);
    const auto file =
        PWHashedFile::initWithFileURL(URL::fileURLWithPath(path), platform_.servicesWith(*codeSigning_));
    if (file == nullptr) return {kExitNoInput, output.lines()};
    if (file->appropriateExitCode() == kExitOK) file->_deleteExistingTicket(nullptr);
    return {file->appropriateExitCode(), output.lines()};
}

}  // namespace pinwell::test
