// The two TLS policies of the record service and its asset servers.
#include "trust/trust.h"

namespace pinwell::trust {
namespace {

constexpr std::int64_t kMinimumRsaBits = 2048;
constexpr std::int64_t kMinimumEllipticCurveBits = 256;

// Our own identifiers, next to the ticket-signing policy's.
constexpr std::string_view kPinnedServerPolicyOid = "1.2.840.177245.100.1.27.1";
constexpr std::string_view kCompatibilityServerPolicyOid = "1.2.840.177245.100.1.27.2";

Dictionary serverOptions(std::string_view host) {
    Dictionary keySizes;
    keySizes.emplace(kKeyTypeRSA, kMinimumRsaBits);
    keySizes.emplace(kKeyTypeEllipticCurve, kMinimumEllipticCurveBits);

    Dictionary options;
    options.emplace(option::kValidityDates, true);
    options.emplace(option::kHostName, host);
    options.emplace(option::kServerAuthentication, true);
    options.emplace(option::kNameConstraints, true);
    options.emplace(option::kBasicConstraints, true);
    options.emplace(option::kCriticalExtensions, true);
    options.emplace(option::kKeySize, std::move(keySizes));
    return options;
}

PolicyRef makePolicy(std::string_view oid, Dictionary options) {
    return std::make_shared<const Policy>(Policy{std::string(oid), std::string(oid), std::move(options)});
}

}  // namespace

PolicyRef pinnedServerPolicy(std::string_view host) {
    if (host.empty()) return nullptr;
    Dictionary options = serverOptions(host);
    options.emplace(option::kPlatformAnchor, Dictionary{});
    options.emplace(option::kLeafMarkerOid, kPinnedServerMarkerOid);
    return makePolicy(kPinnedServerPolicyOid, std::move(options));
}

PolicyRef compatibilityServerPolicy(std::string_view host) {
    if (host.empty()) return nullptr;
    Dictionary options = serverOptions(host);
    options.emplace(option::kCompatibilityAnchor, Dictionary{});
    return makePolicy(kCompatibilityServerPolicyOid, std::move(options));
}

}  // namespace pinwell::trust
