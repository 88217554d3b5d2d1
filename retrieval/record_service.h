// Lookups of many records at the record service: takes names, returns one result for each name.
//
// Up to 200 names go into one request. The service must return exactly one record for each name, each with
// its name, in the order of the request. Otherwise the names are looked up one by one; after a response with
// other records, all later names too. Assets are fetched with their records. One call is one try; the caller
// retries (retry_policy.h, ticket_fetch.h).
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "retrieval/answer.h"
#include "retrieval/cancellation.h"
#include "retrieval/retry_policy.h"
#include "src/platform.h"

namespace pinwell::retrieval {

/// The maximum number of names in one request.
inline constexpr std::size_t kNamesPerRequest = 200;

/// The maximum number of connections of one call.
inline constexpr std::size_t kConnectionsPerCall = 4;

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
