// Ticket acceptance and the report of the run's result.

#include "src/DownloadDelegate.h"

#include "formats/explain_ticket.h"
#include "src/messages.h"

namespace pinwell {
namespace {

// Passes the error of the last step to the caller, if it is wanted.
void handOut(ErrorOut error, std::optional<Error> value) {
    if (error != nullptr) *error = std::move(value);
}

}  // namespace

DownloadDelegate::DownloadDelegate(std::shared_ptr<PWHashedFile> hashedFile, const Platform& platform)
    : hashedFile_(std::move(hashedFile)), platform_(platform) {}

std::string DownloadDelegate::fileName() const {
    return hashedFile_->fileURL()->lastPathComponent();
}

std::string DownloadDelegate::prettyHashString() {
    const Data hash = hashedFile_->cdHash().value_or(Data{});
    return foundation::format("%d/%@", hashedFile_->digestAlgorithm(), foundation::toHex(hash));
}

bool DownloadDelegate::isValidTicketData(const std::optional<Data>& data) {
    hashedFile_->setAppropriateExitCode(kExitDataError);
    switch (judgeTicket(
        data, [this] { return hashedFile_->cdHash(); }, platform_.trust)) {
        case TicketVerdict::acceptable:
            hashedFile_->setAppropriateExitCode(kExitOK);
            return true;
        case TicketVerdict::revoked:
            hashedFile_->setRevoked(true);
            hashedFile_->setAppropriateExitCode(kExitNoPermission);
            return false;
        case TicketVerdict::refused:
            return false;
    }
    return false;
}

bool DownloadDelegate::isExistingTicketValid() {
    return isValidTicketData(hashedFile_->ticketData());
}

void DownloadDelegate::writeDownloadedData(const std::optional<Data>& data, ErrorOut error) {
    if (!data) {
        const Error badParameter = Error::osStatus(foundation::kParameterError);
        MessageLog("Could not save data. %@", badParameter.localizedDescription());
        handOut(error, badParameter);
        return;
    }
    NoisyLog("Downloaded ticket has been stored at %@.", tempFileURL_);
    const auto stored = platform_.files.writeFile(*data, *tempFileURL_, files::FileManager::Writing::atomic);
    if (!stored) {
        MessageLog("Could not write ticket to %@ due to %@", tempFileURL_, stored.error());
        hashedFile_->setAppropriateExitCode(kExitCannotCreate);
        handOut(error, stored.error());
        return;
    }
    handOut(error, std::nullopt);
    if (!isValidTicketData(data)) {
        MessageLog("Could not validate ticket for %@", hashedFile_->fileURL()->path());
        return;
    }
    if (operation_ != kOperationStaple) {
        hashedFile_->setAppropriateExitCode(kExitOK);
        return;
    }
    if (hashedFile_->writeNewTicketDataFromURL(*tempFileURL_, error))
        hashedFile_->setAppropriateExitCode(kExitOK);
}

void DownloadDelegate::notifyResult() {
    if (operation_ == kOperationStaple && hashedFile_->appropriateExitCode() == kExitOK) {
        // Read from the disk by a new object: the old one's caches describe the file before the write.
        const URL url = *hashedFile_->fileURL();
        const auto fresh = PWHashedFile::initWithFileURL(url, platform_);
        if (fresh != nullptr) setHashedFile(fresh);
        const bool readable = fresh != nullptr && fresh->appropriateExitCode() == kExitOK;
        if (!readable || !isExistingTicketValid()) {
            MessageLog(
                "Although we wrote the ticket, the written data did not validate. Please restore %@ from "
                "backup to "
                "try again.",
                url.path());
            hashedFile_->setAppropriateExitCode(kExitCannotCreate);
        }
    }
    const std::int32_t status = hashedFile_->appropriateExitCode();
    if (hashedFile_->revoked()) {
        MessageLog("The ticket for %@ has been revoked. Tollmark will prevent it from running.", fileName());
    } else {
        MessageLog("The %@ action %@!%@", operation_ == kOperationStaple ? "staple and validate" : "validate",
                   status == kExitOK ? "worked" : "failed",
                   status == kExitOK ? std::string() : foundation::format(" Error %d.", status));
    }
    platform_.exitProcess(status);
}

}  // namespace pinwell
