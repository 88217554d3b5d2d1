#include "src/cdhash_extract.h"

namespace pinwell {

using values::Dictionary;
using values::Value;

namespace {

template <class T>
codesign::Status statusOf(const base::Result<T>& result) {
    return result ? codesign::kSuccess : result.error().statusOr(codesign::kInvalidSignature);
}

}  // namespace

values::Dictionary basicCodeProperties(const values::URL& fileURL, const Platform& platform) {
    const auto code = platform.codeSigning.staticCode(fileURL, 0);
    if (!code || *code == nullptr) {
        platform.systemLog.error("Unable to create SecCode (%d): %@", statusOf(code), fileURL.path());
        return {};
    }

    // This tool does not judge the executable's pages and the sealed resources: the ticket vouches for the
    // hash.
    if (!platform.codeSigning.checkValidity(
            **code, codesign::kDoNotValidateExecutable | codesign::kDoNotValidateResources))
        return {};

    const auto found = platform.codeSigning.signingInformation(**code, codesign::kInternalInformation |
                                                                           codesign::kSigningInformation |
                                                                           codesign::kContentInformation);
    if (!found) {
        platform.systemLog.error("Unable to copy signing information (%d)", statusOf(found));
        return {};
    }
    const std::optional<codesign::SigningInformation>& information = *found;
    if (!information) {
        platform.systemLog.error("Unable to copy signing information from code reference.");
        return {};
    }
    if (!information->unique) {
        platform.systemLog.error("Unable to extract cdhash from signing information");
        return {};
    }

    Dictionary properties;
    const auto store = [&](std::string_view key, Value value) { properties.emplace(key, std::move(value)); };
    store(kCDHashKey, *information->unique);
    if (information->digestAlgorithm) store(kDigestAlgorithmKey, *information->digestAlgorithm);
    if (information->teamIdentifier) store(kTeamIdKey, *information->teamIdentifier);
    if (information->secureTimestamp)
        store(kSecureTimestampKey, values::format("%@", *information->secureTimestamp));
    if (information->identifier) store(kSigningIdKey, *information->identifier);
    if (information->flags) store(kFlagsKey, *information->flags);
    return properties;
}

std::vector<CodeHash> listableHashes(const CodeHash& own, const values::URL& artefact,
                                     const codesign::CodeSigningService& codeSigning) {
    const auto all = codeSigning.allCodeHashes(artefact);
    if (!all) return {own};
    std::vector<CodeHash> found;
    for (const codesign::SigningInformation& code : *all)
        for (std::size_t i = 0; i < code.cdHashes.size() && i < code.digestAlgorithms.size(); ++i)
            found.push_back({code.digestAlgorithms[i], code.cdHashes[i]});
    return listableHashes(own, found);
}

}  // namespace pinwell
