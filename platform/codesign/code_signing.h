// The code-signing service: static code, its validity, and what its signature says.
//
// All calls block, read the file, and may be made from any thread; one code object serves one thread at a
// time.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "foundation/date.h"
#include "foundation/places.h"
#include "foundation/url.h"

namespace pinwell::codesign {

using foundation::Data;
using foundation::Date;
using foundation::URL;

/// A platform status; 0 is success.
using Status = std::int32_t;
inline constexpr Status kSuccess = 0;
inline constexpr Status kParameterError = -50;
inline constexpr Status kUnimplemented = -67072;
inline constexpr Status kStaticCodeNotFound = -67070;  // nothing there that could be code
inline constexpr Status kInvalidSignature = -67061;    // present, and something about it is wrong
inline constexpr Status kUnsigned = -67062;            // code without a signature
inline constexpr Status kIOError = -36;                // the file could not be read

/// Digest types, as they stand in a code directory.
enum class DigestType : std::uint8_t { sha1 = 1, sha256 = 2, sha256Truncated = 3, sha384 = 4 };

/// Code-directory flag: ad hoc, without a signer.
inline constexpr std::uint32_t kFlagAdHoc = 0x2;

/// What copySigningInformation answers; nothing of it is there for code that is not signed. Lists go index
/// for index, one entry a code directory, the chosen (strongest) one first; what stands alone is said by the
/// chosen one.
struct SigningInformation {
    std::optional<Data> unique;  // the cdhash: 20 bytes, 48 for SHA-384
    std::vector<Data> cdHashes;
    std::vector<std::uint32_t> digestAlgorithms;  // numbers of DigestType
    std::optional<std::uint32_t> digestAlgorithm;
    std::optional<std::uint32_t> flags;
    std::optional<std::string> identifier;
    std::optional<std::string> teamIdentifier;
    std::optional<Date> secureTimestamp;
};

/// Which sets of information are wanted; may be combined. Team identifier and secure timestamp belong to the
/// signing set, all else is in every set; the other two add nothing here.
inline constexpr std::uint32_t kInternalInformation = 1;
inline constexpr std::uint32_t kSigningInformation = 2;
inline constexpr std::uint32_t kContentInformation = 16;

/// Which checks are left out of static validity.
inline constexpr std::uint32_t kDoNotValidateExecutable = 2;
inline constexpr std::uint32_t kDoNotValidateResources = 4;

/// Signer flag: sign the file as opaque data, whatever structure it has.
inline constexpr std::uint32_t kSignOpaque = 8;

/// What a signer signs with. There is no identity among it: this platform signs ad hoc only.
struct SignerParameters {
    std::string identifier;                           // not empty, without a zero byte
    std::shared_ptr<Data> detachedSignature;          // takes the signature; the file stays as it is
    DigestType digestAlgorithm = DigestType::sha256;  // no other is supported
};

/// Code at a path. Opaque; made by the service that later answers about it.
class StaticCode {
  public:
    virtual ~StaticCode() = default;
};

/// Signs code. Opaque; made by the service that later signs with it.
class Signer {
  public:
    virtual ~Signer() = default;
};

/// Out-parameters are written on success only. Every method answers kParameterError for an object of another
/// service.
class CodeSigningService {
  public:
    virtual ~CodeSigningService() = default;

    /// A reference to the code at `path`: a bundle's main executable, a bundle's separate signature files, an
    /// executable image (thin, or the preferred slice of a universal one) or a disk image. Only finds it;
    /// what the signature is worth is asked with checkValidity.
    virtual Status createStaticCode(const URL& path, std::uint32_t flags,
                                    std::shared_ptr<StaticCode>& code) = 0;

    /// Static validity as this platform asks for it: structure, component digests and the CMS signature.
    /// Page hashes and sealed resources are not checked (both "do not validate" flags must be given, and no
    /// others; kUnimplemented otherwise). kUnsigned when there is no code directory, kInvalidSignature when
    /// anything is wrong.
    virtual Status checkValidity(StaticCode& code, std::uint32_t flags) = 0;

    virtual Status copySigningInformation(StaticCode& code, std::uint32_t sets,
                                          std::optional<SigningInformation>& information) = 0;

    /// A signer for addSignature; `flags` must be kSignOpaque. A service that does not sign need not override
    /// this method and the next two.
    virtual Status createSigner(const SignerParameters&, std::uint32_t /*flags*/, std::shared_ptr<Signer>&) {
        return kUnimplemented;
    }

    /// Signs the file of `code` ad hoc, into the signer's detached buffer, whose former contents are
    /// replaced. Reads every byte of the file, with bounded memory. `flags` must be 0. The same bytes give
    /// the same signature.
    virtual Status addSignature(Signer&, StaticCode&, std::uint32_t /*flags*/) { return kUnimplemented; }

    /// From now on the answers about `code` come from the signature in `detached`. `flags` must be 0.
    virtual Status setDetachedSignature(StaticCode&, const Data& /*detached*/, std::uint32_t /*flags*/) {
        return kUnimplemented;
    }

    /// Every code hash that the artefact at `path` is known by: the cdhashes of all code directories of all
    /// signed slices, and of the signed code nested in a bundle, one entry a signature. For a service that
    /// issues tickets. The artefact's own signatures must be valid (kInvalidSignature); nested code that is
    /// not is passed over. kUnsigned when nothing is signed, kUnimplemented for a bundle too large to be
    /// walked to its end.
    virtual Status copyAllCodeHashes(const URL& path, std::vector<SigningInformation>& all) = 0;
};

/// The service over files of this machine. Files are found through `places`: what is held there is reached
/// from its one descriptor.
std::unique_ptr<CodeSigningService> makeCodeSigningService(
    std::shared_ptr<foundation::Places> places = std::make_shared<foundation::Places>());

}  // namespace pinwell::codesign
