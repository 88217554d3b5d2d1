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
using foundation::Result;
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

Status statusOf(const Error& error) {
    return error.statusOr(codesign::kInvalidSignature);
}

// Signs `code` in memory and attaches that signature to it.
Result<void> signDetached(const codesign::CodeSigningService& service, codesign::StaticCode& code) {
    codesign::SignerParameters parameters;
    parameters.identifier = kIdentifier;
    parameters.detachedSignature = std::make_shared<Data>();
    parameters.digestAlgorithm = codesign::DigestType::sha256;

    const auto signer = service.makeSigner(parameters, codesign::kSignOpaque);
    if (!signer) {
        NoisyLog("Unable to create signer reference. %@", signer.error());
        return signer.error();
    }
    if (auto signing = service.addSignature(**signer, code, 0); !signing) {
        NoisyLog("Unable to add signer to code reference. %@", signing.error());
        return signing;
    }
    auto attachment = service.setDetachedSignature(code, *parameters.detachedSignature, 0);
    if (!attachment) NoisyLog("Unable to add detached signature to code reference. %@", attachment.error());
    return attachment;
}

}  // namespace

Status syntheticCDHashForURL(const foundation::URL& fileURL, const Platform& platform,
                             std::uint32_t* digestAlgorithm, std::optional<Data>* cdHash) {
    if (digestAlgorithm == nullptr && cdHash == nullptr) return codesign::kParameterError;
    const codesign::CodeSigningService& service = platform.codeSigning;

    const auto code = service.staticCode(fileURL, 0);
    if (!code || *code == nullptr) {
        const Error error = code ? Error::osStatus(codesign::kSuccess) : code.error();
        NoisyLog("Unable to create for %@: %@", fileURL.lastPathComponent(), error);
        return code ? codesign::kSuccess : statusOf(error);
    }
    if (const auto signing = signDetached(service, **code); !signing) return statusOf(signing.error());

    const auto found = service.signingInformation(**code, codesign::kSigningInformation);
    if (!found || !*found) {
        const Error error = found ? Error::osStatus(codesign::kSuccess) : found.error();
        NoisyLog("Could not get signing information. %@", error);
        return found ? codesign::kSuccess : statusOf(error);
    }
    const std::optional<SigningInformation>& information = *found;

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
