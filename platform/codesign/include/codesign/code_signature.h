// A whole signature, from any kind of storage: its code directories, the components they cover, and the
// signer's CMS message.
#pragma once

#include <map>
#include <optional>
#include <vector>

#include "codesign/code_directory.h"
#include "codesign/code_signing.h"

namespace pinwell::codesign {

/// The parts of a signature, by slot, each with its blob header; the CMS message without it. Missing parts
/// have no entry.
struct SignatureComponents {
    std::map<std::uint32_t, SharedBytes> blobs;
    SharedBytes cms;
};

/// The components of a superblob, which they share; unneeded components are left out. Throws CodeError or
/// base::ShortRead.
SignatureComponents componentsOfSuperBlob(const SharedBytes& superblob);

/// A signature whose code directories are well formed. Immutable.
class CodeSignature {
  public:
    /// Returns `nullopt` if there is no code directory, as in a superblob with only a ticket. Before the
    /// call, outside components are added under the number of their special slot, such as a disk image's
    /// trailer. Throws CodeError or base::ShortRead if a code directory is not well formed, if there
    /// are too many or two of one digest type, or if there are only alternates. An alternate of an unknown
    /// digest type is skipped.
    static std::optional<CodeSignature> parse(SignatureComponents components);

    /// Checks static validity. Throws CodeError (kInvalidSignature) if a component does not have the digest
    /// that a code directory requires. Throws it too unless a CMS message verifies over the primary code
    /// directory, or the ad-hoc flag is set and there is no message.
    void requireValid() const;

    /// `sets` is as for CodeSigningService::signingInformation.
    SigningInformation information(std::uint32_t sets) const;

  private:
    CodeSignature() = default;

    const CodeDirectory& chosen() const { return directories_.front(); }

    SignatureComponents components_;
    std::vector<CodeDirectory> directories_;  // the strongest first, the others in slot order
    SharedBytes primary_;                     // slot 0, which the CMS message signs
};

}  // namespace pinwell::codesign
