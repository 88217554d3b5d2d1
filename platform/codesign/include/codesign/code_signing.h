// The code-signing service: static code, its validity, and the contents of its signature.
//
// All calls block, read the file, and may be made from any thread; one code object serves one thread at a
// time.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "base/error.h"
#include "base/places.h"
#include "values/date.h"
#include "values/url.h"

namespace pinwell::codesign {

using base::Data;
using base::Result;
using values::Date;
using values::URL;

/// A platform status; 0 is success.
using Status = std::int32_t;
inline constexpr Status kSuccess = 0;
using base::kParameterError;  // -50
inline constexpr Status kUnimplemented = -67072;
inline constexpr Status kStaticCodeNotFound = -67070;  // no file that could be code
inline constexpr Status kInvalidSignature = -67061;    // a signature is present but wrong
inline constexpr Status kUnsigned = -67062;            // code without a signature
inline constexpr Status kIOError = -36;                // the file could not be read

/// Digest types, as numbered in a code directory.
enum class DigestType : std::uint8_t { sha1 = 1, sha256 = 2, sha256Truncated = 3, sha384 = 4 };

/// Code-directory flag: ad hoc, without a signer.
inline constexpr std::uint32_t kFlagAdHoc = 0x2;

/// The contents of a signature; empty for unsigned code. The lists are parallel: one entry
/// for each code directory, the chosen (strongest) one first. The single values are from the chosen
/// one.
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

/// The requested sets of information; may be combined. Team identifier and secure timestamp belong to the
/// signing set, all else is in every set; the other two add nothing here.
inline constexpr std::uint32_t kInternalInformation = 1;
inline constexpr std::uint32_t kSigningInformation = 2;
inline constexpr std::uint32_t kContentInformation = 16;

/// The checks to skip in static validity.
inline constexpr std::uint32_t kDoNotValidateExecutable = 2;
inline constexpr std::uint32_t kDoNotValidateResources = 4;

/// Signer flag: sign the file as opaque data, with any structure.
inline constexpr std::uint32_t kSignOpaque = 8;

/// The parameters of a signer. They have no identity: this platform only signs ad hoc.
struct SignerParameters {
    std::string identifier;                           // not empty, without a zero byte
    std::shared_ptr<Data> detachedSignature;          // receives the signature; the file is not changed
    DigestType digestAlgorithm = DigestType::sha256;  // no other is supported
};

/// Code at a path. Opaque; only for the service that made it.
class StaticCode {
  public:
    virtual ~StaticCode() = default;
};

/// Signs code. Opaque; only for the service that made it.
class Signer {
  public:
    virtual ~Signer() = default;
};

/// An error has the domain kOSStatusErrorDomain and one of the statuses above as its code; kParameterError
/// for an object of another service.
class CodeSigningService {
  public:
    virtual ~CodeSigningService() = default;

    /// A reference to the code at `path`: a bundle's main executable, a bundle's separate signature files, an
    /// executable image (thin, or the preferred slice of a universal one) or a disk image. Only finds it;
    /// checkValidity judges the signature.
    virtual Result<std::shared_ptr<StaticCode>> staticCode(const URL& path, std::uint32_t flags) const = 0;

    /// Static validity on this platform: structure, component digests and the CMS signature. Page hashes and
    /// sealed resources are not checked (exactly the two "do not validate" flags must be given; otherwise
    /// returns kUnimplemented). Returns kUnsigned if there is no code directory, kInvalidSignature for any
    /// fault.
    virtual Result<void> checkValidity(const StaticCode& code, std::uint32_t flags) const = 0;

    /// The contents of the code's signature. Callers treat `nullopt` as missing information.
    virtual Result<std::optional<SigningInformation>> signingInformation(const StaticCode& code,
                                                                         std::uint32_t sets) const = 0;

    /// A signer for addSignature; `flags` must be kSignOpaque. A service that does not sign need not override
    /// this method and the next two.
    virtual Result<std::shared_ptr<Signer>> makeSigner(const SignerParameters&,
                                                       std::uint32_t /*flags*/) const {
        return base::Error::osStatus(kUnimplemented);
    }

    /// Signs the file of `code` ad hoc, and replaces the contents of the signer's detached buffer. Reads
    /// every byte of the file, with bounded memory. `flags` must be 0. The same bytes give the same
    /// signature.
    virtual Result<void> addSignature(Signer&, const StaticCode&, std::uint32_t /*flags*/) const {
        return base::Error::osStatus(kUnimplemented);
    }

    /// From now on `code` is described by the signature in `detached`. `flags` must be 0.
    virtual Result<void> setDetachedSignature(StaticCode&, const Data& /*detached*/,
                                              std::uint32_t /*flags*/) const {
        return base::Error::osStatus(kUnimplemented);
    }

    /// Every code hash of the artefact at `path`: the cdhashes of all code directories of all signed slices,
    /// and of the signed code nested in a bundle, one entry for each signature. For a service that issues
    /// tickets. The artefact's own signatures must be valid (kInvalidSignature); invalid nested code is
    /// skipped. Returns kUnsigned if nothing is signed, kUnimplemented for a bundle beyond the limits of the
    /// walk.
    virtual Result<std::vector<SigningInformation>> allCodeHashes(const URL& path) const = 0;
};

/// The service over files of this machine. Paths are resolved through `places`: a held item is reached only
/// through its descriptor.
std::unique_ptr<CodeSigningService> makeCodeSigningService(
    std::shared_ptr<base::Places> places = std::make_shared<base::Places>());

}  // namespace pinwell::codesign
