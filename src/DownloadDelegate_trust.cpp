// Accepts a server that satisfies either of the two server policies for the contacted
// host.

#include <vector>

#include "src/DownloadDelegate.h"
#include "src/messages.h"

namespace pinwell {
namespace {

bool isSuccess(trust::Verdict verdict) {
    return verdict == trust::Verdict::proceed || verdict == trust::Verdict::unspecified;
}

void reportRefusal(const trust::Trust& serverTrust, trust::Verdict verdict) {
    const foundation::Array properties = serverTrust.properties();
    MessageLog("Certificate trust evaluation did not return expected result. (%d) %@",
               static_cast<std::uint32_t>(verdict), serverTrust.failureDescription().value_or(std::string()));
    for (const foundation::Value& certificate : properties) {
        const foundation::Value& error = certificate[trust::kPropertyError];
        if (error.isNil()) continue;
        MessageLog("Certificate trust evaluation for %@ did not return expected result. %@.",
                   certificate[trust::kPropertyTitle], error);
    }
}

bool accepts(trust::Trust& serverTrust, const trust::PolicyRef& policy) {
    if (const auto set = serverTrust.setPolicy(policy); !set) {
        NoisyLog("Could not set trust policy. %@", set.error());
        return false;
    }
    const auto verdict = serverTrust.evaluate();
    if (!verdict) {
        MessageLog("Certificate trust evaluation failed. %@", verdict.error());
        return false;
    }
    if (isSuccess(*verdict)) return true;
    reportRefusal(serverTrust, *verdict);
    return false;
}

}  // namespace

void DownloadDelegate::didReceiveChallenge(https::Session&, const https::AuthenticationChallenge& challenge,
                                           const https::ChallengeCompletion& completion) {
    answerServerChallenge(challenge, completion);
}

void answerServerChallenge(const https::AuthenticationChallenge& challenge,
                           const https::ChallengeCompletion& completion) {
    NoisyLog("Domain is %@", challenge.host);
    if (challenge.method != https::AuthenticationMethod::serverTrust) {
        completion(https::Disposition::performDefaultHandling, std::nullopt);
        return;
    }
    std::vector<trust::PolicyRef> policies;
    for (auto policy :
         {trust::pinnedServerPolicy(challenge.host), trust::compatibilityServerPolicy(challenge.host)})
        if (policy != nullptr) policies.push_back(std::move(policy));
    if (policies.empty()) {
        completion(https::Disposition::cancelChallenge, std::nullopt);
        return;
    }
    for (const trust::PolicyRef& policy : policies) {
        if (accepts(*challenge.serverTrust, policy)) {
            completion(https::Disposition::useCredential, https::Credential{challenge.serverTrust});
            return;
        }
    }
    MessageLog("Could not establish secure connection to %@", challenge.host);
    completion(https::Disposition::cancelChallenge, std::nullopt);
}

}  // namespace pinwell
