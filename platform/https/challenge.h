// Asks a session's delegate whether to accept a server.
#pragma once

#include <string>
#include <vector>

#include "https/session.h"

namespace pinwell::https {

/// The delegate, and its queue.
struct ChallengeContext {
    Session& session;
    SessionDelegate& delegate;
    foundation::SerialQueue& queue;
    trust::TrustService& trust;
};

/// Asks the delegate on the queue and waits for its decision. Returns `nullopt` if it accepts: with a
/// credential for the given trust object, before it returns; only its first decision counts. Every other
/// outcome is an error.
std::optional<Error> challengeDelegate(const ChallengeContext& context, const std::string& host,
                                       const std::vector<Data>& certificates);

}  // namespace pinwell::https
