#include "retrieval/record_service.h"

#include <algorithm>
#include <atomic>
#include <functional>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <thread>
#include <utility>

#include "base/bytes.h"
#include "base/file_io.h"
#include "src/ticket_record.h"
#include "values/json.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell::retrieval {

using values::Array;
using values::Dictionary;
using values::Value;

namespace {

/// A connection for one thread of a call. It returns to the pool unless it was cancelled.
class ConnectionLease {
  public:
    ConnectionLease(const Cancellation& cancellation, std::unique_ptr<Connection> connection,
                    std::function<void(std::unique_ptr<Connection>)> giveBack)
        : connection_(std::move(connection)), giveBack_(std::move(giveBack)) {
        use_.emplace(cancellation, *connection_);
    }
    ~ConnectionLease() {
        use_.reset();
        if (!connection_->isCancelled()) giveBack_(std::move(connection_));
    }
    ConnectionLease(const ConnectionLease&) = delete;
    ConnectionLease& operator=(const ConnectionLease&) = delete;

    Connection& operator*() const noexcept { return *connection_; }

  private:
    std::unique_ptr<Connection> connection_;
    const std::function<void(std::unique_ptr<Connection>)> giveBack_;
    std::optional<Cancellation::Use> use_;
};

// After this many failures in a row, the remaining names are not looked up.
constexpr unsigned kFailuresInARow = 6;

// The request's identifier names the ticket's file: a number makes it unique.
https::HTTPResponse withOwnIdentifier(https::HTTPResponse response) {
    static std::atomic<std::uint64_t> last = 0;
    const auto found = response.headers.find(kRequestIdentifierHeader);
    if (found == response.headers.end()) return response;
    if (base::isSafeFileName(found->second))
        found->second += "-" + std::to_string(++last);
    else
        response.headers.erase(found);
    return response;
}

Answer answerOf(const Exchange& exchange, base::Data body) {
    Answer answer;
    answer.kind = Answer::Kind::answered;
    answer.response = withOwnIdentifier(*exchange.response);
    answer.body = std::move(body);
    answer.messages = exchange.messages;
    return answer;
}

base::Error busyError(const https::HTTPResponse& response) {
    return {base::kURLErrorDomain, static_cast<std::int64_t>(https::URLErrorCode::badServerResponse),
            "The host \"" + response.url.host() + "\" answered with status " +
                std::to_string(response.status) + " (" +
                https::localizedStringForStatusCode(response.status) + ")."};
}

// Returns `nullopt` if there is a response with a body, and its status is not a busy one. Otherwise returns
// the failure as an answer, which is not `answered`.
std::optional<Answer> failureOf(const Exchange& exchange) {
    Answer answer;
    answer.messages = exchange.messages;
    if (exchange.error) {
        answer.kind = exchange.serverWasRefused ? Answer::Kind::untrusted : Answer::Kind::unreachable;
        answer.error = exchange.error;
        return answer;
    }
    if (exchange.response && isBusyStatus(exchange.response->status)) {
        answer.retryAfter = retryAfterOf(*exchange.response);
        answer.error = busyError(*exchange.response);
        return answer;
    }
    if (exchange.body.empty()) {
        answer.response = exchange.response;
        return answer;
    }
    return std::nullopt;
}

// The limits that end a call early.
struct Limits {
    const Cancellation& cancellation;
    std::optional<Clock::time_point> deadline;
};

enum class Grouping {
    inOrder,  // one record for each name, with its name, in the requested order
    none,     // other records
    unknown,  // no records
};

Grouping groupingOf(const Value& document, const std::vector<std::string>& names) {
    if (document.dictionary() == nullptr) return Grouping::unknown;
    const Array* const records = document["records"].array();
    if (records == nullptr) return Grouping::unknown;
    if (records->size() != names.size()) return Grouping::none;
    for (std::size_t i = 0; i < names.size(); ++i) {
        const Dictionary* const record = records->at(i).dictionary();
        if (record == nullptr) return Grouping::none;
        const std::string* const name = records->at(i)["recordName"].string();
        if (name == nullptr || *name != names[i]) return Grouping::none;
    }
    return Grouping::inOrder;
}

// The request for the record's asset, if it has one instead of a ticket.
std::optional<https::Request> assetRequest(const base::Data& body) {
    const auto document = values::parseJSON(body);
    if (!document) return std::nullopt;
    try {
        const TicketRecord record = ticketRecordOf(*document);
        const std::string* const url = record.ticketText() == nullptr ? record.assetURLTemplate() : nullptr;
        if (url == nullptr) return std::nullopt;
        https::Request request;
        request.url = values::URL::fromString(assetURLText(*url));
        if (!request.url) return std::nullopt;
        return request;
    } catch (const values::ValueTypeError&) {
        return std::nullopt;
    } catch (const std::out_of_range&) {
        return std::nullopt;
    }
}

}  // namespace

