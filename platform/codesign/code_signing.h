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

/// What copySigningInformation answers. Lists go index for index, the chosen code directory first.
struct SigningInformation {
    std::optional<Data> unique;  // the cdhash of the chosen code directory
    std::vector<Data> cdHashes;
    std::vector<std::uint32_t> digestAlgorithms;
    std::optional<std::uint32_t> digestAlgorithm;
    std::optional<std::uint32_t> flags;
    std::optional<std::string> identifier;
    std::optional<std::string> teamIdentifier;
    std::optional<Date> secureTimestamp;
};

/// Which sets of information are wanted; may be combined.
inline constexpr std::uint32_t kInternalInformation = 1;
inline constexpr std::uint32_t kSigningInformation = 2;
inline constexpr std::uint32_t kContentInformation = 16;

/// Which checks are left out of static validity.
inline constexpr std::uint32_t kDoNotValidateExecutable = 2;
inline constexpr std::uint32_t kDoNotValidateResources = 4;

/// Code at a path. Opaque; made by the service that later answers about it.
class StaticCode {
  public:
    virtual ~StaticCode() = default;
};

class CodeSigningService {
  public:
    virtual ~CodeSigningService() = default;

    /// A reference to the code at `path`: a bundle's main executable, a bundle's separate signature files, an
    /// executable image (thin, or the preferred slice of a universal one) or a disk image. Only finds it;
    /// what the signature is worth is asked with checkValidity.
    virtual Status createStaticCode(const URL& path, std::uint32_t flags,
                                    std::shared_ptr<StaticCode>& code) = 0;

    /// Static validity as this platform asks for it: structure, component digests and the CMS signature.
    /// Page hashes and sealed resources are not checked (both "do not validate" flags must be given).
    virtual Status checkValidity(StaticCode& code, std::uint32_t flags) = 0;

    virtual Status copySigningInformation(StaticCode& code, std::uint32_t sets,
                                          std::optional<SigningInformation>& information) = 0;

    /// Every code hash that the artefact at `path` is known by: the cdhashes of all code directories of all
    /// signed slices, and of the signed code nested in a bundle. For a service that issues tickets.
    virtual Status copyAllCodeHashes(const URL& path, std::vector<SigningInformation>& all) = 0;
};

/// The service over files of this machine.
std::unique_ptr<CodeSigningService> makeCodeSigningService();

}  // namespace pinwell::codesign
