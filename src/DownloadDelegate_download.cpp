// Tickets too large for their record: downloaded as a separate file.

#include "foundation/byte_count.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"
#include "src/ticket_record.h"

namespace pinwell {
bool DownloadDelegate::asynchronouslyDownloadLargeTicketFromURLString(const std::string& urlTemplate) {
    const std::string text = assetURLText(urlTemplate);
    https::Request request;
    request.url = URL::fromString(text);
    if (!request.url) MessageLog("Large ticket was requested from an invalid URL: %@", request.url);
    NoisyLog("URL of large ticket asset: %@", text);
    auto session = platform_.https.ephemeralSession(*this);
    if (!session) {
        NoisyLog("No session for the large ticket: %@", session.error());
        return false;
    }
    downloadSession_ = *std::move(session);
    downloadTask_ = downloadSession_->downloadTask(std::move(request));
    downloadTask_->resume();
    return downloadTask_->state() == https::TaskState::running;
}

void DownloadDelegate::didFinishDownloading(https::Session&, https::Task& task, const URL& location) {
    const auto data = platform_.files.contentsOfFile(location).asOptional();
    const std::size_t length = data ? data->size() : 0;
    // For any announced size, and although the stapled ticket recorded 0: this ticket was not checked.
    if (!data) hashedFile_->setAppropriateExitCode(kExitDataError);
    const auto response = task.response();
    switch (faultOfAsset(largeTicketSize_, length, response)) {
        case AssetFault::length:
            MessageLog("We were expecting a ticket size of %@ but download a ticket of size %lu",
                       largeTicketSize_, length);
            hashedFile_->setAppropriateExitCode(kExitDataError);
            break;
        case AssetFault::status:
            MessageLog("Attempting to download larger ticket for %@ failed. %@", fileName(),
                       https::localizedStringForStatusCode(response->status));
            hashedFile_->setAppropriateExitCode(kExitNoHost);
            break;
        case AssetFault::none:
            NoisyLog("Big ticket response is %@", response);
            NoisyLog("Downloaded large ticket size is %@", foundation::formatByteCount(length));
            writeDownloadedData(data, nullptr);
            break;
    }
    notifyResult();
}

void DownloadDelegate::didComplete(https::Session&, https::Task&, const std::optional<Error>& error) {
    if (!error) return;
    MessageLog("Large ticket for %@ failed to download. %@", hashedFile_->fileURL()->path(),
               error->localizedFailureReason());
    hashedFile_->setAppropriateExitCode(kExitNoHost);
    // The run only waits from here on, and writes nothing: other processes need not wait for it.
    lock_.reset();
}

}  // namespace pinwell
