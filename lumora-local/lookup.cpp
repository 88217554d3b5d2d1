#include "lookup.h"

#include <algorithm>
#include <span>
#include <unordered_map>

#include "base/text.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using values::Array;
using values::Dictionary;
using values::format;
using values::Value;

constexpr std::string_view kDatabasePrefix = "/database/1/";
constexpr std::string_view kLookupSuffix = "/public/records/lookup";
constexpr std::string_view kAssetPrefix = "/assets/";
constexpr std::string_view kHealthPath = "/healthz";
constexpr std::string_view kReadyPath = "/readyz";
constexpr std::string_view kFileNameToken = "${f}";
constexpr std::size_t kAssetIdentifierLength = 64;  // SHA-256 in hexadecimal
constexpr std::size_t kMaximumFileNameLength = 200;

// A query costs one round trip to the database. All its tickets are in memory at once.
constexpr std::size_t kNamesAtOnce = 16;

std::string json(const Value& value) {
    const base::Result<Data> document = values::serializeJSON(value);
    // The values are our own text, or text from a JSON parser.
    return document ? base::toString(*document) : std::string("{}");
}

Answer notFound() {
    return refusal(404, "NOT_FOUND", "There is nothing at this path");
}

Answer methodNotAllowed(const char* allowed) {
    Answer answer = refusal(405, "METHOD_NOT_ALLOWED", format("The method here is %s", allowed));
    answer.headers.emplace_back("Allow", allowed);
    return answer;
}

/// The container and the environment are between the prefix and the suffix.
std::optional<Environment> environmentOfLookup(std::string_view path) {
    if (!path.starts_with(kDatabasePrefix)) return std::nullopt;
    path.remove_prefix(kDatabasePrefix.size());
    if (!path.ends_with(kLookupSuffix)) return std::nullopt;
    path.remove_suffix(kLookupSuffix.size());
    if (!path.starts_with(kContainer)) return std::nullopt;
    path.remove_prefix(kContainer.size());
    if (!path.starts_with('/')) return std::nullopt;
    return parseEnvironment(path.substr(1));
}

bool isFileNameCharacter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' ||
           c == '_' || c == '-';
}

/// The identifier in "/assets/IDENTIFIER/NAME". A name that still is the token, or anything but a plain file
/// name, is refused: it means that the client did not fill in the template.
std::optional<std::string> assetIdentifier(std::string_view path) {
    path.remove_prefix(kAssetPrefix.size());
    const std::size_t slash = path.find('/');
    if (slash != kAssetIdentifierLength) return std::nullopt;
    const std::string_view name = path.substr(slash + 1);
    if (name.empty() || name.size() > kMaximumFileNameLength ||
        !std::all_of(name.begin(), name.end(), isFileNameCharacter)) {
        return std::nullopt;
    }
    return std::string(path.substr(0, slash));
}

/// The requested names, or the reason for a refusal.
struct LookupBody {
    std::vector<std::string> names;
    std::optional<Answer> refused;
};

LookupBody badRequest(std::string_view reason) {
    return {{}, refusal(400, "BAD_REQUEST", reason)};
}

LookupBody parseLookupBody(std::string_view body) {
    const base::Result<Value> document = values::parseJSON(base::asBytes(body));
    if (!document) {
        return badRequest(format("The body is not JSON: %@", document.error().localizedDescription()));
    }
    if (document->dictionary() == nullptr) return badRequest("The body is not a JSON object");
    const Array* records = (*document)["records"].array();
    if (records == nullptr) return badRequest("\"records\" is not an array");
    if (records->empty()) return badRequest("\"records\" is empty");
    if (records->size() > kMaximumRecordsPerRequest) {
        return badRequest(format("At most %zu records can be looked up at once", kMaximumRecordsPerRequest));
    }
    LookupBody parsed;
    for (const Value& record : *records) {
        if (record.dictionary() == nullptr) return badRequest("A record is not a JSON object");
        const std::string* name = record["recordName"].string();
        if (name == nullptr) return badRequest("\"recordName\" is not a string");
        if (name->size() > kMaximumRecordNameLength) {
            return badRequest(format("A record name has at most %zu bytes", kMaximumRecordNameLength));
        }
        parsed.names.push_back(*name);
    }
    return parsed;
}

Value missingRecord(const std::string& name) {
    return Dictionary{{"recordName", name}, {"serverErrorCode", "NOT_FOUND"}, {"reason", "Record not found"}};
}

Value foundRecord(const std::string& name, std::string field, const char* type, Value value) {
    Dictionary fields{{std::move(field), Dictionary{{"type", type}, {"value", std::move(value)}}}};
    return Dictionary{{"recordName", name}, {"recordType", "SignedTicket"}, {"fields", std::move(fields)}};
}

