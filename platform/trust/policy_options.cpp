// The options of policies: reading them, and those of the two policies for servers.
#include <algorithm>
#include <array>

#include "policy_checks.h"
#include "trust/trust.h"
#include "values/format.h"
#include "values/value.h"

namespace pinwell::trust {

namespace {

using base::Result;
using values::Value;

/// Each reader returns whether the value has the option's type.
bool readSwitch(const Value& value, bool& into) {
    if (value.boolean() == nullptr) return false;
    into = *value.boolean();
    return true;
}

bool isProperNumber(const Value& value) {
    return value.isNumber() && value.boolean() == nullptr;
}

bool readText(const Value& value, std::vector<std::string>& into) {
    if (value.string() == nullptr || value.string()->empty()) return false;
    into.push_back(*value.string());
    return true;
}

/// One text or a list of at least one.
bool readTexts(const Value& value, std::vector<std::string>& into) {
    if (value.array() == nullptr) return readText(value, into);
    const Array& list = *value.array();
    return !list.empty() &&
           std::all_of(list.begin(), list.end(), [&](const Value& one) { return readText(one, into); });
}

bool readAnchorSet(const Value& value, AnchorSet set, Requirements& into) {
    if (value.dictionary() == nullptr || !value.dictionary()->empty())
        return false;  // no sub-option is known
    into.anchors = set;
    return true;
}

bool readKeySizes(const Value& value, Requirements& into) {
    if (value.dictionary() == nullptr) return false;
    auto& sizes = into.keySizes.emplace();
    for (const auto& [type, minimum] : *value.dictionary()) {
        if (!isProperNumber(minimum)) return false;
        sizes.emplace(type, minimum.unsignedIntegerValue());
    }
    return true;
}

struct OptionReader {
    std::string_view key;
    bool (*read)(const Value& value, Requirements& into);
};
constexpr std::array kRequirementReaders{
    OptionReader{option::kCriticalExtensions,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.criticalExtensions); }},
    OptionReader{option::kIdLinkage,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.idLinkage); }},
    OptionReader{option::kBasicConstraints,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.basicConstraints); }},
    OptionReader{option::kNonEmptySubject,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.nonEmptySubject); }},
    OptionReader{option::kValidityDates,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.validityDates); }},
    OptionReader{option::kServerAuthentication,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.serverAuthentication); }},
    OptionReader{option::kNameConstraints,
                 [](const Value& v, Requirements& r) { return readSwitch(v, r.nameConstraints); }},
    OptionReader{option::kPlatformAnchor,
                 [](const Value& v, Requirements& r) { return readAnchorSet(v, AnchorSet::platform, r); }},
    OptionReader{option::kCompatibilityAnchor,
                 [](const Value& v, Requirements& r) {
                     return readAnchorSet(v, AnchorSet::platformAndCompatibility, r);
                 }},
    OptionReader{option::kChainLength,
                 [](const Value& v, Requirements& r) {
                     if (!isProperNumber(v)) return false;
                     r.chainLength = v.unsignedIntegerValue();
                     return true;
                 }},
    OptionReader{option::kIntermediateMarkerOid,
                 [](const Value& v, Requirements& r) { return readTexts(v, r.intermediateMarkers); }},
    OptionReader{option::kLeafMarkerOid,
                 [](const Value& v, Requirements& r) { return readTexts(v, r.leafMarkers); }},
    OptionReader{option::kKeySize, readKeySizes},
    OptionReader{option::kHostName,
                 [](const Value& v, Requirements& r) {
                     if (v.string() == nullptr || v.string()->empty()) return false;
                     r.hostName = *v.string();
                     return true;
                 }},
};

Error refusal(std::string text) {
    return {base::kOSStatusErrorDomain, kParameterError, std::move(text)};
}

}  // namespace

Result<Requirements> readRequirements(const Dictionary& options) {
    Requirements requirements;
    for (const auto& [key, value] : options) {
        const auto* const reader =
            std::find_if(kRequirementReaders.begin(), kRequirementReaders.end(),
                         [&wanted = key](const OptionReader& entry) { return entry.key == wanted; });
        if (reader == kRequirementReaders.end())
            return refusal(values::format("the policy option %@ is not known", key));
        if (!reader->read(value, requirements)) {
            return refusal(values::format("the policy option %@ has a value of the wrong type", key));
        }
    }
    // Both anchor options together: each must hold, and the platform's own anchors are in both sets.
    if (options.contains(option::kPlatformAnchor)) requirements.anchors = AnchorSet::platform;
    return requirements;
}

// The two TLS policies of the record service and its asset servers.

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
