// A signature as a whole, wherever it was stored: its code directories, the components they cover, and the
// signer's CMS message.
#pragma once

#include <map>
#include <optional>
#include <vector>

#include "codesign/code_directory.h"
#include "codesign/code_signing.h"

namespace pinwell::codesign {

/// The parts of a signature, by slot, each with its blob header; the CMS message without. What a signature
/// lacks is not in here.
struct SignatureComponents {
    std::map<std::uint32_t, SharedBytes> blobs;
    SharedBytes cms;
};

/// The components of a superblob, which they share; those that nothing here asks for are left behind. Throws
/// CodeError or foundation::ShortRead.
SignatureComponents componentsOfSuperBlob(const SharedBytes& superblob);

/// A signature whose code directories are well formed. Immutable.
class CodeSignature {
  public:
    /// Nothing when there is no code directory at all, as in a superblob that carries only a ticket.
    /// Components are added under their special slot's number before, the trailer of a disk image for one.
    /// Throws CodeError or foundation::ShortRead when a code directory is not well formed, when there are too
    /// many or two of one digest type, or when only alternates are there. An alternate of an unknown digest
    /// type is passed over.
    static std::optional<CodeSignature> parse(SignatureComponents components);

    /// Static validity: throws CodeError (kInvalidSignature) when a component has not the digest that a code
    /// directory demands of it, or when there is neither a CMS message that verifies over the primary code
    /// directory nor, with the ad-hoc flag, none at all.
    void requireValid() const;

    /// `sets` as for CodeSigningService::copySigningInformation.
    SigningInformation information(std::uint32_t sets) const;

  private:
    CodeSignature() = default;

    const CodeDirectory& chosen() const { return directories_.front(); }

    SignatureComponents components_;
    std::vector<CodeDirectory> directories_;  // the strongest first, the others in slot order
    SharedBytes primary_;                     // slot 0, which the CMS message is over
};

}  // namespace pinwell::codesign
