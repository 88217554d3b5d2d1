#include <nlohmann/json.hpp>

#include "foundation/format.h"
#include "ticket/artefact.h"
#include "ticket/commands.h"

namespace pinwell::ticket_files {
namespace {

std::string hashJson(const OpenedArtefact& artefact) {
    const retrieval::Report& report = artefact.report;
    const bool hasHash = !artefact.hash.empty();
    const nlohmann::ordered_json json = {
        {"path", report.path},
        {"kind", report.kind == retrieval::Kind::none ? nlohmann::ordered_json(nullptr)
                                                      : nlohmann::ordered_json(nameOf(report.kind))},
        {"recordName", hasHash ? nlohmann::ordered_json(report.recordName) : nlohmann::ordered_json(nullptr)},
        {"digestAlgorithm",
         hasHash ? nlohmann::ordered_json(artefact.algorithm) : nlohmann::ordered_json(nullptr)},
        {"hash", hasHash ? nlohmann::ordered_json(foundation::toHex(artefact.hash))
                         : nlohmann::ordered_json(nullptr)},
        {"exitStatus", report.exitStatus},
        {"cause", nameOf(report.cause)},
        {"messages", report.messages}};
    return json.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
}

}  // namespace

int hash(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    for (const std::string& path : settings.arguments) {
        OpenedArtefact artefact = openArtefact(path, "hash", platform);
        if (artefact.file != nullptr && artefact.hash.empty()) {
            artefact.report.exitStatus = kExitNoInput;
            artefact.report.cause = retrieval::Cause::notSigned;
        }
        const int status = artefact.report.exitStatus;
        if (settings.asJson)
            reporter.line(hashJson(artefact), status);
        else if (status == kExitOK)
            reporter.line(artefact.report.recordName + "  " + foundation::escapeForTerminal(path), status);
        else
            reporter.complain(asText(artefact.report, settings.isVerbose, false), status);
    }
    return reporter.exitStatus();
}

}  // namespace pinwell::ticket_files
