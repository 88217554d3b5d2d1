#include "codesign/service.h"

#include <iterator>
#include <set>

#include "codesign/adhoc_signer.h"
#include "codesign/code_error.h"
#include "codesign/nested_code.h"
#include "foundation/byte_reader.h"

namespace pinwell::codesign {

namespace {

/// Longest identifier; real ones are about as long as a domain name.
constexpr std::size_t kMaximumIdentifierLength = 1024;

constexpr std::uint32_t kRequiredValidityFlags = kDoNotValidateExecutable | kDoNotValidateResources;

/// Runs `body`, which returns a status; turns its exceptions into a status.
template <class Body>
Status asStatus(Body body) {
    try {
        return body();
    } catch (const CodeError& error) {
        return error.status();
    } catch (const foundation::ShortRead&) {
        return kInvalidSignature;
    }
}

struct OpaqueSigner final : Signer {
    std::string identifier;
    std::shared_ptr<Data> signature;
};

FileCode& fileCode(StaticCode& code) {
    auto* own = dynamic_cast<FileCode*>(&code);
    if (own == nullptr) throw CodeError(kParameterError, "code of another service");
    return *own;
}

std::shared_ptr<FileCode> codeAt(const URL& url, const CodeAccess& access) {
    if (!url.isFileURL() || url.path().empty()) throw CodeError(kParameterError, "not a file URL");
    return FileCode::atPath(url.path(), access);
}

}  // namespace

Status FileCodeSigningService::createStaticCode(const URL& path, std::uint32_t flags,
                                                std::shared_ptr<StaticCode>& code) {
    return asStatus([&] {
        if (flags != 0) return kParameterError;
        code = codeAt(path, access_);
        return kSuccess;
    });
}

Status FileCodeSigningService::checkValidity(StaticCode& code, std::uint32_t flags) {
    return asStatus([&] {
        if (flags != kRequiredValidityFlags) return kUnimplemented;
        const std::optional<CodeSignature>& signature = fileCode(code).signature();
        if (!signature) return kUnsigned;
        signature->requireValid();
        return kSuccess;
    });
}

Status FileCodeSigningService::copySigningInformation(StaticCode& code, std::uint32_t sets,
                                                      std::optional<SigningInformation>& information) {
    return asStatus([&] {
        const std::optional<CodeSignature>& signature = fileCode(code).signature();
        information = signature ? signature->information(sets) : SigningInformation();
        return kSuccess;
    });
}

Status FileCodeSigningService::createSigner(const SignerParameters& parameters, std::uint32_t flags,
                                            std::shared_ptr<Signer>& signer) {
    if (flags != kSignOpaque || parameters.digestAlgorithm != DigestType::sha256) return kUnimplemented;
    if (!parameters.detachedSignature) return kParameterError;
    if (parameters.identifier.empty() || parameters.identifier.size() > kMaximumIdentifierLength ||
        parameters.identifier.find('\0') != std::string::npos) {
        return kParameterError;
    }
    auto opaque = std::make_shared<OpaqueSigner>();
    opaque->identifier = parameters.identifier;
    opaque->signature = parameters.detachedSignature;
    signer = std::move(opaque);
    return kSuccess;
}

Status FileCodeSigningService::addSignature(Signer& signer, StaticCode& code, std::uint32_t flags) {
    return asStatus([&] {
        const auto* opaque = dynamic_cast<OpaqueSigner*>(&signer);
        if (opaque == nullptr || flags != 0) return kParameterError;
        const FileCode& file = fileCode(code);
        *opaque->signature = signOpaque(file.source(), file.trailer(), opaque->identifier);
        return kSuccess;
    });
}

Status FileCodeSigningService::setDetachedSignature(StaticCode& code, const Data& detached,
                                                    std::uint32_t flags) {
    return asStatus([&] {
        if (flags != 0) return kParameterError;
        fileCode(code).setDetachedSignature(detached);
        return kSuccess;
    });
}

Status FileCodeSigningService::copyAllCodeHashes(const URL& path, std::vector<SigningInformation>& all) {
    return asStatus([&] {
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
        if (found.empty()) return kUnsigned;
        all = std::move(found);
        return kSuccess;
    });
}

}  // namespace pinwell::codesign
