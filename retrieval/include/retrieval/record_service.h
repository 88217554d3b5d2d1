// Lookups of many records at the record service: takes names, returns one result for each name.
//
// Up to 200 names go into one request. The service must return exactly one record for each name, each with
// its name, in the order of the request. Otherwise the names are looked up one by one; after a response with
// other records, all later names too. Assets are fetched with their records. One call is one try; the caller
// retries (retry_policy.h, ticket_fetch.h).
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "https/session.h"
#include "retrieval/connection.h"
#include "retrieval/retry_policy.h"
#include "src/platform.h"

namespace pinwell::retrieval {

/// The maximum number of names in one request.
inline constexpr std::size_t kNamesPerRequest = 200;

/// The maximum number of connections of one call.
inline constexpr std::size_t kConnectionsPerCall = 4;

/// The result of one try to get a record's ticket.
struct Answer {
    enum class Kind : std::uint8_t {
        answered,     // there is a response, with or without a ticket
        unreachable,  // a retry may help; there is an error, or a response without a body
        untrusted,    // there is an error: the server was refused
    };
    Kind kind = Kind::unreachable;

    /// The response as if this record alone had been looked up; set if the outcome is `answered`. Its request
    /// identifier is the service's with a number of ours, so that it is unique in the process.
    std::optional<https::HTTPResponse> response;
    base::Data body;

    /// The file that the record names instead of a ticket; `nullopt` if it names none, or its URL is invalid.
    struct Asset {
        https::HTTPResponse response;
        base::Data contents;
    };
    std::optional<Asset> asset;

    std::optional<base::Error> error;
    bool errorIsOfAsset = false;  // the lookup succeeded, the asset's download failed

    /// The delay that the service asks for.
    std::optional<std::chrono::seconds> retryAfter;

    /// The messages of the server's judgement, for the user.
    std::vector<std::string> messages;

    /// Whether the service responded that there is no ticket.
    bool hasNoTicket() const;
};

class RecordService {
  public:
    /// The platform's services must outlive it.
    explicit RecordService(const Platform& platform);
    ~RecordService();
    RecordService(const RecordService&) = delete;
    RecordService& operator=(const RecordService&) = delete;

    /// Returns one result for each name, in their order; at most kNamesPerRequest names. Blocks, at most
    /// until `deadline` if given; never throws for a server's behaviour. May be called from several threads
    /// at once.
    std::vector<Answer> lookUp(const std::vector<std::string>& names, const Cancellation& cancellation,
                               std::optional<Clock::time_point> deadline = std::nullopt);

  private:
    class Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace pinwell::retrieval
