#include "retrieval/ticket_fetch.h"

#include <algorithm>
#include <map>
#include <stdexcept>
#include <utility>

#include "base/text.h"
#include "formats/explain_ticket.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/messages.h"
#include "src/ticket_record.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::retrieval {
namespace {

constexpr std::size_t kShortestHash = 20;
constexpr std::size_t kLongestHash = 64;
constexpr std::size_t kMostAlgorithmDigits = 10;  // of 32 bits

struct Pending {
    std::size_t index = 0;  // of the name
    FetchedTicket result;
    unsigned failures = 0;  // tries without a result
    unsigned polls = 0;     // responses: not issued yet
    Clock::time_point begun;
    std::optional<Clock::time_point> notIssuedSince;
};

// Returns false, and ends the result, if the asset is not the one that the record announces.
bool isAnnounced(const Answer::Asset& asset, const TicketRecord& record, FetchedTicket& result) {
    switch (faultOfAsset(record.assetSize, asset.contents.size(), asset.response)) {
        case AssetFault::length:
            result.end(
                Cause::notAcceptable, kExitDataError,
                values::format("We were expecting a ticket size of %@ but download a ticket of size %lu",
                               record.assetSize, asset.contents.size()));
            return false;
        case AssetFault::status:
            result.end(
                Cause::unreachable, kExitNoHost,
                values::format("Attempting to download larger ticket for %@ failed. %@", result.recordName,
                               https::localizedStringForStatusCode(asset.response.status)));
            return false;
        case AssetFault::none:
            break;
    }
    return true;
}

// Takes the ticket from a record. Throws as ticketRecordOf() if the response has another form.
void takeTicket(const Answer& answer, FetchedTicket& result, trust::TrustService& trust) {
    const auto document = values::parseJSON(answer.body);
    const TicketRecord record = ticketRecordOf(document ? *document : values::Value());
    std::optional<base::Data> ticket;
    if (const std::string* const text = record.ticketText()) {
        ticket = base::decodeBase64(*text);
    } else if (record.assetURLTemplate() == nullptr) {
        return result.end(
            Cause::notIssued, kExitDataError,
            values::format("Lumora query for %@ failed due to \"%@\".", result.recordName, record.reason));
    } else if (answer.asset) {
        if (!isAnnounced(*answer.asset, record, result)) return;
        ticket = answer.asset->contents;
    }
    // The name was looked up, so it holds a hash.
    result.take(std::move(ticket), {*hashInRecordName(result.recordName)}, trust);
}

void takeAnswer(const Answer& answer, FetchedTicket& result, trust::TrustService& trust) {
    ++result.attempts;
    result.messages = answer.messages;
    result.ticket.clear();
    if (answer.error) {
        result.end(answer.kind == Answer::Kind::untrusted ? Cause::untrusted : Cause::unreachable,
                   kExitNoHost, values::format("error is %@", answer.error));
        return;
    }
    if (answer.body.empty()) {
        result.end(Cause::unreachable, kExitNoHost,
                   values::format("Lumora's response is inconsistent with expections: %@", answer.response));
        return;
    }
    const auto refuseForm = [&result] {
        result.end(
            Cause::notAcceptable, kExitDataError,
            values::format("Lumora query for %@ did not return expected JSON data.", result.recordName));
    };
    try {
        takeTicket(answer, result, trust);
    } catch (const values::ValueTypeError&) {
        refuseForm();
    } catch (const std::out_of_range&) {
        refuseForm();
    }
}

class Fetch {
  public:
    Fetch(const std::vector<std::string>& names, const FetchOptions& options, const Platform& platform,
          Cancellation& cancellation, const TakeFetched& take)
        : names_(names),
          options_(options),
          platform_(platform),
          cancellation_(cancellation),
          take_(take),
          service_(platform) {}

    void run() {
        while (next_ < names_.size() || !waiting_.empty()) {
            if (next_ == names_.size() && !sleepUntilDue()) break;
            if (cancellation_.isCancelled() || isLate()) break;
            lookUp(takeDue());
        }
        const Cause why = isLate() ? Cause::timedOut : Cause::interrupted;
        for (auto& [due, left] : waiting_) endUndone(left, why);
        while (next_ < names_.size()) {
            Pending fresh = begin(next_++);
            endUndone(fresh, why);
        }
    }

  private:
    bool isLate() const { return options_.deadline && Clock::now() >= *options_.deadline; }

    bool sleepUntilDue() {
        auto due = waiting_.begin()->first;
        if (options_.deadline) due = std::min(due, *options_.deadline);
        return !cancellation_.sleepUntil(due);
    }

    Pending begin(std::size_t index) const {
        Pending pending;
        pending.index = index;
        pending.result.recordName = names_[index];
        pending.begun = Clock::now();
        return pending;
    }

    // Takes the due names first, then names that were not looked up yet.
    std::vector<Pending> takeDue() {
        std::vector<Pending> group;
        const auto now = Clock::now();
        while (group.size() < kNamesPerRequest && !waiting_.empty() && waiting_.begin()->first <= now)
            group.push_back(std::move(waiting_.extract(waiting_.begin()).mapped()));
        while (group.size() < kNamesPerRequest && next_ < names_.size()) {
            Pending fresh = begin(next_++);
            if (hashInRecordName(fresh.result.recordName)) {
                group.push_back(std::move(fresh));
                continue;
            }
            fresh.result.end(Cause::notIssued, kExitDataError,
                             values::format("%@ is not the name of a record.", fresh.result.recordName));
            end(fresh);
        }
        return group;
    }

