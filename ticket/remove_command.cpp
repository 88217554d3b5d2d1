// The command that removes tickets.
#include "command_parts.h"
#include "commands.h"
#include "formats/package_trailers.h"
#include "retrieval/artefact_run.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/messages.h"
#include "src/run.h"
#include "values/format.h"

namespace pinwell::ticket_files {
namespace {

using retrieval::Cause;

// A flat package whose terminator is removed with the ticket, if no other trailer needs it. The package is
// then as before its first staple, and can be stapled again. If the terminator stayed alone, the next ticket
// would be written over the package from its first byte on. Trailers of other types stay, and the terminator
// with them.
class RemovablePackage : public PWHashedFlatPackage {
  public:
    using PWHashedFlatPackage::PWHashedFlatPackage;

    bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target, bool deleteExisting,
                                    ErrorOut error) override;

  private:
    bool cutTerminatorToo(files::FileHandle& file) const;
};

bool RemovablePackage::_writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                                  bool deleteExisting, ErrorOut error) {
    if (deleteExisting && ticketData()) {
        try {
            const auto opened = platform().files.openForUpdating(target);
            if (opened && cutTerminatorToo(**opened)) {
                setAppropriateExitCode(kExitOK);
                return true;
            }
        } catch (const base::FileFailure& failure) {
            NoisyLog("Fatal error while deleting existing ticket to %@. %@.", target.path(), failure.what());
            return failedToWrite(std::nullopt, error);
        }
    }
    return PWHashedFlatPackage::_writeNewTicketDataFromURL(source, target, deleteExisting, error);
}

// Returns false, and writes nothing, if the archive is followed by more than the terminator and the ticket.
// Cuts once: if the process dies, either both are there or none.
bool RemovablePackage::cutTerminatorToo(files::FileHandle& file) const {
    if (dataToAppend() || ticketStart() < kTrailerSize) return false;
    const std::uint64_t terminator = ticketStart() - kTrailerSize;
    const Diagnostics diagnostics = noisyDiagnostics();
    trailer_header record;
    if (!trailer_data_is_valid(file.readUpTo(terminator, kTrailerSize), &record, diagnostics) ||
        !trailer_is_terminator(record.firstWord(), record.length(), diagnostics))
        return false;
    file.truncate(terminator);
    file.synchronize();
    file.close();
    return true;
}

// The object that removes the ticket.
std::shared_ptr<PWHashedFile> remover(const std::shared_ptr<PWHashedFile>& file, const Platform& platform) {
    if (retrieval::kindOf(*file) != retrieval::Kind::package) return file;
    return std::make_shared<RemovablePackage>(file->fileURL(), platform);
}

// Returns false if the deletion failed, and sets the error if the reason is known.
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
                   values::format("%@ does not have a ticket stapled to it.", name));
    std::optional<Error> error;
    const auto file = remover(artefact.file, platform);
    if (!deleteTicket(*file, error))
        return end(kExitCannotCreate, file->wasRefusedAsChanged() ? Cause::changed : Cause::notWritable,
                   error ? values::format("The ticket of %@ could not be removed. %@", name, error)
                         : values::format("The ticket of %@ could not be removed.", name));
    // Reads the result from the disk, with a new object.
    const auto fresh = PWHashedFile::initWithFileURL(URL::fileURLWithPath(path), platform);
    if (fresh == nullptr || fresh->appropriateExitCode() != kExitOK)
        return end(kExitCannotCreate, Cause::notWritable,
                   values::format("%@ cannot be read any more. Please restore it from backup.", name));
    if (fresh->ticketData()) {
        // A disk image whose signature holds only the ticket: a signature is never removed.
        return end(
            kExitOK, Cause::worked,
            values::format("The ticket of %@ is all that its signature holds: it stays in place.", name));
    }
    if (retrieval::holdsTrailersWithoutTicket(*fresh))
        return end(kExitOK, Cause::worked,
                   values::format("The ticket of %@ has been removed. Trailers of other types stay: pinwell "
                                  "would write another ticket over its first bytes.",
                                  name));
    return end(kExitOK, Cause::worked, values::format("The ticket of %@ has been removed.", name));
}

}  // namespace

int remove(const Settings& settings, const Platform& platform) {
    Reporter reporter(settings);
    return writeEach(settings, reporter,
                     [&](const std::string& path) { return removeTicket(path, platform); });
}

}  // namespace pinwell::ticket_files
