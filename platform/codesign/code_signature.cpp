#include "codesign/code_signature.h"

#include <algorithm>

#include "base/byte_io.h"
#include "codesign/cms_signature.h"
#include "codesign/code_error.h"
#include "codesign/superblob.h"

namespace pinwell::codesign {

namespace {

/// The special slots whose component is in the signature.
constexpr std::uint32_t kCoveredSlots[] = {kSlotRequirements, kSlotEntitlements, kSlotTrailer,
                                           kSlotDerEntitlements};

ByteView unwrapCms(const Blob& blob) {
    if (blob.magic != kWrapperMagic) refuse("the CMS blob has a wrong magic");
    return blob.bytes.subspan(kBlobHeaderSize);
}

}  // namespace

SignatureComponents componentsOfSuperBlob(const SharedBytes& superblob) {
    SignatureComponents components;
    std::size_t directories = 0;
    for (const Blob& blob : parseSuperBlob(superblob)) {
        if (blob.magic == kCodeDirectoryMagic) ++directories;
        if (blob.slot == kSlotCms) {
            components.cms = superblob.share(unwrapCms(blob));
        } else if (isSlotOfSignature(blob.slot)) {
            components.blobs.emplace(blob.slot, superblob.share(blob.bytes));
        }
    }
    if (directories > kMaximumCodeDirectories) refuse("too many code directories");
    return components;
}

std::optional<CodeSignature> CodeSignature::parse(SignatureComponents components) {
    std::vector<CodeDirectory> directories;
    for (const auto& [slot, blob] : components.blobs) {
        if (slot != kSlotCodeDirectory && !isAlternateSlot(slot)) continue;
        const bool known = digestTypeNumbered(CodeDirectory::digestTypeNumberOf(blob)).has_value();
        if (isAlternateSlot(slot) && directories.empty())
            refuse("alternate code directories without a primary one");
        if (isAlternateSlot(slot) && !known) continue;
        CodeDirectory directory = CodeDirectory::parse(blob);
        const auto sameType = [&directory](const CodeDirectory& other) {
            return other.digestType() == directory.digestType();
        };
        if (std::any_of(directories.begin(), directories.end(), sameType)) {
            refuse("two code directories of one digest type");
        }
        directories.push_back(std::move(directory));
    }
    if (directories.empty()) return std::nullopt;

    CodeSignature signature;
    signature.primary_ = directories.front().bytes();
    const auto strongest = std::max_element(
        directories.begin(), directories.end(), [](const CodeDirectory& a, const CodeDirectory& b) {
            return digestStrength(a.digestType()) < digestStrength(b.digestType());
        });
    std::rotate(directories.begin(), strongest, strongest + 1);
    signature.directories_ = std::move(directories);
    signature.components_ = std::move(components);
    return signature;
}

void CodeSignature::requireValid() const {
    for (const CodeDirectory& directory : directories_) {
        for (const std::uint32_t slot : kCoveredSlots) {
            const auto component = components_.blobs.find(slot);
            if (component == components_.blobs.end()) continue;
            const std::optional<Data> demanded = directory.specialSlotDigest(slot);
            if (demanded && *demanded != digest(directory.digestType(), component->second)) {
                refuse("a component has not the digest that the code directory demands");
            }
        }
    }
    if (components_.cms.empty()) {
        if ((chosen().flags() & kFlagAdHoc) == 0) refuse("no signer, and not ad hoc");
    } else {
        requireDetachedCms(components_.cms, primary_);
    }
}

SigningInformation CodeSignature::information(std::uint32_t sets) const {
    SigningInformation information;
    information.unique = chosen().codeHash();
    information.digestAlgorithm = static_cast<std::uint32_t>(chosen().digestType());
    information.flags = chosen().flags();
    information.identifier = chosen().identifier();
    for (const CodeDirectory& directory : directories_) {
        information.cdHashes.push_back(directory.codeHash());
        information.digestAlgorithms.push_back(static_cast<std::uint32_t>(directory.digestType()));
    }
    if ((sets & kSigningInformation) != 0) {
        information.teamIdentifier = chosen().teamIdentifier();
        information.secureTimestamp = secureTimestamp(components_.cms);
    }
    return information;
}

}  // namespace pinwell::codesign
