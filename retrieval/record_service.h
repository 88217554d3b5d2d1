// The record service as those see it that want many records: names in, one answer a name out.
//
// Up to 200 names go into one request. Where the service does not return exactly one record a name, each with
// its name and in the order asked for, the names are asked for one by one, and so are all later ones if the
// service answered a group with other records. Assets are fetched with their records. One call is one try;
// trying again is the caller's business (retry_policy.h, ticket_fetch.h).
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

/// The most names of one request.
inline constexpr std::size_t kNamesPerRequest = 200;

/// The most connections of one call.
inline constexpr std::size_t kConnectionsPerCall = 4;

class RecordService {
  public:
    /// The platform's services must outlive it.
    explicit RecordService(const Platform& platform);
    ~RecordService();
    RecordService(const RecordService&) = delete;
    RecordService& operator=(const RecordService&) = delete;

    /// One answer for each of at most kNamesPerRequest names, in their order. Blocks, until `deadline` if
    /// there is one; never throws for what a server does. May be called from several threads at once.
    std::vector<Answer> lookUp(const std::vector<std::string>& names, const Cancellation& cancellation,
                               std::optional<Clock::time_point> deadline = std::nullopt);

  private:
    class Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace pinwell::retrieval
