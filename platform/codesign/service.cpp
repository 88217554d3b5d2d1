#include "codesign/service.h"

#include <iterator>
#include <set>
#include <type_traits>

#include "codesign/adhoc_signer.h"
#include "codesign/code_error.h"
#include "codesign/nested_code.h"
#include "foundation/byte_reader.h"

namespace pinwell::codesign {

namespace {

using foundation::Error;

/// Longest identifier; real ones are about as long as a domain name.
constexpr std::size_t kMaximumIdentifierLength = 1024;

constexpr std::uint32_t kRequiredValidityFlags = kDoNotValidateExecutable | kDoNotValidateResources;

/// Runs `body`; turns its exceptions into the status that they stand for.
template <class Body>
auto guarded(Body body) -> decltype(body()) {
    try {
        return body();
    } catch (const CodeError& error) {
        return Error::osStatus(error.status());
    } catch (const foundation::ShortRead&) {
        return Error::osStatus(kInvalidSignature);
    }
}

struct OpaqueSigner final : Signer {
    std::string identifier;
    std::shared_ptr<Data> signature;
};

/// `Code` is StaticCode, const or not.
template <class Code>
auto& fileCode(Code& code) {
    using Own = std::conditional_t<std::is_const_v<Code>, const FileCode, FileCode>;
    auto* const own = dynamic_cast<Own*>(&code);
    if (own == nullptr) throw CodeError(kParameterError, "code of another service");
    return *own;
}

std::shared_ptr<FileCode> codeAt(const URL& url, const CodeAccess& access) {
    if (!url.isFileURL() || url.path().empty()) throw CodeError(kParameterError, "not a file URL");
    return FileCode::atPath(url.path(), access);
}

}  // namespace

Result<std::shared_ptr<StaticCode>> FileCodeSigningService::staticCode(const URL& path,
                                                                       std::uint32_t flags) const {
    return guarded([&]() -> Result<std::shared_ptr<StaticCode>> {
        if (flags != 0) return Error::osStatus(kParameterError);
        return std::shared_ptr<StaticCode>(codeAt(path, access_));
    });
}

Result<void> FileCodeSigningService::checkValidity(const StaticCode& code, std::uint32_t flags) const {
    return guarded([&]() -> Result<void> {
        if (flags != kRequiredValidityFlags) return Error::osStatus(kUnimplemented);
        const std::optional<CodeSignature>& signature = fileCode(code).signature();
        if (!signature) return Error::osStatus(kUnsigned);
        signature->requireValid();
        return {};
    });
}

Result<std::optional<SigningInformation>> FileCodeSigningService::signingInformation(
    const StaticCode& code, std::uint32_t sets) const {
    return guarded([&]() -> Result<std::optional<SigningInformation>> {
        const std::optional<CodeSignature>& signature = fileCode(code).signature();
        return std::optional(signature ? signature->information(sets) : SigningInformation());
    });
}

Result<std::shared_ptr<Signer>> FileCodeSigningService::makeSigner(const SignerParameters& parameters,
                                                                   std::uint32_t flags) const {
    if (flags != kSignOpaque || parameters.digestAlgorithm != DigestType::sha256)
        return Error::osStatus(kUnimplemented);
    if (!parameters.detachedSignature) return Error::osStatus(kParameterError);
    if (parameters.identifier.empty() || parameters.identifier.size() > kMaximumIdentifierLength ||
        parameters.identifier.find('\0') != std::string::npos) {
        return Error::osStatus(kParameterError);
    }
    auto opaque = std::make_shared<OpaqueSigner>();
    opaque->identifier = parameters.identifier;
    opaque->signature = parameters.detachedSignature;
    return std::shared_ptr<Signer>(std::move(opaque));
}

Result<void> FileCodeSigningService::addSignature(Signer& signer, const StaticCode& code,
                                                  std::uint32_t flags) const {
    return guarded([&]() -> Result<void> {
        const auto* opaque = dynamic_cast<OpaqueSigner*>(&signer);
        if (opaque == nullptr || flags != 0) return Error::osStatus(kParameterError);
        const FileCode& file = fileCode(code);
        *opaque->signature = signOpaque(file.source(), file.trailer(), opaque->identifier);
        return {};
    });
}

Result<void> FileCodeSigningService::setDetachedSignature(StaticCode& code, const Data& detached,
                                                          std::uint32_t flags) const {
    return guarded([&]() -> Result<void> {
        if (flags != 0) return Error::osStatus(kParameterError);
        fileCode(code).setDetachedSignature(detached);
        return {};
    });
}

Result<std::vector<SigningInformation>> FileCodeSigningService::allCodeHashes(const URL& path) const {
    return guarded([&]() -> Result<std::vector<SigningInformation>> {
        const std::shared_ptr<FileCode> code = codeAt(path, access_);
        std::vector<CodeSignature> signatures = code->allSignatures();
        for (const CodeSignature& signature : signatures) signature.requireValid();
        if (code->inBundle()) {
            std::vector<CodeSignature> nested = findNestedSignatures(path.path(), access_);
            std::move(nested.begin(), nested.end(), std::back_inserter(signatures));
        }
        // The walk finds the main executable again, and a library may be in several places.
        std::set<std::vector<Data>> known;
        std::vector<SigningInformation> found;
        for (const CodeSignature& signature : signatures) {
            SigningInformation information = signature.information(kSigningInformation);
            if (known.insert(information.cdHashes).second) found.push_back(std::move(information));
        }
        if (found.empty()) return Error::osStatus(kUnsigned);
        return found;
    });
}

}  // namespace pinwell::codesign