Answer answerTooLarge() {
    return refusal(413, "ANSWER_TOO_LARGE", "The answer would be too large; ask for fewer records at once");
}

}  // namespace

Answer refusal(int status, std::string_view code, std::string_view reason) {
    Answer answer;
    answer.status = status;
    answer.body = json(Dictionary{{"serverErrorCode", code}, {"reason", reason}});
    return answer;
}

Answer refusalForNow(std::string_view reason) {
    Answer answer = refusal(503, "SERVICE_UNAVAILABLE", reason);
    answer.headers.emplace_back("Retry-After", "1");
    return answer;
}

RequestKind LookupService::kindOf(std::string_view target) const {
    const std::string_view path = pathOf(target);
    if (path == kHealthPath) return RequestKind::health;
    if (path == kReadyPath) return RequestKind::readiness;
    if (path.starts_with(kAssetPrefix)) return RequestKind::asset;
    return environmentOfLookup(path) ? RequestKind::lookup : RequestKind::other;
}

Answer LookupService::refuse(int status, const RequestHead*) const {
    switch (status) {
        case 408:
            return refusal(408, "REQUEST_TIMEOUT", "The request took too long to arrive");
        case 411:
            return refusal(411, "LENGTH_REQUIRED", "A lookup says how long it is");
        case 413:
            return refusal(413, "PAYLOAD_TOO_LARGE", "The body is too large");
        case 414:
            return refusal(414, "URI_TOO_LONG", "The request's target is too long");
        case 431:
            return refusal(431, "HEADERS_TOO_LARGE", "The request's headers are too large");
        default:
            return refusal(400, "BAD_REQUEST", "The request is malformed");
    }
}

std::optional<Answer> LookupService::answerHead(const RequestHead& head) const {
    const std::string_view path = pathOf(head.target);
    const bool reading = head.method == "GET" || head.method == "HEAD";
    if (path == kHealthPath) return reading ? answerHealth() : methodNotAllowed("GET");
    if (path == kReadyPath) return reading ? answerReadiness() : methodNotAllowed("GET");
    if (path.starts_with(kAssetPrefix)) return reading ? answerAsset(path) : methodNotAllowed("GET");
    if (!environmentOfLookup(path)) return notFound();
    if (head.method != "POST") return methodNotAllowed("POST");
    if (!isJson(head.contentType)) {
        return refusal(415, "UNSUPPORTED_MEDIA_TYPE", "The content type of a lookup is application/json");
    }
    if (!head.contentEncoding.empty() && head.contentEncoding != "identity") {
        return refusal(415, "UNSUPPORTED_MEDIA_TYPE", "A lookup is sent without a content encoding");
    }
    return std::nullopt;
}

Answer LookupService::answerLookup(const RequestHead& head, std::string_view body) const {
    const std::optional<Environment> environment = environmentOfLookup(pathOf(head.target));
    if (!environment) return notFound();
    const std::optional<std::uint64_t> state = source_.changeCounter();
    Answer answer;
    if (state) {
        if (const auto known = answers_.find(*state, *environment, body)) {
            answer.body = known->text;
            answer.records = known->names;
            answer.recordsFound = answer.recordsFromMemory = known->names.size();
            return answer;
        }
    }
    LookupBody request = parseLookupBody(body);
    if (request.refused) return *std::move(request.refused);
    const std::optional<FoundByName> found = findRecords(head, *environment, request.names, state);
    if (!found) return answerTooLarge();
    // Responses share their repeated parts until they are joined.
    constexpr std::string_view kBegin = "{\"records\":[";
    constexpr std::string_view kEnd = "]}";
    std::size_t size = kBegin.size() + kEnd.size();
    bool isForAll = true;
    for (const std::string& name : request.names) {
        const Found& entry = found->at(name);
        isForAll = isForAll && entry.isForAll;
        size += entry.record->text.size() + 1;
        if (size > kMaximumAnswerSize) return answerTooLarge();
    }
    answer.body.reserve(size);
    answer.body = kBegin;
    std::string_view separator;
    for (const std::string& name : request.names) {
        answer.body += separator;
        const Found& entry = found->at(name);
        answer.body += entry.record->text;
        answer.recordsFound += entry.isKnown ? 1U : 0U;
        answer.recordsFromMemory += entry.fromMemory ? 1U : 0U;
        separator = ",";
    }
    answer.body += kEnd;
    answer.records = std::move(request.names);
    if (state && isForAll) {
        answers_.insert(*state, *environment, body,
                        std::make_shared<const KeptAnswer>(KeptAnswer{answer.body, answer.records}));
    }
    return answer;
}

