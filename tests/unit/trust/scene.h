// The input of one evaluation: a chain, the anchors around it and a policy.
#pragma once

#include <memory>

#include "support/certificate_builder.h"
#include "trust/trust_service.h"

namespace pinwell::trust {

inline constexpr Date kNow{1795204500};  // 2026-11-20 19:55:00 UTC
inline constexpr std::int64_t kDay = 86400;
inline constexpr const char* kHost = "api.lumora.example";

/// The ticket-signing policy as the tool builds it.
inline Policy ticketPolicy() {
    Policy policy{"1.2.840.177245.100.1.90", "1.2.840.177245.100.1.90", {}};
    policy.options.emplace(option::kCriticalExtensions, true);
    policy.options.emplace(option::kIdLinkage, true);
    policy.options.emplace(option::kBasicConstraints, true);
    policy.options.emplace(option::kNonEmptySubject, true);
    policy.options.emplace(option::kPlatformAnchor, Dictionary{});
    policy.options.emplace(option::kChainLength, 3);
    policy.options.emplace(option::kIntermediateMarkerOid, test::kTicketIntermediateMarker);
    policy.options.emplace(option::kLeafMarkerOid, test::kTicketLeafMarker);
    policy.options.emplace(option::kKeySize, Dictionary{{"RSA", 2048}, {"EC", 256}});
    return policy;
}

struct Scene {
    explicit Scene(const test::ChainFields& fields)
        : chain(fields.issue()), list(chain.list()), roots{chain.root.der} {}

    test::IssuedChain chain;
    std::vector<Data> list;
    std::vector<Data> roots;
    std::vector<Data> compatibility;
    std::vector<Data> allowed;
    std::vector<Data> denied;
    Date now = kNow;

    std::unique_ptr<TrustService> service() const {
        const auto parse = [](const std::vector<Data>& ders) {
            CertificateList certificates;
            for (const Data& der : ders)
                if (auto certificate = X509Certificate::parse(der)) certificates.push_back(certificate);
            return certificates;
        };
        Anchors anchors{parse(roots), parse(compatibility), parse(allowed), parse(denied)};
        for (const Data& der : denied)
            if (X509Certificate::parse(der) == nullptr) anchors.denied.addUnreadable(der);
        return makeTrustService([anchors] { return anchors; }, [time = now] { return time; });
    }

    std::shared_ptr<Trust> trust(Policy policy) const {
        const auto trustService = service();
        std::vector<CertificateRef> certificates;
        for (const Data& der : list) certificates.push_back(trustService->parseCertificate(der));
        const auto made =
            trustService->makeTrust(certificates, std::make_shared<const Policy>(std::move(policy)));
        return made ? *made : nullptr;
    }

    Verdict verdict(Policy policy) const {
        const auto verdict = trust(std::move(policy))->evaluate();
        return verdict ? *verdict : Verdict::invalid;
    }
};

}  // namespace pinwell::trust