bool Answer::hasNoTicket() const {
    if (kind != Kind::answered || body.empty()) return false;
    const auto document = values::parseJSON(body);
    try {
        const TicketRecord record = ticketRecordOf(document ? *document : values::Value());
        return record.ticketText() == nullptr && record.assetURLTemplate() == nullptr;
    } catch (const values::ValueTypeError&) {
        return false;
    } catch (const std::out_of_range&) {
        return false;
    }
}

class RecordService::Impl {
  public:
    explicit Impl(const Platform& platform) : platform_(platform) {}

    std::vector<Answer> lookUp(const std::vector<std::string>& names, const Limits& limits) {
        std::vector<Answer> answers(names.size());
        if (names.empty()) return answers;
        const auto url = lookupURL(platform_);
        if (!url) {
            for (Answer& answer : answers) answer.error = url.error();
            return answers;
        }
        if (names.size() == 1 || !answersGroups_ || !lookUpGroup(*url, names, answers, limits))
            lookUpOneByOne(*url, names, answers, limits);
        fetchAssets(answers, limits);
        return answers;
    }

  private:
    // Returns false if the names must be looked up one by one.
    bool lookUpGroup(const values::URL& url, const std::vector<std::string>& names,
                     std::vector<Answer>& answers, const Limits& limits) {
        Exchange exchange;
        {
            const ConnectionLease lease = lend(limits.cancellation);
            auto request = lookupRequest(url, lookupBody(names));
            if (!request) return false;
            exchange = (*lease).exchange(*std::move(request), limits.deadline);
        }
        if (const auto failure = failureOf(exchange)) {
            for (Answer& answer : answers) answer = *failure;
            return true;
        }
        const auto document = values::parseJSON(exchange.body);
        const Grouping grouping = document ? groupingOf(*document, names) : Grouping::unknown;
        if (grouping == Grouping::none) answersGroups_ = false;
        if (grouping != Grouping::inOrder) return false;
        for (std::size_t i = 0; i < names.size(); ++i) {
            auto body = values::serializeJSON(Dictionary{{"records", Array{(*document)["records"][i]}}});
            if (!body) return false;
            answers[i] = answerOf(exchange, *std::move(body));
        }
        return true;
    }

    void lookUpOneByOne(const values::URL& url, const std::vector<std::string>& names,
                        std::vector<Answer>& answers, const Limits& limits) {
        std::vector<std::size_t> all(names.size());
        for (std::size_t i = 0; i < all.size(); ++i) all[i] = i;
        onConnections(
            all, limits,
            [&](std::size_t index, Connection& connection) {
                auto request = lookupRequest(url, lookupBody({names[index]}));
                // A name that is not UTF-8 has no record.
                if (!request) return std::optional<Answer>(answers[index]);
                Exchange exchange = connection.exchange(*std::move(request), limits.deadline);
                if (auto failure = failureOf(exchange)) {
                    answers[index] = *failure;
                    return failure;
                }
                answers[index] = answerOf(exchange, std::move(exchange.body));
                return std::optional<Answer>();
            },
            answers);
    }

