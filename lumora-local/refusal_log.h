// Refused attempts to issue and revoke, as events of the log.
//
// Events are kept for ever, so their number is bounded: each client may cause twenty at once and one a
// minute, all clients together a hundred at once and one every ten seconds. Further refusals are counted, and
// the next event's comment has their number. The access log has a line for every request.
#pragma once

#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>

#include "foundation/date.h"
#include "lumora-local/record_store.h"
#include "lumora-local/token_buckets.h"

namespace pinwell::lumora {

/// For any thread.
class RefusalLog {
  public:
    using ErrorLog = std::function<void(std::string_view)>;

    /// `store` must outlive it. `errorLog` hears of events that cannot be written.
    RefusalLog(RecordStore& store, ErrorLog errorLog, TokenBuckets::Now now = TokenBuckets::Clock::now);

    /// Never throws: the request is refused even if the refusal cannot be logged.
    void note(const std::string& client, const RefusedAttempt& attempt, const std::string& why) noexcept;

  private:
    RecordStore& store_;
    const ErrorLog errorLog_;
    TokenBuckets perClient_;
    TokenBuckets overall_;
    std::mutex mutex_;
    std::uint64_t leftOut_ = 0;
};

}  // namespace pinwell::lumora
