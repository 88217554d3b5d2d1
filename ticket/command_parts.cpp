#include "command_parts.h"

#include <sysexits.h>
#include <unistd.h>

#include <chrono>
#include <utility>

#include "companion/process.h"
#include "retrieval/artefact_run.h"
#include "src/messages.h"
#include "src/ticket_record.h"
#include "values/format.h"

namespace pinwell::ticket_files {

using retrieval::Cause;

Reporter::Reporter(const Settings& settings)
    : settings_(settings),
      output_(STDOUT_FILENO),
      inColor_(companion::wantsColor(settings.color, STDOUT_FILENO)) {}

void Reporter::report(const retrieval::Report& report) {
    worst_ = retrieval::worseStatus(worst_, report.exitStatus);
    if (settings_.asJson)
        output_.write(asJson(report) + "\n");
    else if (!settings_.isQuiet)
        output_.write(asText(report, settings_.isVerbose, inColor_) + "\n");
}

void Reporter::line(const std::string& text, int exitStatus) {
    worst_ = retrieval::worseStatus(worst_, exitStatus);
    output_.write(text + "\n");
}

void Reporter::complain(const std::string& text, int exitStatus) {
    worst_ = retrieval::worseStatus(worst_, exitStatus);
    companion::complain(kProgramName, text);
}

int Reporter::exitStatus() const {
    if (!output_.hasFailed()) return worst_;
    companion::complain(kProgramName, "cannot write to standard output");
    return worst_ == EX_OK ? EX_IOERR : worst_;
}

int writeEach(const Settings& settings, Reporter& reporter,
              const std::function<retrieval::Report(const std::string& path)>& write) {
    auto temporary = companion::OwnTemporaryDirectory::make(kProgramName);
    if (!temporary) {
        reporter.complain("no temporary directory can be made: " + temporary.error().localizedDescription(),
                          kExitCannotCreate);
        return reporter.exitStatus();
    }
    bool wroteAll = true;
    for (const std::string& path : settings.arguments) {
        const auto begun = retrieval::Clock::now();
        retrieval::Report report = write(path);
        report.attempts = 1;
        report.seconds = std::chrono::duration<double>(retrieval::Clock::now() - begun).count();
        wroteAll = wroteAll && report.exitStatus != kExitCannotCreate;
        reporter.report(report);
    }
    if (wroteAll || !temporary->holdsFiles())
        temporary->remove();
    else if (!settings.isQuiet)
        reporter.complain("tickets and copies are kept in " + temporary->path(), kExitOK);
    return reporter.exitStatus();
}

OpenedArtefact openArtefact(const std::string& path, std::string_view operation, const Platform& platform,
                            const PWHashedFile::BeforeReading& beforeReading) {
    OpenedArtefact opened;
    opened.report.path = path;
    opened.report.operation = operation;
    opened.report.attempts = 1;
    const MessageRedirection redirection(
        [&](std::string line) { opened.report.messages.push_back(std::move(line)); });
    opened.report.exitStatus = kExitNoInput;
    opened.report.cause = Cause::notReadable;
    if (!retrieval::isPath(path)) {
        opened.report.messages.push_back(values::format("%@ is no path: it holds a zero byte.", path));
        return opened;
    }
    const auto file = PWHashedFile::initWithFileURL(URL::fileURLWithPath(path), platform, beforeReading);
    opened.report.cause = Cause::unsupported;
    if (file == nullptr) return opened;
    opened.report.kind = retrieval::kindOf(*file);
    opened.report.exitStatus = file->appropriateExitCode();
    opened.report.cause =
        opened.report.exitStatus == kExitCannotCreate ? Cause::notWritable : Cause::notReadable;
    if (opened.report.exitStatus != kExitOK) return opened;
    opened.report.cause = Cause::worked;
    opened.file = file;
    if (auto hash = codeHashOf(*file)) {
        opened.report.recordName = recordNameForHash(*hash);
        opened.algorithm = hash->algorithm;
        opened.hash = std::move(hash->hash);
    }
    return opened;
}

OpenedArtefact openSignedArtefact(const std::string& path, std::string_view operation,
                                  const Platform& platform) {
    OpenedArtefact opened = openArtefact(path, operation, platform);
    if (opened.file != nullptr && opened.hash.empty()) {
        opened.report.exitStatus = kExitNoInput;
        opened.report.cause = Cause::notSigned;
    }
    return opened;
}

std::optional<retrieval::Clock::time_point> deadlineOf(const Settings& settings) {
    if (!settings.deadline) return std::nullopt;
    return retrieval::Clock::now() +
           std::chrono::duration_cast<retrieval::Clock::duration>(*settings.deadline);
}

void moveResult(retrieval::FetchedTicket& ticket, int signal, retrieval::Report& report) {
    report.exitStatus = ticket.exitStatus;
    report.cause = ticket.cause;
    if (ticket.cause == Cause::interrupted) report.exitStatus = companion::kSignalBase + signal;
    report.attempts = ticket.attempts;
    report.seconds = ticket.seconds;
    report.messages = std::move(ticket.messages);
}

}  // namespace pinwell::ticket_files
