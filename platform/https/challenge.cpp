#include "https/challenge.h"

#include <mutex>
#include <optional>

#include "foundation/value.h"
#include "https/transfer_error.h"

namespace pinwell::https {
namespace {

// The policy of a trust object until the delegate chooses one: only the platform's anchors, for this host. So
// a delegate that forgets to choose is too strict, not too lax.
trust::PolicyRef initialPolicy(const std::string& host) {
    namespace option = trust::option;
    trust::Policy policy;
    policy.oid = "1.3.6.1.5.5.7.3.1";  // id-kp-serverAuth, RFC 5280, section 4.2.1.12
    policy.options.emplace(option::kHostName, host);
    policy.options.emplace(option::kPlatformAnchor, foundation::Dictionary{});
    for (const auto check : {option::kServerAuthentication, option::kValidityDates, option::kBasicConstraints,
                             option::kNameConstraints, option::kCriticalExtensions, option::kIdLinkage})
        policy.options.emplace(check, true);
    return std::make_shared<const trust::Policy>(std::move(policy));
}

std::shared_ptr<trust::Trust> makeTrust(const trust::TrustService& service, const std::string& host,
                                        const std::vector<Data>& list) {
    std::vector<trust::CertificateRef> certificates;
    for (const Data& der : list) {
        certificates.push_back(service.parseCertificate(der));
        if (!certificates.back()) return nullptr;
    }
    const auto trust = service.makeTrust(std::move(certificates), initialPolicy(host));
    return trust ? *trust : nullptr;
}

// Outlives the delegate's call, because a faulty delegate may keep the completion and call it later.
struct Answer {
    std::mutex mutex;
    bool given = false;
    bool accepted = false;
};

bool ask(const ChallengeContext& context, const std::string& host,
         const std::shared_ptr<trust::Trust>& trust) {
    const auto answer = std::make_shared<Answer>();
    const auto completion = [answer, wanted = std::weak_ptr(trust)](
                                Disposition disposition, const std::optional<Credential>& credential) {
        const std::lock_guard lock(answer->mutex);
        if (answer->given) return;
        answer->given = true;
        answer->accepted = disposition == Disposition::useCredential && credential && credential->trust &&
                           credential->trust == wanted.lock();
    };
    context.queue.sync([&] {
        context.delegate.didReceiveChallenge(context.session,
                                             {host, AuthenticationMethod::serverTrust, trust}, completion);
    });
    const std::lock_guard lock(answer->mutex);
    answer->given = true;  // later calls are ignored
    return answer->accepted;
}

}  // namespace

std::optional<Error> challengeDelegate(const ChallengeContext& context, const std::string& host,
                                       const std::vector<Data>& certificates) {
    const std::shared_ptr<trust::Trust> trust = makeTrust(context.trust, host, certificates);
    if (!trust)
        return makeError(URLErrorCode::secureConnectionFailed,
                         "The certificates sent by \"" + host + "\" could not be read.");
    if (ask(context, host, trust)) return std::nullopt;
    return makeError(URLErrorCode::cancelled,
                     "The connection to \"" + host + "\" was cancelled: the server is not trusted.");
}

}  // namespace pinwell::https
