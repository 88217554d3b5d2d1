#include "stapling.h"

#include <algorithm>
#include <cerrno>
#include <ostream>

#include "support/message_capture.h"

namespace pinwell::test {

bool Outcome::says(std::string_view beginning) const {
    return std::any_of(lines.begin(), lines.end(),
                       [&](const std::string& line) { return line.starts_with(beginning); });
}

void PrintTo(const Outcome& outcome, std::ostream* stream) {
    *stream << "a run that ended with " << outcome.status << " and said";
    // The last lines are enough.
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
    return statusOfRun(kOperationStaple, path, platform_, platform_.servicesWith(*codeSigning_),
                       ControllerRun::inlineAnswer(ticket));
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
