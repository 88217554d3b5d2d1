// The question put to a session's delegate: may we talk to this server?
#pragma once

#include <string>
#include <vector>

#include "https/session.h"

namespace pinwell::https {

/// Whom to ask, and where.
struct ChallengeContext {
    Session& session;
    SessionDelegate& delegate;
    foundation::SerialQueue& queue;
    trust::TrustService& trust;
};

/// Asks the delegate on the queue and waits for its answer. Nothing when it accepts: with a credential for
/// the trust object it was given, before it returns; only its first answer counts. Every other outcome is an
/// error.
std::optional<Error> challengeDelegate(const ChallengeContext& context, const std::string& host,
                                       const std::vector<Data>& certificates);

}  // namespace pinwell::https
