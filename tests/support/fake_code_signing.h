// A code-signing service with results set by the test.
#pragma once

#include <optional>

#include "codesign/code_signing.h"
#include "foundation/bytes.h"
#include "foundation/url.h"

namespace pinwell::test {

class FakeCodeSigningService : public codesign::CodeSigningService {
  public:
    codesign::Status createStatus = codesign::kSuccess;
    bool handsOutCode = true;
    codesign::Status validity = codesign::kSuccess;
    codesign::Status copyStatus = codesign::kSuccess;
    std::optional<codesign::SigningInformation> information;
    codesign::Status signerStatus = codesign::kSuccess;
    codesign::Status addStatus = codesign::kSuccess;
    codesign::Status detachedStatus = codesign::kSuccess;
    std::optional<codesign::SigningInformation> detachedInformation;  // from when a signature is attached
    std::optional<codesign::SignerParameters> signerParameters;
    std::uint32_t signerFlags = 0;
    std::uint32_t validityFlags = 0;
    std::uint32_t informationSets = 0;
    int createCalls = 0;

    codesign::Status createStaticCode(const foundation::URL&, std::uint32_t,
                                      std::shared_ptr<codesign::StaticCode>& code) override {
        ++createCalls;
        if (createStatus == codesign::kSuccess && handsOutCode) code = std::make_shared<Code>();
        return createStatus;
    }
    codesign::Status checkValidity(codesign::StaticCode&, std::uint32_t flags) override {
        validityFlags = flags;
        return validity;
    }
    codesign::Status copySigningInformation(codesign::StaticCode& code, std::uint32_t sets,
                                            std::optional<codesign::SigningInformation>& out) override {
        informationSets = sets;
        const bool isDetached = dynamic_cast<Code&>(code).isDetached;
        if (copyStatus == codesign::kSuccess) out = isDetached ? detachedInformation : information;
        return copyStatus;
    }
    codesign::Status createSigner(const codesign::SignerParameters& parameters, std::uint32_t flags,
                                  std::shared_ptr<codesign::Signer>& signer) override {
        signerParameters = parameters;
        signerFlags = flags;
        if (signerStatus == codesign::kSuccess) signer = std::make_shared<Signer>();
        return signerStatus;
    }

    /// The "signature" is one byte, which setDetachedSignature expects.
    codesign::Status addSignature(codesign::Signer&, codesign::StaticCode&, std::uint32_t) override {
        if (addStatus == codesign::kSuccess) *signerParameters->detachedSignature = kSignature;
        return addStatus;
    }
    codesign::Status setDetachedSignature(codesign::StaticCode& code, const foundation::Data& detached,
                                          std::uint32_t) override {
        if (detached != kSignature) return codesign::kInvalidSignature;
        if (detachedStatus == codesign::kSuccess) dynamic_cast<Code&>(code).isDetached = true;
        return detachedStatus;
    }
    codesign::Status copyAllCodeHashes(const foundation::URL&,
                                       std::vector<codesign::SigningInformation>& all) override {
        if (information) all.push_back(*information);
        return copyStatus;
    }

  private:
    struct Code : codesign::StaticCode {
        bool isDetached = false;
    };
    struct Signer : codesign::Signer {};
    inline static const foundation::Data kSignature{std::byte{0x51}};
};

}  // namespace pinwell::test
