#include "src/cdhash_extract.h"

namespace pinwell {

using foundation::Dictionary;
using foundation::Value;

foundation::Dictionary basicCodeProperties(const foundation::URL& fileURL, const Platform& platform) {
    std::shared_ptr<codesign::StaticCode> code;
    codesign::Status status = platform.codeSigning.createStaticCode(fileURL, 0, code);
    if (status != codesign::kSuccess || code == nullptr) {
        platform.systemLog.error("Unable to create SecCode (%d): %@", status, fileURL.path());
        return {};
    }

    // This tool does not judge the executable's pages and the sealed resources: the ticket vouches for the
    // hash.
    status = platform.codeSigning.checkValidity(
        *code, codesign::kDoNotValidateExecutable | codesign::kDoNotValidateResources);
    if (status != codesign::kSuccess) return {};

    std::optional<codesign::SigningInformation> information;
    status = platform.codeSigning.copySigningInformation(
        *code, codesign::kInternalInformation | codesign::kSigningInformation | codesign::kContentInformation,
        information);
    if (status != codesign::kSuccess) {
        platform.systemLog.error("Unable to copy signing information (%d)", status);
        return {};
    }
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
        store(kSecureTimestampKey, foundation::format("%@", *information->secureTimestamp));
    if (information->identifier) store(kSigningIdKey, *information->identifier);
    if (information->flags) store(kFlagsKey, *information->flags);
    return properties;
}

}  // namespace pinwell
