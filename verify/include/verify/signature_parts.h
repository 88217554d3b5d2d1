// The parts of a signature for deep verification: its code directories with the fields that locate the
// hashes, its components, and the signer's message.
//
// The rules of form are in codesign/code_directory.h and codesign/superblob.h. Here they apply to every blob,
// because every blob counts.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "codesign/code_directory.h"
#include "verify/check.h"
#include "verify/signer_message.h"

namespace pinwell::verify {

using base::ByteView;
using base::Data;
using codesign::DigestType;

/// A code directory, with the fields of its header that codesign does not use.
struct Directory {
    std::uint32_t slot = 0;
    codesign::CodeDirectory content;
    std::uint32_t hashOffset = 0;
    std::uint32_t specialSlots = 0;
    std::uint32_t codeSlots = 0;
    std::uint64_t limit = 0;     // end of the hashed code, in bytes from its start
    std::uint8_t pageShift = 0;  // a page is two to this power; 0: all is one page
    bool hasScatter = false;

    /// "SHA-256" and so on.
    std::string digestName() const;

    /// The digest of a code slot below codeSlots.
    ByteView codeDigest(std::uint32_t index) const;
};

/// Owns all of its bytes.
class SignatureParts {
  public:
    /// From the bytes of a superblob, with padding. `nullopt` if it has no code directory. Throws
    /// codesign::CodeError or base::ShortRead if it is not well formed.
    static std::optional<SignatureParts> fromSuperBlob(codesign::SharedBytes superblob);

    /// From the three files of the separate form.
    static std::optional<SignatureParts> fromSeparateFiles(const codesign::SharedBytes& directory,
                                                           std::optional<codesign::SharedBytes> requirements,
                                                           codesign::SharedBytes cms);

    /// By slot; slot 0 is the first. Directories of unknown digest types are left out.
    const std::vector<Directory>& directories() const noexcept { return directories_; }

    /// The directory whose hash is the cdhash.
    const Directory& chosen() const;

    /// The cdhashes of all directories, the chosen one's first.
    std::vector<Data> codeHashes() const;

    /// Blobs of slots 1 to 0xFFF, header included.
    const std::map<std::uint32_t, ByteView>& components() const noexcept { return components_; }

    ByteView cms() const noexcept { return cms_; }

  private:
    SignatureParts() = default;
    void addDirectory(std::uint32_t slot, const codesign::SharedBytes& blob);

    std::vector<codesign::SharedBytes> storage_;  // the bytes behind the views
    std::vector<Directory> directories_;
    std::map<std::uint32_t, ByteView> components_;
    ByteView cms_;
};

/// The kind of file around a superblob. Only a disk image has its ticket there.
enum class SignatureHost { executable, diskImage };

/// Checks that every blob of a well-formed superblob is covered and has the magic of its slot, and that only
/// zeros are between the blobs. The ticket's blob covers itself.
void checkBlobs(ByteView superblob, SignatureHost host, const std::string& place, Section& section);

/// Checks that all code directories agree, each in its own digest type. This matters because each reader uses
/// the one that it prefers, and a ticket need not list them all.
void checkAgreement(const SignatureParts& parts, const std::string& place, Section& section);

/// A file that a special slot covers, outside the signature.
struct OutsideComponent {
    const Data* bytes = nullptr;  // null: it does not exist
    bool mustBeCovered = true;    // no other hash covers it
};
using OutsideComponents = std::map<std::uint32_t, OutsideComponent>;

/// The property list, the resource seal; the trailer is kSlotTrailer.
inline constexpr std::uint32_t kSlotPropertyList = 1;
inline constexpr std::uint32_t kSlotResourceSeal = 3;

/// Checks every special slot of every directory against the bytes that it covers, and checks that every
/// component is covered.
void checkSpecialSlots(const SignatureParts& parts, const OutsideComponents& outside,
                       const std::string& place, Section& section);

/// Checks that the signer's message verifies, or is absent where it may be.
void checkSigner(const SignatureParts& parts, const std::string& place, Section& section);

/// Adds a note if the message has certificates whose own signatures cannot be verified.
void noteCertificates(const SignerMessage& message, const std::string& place, Section& section);

/// "special slot 3 (sealed resources)".
std::string specialSlotName(std::uint32_t slot);

}  // namespace pinwell::verify
