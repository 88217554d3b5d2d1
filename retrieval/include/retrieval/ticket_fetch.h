// Fetches tickets by the names of their records, without any artefact. Each ticket is judged; a missing one
// has its cause.
//
//   const HostPlatform host(...);
//   for (const FetchedTicket& one : fetchTickets({"2/2/0a1b..."}, {}, host.services()))
//       if (one.cause == Cause::worked) use(one.ticket);
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "retrieval/record_service.h"
#include "retrieval/report.h"
#include "retrieval/retry_policy.h"
#include "src/host_platform.h"
#include "src/platform.h"
#include "trust/trust.h"

namespace pinwell::retrieval {

struct FetchOptions {
    RetryPolicy retry;

    /// How long to poll for a ticket that is not issued yet. Counts from the first such response.
    std::chrono::duration<double> wait{0};

    /// The end of all; unfinished tickets are timedOut.
    std::optional<Clock::time_point> deadline;
};

struct FetchedTicket {
    std::string recordName;
    Cause cause = Cause::unreachable;
    int exitStatus = 0;     // the exit status of `pinwell`
    unsigned attempts = 0;  // lookups that named the record
    double seconds = 0;     // from the first lookup to the end

    /// The ticket's bytes: genuine, and listing the hash of the record's name (worked), or genuine and
    /// marking the software as revoked (revoked). Empty otherwise.
    base::Data ticket;

    /// For the user: why there is no ticket.
    std::vector<std::string> messages;

    /// Sets the cause and the exit status, and adds the message.
    void end(Cause itsCause, int itsStatus, std::string message);

    /// Judges a ticket, and ends as worked, revoked or notAcceptable. `received` is `nullopt` if its text is
    /// not base64. `hashes` are the ones that the ticket must list, the artefact's own first; never empty.
    void take(std::optional<base::Data> received, const std::vector<base::Data>& hashes,
              trust::TrustService& trust);
};

/// The rule that a refused ticket breaks, without a full stop. The arguments are as in FetchedTicket::take.
std::string ruleBrokenByTicket(const std::optional<base::Data>& ticket, const std::vector<base::Data>& hashes,
                               trust::TrustService& trust);

/// The hash in the name of a record: "2/ALGORITHM/HEX" or "1/HEX", the digits in lower case, 20 to 64 bytes
/// of hash. `nullopt` for any other name.
std::optional<base::Data> hashInRecordName(std::string_view name);

/// Gets each finished ticket, with the index of its name.
using TakeFetched = std::function<void(std::size_t index, FetchedTicket ticket)>;

/// Fetches these tickets and passes on each one when it ends, on the calling thread. Blocks. An invalid name
/// ends as notIssued without a lookup. `cancellation` ends all unfinished tickets as `interrupted`, the
/// deadline as `timedOut`.
void fetchTickets(const std::vector<std::string>& names, const FetchOptions& options,
                  const Platform& platform, Cancellation& cancellation, const TakeFetched& take);

/// The same, all at once, in the order of the names.
std::vector<FetchedTicket> fetchTickets(const std::vector<std::string>& names, const FetchOptions& options,
                                        const Platform& platform);

}  // namespace pinwell::retrieval
