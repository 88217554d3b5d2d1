#include "src/PWHashedFile/synthetic_cdhash.h"

#include "foundation/value.h"
#include "src/messages.h"

namespace pinwell {

using codesign::SigningInformation;
using codesign::Status;
using foundation::Array;
using foundation::Data;
using foundation::Dictionary;
using foundation::Error;
using foundation::Value;

namespace {

constexpr std::string_view kIdentifier = "ADHOC";

template <class Element>
Array arrayOf(const std::vector<Element>& elements) {
    return Array(elements.begin(), elements.end());
}

// For the verbose dump: missing values have no entry.
Dictionary dictionaryOf(const SigningInformation& information) {
    Dictionary dictionary;
    const auto store = [&](std::string_view key, const auto& value) {
        if (value) dictionary.emplace(key, Value(*value));
    };
    dictionary.emplace("cdhashes", arrayOf(information.cdHashes));
    dictionary.emplace("digest-algorithms", arrayOf(information.digestAlgorithms));
    store("unique", information.unique);
    store("digest-algorithm", information.digestAlgorithm);
    store("flags", information.flags);
    store("identifier", information.identifier);
    store("team-identifier", information.teamIdentifier);
    store("secure-timestamp", information.secureTimestamp);
    return dictionary;
}

// Signs `code` in memory and attaches that signature to it.
Status signDetached(codesign::CodeSigningService& service, codesign::StaticCode& code) {
    codesign::SignerParameters parameters;
    parameters.identifier = kIdentifier;
    parameters.detachedSignature = std::make_shared<Data>();
    parameters.digestAlgorithm = codesign::DigestType::sha256;

    std::shared_ptr<codesign::Signer> signer;
    Status status = service.createSigner(parameters, codesign::kSignOpaque, signer);
    if (status != codesign::kSuccess) {
        NoisyLog("Unable to create signer reference. %@", Error::osStatus(status));
        return status;
    }
    status = service.addSignature(*signer, code, 0);
    if (status != codesign::kSuccess) {
        NoisyLog("Unable to add signer to code reference. %@", Error::osStatus(status));
        return status;
    }
    status = service.setDetachedSignature(code, *parameters.detachedSignature, 0);
    if (status != codesign::kSuccess)
        NoisyLog("Unable to add detached signature to code reference. %@", Error::osStatus(status));
    return status;
}

}  // namespace

Status syntheticCDHashForURL(const foundation::URL& fileURL, const Platform& platform,
                             std::uint32_t* digestAlgorithm, std::optional<Data>* cdHash) {
    if (digestAlgorithm == nullptr && cdHash == nullptr) return codesign::kParameterError;
    codesign::CodeSigningService& service = platform.codeSigning;

    std::shared_ptr<codesign::StaticCode> code;
    Status status = service.createStaticCode(fileURL, 0, code);
    if (status != codesign::kSuccess || code == nullptr) {
        NoisyLog("Unable to create for %@: %@", fileURL.lastPathComponent(), Error::osStatus(status));
        return status;
    }
    status = signDetached(service, *code);
    if (status != codesign::kSuccess) return status;

    std::optional<SigningInformation> information;
    status = service.copySigningInformation(*code, codesign::kSigningInformation, information);
    if (status != codesign::kSuccess || !information) {
        NoisyLog("Could not get signing information. %@", Error::osStatus(status));
        return status;
    }

    const auto& algorithms = information->digestAlgorithms;
    if (algorithms.empty() || algorithms.size() != information->cdHashes.size()) {
        // Not a failure: the caller goes on and notices the missing cdhash.
        NoisyLog("Could not get newly minted CD hash for %@.", fileURL.lastPathComponent());
        return codesign::kSuccess;
    }
    if (digestAlgorithm != nullptr) *digestAlgorithm = algorithms.front();
    if (cdHash != nullptr) *cdHash = information->cdHashes.front();
    NoisyLog("Signing information is %@", dictionaryOf(*information));
    return codesign::kSuccess;
}

}  // namespace pinwell
