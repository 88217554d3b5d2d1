#include "src/ticket_record.h"

#include <utility>

#include "values/json.h"

namespace pinwell {

using values::Array;
using values::Dictionary;
using values::URL;
using values::Value;

namespace {

constexpr std::string_view kDefaultContainer = "com.ostrel.tm.ticket-delivery";
constexpr std::string_view kProduction = "production";
constexpr std::string_view kDevelopment = "development";

constexpr std::string_view kContainerKey = "lm-container";
constexpr std::string_view kProductionKey = "lm-production";

constexpr int kHTTPStatusOK = 200;
constexpr std::string_view kFileNameToken = "${f}";
constexpr std::string_view kAssetFileName = "lmasset.ticket";

URL lookupURLForHost(const std::string& host, std::string_view container, std::string_view environment) {
    // The host was checked when it was read, so this is a valid URL with any container.
    return URL::fromString("https://" + host)
        ->appendingPathComponent(
            values::format("database/1/%@/%@/public/records/lookup", container, environment));
}

// A member that must be text if it exists.
const std::string* textOrNil(const Value& value) {
    if (value.isNil()) return nullptr;
    if (value.string() == nullptr) throw values::ValueTypeError("a text was expected");
    return value.string();
}

}  // namespace

base::Result<URL> lookupURL(const Platform& platform) {
    const auto host = platform.directory.lumoraHost();
    if (!host) return host.error();
    if (!platform.directory.allowsInternalSecurityPolicies())
        return lookupURLForHost(*host, kDefaultContainer, kProduction);

    const auto defaults = platform.userDefaults.openDomain(kDefaultsDomain);
    defaults->registerDefaults(
        {{std::string(kContainerKey), kDefaultContainer}, {std::string(kProductionKey), true}});
    return lookupURLForHost(*host, defaults->stringForKey(kContainerKey),
                            defaults->boolForKey(kProductionKey) ? kProduction : kDevelopment);
}

Value lookupBody(const std::vector<std::string>& recordNames) {
    Array records;
    for (const std::string& name : recordNames) records.push_back(Dictionary{{"recordName", name}});
    return Dictionary{{"records", std::move(records)}};
}

std::optional<https::Request> lookupRequest(std::optional<URL> url, const Value& body) {
    auto serialized = values::serializeJSON(body);
    if (!serialized) return std::nullopt;
    https::Request request;
    request.url = std::move(url);
    request.method = "POST";
    request.body = std::move(*serialized);
    request.addHeader("Content-Type", "application/json");
    return request;
}

const std::string* TicketRecord::ticketText() const {
    return textOrNil(ticket);
}

const std::string* TicketRecord::assetURLTemplate() const {
    const std::string* const text = textOrNil(assetURL);
    return text == nullptr || text->empty() ? nullptr : text;
}

TicketRecord ticketRecordOf(const Value& response) {
    const Value& record = response["records"][std::size_t{0}];
    const Value& fields = record["fields"];
    const Value& ticket = fields["signedTicket"]["value"];
    const Value& asset = fields["signedTicketAsset"]["value"];
    return {ticket, asset["downloadURL"], asset["size"], record["reason"]};
}

AssetFault faultOfAsset(const Value& announcedSize, std::size_t length,
                        const std::optional<https::HTTPResponse>& response) {
    if (length != announcedSize.unsignedIntegerValue()) return AssetFault::length;
    if (response && response->status != kHTTPStatusOK) return AssetFault::status;
    return AssetFault::none;
}

std::string assetURLText(std::string_view urlTemplate) {
    std::string text;
    while (true) {
        const std::size_t at = urlTemplate.find(kFileNameToken);
        text += urlTemplate.substr(0, at);
        if (at == std::string_view::npos) return text;
        text += kAssetFileName;
        urlTemplate.remove_prefix(at + kFileNameToken.size());
    }
}

}  // namespace pinwell
