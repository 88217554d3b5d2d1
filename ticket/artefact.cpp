#include "ticket/artefact.h"

#include <algorithm>

#include "foundation/format.h"
#include "retrieval/artefact_run.h"
#include "src/messages.h"
#include "src/ticket_record.h"

namespace pinwell::ticket_files {

using retrieval::Cause;

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
        opened.report.messages.push_back(foundation::format("%@ is no path: it holds a zero byte.", path));
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
    opened.report.exitStatus = kExitOK;
    opened.report.cause = Cause::worked;
    opened.file = file;
    if (const auto hash = file->cdHash()) {
        opened.hash = *hash;
        opened.algorithm = file->digestAlgorithm();
        opened.report.recordName = recordNameForHash(opened.algorithm, opened.hash);
    }
    return opened;
}

std::string fileNameOfRecord(const std::string& recordName) {
    std::string name = recordName + ".ticket";
    std::replace(name.begin(), name.end(), '/', '-');
    return name;
}

}  // namespace pinwell::ticket_files
