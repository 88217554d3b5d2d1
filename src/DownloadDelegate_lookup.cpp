// The lookup of the ticket's record: one POST to the record service, and what its answer means.

#include <stdexcept>

#include "foundation/base64.h"
#include "foundation/json.h"
#include "foundation/process.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"

namespace pinwell {

using foundation::Array;
using foundation::Dictionary;
using foundation::Value;

namespace {

constexpr std::string_view kDefaultContainer = "com.ostrel.tm.ticket-delivery";
constexpr std::string_view kProduction = "production";
constexpr std::string_view kDevelopment = "development";

constexpr std::string_view kDefaultsDomain = "com.ostrel.tm.pinwell";
constexpr std::string_view kContainerKey = "lm-container";
constexpr std::string_view kProductionKey = "lm-production";

constexpr std::string_view kRequestIdentifierHeader = "X-Ostrel-Request-UUID";

constexpr int kRecordNameVersionPlain = 1;
constexpr int kRecordNameVersionWithAlgorithm = 2;

URL lookupURLForHost(const std::string& host, std::string_view container, std::string_view environment) {
    // The host was checked when it was read, so this is a URL whatever the container holds.
    return URL::fromString("https://" + host)
        ->appendingPathComponent(
            foundation::format("database/1/%@/%@/public/records/lookup", container, environment));
}

// Text of a member that must be text when it is there at all.
const std::string* textOrNil(const Value& value) {
    if (value.isNil()) return nullptr;
    if (value.string() == nullptr) throw foundation::ValueTypeError("a text was expected");
    return value.string();
}

}  // namespace

std::optional<URL> DownloadDelegate::lookupURL(std::optional<Error>& error) const {
    const auto host = platform_.directory.lumoraHost();
    if (!host) {
        error = host.error();
        return std::nullopt;
    }
    if (!platform_.directory.allowsInternalSecurityPolicies())
        return lookupURLForHost(*host, kDefaultContainer, kProduction);

    const auto defaults = platform_.userDefaults.openDomain(kDefaultsDomain);
    defaults->registerDefaults(
        {{std::string(kContainerKey), kDefaultContainer}, {std::string(kProductionKey), true}});
    return lookupURLForHost(*host, defaults->stringForKey(kContainerKey),
                            defaults->boolForKey(kProductionKey) ? kProduction : kDevelopment);
}

std::string recordNameForHash(std::uint32_t algorithm, foundation::ByteView hash) {
    const std::string hex = foundation::toHex(hash);
    if (algorithm == 0) return foundation::format("%d/%@", kRecordNameVersionPlain, hex);
    return foundation::format("%d/%d/%@", kRecordNameVersionWithAlgorithm, algorithm, hex);
}

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

    std::optional<Error> configurationError;
    https::Request request;
    request.url = lookupURL(configurationError);

    const Value body = Dictionary{{"records", Array{Dictionary{{"recordName", recordName()}}}}};
    auto serialized = foundation::serializeJSON(body);
    if (!serialized) return false;
    request.method = "POST";
    request.body = std::move(*serialized);
    request.addHeader("Content-Type", "application/json");
    Dictionary headers;
    for (const auto& [name, value] : request.headers) headers.emplace(name, value);
    NoisyLog("JSON Data is %@", body);
    NoisyLog(" Headers: %@", headers);

    if (configurationError) {
        // Without a host there is nothing to connect to: the lookup has failed before it began.
        lookupDidComplete(std::nullopt, std::nullopt, configurationError);
        return true;
    }
    auto session = platform_.https.ephemeralSession(*this);
    if (!session) {
        lookupDidComplete(std::nullopt, std::nullopt, session.error());
        return true;
    }
    lookupSession_ = *std::move(session);
    const auto task = lookupSession_->dataTask(
        std::move(request), [this](const auto& data, const auto& response, const auto& error) {
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

// Throws when the response does not have the shape that is expected of it.
std::optional<Data> DownloadDelegate::ticketFromResponse(const Value& response, bool& downloading) {
    const Value& record = response["records"][std::size_t{0}];
    const Value& fields = record["fields"];
    const Value& ticketValue = fields["signedTicket"]["value"];
    const Value& asset = fields["signedTicketAsset"]["value"];
    const Value& downloadURL = asset["downloadURL"];
    setLargeTicketSize(asset["size"]);

    if (const std::string* ticket = textOrNil(ticketValue)) return foundation::decodeBase64(*ticket);
    if (const std::string* url = textOrNil(downloadURL); url != nullptr && !url->empty()) {
        downloading = asynchronouslyDownloadLargeTicketFromURLString(*url);
        return std::nullopt;
    }
    MessageLog("Lumora query for %@ (%@) failed due to \"%@\".", fileName(), prettyHashString(),
               record["reason"]);
    return std::nullopt;
}

}  // namespace pinwell