    void fetchAssets(std::vector<Answer>& answers, const Limits& limits) {
        std::vector<std::size_t> wanted;
        for (std::size_t i = 0; i < answers.size(); ++i)
            if (answers[i].kind == Answer::Kind::answered && assetRequest(answers[i].body))
                wanted.push_back(i);
        onConnections(
            wanted, limits,
            [&](std::size_t index, Connection& connection) {
                Exchange exchange = connection.exchange(*assetRequest(answers[index].body), limits.deadline);
                auto failure = failureOf(exchange);
                Answer& answer = answers[index];
                answer.messages.insert(answer.messages.end(), exchange.messages.begin(),
                                       exchange.messages.end());
                if (failure) {
                    markAssetFailed(answer, *failure);
                } else {
                    answer.asset = Answer::Asset{*exchange.response, std::move(exchange.body)};
                }
                return failure;
            },
            answers, true);
    }

    static void markAssetFailed(Answer& answer, const Answer& failure) {
        answer.kind = failure.kind;
        answer.error = failure.error;
        answer.retryAfter = failure.retryAfter;
        answer.errorIsOfAsset = true;
    }

    // Calls `work` for each index, on a few connections at once. `work` returns the failure, if any.
    void onConnections(const std::vector<std::size_t>& indices, const Limits& limits,
                       const std::function<std::optional<Answer>(std::size_t, Connection&)>& work,
                       std::vector<Answer>& answers, bool ofAssets = false) {
        std::atomic<std::size_t> next = 0;
        const auto takeTurns = [&] {
            const ConnectionLease lease = lend(limits.cancellation);
            unsigned failures = 0;
            std::optional<Answer> lastFailure;
            for (std::size_t i = next++; i < indices.size(); i = next++) {
                const bool goesOn = failures < kFailuresInARow &&
                                    !(lastFailure && lastFailure->kind == Answer::Kind::untrusted);
                if (!goesOn) {
                    if (ofAssets)
                        markAssetFailed(answers[indices[i]], *lastFailure);
                    else
                        answers[indices[i]] = *lastFailure;
                    continue;
                }
                lastFailure = work(indices[i], *lease);
                failures = lastFailure ? failures + 1 : 0;
            }
        };
        std::vector<std::thread> others;
        const std::size_t threads = std::min(indices.size(), kConnectionsPerCall);
        for (std::size_t i = 1; i < threads; ++i) {
            try {
                others.emplace_back(takeTurns);
            } catch (const std::system_error&) {
                break;  // with fewer threads it only takes longer
            }
        }
        if (!indices.empty()) takeTurns();
        for (std::thread& other : others) other.join();
    }

    ConnectionLease lend(const Cancellation& cancellation) {
        std::unique_ptr<Connection> connection;
        {
            const std::lock_guard lock(mutex_);
            if (!idle_.empty()) {
                connection = std::move(idle_.back());
                idle_.pop_back();
            }
        }
        if (!connection) connection = std::make_unique<Connection>(platform_);
        return {cancellation, std::move(connection), [this](std::unique_ptr<Connection> back) {
                    const std::lock_guard lock(mutex_);
                    if (idle_.size() < kConnectionsPerCall) idle_.push_back(std::move(back));
                }};
    }

    const Platform platform_;
    std::atomic<bool> answersGroups_ = true;
    std::mutex mutex_;
    std::vector<std::unique_ptr<Connection>> idle_;
};

RecordService::RecordService(const Platform& platform) : impl_(std::make_unique<Impl>(platform)) {}
RecordService::~RecordService() = default;

std::vector<Answer> RecordService::lookUp(const std::vector<std::string>& names,
                                          const Cancellation& cancellation,
                                          std::optional<Clock::time_point> deadline) {
    return impl_->lookUp(names, {cancellation, deadline});
}

}  // namespace pinwell::retrieval
