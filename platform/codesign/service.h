// The code-signing service over files of this machine.
#pragma once

#include "codesign/static_code.h"

namespace pinwell::codesign {

class FileCodeSigningService final : public CodeSigningService {
  public:
    explicit FileCodeSigningService(CodeAccess access) : access_(std::move(access)) {}

    Status createStaticCode(const URL& path, std::uint32_t flags, std::shared_ptr<StaticCode>& code) override;
    Status checkValidity(StaticCode& code, std::uint32_t flags) override;
    Status copySigningInformation(StaticCode& code, std::uint32_t sets,
                                  std::optional<SigningInformation>& information) override;
    Status createSigner(const SignerParameters& parameters, std::uint32_t flags,
                        std::shared_ptr<Signer>& signer) override;
    Status addSignature(Signer& signer, StaticCode& code, std::uint32_t flags) override;
    Status setDetachedSignature(StaticCode& code, const Data& detached, std::uint32_t flags) override;
    Status copyAllCodeHashes(const URL& path, std::vector<SigningInformation>& all) override;

  private:
    CodeAccess access_;
};

}  // namespace pinwell::codesign
