// The service's protocol, from request to response, without sockets.
//
//   POST /database/1/CONTAINER/ENVIRONMENT/public/records/lookup    application/json
//        {"records": [{"recordName": "2/2/..."}, ...]}
//     -> {"records": [RECORD, ...]}, in the order asked for; a RECORD is one of
//        {"recordName": N, "fields": {"signedTicket": {"type": "BYTES", "value": BASE64}}}
//        {"recordName": N, "fields": {"signedTicketAsset": {"type": "ASSET",
//                                     "value": {"downloadURL": "https://.../${f}", "size": BYTES}}}}
//        {"recordName": N, "serverErrorCode": "NOT_FOUND", "reason": "Record not found"}
//   GET  /assets/IDENTIFIER/NAME    the ticket's bytes; NAME is the client's text for ${f}
//   GET  /healthz                   {"status": "ok", "records": N}, or 503 if the records cannot be read
//   GET  /readyz                    {"status": "ready"}, or 503 if lookups or changes would fail
//
// Every refusal is a JSON object {"serverErrorCode": C, "reason": R} with a 4xx or 5xx status.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "answer_cache.h"
#include "base/bytes.h"
#include "endpoint.h"
#include "http_service.h"
#include "record_store.h"
#include "service_counts.h"

namespace pinwell::lumora {

inline constexpr std::string_view kContainer = "com.ostrel.tm.ticket-delivery";
inline constexpr std::size_t kMaximumRecordsPerRequest = 200;
inline constexpr std::size_t kMaximumRecordNameLength = 255;

/// A lookup with a longer response is refused: its client must request fewer records at a time.
inline constexpr std::size_t kMaximumAnswerSize = 8 * 1024 * 1024;

/// A refusal in the form that all refusals have.
Answer refusal(int status, std::string_view code, std::string_view reason);

/// A temporary refusal: 503, with Retry-After.
Answer refusalForNow(std::string_view reason);

/// The reason why the service cannot do all of its work although the records can be read; `nullopt` if it
/// can. From any thread.
using Obstacle = std::function<std::optional<std::string>()>;

class LookupService final : public HttpService {
  public:
    /// `hosts` are the names in the server's certificate; `fallback` is the service's place if a request does
    /// not name one of them.
    LookupService(RecordSource& source, std::vector<std::string> hosts, Endpoint fallback,
                  Obstacle obstacle = {})
        : source_(source),
          hosts_(std::move(hosts)),
          fallback_(std::move(fallback)),
          obstacle_(std::move(obstacle)) {}

    /// The response, if the head is enough to decide it; `nullopt` if the body must be read and passed to
    /// answerLookup. From any thread.
    std::optional<Answer> answerHead(const RequestHead& head) const override;

    /// The response to a lookup whose head was accepted. From any thread.
    Answer answerLookup(const RequestHead& head, std::string_view body) const;
    Answer answerBody(const RequestHead& head, std::string_view body) const override {
        return answerLookup(head, body);
    }

    Answer refuse(int status, const RequestHead* head) const override;
    Answer refuseForNow(std::string_view reason) const override { return refusalForNow(reason); }
    RequestKind kindOf(std::string_view target) const override;

  private:
    struct Found {
        std::shared_ptr<const KeptAnswer> record;
        bool isForAll = false;  // the same for all clients
        bool isKnown = false;
        bool fromMemory = false;
    };
    using FoundByName = std::unordered_map<std::string_view, Found>;
    std::optional<FoundByName> findRecords(const RequestHead& head, Environment environment,
                                           const std::vector<std::string>& names,
                                           std::optional<std::uint64_t> state) const;
    Found makeRecord(const RequestHead& head, Environment environment, const std::string& name,
                     const std::optional<Delivery>& delivery, std::optional<std::uint64_t> state) const;
    Answer answerAsset(std::string_view path) const;
    std::shared_ptr<const base::Data> sharedAsset(const std::string& identifier) const;
    Answer answerHealth() const;
    Answer answerReadiness() const;
    std::string assetUrlTemplate(const RequestHead& head, const std::string& identifier) const;

    RecordSource& source_;
    std::vector<std::string> hosts_;
    Endpoint fallback_;
    Obstacle obstacle_;
    mutable AnswerCache records_;
    mutable AnswerCache answers_;  // by the bodies of their requests
    mutable std::mutex assetsMutex_;
    mutable std::unordered_map<std::string, std::weak_ptr<const base::Data>> assets_;  // being sent
};

}  // namespace pinwell::lumora
