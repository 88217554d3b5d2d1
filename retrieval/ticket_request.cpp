#include "retrieval/ticket_request.h"

#include <algorithm>
#include <array>
#include <random>
#include <utility>

#include "base/text.h"
#include "codesign/code_directory.h"
#include "formats/code_hashes.h"
#include "formats/explain_ticket.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/messages.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::retrieval {
namespace {

using https::URLErrorCode;
using values::Array;
using values::Dictionary;
using values::Value;

constexpr std::string_view kPath = "/v1/tickets";
constexpr std::array<std::string_view, 3> kActions{"issued", "reissued", "reinstated"};
constexpr std::size_t kEventDigits = 64;
constexpr std::size_t kShownDetail = 500;  // bytes of a service's own text

constexpr int kStatusRequestTimeout = 408;
constexpr int kStatusConflict = 409;

// A retry may reach the service after these failures.
constexpr std::array kLosses{URLErrorCode::cannotFindHost, URLErrorCode::cannotConnect,
                             URLErrorCode::timedOut, URLErrorCode::connectionLost, URLErrorCode::proxyFailed};

bool isCode(const base::Error& error, URLErrorCode code) {
    return error.domain() == base::kURLErrorDomain && error.code() == static_cast<std::int64_t>(code);
}

bool isLoss(const base::Error& error) {
    return std::any_of(kLosses.begin(), kLosses.end(),
                       [&error](URLErrorCode code) { return isCode(error, code); });
}

std::string nameOf(const CodeHash& hash) {
    return recordNameForHash(hash);
}

base::Result<base::Data> bodyOf(const TicketWish& wish) {
    Array hashes;
    for (const CodeHash& hash : wish.hashes) hashes.push_back(nameOf(hash));
    Dictionary body{
        {"record", nameOf(wish.hashes.front())}, {"hashes", std::move(hashes)}, {"label", wish.label}};
    if (wish.reinstates) body.emplace("reinstate", true);
    if (!wish.comment.empty()) body.emplace("comment", wish.comment);
    return values::serializeJSON(Value(std::move(body)));
}

// Independent of the request's contents. A key made from the contents would return an old ticket after the
// record was revoked.
std::string newKey() {
    std::random_device source;
    base::Data bytes;
    for (int i = 0; i < 4; ++i) {
        const std::uint32_t word = source();
        for (unsigned shift = 0; shift < 32; shift += 8) bytes.push_back(std::byte(word >> shift & 0xFFU));
    }
    return base::toHex(bytes);
}

https::Request requestFor(const values::URL& url, base::Data body) {
    https::Request request;
    request.url = url;
    request.method = "POST";
    request.body = std::move(body);
    request.addHeader("Content-Type", "application/json");
    request.addHeader("Accept", "application/json, application/problem+json");
    request.addHeader("Idempotency-Key", "\"" + newKey() + "\"");
    return request;
}

// "application/json; charset=utf-8" is application/json.
bool hasType(const https::HTTPResponse& response, std::string_view type) {
    std::string field = response.header("Content-Type").value_or("");
    field.resize(std::min(field.find_first_of("; \t"), field.size()));
    const https::CaseInsensitiveLess less;
    return !less(field, type) && !less(type, field);
}

const std::string* textIn(const Value& document, std::string_view key) {
    return document.dictionary() != nullptr ? document[key].string() : nullptr;
}

// The beginning of a text, cut between two characters.
std::string cutTo(std::size_t length, const std::string& text) {
    if (text.size() <= length) return text;
    while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0U) == 0x80U) --length;
    return text.substr(0, length) + "...";
}

// The service's description of the problem, with its status; only the status if the body is not a problem
// document.
std::string problemIn(const Exchange& exchange) {
    std::string text = values::format("%d (%@)", exchange.response->status,
                                      https::localizedStringForStatusCode(exchange.response->status));
    if (!hasType(*exchange.response, "application/problem+json")) return text;
    const auto problem = values::parseJSON(exchange.body);
    const std::string* const detail = problem ? textIn(*problem, "detail") : nullptr;
    return detail == nullptr ? text : text + values::format(": %@", cutTo(kShownDetail, *detail));
}

bool isHash(std::string_view text) {
    return text.size() == kEventDigits &&
           text.find_first_not_of("0123456789abcdef") == std::string_view::npos;
}

}  // namespace

std::optional<values::URL> serviceURLOf(std::string_view text) {
    while (text.ends_with('/')) text.remove_suffix(1);
    const auto url = values::URL::fromString(std::string(text) + std::string(kPath));
    if (!url || url->scheme() != "https" || url->host().empty()) return std::nullopt;
    const bool isPlain = text.find_first_of("?#@") == std::string_view::npos;
    return isPlain ? url : std::nullopt;
}

TicketRequests::TicketRequests(const Platform& platform, RequestOptions options, Cancellation& cancellation)
    : platform_(platform),
      options_(std::move(options)),
      cancellation_(cancellation),
      connection_(platform_),
      use_(cancellation_, connection_) {}

