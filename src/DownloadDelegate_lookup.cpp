// The lookup of the ticket's record: one POST to the record service, and reading its response.

#include <stdexcept>

#include "foundation/base64.h"
#include "foundation/json.h"
#include "foundation/process.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"
#include "src/ticket_record.h"

namespace pinwell {

using foundation::Dictionary;
using foundation::Value;

std::string DownloadDelegate::recordName() {
    const Data hash = hashedFile_->cdHash().value_or(Data{});
    return recordNameForHash(hashedFile_->digestAlgorithm(), hash);
}

bool DownloadDelegate::grabTicket() {
    hashedFile_->setAppropriateExitCode(kExitNoInput);
    const bool hasHash = hashedFile_->cdHash().has_value();
    const bool hasURL = hashedFile_->fileURL().has_value();
    if (!hasHash) NoisyLog("Cannot download ticket. CDHash must be set.");
    if (!hasURL) NoisyLog("Cannot download ticket. File Path is required for the given CDHash.");
    if (!hasHash || !hasURL) return false;

    if (operation_ != kOperationStaple && !isExistingTicketValid()) {
        if (!hashedFile_->ticketData()) {
            MessageLog("%@ does not have a ticket stapled to it.", fileName());
        } else if (hashedFile_->revoked()) {
            notifyResult();
        }
        return false;
    }

    const auto url = lookupURL(platform_);
    const Value body = lookupBody({recordName()});
    auto request = lookupRequest(url ? std::optional(*url) : std::nullopt, body);
    if (!request) return false;
    Dictionary headers;
    for (const auto& [name, value] : request->headers) headers.emplace(name, value);
    NoisyLog("JSON Data is %@", body);
    NoisyLog(" Headers: %@", headers);

    if (!url) {
        // Without a host there is nothing to connect to: the lookup fails before it begins.
        lookupDidComplete(std::nullopt, std::nullopt, url.error());
        return true;
    }
    auto session = platform_.https.ephemeralSession(*this);
    if (!session) {
        lookupDidComplete(std::nullopt, std::nullopt, session.error());
        return true;
    }
    lookupSession_ = *std::move(session);
    const auto task = lookupSession_->dataTask(
        *std::move(request), [this](const auto& data, const auto& response, const auto& error) {
            lookupDidComplete(data, response, error);
        });
    task->resume();
    return true;
}

void DownloadDelegate::lookupDidComplete(const std::optional<Data>& data,
                                         const std::optional<https::HTTPResponse>& response,
                                         const std::optional<Error>& error) {
    NoisyLog("Response is %@", response);
    if (error) MessageLog("error is %@", error);
    NoisyLog("Size of data is %lu", data ? data->size() : std::size_t{0});
    if (error || !data || data->empty() || !response) {
        MessageLog("Lumora's response is inconsistent with expections: %@", response);
        hashedFile_->setAppropriateExitCode(kExitNoHost);
        notifyResult();
        return;
    }

    std::string identifier = response->header(kRequestIdentifierHeader).value_or(std::string());
    if (!foundation::isSafeFileName(identifier)) identifier = foundation::globallyUniqueString();
    setTempFileURL(platform_.files.temporaryDirectory().appendingPathComponent(identifier + ".ticket"));

    const auto parsed = foundation::parseJSON(*data);
    const Value answer = parsed ? *parsed : Value();
    NoisyLog("JSON Response is: %@", answer);

    bool downloading = false;
    std::optional<Data> ticket;
    try {
        ticket = ticketFromResponse(answer, downloading);
    } catch (const foundation::ValueTypeError&) {
        MessageLog("Lumora query for %@ did not return expected JSON data.", prettyHashString());
    } catch (const std::out_of_range&) {
        MessageLog("Lumora query for %@ did not return expected JSON data.", prettyHashString());
    }

    if (!downloading && (!ticket || ticket->empty())) {
        MessageLog("Could not find base64 encoded ticket in response for %@", prettyHashString());
        hashedFile_->setAppropriateExitCode(kExitDataError);
        notifyResult();
        return;
    }
    if (downloading) return;
    writeDownloadedData(ticket, nullptr);
    notifyResult();
}

// Throws if the response does not have the expected shape.
std::optional<Data> DownloadDelegate::ticketFromResponse(const Value& response, bool& downloading) {
    const TicketRecord record = ticketRecordOf(response);
    setLargeTicketSize(record.assetSize);
    if (const std::string* ticket = record.ticketText()) return foundation::decodeBase64(*ticket);
    if (const std::string* url = record.assetURLTemplate()) {
        downloading = asynchronouslyDownloadLargeTicketFromURLString(*url);
        return std::nullopt;
    }
    MessageLog("Lumora query for %@ (%@) failed due to \"%@\".", fileName(), prettyHashString(),
               record.reason);
    return std::nullopt;
}

}  // namespace pinwell
