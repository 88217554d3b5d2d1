#include "retrieval/artefact_run.h"
#include "retrieval/ticket_fetch.h"
#include "src/DownloadDelegate.h"
#include "ticket/artefact.h"
#include "ticket/commands.h"

namespace pinwell::ticket_files {

int attach(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
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
    return writeEach(settings, reporter, [&](const std::string& path) {
        retrieval::ArtefactRun run(path, kOperationStaple, platform);
        const retrieval::Outcome outcome = run.attach(ticketFor);
        retrieval::Report report;
        report.path = path;
        report.operation = "attach";
        report.kind = run.kind();
        report.recordName = run.recordName();
        report.exitStatus = outcome.exitStatus;
        report.cause = outcome.cause;
        report.messages = run.messages();
        if (report.cause == retrieval::Cause::notAcceptable) {
            const auto hash = retrieval::hashInRecordName(report.recordName);
            const auto ticket = ticketFor(report.recordName);
            if (hash && ticket)
                report.messages.push_back("The ticket is not acceptable: " +
                                          retrieval::ruleBrokenByTicket(*ticket, {*hash}, platform.trust) +
                                          ".");
        }
        return report;
    });
}

}  // namespace pinwell::ticket_files
