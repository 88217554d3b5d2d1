// The commands between an artefact and a file: hash prints the name of its record, extract writes its ticket
// to a file, attach takes its ticket from one.
#include <nlohmann/json.hpp>
#include <utility>

#include "base/text.h"
#include "command_parts.h"
#include "commands.h"
#include "retrieval/artefact_run.h"
#include "retrieval/ticket_fetch.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"
#include "ticket_files.h"
#include "values/format.h"

namespace pinwell::ticket_files {
namespace {

using retrieval::Cause;

std::string hashJson(const OpenedArtefact& artefact) {
    using Json = nlohmann::ordered_json;
    const retrieval::Report& report = artefact.report;
    const bool hasKind = report.kind != retrieval::Kind::none;
    const bool hasHash = !artefact.hash.empty();
    const Json json = {{"path", report.path},
                       {"kind", hasKind ? Json(nameOf(report.kind)) : Json(nullptr)},
                       {"recordName", hasHash ? Json(report.recordName) : Json(nullptr)},
                       {"digestAlgorithm", hasHash ? Json(artefact.algorithm) : Json(nullptr)},
                       {"hash", hasHash ? Json(base::toHex(artefact.hash)) : Json(nullptr)},
                       {"exitStatus", report.exitStatus},
                       {"cause", nameOf(report.cause)},
                       {"messages", report.messages}};
    return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

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
                   values::format("%@ does not have a ticket stapled to it.", name));
    if (!output && artefact.hash.empty())
        return end(report, kExitNoInput, Cause::notSigned,
                   values::format("%@ has no hash to name the file by; name one with -o.", name));
    const std::string path = output.value_or(fileNameOfRecord(report.recordName));
    report.file = path;
    if (const auto written = writeNewFile(*ticket, path); !written)
        return end(report, kExitCannotCreate, Cause::notWritable,
                   values::format("Could not write the ticket to %@. %@", path,
                                  written.error().localizedFailureReason()));
    report.messages.push_back(values::format("The ticket has been written to %@.", path));
}

}  // namespace

int hash(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    for (const std::string& path : settings.arguments) {
        const OpenedArtefact artefact = openSignedArtefact(path, "hash", platform);
        const int status = artefact.report.exitStatus;
        if (settings.asJson)
            reporter.line(hashJson(artefact), status);
        else if (status == kExitOK)
            reporter.line(artefact.report.recordName + "  " + base::escapeForTerminal(path), status);
        else
            reporter.complain(asText(artefact.report, settings.isVerbose, false), status);
    }
    return reporter.exitStatus();
}

int extract(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    OpenedArtefact artefact = openArtefact(settings.arguments.front(), "extract", platform);
    if (artefact.file != nullptr) extractTicket(artefact, settings.output);
    reporter.report(artefact.report);
    return reporter.exitStatus();
}

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
        if (report.cause == Cause::notAcceptable) {
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