    void lookUp(std::vector<Pending> group) {
        std::vector<std::string> names;
        for (const Pending& pending : group) names.push_back(pending.result.recordName);
        const std::vector<Answer> answers = service_.lookUp(names, cancellation_, options_.deadline);
        const double chance = randomChance();  // one for all, so that the group stays together
        for (std::size_t i = 0; i < group.size(); ++i) {
            const auto due = takeAnswerOf(group[i], answers[i], chance);
            if (due)
                waiting_.emplace(*due, std::move(group[i]));
            else
                end(group[i]);
        }
    }

    // The time of the next try; `nullopt` if it has ended.
    std::optional<Clock::time_point> takeAnswerOf(Pending& pending, const Answer& answer, double chance) {
        const auto now = Clock::now();
        takeAnswer(answer, pending.result, platform_.trust);
        if (answer.error && (cancellation_.isCancelled() || isLate())) return now;  // run() says why
        if (isCurable(pending.result.cause) && pending.failures++ < options_.retry.retries)
            return now + options_.retry.delayAfter(pending.failures, answer.retryAfter, chance);
        if (pending.result.cause != Cause::notIssued || options_.wait.count() <= 0) return std::nullopt;
        if (!pending.notIssuedSince) pending.notIssuedSince = now;
        const auto last =
            *pending.notIssuedSince + std::chrono::duration_cast<Clock::duration>(options_.wait);
        if (now >= last) return std::nullopt;
        return std::min(now + options_.retry.pollDelayAfter(++pending.polls, chance), last);
    }

    void endUndone(Pending& pending, Cause why) {
        pending.result.cause = why;
        pending.result.exitStatus = kExitNoHost;
        end(pending);
    }

    void end(Pending& pending) {
        pending.result.seconds = std::chrono::duration<double>(Clock::now() - pending.begun).count();
        take_(pending.index, std::move(pending.result));
    }

    const std::vector<std::string>& names_;
    const FetchOptions& options_;
    const Platform& platform_;
    Cancellation& cancellation_;
    const TakeFetched& take_;
    RecordService service_;
    std::size_t next_ = 0;                               // of the names that were not looked up yet
    std::multimap<Clock::time_point, Pending> waiting_;  // by due time
};

}  // namespace

void FetchedTicket::end(Cause itsCause, int itsStatus, std::string message) {
    cause = itsCause;
    exitStatus = itsStatus;
    messages.push_back(std::move(message));
}

void FetchedTicket::take(std::optional<base::Data> received, const std::vector<base::Data>& hashes,
                         trust::TrustService& trust) {
    const auto own = [&] { return std::optional(hashes.front()); };  // found without sorting the list
    switch (hashes.size() == 1 ? judgeTicket(received, own, trust) : judgeTicket(received, hashes, trust)) {
        case TicketVerdict::acceptable:
            cause = Cause::worked;
            exitStatus = kExitOK;
            break;
        case TicketVerdict::revoked:
            end(Cause::revoked, kExitNoPermission,
                values::format("The ticket for %@ has been revoked. Tollmark will prevent it from running.",
                               recordName));
            break;
        case TicketVerdict::refused:
            return end(Cause::notAcceptable, kExitDataError,
                       values::format("Could not validate ticket for %@: %@.", recordName,
                                      ruleBrokenByTicket(received, hashes, trust)));
    }
    ticket = *std::move(received);
}

std::string ruleBrokenByTicket(const std::optional<base::Data>& ticket, const std::vector<base::Data>& hashes,
                               trust::TrustService& trust) {
    if (!ticket) return "its text is not base64";
    const auto refusal = explainTicket(*ticket, hashes.front(), trust);
    return refusal ? refusal->reason : "the ticket does not list every hash of the artefact";
}

std::optional<base::Data> hashInRecordName(std::string_view name) {
    if (name.starts_with("1/")) {
        name.remove_prefix(2);
    } else if (name.starts_with("2/")) {
        name.remove_prefix(2);
        const std::size_t slash = name.find('/');
        if (slash == std::string_view::npos || slash == 0 || slash > kMostAlgorithmDigits)
            return std::nullopt;
        const std::string_view algorithm = name.substr(0, slash);
        const bool isNumber = std::all_of(algorithm.begin(), algorithm.end(),
                                          [](char digit) { return digit >= '0' && digit <= '9'; });
        if (!isNumber || algorithm.front() == '0') return std::nullopt;
        name.remove_prefix(slash + 1);
    } else {
        return std::nullopt;
    }
    if (name.size() < 2 * kShortestHash || name.size() > 2 * kLongestHash) return std::nullopt;
    return base::parseHex(name);
}

void fetchTickets(const std::vector<std::string>& names, const FetchOptions& options,
                  const Platform& platform, Cancellation& cancellation, const TakeFetched& take) {
    Fetch(names, options, platform, cancellation, take).run();
}

std::vector<FetchedTicket> fetchTickets(const std::vector<std::string>& names, const FetchOptions& options,
                                        const Platform& platform) {
    std::vector<FetchedTicket> fetched(names.size());
    Cancellation cancellation;
    fetchTickets(names, options, platform, cancellation,
                 [&](std::size_t index, FetchedTicket ticket) { fetched[index] = std::move(ticket); });
    return fetched;
}

}  // namespace pinwell::retrieval