RequestedTicket TicketRequests::request(const TicketWish& wish) {
    const auto begun = Clock::now();
    RequestedTicket result;
    FetchedTicket& fetched = result.fetched;
    const std::string name = nameOf(wish.hashes.front());
    fetched.recordName = name;
    if (hasEnded(fetched)) return result;
    if (lost_) {
        fetched = *lost_;
        fetched.recordName = name;
        return result;
    }
    auto body = bodyOf(wish);
    if (!body) {
        fetched.end(
            Cause::notIssued, kExitDataError,
            values::format("The request for %@ cannot be written: label or comment is not UTF-8.", name));
        return result;
    }
    const https::Request request = requestFor(options_.service, *std::move(body));
    for (unsigned failures = 1;; ++failures) {
        const Try tried = attempt(wish, request, result);
        if (fetched.cause == Cause::unreachable && hasEnded(fetched)) break;
        if (!tried.mayBeRepeated || failures > options_.retry.retries) break;
        auto due = Clock::now() + options_.retry.delayAfter(failures, tried.retryAfter, randomChance());
        if (options_.deadline) due = std::min(due, *options_.deadline);
        cancellation_.sleepUntil(due);
        if (hasEnded(fetched)) break;
    }
    fetched.seconds = std::chrono::duration<double>(Clock::now() - begun).count();
    return result;
}

std::optional<Cause> TicketRequests::end() const {
    if (options_.deadline && Clock::now() >= *options_.deadline) return Cause::timedOut;
    if (cancellation_.isCancelled()) return Cause::interrupted;
    return std::nullopt;
}

bool TicketRequests::hasEnded(FetchedTicket& result) const {
    const std::optional<Cause> why = end();
    if (!why) return false;
    result.cause = *why;
    result.exitStatus = kExitNoHost;
    return true;
}

TicketRequests::Try TicketRequests::attempt(const TicketWish& wish, const https::Request& request,
                                            RequestedTicket& result) {
    FetchedTicket& fetched = result.fetched;
    const Exchange exchange = connection_.exchange(request, options_.deadline);
    ++fetched.attempts;
    fetched.messages = exchange.messages;
    if (!exchange.error) {
        lost_.reset();
        return takeResponse(wish, exchange, result);
    }
    fetched.end(exchange.serverWasRefused ? Cause::untrusted : Cause::unreachable, kExitNoHost,
                values::format("error is %@", exchange.error));
    const bool isLost = !exchange.serverWasRefused && isLoss(*exchange.error);
    if (isLost || exchange.serverWasRefused ||
        isCode(*exchange.error, URLErrorCode::secureConnectionFailed)) {
        lost_ = fetched;
        lost_->attempts = 0;
    }
    return {isLost};
}

TicketRequests::Try TicketRequests::takeResponse(const TicketWish& wish, const Exchange& exchange,
                                                 RequestedTicket& result) const {
    FetchedTicket& fetched = result.fetched;
    const int status = exchange.response->status;
    if (status >= 200 && status < 300) {
        takeIssued(wish, exchange, result);
        return {};
    }
    const std::string problem = problemIn(exchange);
    if (status == kStatusConflict) {
        fetched.end(Cause::revoked, kExitNoPermission,
                    values::format("No ticket was issued for %@: %@", fetched.recordName, problem));
        return {};
    }
    if (status >= 400 && status < 500 && status != kStatusRequestTimeout && !isBusyStatus(status)) {
        fetched.end(Cause::notIssued, kExitDataError,
                    values::format("No ticket was issued for %@: %@", fetched.recordName, problem));
        return {};
    }
    fetched.end(
        Cause::unreachable, kExitNoHost,
        values::format("The service cannot issue a ticket for %@ now: %@", fetched.recordName, problem));
    return {isBusyStatus(status) || status == kStatusRequestTimeout, retryAfterOf(*exchange.response)};
}

void TicketRequests::takeIssued(const TicketWish& wish, const Exchange& exchange,
                                RequestedTicket& result) const {
    FetchedTicket& fetched = result.fetched;
    const auto refuse = [&fetched](std::string message) {
        fetched.end(Cause::notAcceptable, kExitDataError, std::move(message));
    };
    const auto document = values::parseJSON(exchange.body);
    const Value issued = document && hasType(*exchange.response, "application/json") ? *document : Value();
    const std::string* const record = textIn(issued, "record");
    const std::string* const action = textIn(issued, "action");
    const std::string* const event = textIn(issued, "event");
    const std::string* const text = textIn(issued, "ticket");
    if (record == nullptr || action == nullptr || event == nullptr || text == nullptr || !isHash(*event) ||
        std::find(kActions.begin(), kActions.end(), *action) == kActions.end())
        return refuse(
            values::format("The service's answer for %@ does not have the form of one.", fetched.recordName));
    if (*record != fetched.recordName)
        return refuse(values::format("The service's answer for %@ is about another record, %@.",
                                     fetched.recordName, cutTo(kShownDetail, *record)));
    std::vector<base::Data> hashes;
    for (const CodeHash& hash : wish.hashes) hashes.push_back(hash.hash);
    fetched.take(base::decodeBase64(*text), hashes, platform_.trust);
    if (fetched.cause == Cause::notAcceptable) return;
    result.action = *action;
    result.event = *event;
}

}  // namespace pinwell::retrieval
