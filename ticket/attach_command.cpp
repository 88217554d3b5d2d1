#include "companion/own_temporary_directory.h"
#include "foundation/format.h"
#include "src/DownloadDelegate.h"
#include "ticket/artefact.h"
#include "ticket/commands.h"

namespace pinwell::ticket_files {

int attach(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    // The tool's own road leaves a ticket and a copy there; those that came from a file are of no further
    // use.
    auto temporary = companion::OwnTemporaryDirectory::make(kProgramName);
    if (!temporary) {
        reporter.complain("no temporary directory can be made: " + temporary.error().localizedDescription(),
                          kExitCannotCreate);
        return reporter.exitStatus();
    }
    if (settings.ticket) {
        const auto readable = platform.files.contentsOfFile(URL::fileURLWithPath(*settings.ticket));
        if (!readable) {
            reporter.complain("the ticket cannot be read: " + readable.error().localizedDescription(),
                              kExitNoInput);
            return reporter.exitStatus();
        }
    }
    const auto ticketFor = [&](const std::string& recordName) {
        const URL file = settings.ticket ? URL::fileURLWithPath(*settings.ticket)
                                         : URL::fileURLWithPath(*settings.tickets)
                                               .appendingPathComponent(fileNameOfRecord(recordName));
        return platform.files.contentsOfFile(file);
    };
    bool wroteAll = true;
    for (const std::string& path : settings.arguments) {
        const auto begun = retrieval::Clock::now();
        retrieval::ArtefactRun run(path, kOperationStaple, platform);
        const retrieval::Outcome outcome = run.attach(ticketFor);
        retrieval::Report report;
        report.path = path;
        report.operation = "attach";
        report.kind = run.kind();
        report.recordName = run.recordName();
        report.exitStatus = outcome.exitStatus;
        report.cause = outcome.cause;
        report.attempts = 1;
        report.seconds = std::chrono::duration<double>(retrieval::Clock::now() - begun).count();
        report.messages = run.messages();
        wroteAll = wroteAll && report.exitStatus != kExitCannotCreate;
        reporter.report(report);
    }
    // With them a write that was cut short can be put right.
    if (wroteAll || !temporary->holdsFiles())
        temporary->remove();
    else if (!settings.isQuiet)
        reporter.complain("tickets and copies are kept in " + temporary->path(), kExitOK);
    return reporter.exitStatus();
}

}  // namespace pinwell::ticket_files
