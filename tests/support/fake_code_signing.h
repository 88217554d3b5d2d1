// A code-signing service with results set by the test.
#pragma once

#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "codesign/code_signing.h"
#include "support/status.h"
#include "values/url.h"

namespace pinwell::test {

class FakeCodeSigningService : public codesign::CodeSigningService {
  public:
    codesign::Status createStatus = codesign::kSuccess;
    bool handsOutCode = true;
    codesign::Status validity = codesign::kSuccess;
    codesign::Status informationStatus = codesign::kSuccess;
    std::optional<codesign::SigningInformation> information;
    codesign::Status signerStatus = codesign::kSuccess;
    codesign::Status addStatus = codesign::kSuccess;
    codesign::Status detachedStatus = codesign::kSuccess;
    std::optional<codesign::SigningInformation> detachedInformation;  // from when a signature is attached

    // Records.
    mutable std::optional<codesign::SignerParameters> signerParameters;
    mutable std::uint32_t signerFlags = 0;
    mutable std::uint32_t validityFlags = 0;
    mutable std::uint32_t informationSets = 0;
    mutable int createCalls = 0;

    base::Result<std::shared_ptr<codesign::StaticCode>> staticCode(const values::URL&,
                                                                   std::uint32_t) const override {
        ++createCalls;
        return withStatus<std::shared_ptr<codesign::StaticCode>>(
            createStatus, handsOutCode ? std::make_shared<Code>() : nullptr);
    }
    base::Result<void> checkValidity(const codesign::StaticCode&, std::uint32_t flags) const override {
        validityFlags = flags;
        return withStatus(validity);
    }
    base::Result<std::optional<codesign::SigningInformation>> signingInformation(
        const codesign::StaticCode& code, std::uint32_t sets) const override {
        informationSets = sets;
        const bool isDetached = dynamic_cast<const Code&>(code).isDetached;
        return withStatus(informationStatus, isDetached ? detachedInformation : information);
    }
    base::Result<std::shared_ptr<codesign::Signer>> makeSigner(const codesign::SignerParameters& parameters,
                                                               std::uint32_t flags) const override {
        signerParameters = parameters;
        signerFlags = flags;
        return withStatus<std::shared_ptr<codesign::Signer>>(signerStatus, std::make_shared<Signer>());
    }

    /// The "signature" is one byte, which setDetachedSignature expects.
    base::Result<void> addSignature(codesign::Signer&, const codesign::StaticCode&,
                                    std::uint32_t) const override {
        if (addStatus == codesign::kSuccess) *signerParameters->detachedSignature = kSignature;
        return withStatus(addStatus);
    }
    base::Result<void> setDetachedSignature(codesign::StaticCode& code, const base::Data& detached,
                                            std::uint32_t) const override {
        if (detached != kSignature) return withStatus(codesign::kInvalidSignature);
        if (detachedStatus == codesign::kSuccess) dynamic_cast<Code&>(code).isDetached = true;
        return withStatus(detachedStatus);
    }
    base::Result<std::vector<codesign::SigningInformation>> allCodeHashes(const values::URL&) const override {
        std::vector<codesign::SigningInformation> all;
        if (information) all.push_back(*information);
        return withStatus(informationStatus, std::move(all));
    }

  private:
    struct Code : codesign::StaticCode {
        bool isDetached = false;
    };
    struct Signer : codesign::Signer {};
    inline static const base::Data kSignature{std::byte{0x51}};
};

}  // namespace pinwell::test
