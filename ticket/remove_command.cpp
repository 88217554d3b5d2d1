#include "foundation/format.h"
#include "retrieval/artefact_run.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/messages.h"
#include "src/run.h"
#include "ticket/artefact.h"
#include "ticket/commands.h"
#include "ticket/removable_package.h"

namespace pinwell::ticket_files {
namespace {

using retrieval::Cause;

// What takes the ticket away.
std::shared_ptr<PWHashedFile> remover(const std::shared_ptr<PWHashedFile>& file, const Platform& platform) {
    if (retrieval::kindOf(*file) != retrieval::Kind::package) return file;
    return std::make_shared<RemovablePackage>(file->fileURL(), platform);
}

// False if the deletion failed; the error says why where that is known.
bool deleteTicket(PWHashedFile& file, std::optional<Error>& error) {
    if (auto* const bundle = dynamic_cast<PWHashedBundle*>(&file)) return bundle->_deleteExistingTicket();
    return file._deleteExistingTicket(&error) && !error;
}

retrieval::Report removeTicket(const std::string& path, const Platform& platform) {
    std::unique_ptr<files::ItemLock> lock;
    OpenedArtefact artefact = openArtefact(
        path, "remove", platform, [&] { return lockArtefact(platform, URL::fileURLWithPath(path), lock); });
    retrieval::Report& report = artefact.report;
    if (artefact.file == nullptr) return report;
    std::vector<std::string> messages;
    const MessageRedirection redirection([&](std::string line) { messages.push_back(std::move(line)); });
    const std::string name = artefact.file->fileURL()->lastPathComponent();
    const auto end = [&](int status, Cause cause, std::string message) {
        report.messages.insert(report.messages.end(), messages.begin(), messages.end());
        report.exitStatus = status;
        report.cause = cause;
        report.messages.push_back(std::move(message));
        return report;
    };
    if (!artefact.file->ticketData())
        return end(kExitDataError, Cause::notStapled,
                   foundation::format("%@ does not have a ticket stapled to it.", name));
    std::optional<Error> error;
    const auto file = remover(artefact.file, platform);
    if (!deleteTicket(*file, error))
        return end(kExitCannotCreate, file->wasRefusedAsChanged() ? Cause::changed : Cause::notWritable,
                   error ? foundation::format("The ticket of %@ could not be removed. %@", name, error)
                         : foundation::format("The ticket of %@ could not be removed.", name));
    // From the disk, by a new object.
    const auto fresh = PWHashedFile::initWithFileURL(URL::fileURLWithPath(path), platform);
    if (fresh == nullptr || fresh->appropriateExitCode() != kExitOK)
        return end(kExitCannotCreate, Cause::notWritable,
                   foundation::format("%@ cannot be read any more. Please restore it from backup.", name));
    if (fresh->ticketData()) {
        // Known of disk images: without the ticket there would be no signature left, and none is taken away.
        return end(
            kExitOK, Cause::worked,
            foundation::format("The ticket of %@ is all that its signature holds: it stays in place.", name));
    }
    if (retrieval::holdsTrailersWithoutTicket(*fresh))
        return end(
            kExitOK, Cause::worked,
            foundation::format("The ticket of %@ has been removed. Trailers of other types stay: pinwell "
                               "would write another ticket over its first bytes.",
                               name));
    return end(kExitOK, Cause::worked, foundation::format("The ticket of %@ has been removed.", name));
}

}  // namespace

int remove(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    return writeEach(settings, reporter,
                     [&](const std::string& path) { return removeTicket(path, platform); });
}

}  // namespace pinwell::ticket_files
