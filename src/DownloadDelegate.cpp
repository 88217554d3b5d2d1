#include "src/DownloadDelegate.h"

#include <stdexcept>
#include <utility>
#include <vector>

#include "base/file_io.h"
#include "base/text.h"
#include "runtime/process.h"
#include "src/messages.h"
#include "src/ticket_record.h"
#include "values/json.h"

namespace pinwell {

using values::Dictionary;
using values::Value;

namespace {

// Passes the error of the last step to the caller, if it is wanted.
void handOut(ErrorOut error, std::optional<Error> value) {
    if (error != nullptr) *error = std::move(value);
}

bool isSuccess(trust::Verdict verdict) {
    return verdict == trust::Verdict::proceed || verdict == trust::Verdict::unspecified;
}

void reportRefusal(const trust::Trust& serverTrust, trust::Verdict verdict) {
    const values::Array properties = serverTrust.properties();
    MessageLog("Certificate trust evaluation did not return expected result. (%d) %@",
               static_cast<std::uint32_t>(verdict), serverTrust.failureDescription().value_or(std::string()));
    for (const values::Value& certificate : properties) {
        const values::Value& error = certificate[trust::kPropertyError];
        if (error.isNil()) continue;
        MessageLog("Certificate trust evaluation for %@ did not return expected result. %@.",
                   certificate[trust::kPropertyTitle], error);
    }
}

bool accepts(trust::Trust& serverTrust, const trust::PolicyRef& policy) {
    if (const auto set = serverTrust.setPolicy(policy); !set) {
        NoisyLog("Could not set trust policy. %@", set.error());
        return false;
    }
    const auto verdict = serverTrust.evaluate();
    if (!verdict) {
        MessageLog("Certificate trust evaluation failed. %@", verdict.error());
        return false;
    }
    if (isSuccess(*verdict)) return true;
    reportRefusal(serverTrust, *verdict);
    return false;
}

}  // namespace

DownloadDelegate::DownloadDelegate(std::shared_ptr<PWHashedFile> hashedFile, const Platform& platform)
    : hashedFile_(std::move(hashedFile)), platform_(platform) {}

std::string DownloadDelegate::fileName() const {
    return hashedFile_->fileURL()->lastPathComponent();
}

std::string DownloadDelegate::prettyHashString() {
    const Data hash = hashedFile_->cdHash().value_or(Data{});
    return values::format("%d/%@", hashedFile_->digestAlgorithm(), base::toHex(hash));
}

// The lookup of the ticket's record: one POST to the record service, and reading its response.

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
    if (!base::isSafeFileName(identifier)) identifier = runtime::globallyUniqueString();
    setTempFileURL(platform_.files.temporaryDirectory().appendingPathComponent(identifier + ".ticket"));

    const auto parsed = values::parseJSON(*data);
    const Value answer = parsed ? *parsed : Value();
    NoisyLog("JSON Response is: %@", answer);

    bool downloading = false;
    std::optional<Data> ticket;
    try {
        ticket = ticketFromResponse(answer, downloading);
    } catch (const values::ValueTypeError&) {
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
    if (const std::string* ticket = record.ticketText()) return base::decodeBase64(*ticket);
    if (const std::string* url = record.assetURLTemplate()) {
        downloading = asynchronouslyDownloadLargeTicketFromURLString(*url);
        return std::nullopt;
    }
    MessageLog("Lumora query for %@ (%@) failed due to \"%@\".", fileName(), prettyHashString(),
               record.reason);
    return std::nullopt;
}

// Tickets too large for their record: downloaded as a separate file.

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
    // Set here, because an announced size of 0 is no fault below, and the check of the stapled ticket may
    // have recorded 0. But the new ticket was not checked.
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
            NoisyLog("Downloaded large ticket size is %@", base::formatByteCount(length));
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

// The server's trust: either of the two server policies is enough, for the contacted host.

void DownloadDelegate::didReceiveChallenge(https::Session&, const https::AuthenticationChallenge& challenge,
                                           const https::ChallengeCompletion& completion) {
    answerServerChallenge(challenge, completion);
}

void answerServerChallenge(const https::AuthenticationChallenge& challenge,
                           const https::ChallengeCompletion& completion) {
    NoisyLog("Domain is %@", challenge.host);
    if (challenge.method != https::AuthenticationMethod::serverTrust) {
        completion(https::Disposition::performDefaultHandling, std::nullopt);
        return;
    }
    std::vector<trust::PolicyRef> policies;
    for (auto policy :
         {trust::pinnedServerPolicy(challenge.host), trust::compatibilityServerPolicy(challenge.host)})
        if (policy != nullptr) policies.push_back(std::move(policy));
    if (policies.empty()) {
        completion(https::Disposition::cancelChallenge, std::nullopt);
        return;
    }
    for (const trust::PolicyRef& policy : policies) {
        if (accepts(*challenge.serverTrust, policy)) {
            completion(https::Disposition::useCredential, https::Credential{challenge.serverTrust});
            return;
        }
    }
    MessageLog("Could not establish secure connection to %@", challenge.host);
    completion(https::Disposition::cancelChallenge, std::nullopt);
}

// Acceptance of a ticket, and the report of the run's result.

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
        const Error badParameter = Error::osStatus(base::kParameterError);
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
                   status == kExitOK ? std::string() : values::format(" Error %d.", status));
    }
    platform_.exitProcess(status);
}

}  // namespace pinwell
