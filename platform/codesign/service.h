// The code-signing service over files of this machine.
#pragma once

#include "codesign/static_code.h"

namespace pinwell::codesign {

/// Maximum depth and number of directory entries of a walk. The largest real bundles have some 100000 files,
/// and a framework in a plug-in in an application is some 20 directories deep.
inline constexpr unsigned kMaximumBundleDepth = 64;
inline constexpr std::size_t kMaximumBundleEntries = 1'000'000;

class FileCodeSigningService final : public CodeSigningService {
  public:
    explicit FileCodeSigningService(CodeAccess access) : access_(std::move(access)) {}

    Result<std::shared_ptr<StaticCode>> staticCode(const URL& path, std::uint32_t flags) const override;
    Result<void> checkValidity(const StaticCode& code, std::uint32_t flags) const override;
    Result<std::optional<SigningInformation>> signingInformation(const StaticCode& code,
                                                                 std::uint32_t sets) const override;
    Result<std::shared_ptr<Signer>> makeSigner(const SignerParameters& parameters,
                                               std::uint32_t flags) const override;
    Result<void> addSignature(Signer& signer, const StaticCode& code, std::uint32_t flags) const override;
    Result<void> setDetachedSignature(StaticCode& code, const Data& detached,
                                      std::uint32_t flags) const override;
    Result<std::vector<SigningInformation>> allCodeHashes(const URL& path) const override;

  private:
    CodeAccess access_;
};

}  // namespace pinwell::codesign