/// A repeated name is looked up once. `nullopt` if the records together are too large for a response.
std::optional<LookupService::FoundByName> LookupService::findRecords(
    const RequestHead& head, Environment environment, const std::vector<std::string>& names,
    std::optional<std::uint64_t> state) const {
    FoundByName found;
    std::vector<std::string> missing;
    for (const std::string& name : names) {
        auto [entry, fresh] = found.try_emplace(name);
        if (!fresh) continue;
        if (state) entry->second = {records_.find(*state, environment, name), true, true, true};
        if (entry->second.record == nullptr) missing.push_back(name);
    }
    std::size_t size = 0;
    for (std::span<const std::string> rest = missing; !rest.empty();) {
        const auto group = rest.first(std::min(rest.size(), kNamesAtOnce));
        const std::vector<std::optional<Delivery>> deliveries = source_.findTickets(environment, group);
        for (std::size_t i = 0; i < group.size(); ++i) {
            Found record = makeRecord(head, environment, group[i], deliveries.at(i), state);
            size += record.record->text.size();
            found.at(group[i]) = std::move(record);
        }
        if (size > kMaximumAnswerSize) return std::nullopt;
        rest = rest.subspan(group.size());
    }
    return found;
}

/// A record in the form of a response. Only parts that are the same for all clients are cached: an asset's
/// URL has the client's name for the service, and anybody can request missing names.
LookupService::Found LookupService::makeRecord(const RequestHead& head, Environment environment,
                                               const std::string& name,
                                               const std::optional<Delivery>& delivery,
                                               std::optional<std::uint64_t> state) const {
    const auto share = [](const Value& record) {
        return std::make_shared<const KeptAnswer>(KeptAnswer{json(record)});
    };
    if (delivery && delivery->inlineTicket) {
        auto record =
            share(foundRecord(name, "signedTicket", "BYTES", base::encodeBase64(*delivery->inlineTicket)));
        if (state) records_.insert(*state, environment, name, record);
        return {std::move(record), true, true};
    }
    if (delivery && delivery->asset) {
        Dictionary asset{{"downloadURL", assetUrlTemplate(head, delivery->asset->identifier)},
                         {"size", delivery->asset->size}};
        return {share(foundRecord(name, "signedTicketAsset", "ASSET", std::move(asset))), false, true};
    }
    return {share(missingRecord(name)), false};
}

Answer LookupService::answerAsset(std::string_view path) const {
    const std::optional<std::string> identifier = assetIdentifier(path);
    std::shared_ptr<const Data> ticket = identifier ? sharedAsset(*identifier) : nullptr;
    if (ticket == nullptr) return notFound();
    Answer answer;
    answer.contentType = "application/octet-stream";
    answer.asset = std::move(ticket);
    return answer;
}

std::shared_ptr<const Data> LookupService::sharedAsset(const std::string& identifier) const {
    // The record decides whether there is such an asset; downloads of the same asset share its bytes.
    std::optional<Data> ticket = source_.findAsset(identifier);
    if (!ticket) return nullptr;
    const std::lock_guard lock(assetsMutex_);
    std::erase_if(assets_, [](const auto& entry) { return entry.second.expired(); });
    std::weak_ptr<const Data>& known = assets_[identifier];
    std::shared_ptr<const Data> shared = known.lock();
    if (shared == nullptr) {
        shared = std::make_shared<const Data>(*std::move(ticket));
        known = shared;
    }
    return shared;
}

Answer LookupService::answerHealth() const {
    const std::size_t records = source_.countRecords();
    Answer answer;
    answer.body = json(Dictionary{{"status", "ok"}, {"records", std::uint64_t{records}}});
    return answer;
}

Answer LookupService::answerReadiness() const {
    // Throws if the records cannot be read. No record has this name.
    static_cast<void>(source_.findTicket(Environment::production, ""));
    if (obstacle_) {
        if (const std::optional<std::string> obstacle = obstacle_()) return refusalForNow(*obstacle);
    }
    Answer answer;
    answer.body = json(Dictionary{{"status", "ready"}});
    return answer;
}

std::string LookupService::assetUrlTemplate(const RequestHead& head, const std::string& identifier) const {
    // A client that used one of our names can use it again; any other text is not repeated.
    const std::optional<Endpoint> asked = parseEndpoint(head.host, kHttpsPort);
    const bool ours =
        asked && asked->port != 0 && std::find(hosts_.begin(), hosts_.end(), asked->host) != hosts_.end();
    return "https://" + toString(ours ? *asked : fallback_) + std::string(kAssetPrefix) + identifier + "/" +
           std::string(kFileNameToken);
}

}  // namespace pinwell::lumora
