#include "foundation/format.h"
#include "src/messages.h"
#include "ticket/artefact.h"
#include "ticket/commands.h"
#include "ticket/file_writing.h"

namespace pinwell::ticket_files {
namespace {

using retrieval::Cause;

void end(retrieval::Report& report, int status, Cause cause, std::string message) {
    report.exitStatus = status;
    report.cause = cause;
    report.messages.push_back(std::move(message));
}

void extractTicket(OpenedArtefact& artefact, const std::optional<std::string>& output) {
    retrieval::Report& report = artefact.report;
    const auto ticket = [&] {
        const MessageRedirection redirection(
            [&](std::string line) { report.messages.push_back(std::move(line)); });
        return artefact.file->ticketData();
    }();
    const std::string name = artefact.file->fileURL()->lastPathComponent();
    if (!ticket)
        return end(report, kExitDataError, Cause::notStapled,
                   foundation::format("%@ does not have a ticket stapled to it.", name));
    if (!output && artefact.hash.empty())
        return end(report, kExitNoInput, Cause::notSigned,
                   foundation::format("%@ has no hash to name the file by; name one with -o.", name));
    const std::string path = output.value_or(fileNameOfRecord(report.recordName));
    report.file = path;
    if (const auto written = writeNewFile(*ticket, path); !written)
        return end(report, kExitCannotCreate, Cause::notWritable,
                   foundation::format("Could not write the ticket to %@. %@", path,
                                      written.error().localizedFailureReason()));
    report.messages.push_back(foundation::format("The ticket has been written to %@.", path));
}

}  // namespace

int extract(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    OpenedArtefact artefact = openArtefact(settings.arguments.front(), "extract", platform);
    if (artefact.file != nullptr) extractTicket(artefact, settings.output);
    reporter.report(artefact.report);
    return reporter.exitStatus();
}

}  // namespace pinwell::ticket_files
