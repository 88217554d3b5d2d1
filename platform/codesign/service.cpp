#include "service.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <iterator>
#include <memory>
#include <set>
#include <type_traits>

#include "adhoc_signer.h"
#include "base/byte_io.h"
#include "codesign/code_error.h"

namespace pinwell::codesign {

namespace {

using base::Error;

/// Longest identifier; real ones are about as long as a domain name.
constexpr std::size_t kMaximumIdentifierLength = 1024;

constexpr std::uint32_t kRequiredValidityFlags = kDoNotValidateExecutable | kDoNotValidateResources;

/// Runs `body`, and returns an error with the matching status if it throws.
template <class Body>
auto guarded(Body body) -> decltype(body()) {
    try {
        return body();
    } catch (const std::runtime_error& failure) {
        return Error::osStatus(asCodeError(failure).status());
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

struct DirectoryCloser {
    void operator()(DIR* directory) const noexcept { closedir(directory); }
};
using DirectoryStream = std::unique_ptr<DIR, DirectoryCloser>;

class BundleWalk {
  public:
    explicit BundleWalk(const CodeAccess& access) : access_(access) {}

    void directory(const std::string& path, unsigned depth) {
        if (depth > kMaximumBundleDepth) throw CodeError(kUnimplemented, "the bundle is too deep");
        if (S_ISREG(typeOf(path + "/Contents/_CodeSignature/CodeDirectory")))
            collect(path, CodeKind::separatelySigned);
        for (const std::string& name : names(path)) {
            const std::string entry = path + "/" + name;
            const mode_t type = typeOf(entry);
            if (S_ISDIR(type)) directory(entry, depth + 1);
            if (S_ISREG(type)) collect(entry, CodeKind::executableImage);
        }
    }

    std::vector<CodeSignature> take() && { return std::move(found_); }

  private:
    // The type of the item itself, without following a link; 0 if stat fails.
    mode_t typeOf(const std::string& path) const {
        const auto place = access_.places->find(path);
        const auto status = place ? place->status() : place.error();
        return status ? status->st_mode : 0;
    }

    std::vector<std::string> names(const std::string& path) {
        std::vector<std::string> result;
        const auto place = access_.places->find(path);
        auto opened = place ? place->open(O_RDONLY | O_DIRECTORY) : place.error();
        if (!opened) return result;
        const DirectoryStream stream(fdopendir(opened->get()));
        if (!stream) return result;
        static_cast<void>(opened->release());  // the stream owns it now
        while (const dirent* const entry = readdir(stream.get())) {
            const std::string name(&entry->d_name[0]);
            if (name == "." || name == "..") continue;
            if (++entries_ > kMaximumBundleEntries)
                throw CodeError(kUnimplemented, "the bundle is too large");
            result.push_back(name);
        }
        std::sort(result.begin(), result.end());
        return result;
    }

    void collect(const std::string& path, CodeKind kind) {
        try {
            const std::shared_ptr<FileCode> code = FileCode::atPath(path, access_);
            if (code->kind() != kind) return;
            std::vector<CodeSignature> signatures = code->allSignatures();
            for (const CodeSignature& signature : signatures) signature.requireValid();
            std::move(signatures.begin(), signatures.end(), std::back_inserter(found_));
        } catch (const CodeError&) {
            // Skipped: bad code in the bundle must not hide the good code.
        } catch (const base::ShortRead&) {
        } catch (const base::ReadFailure&) {
        }
    }

    const CodeAccess& access_;
    std::size_t entries_ = 0;
    std::vector<CodeSignature> found_;
};

/// The valid signatures of all code below the directory `bundlePath`, also of its own main executable
/// if that is an executable image. Executable images are recognised by their first bytes, in any
/// place; a nested bundle in the separate form by its Contents/_CodeSignature/CodeDirectory. Files are
/// visited in byte order of their names. Links are not followed, and moving items during the walk
/// never leads outside the directory. Code that is unreadable, unsigned or invalid is skipped. Throws
/// CodeError (kUnimplemented) for a bundle beyond the limits, because a partial list would look
/// complete.
std::vector<CodeSignature> findNestedSignatures(const std::string& bundlePath, const CodeAccess& access) {
    const auto anchor = access.places->hold(bundlePath);
    if (!anchor) return {};
    BundleWalk walk(access);
    walk.directory(bundlePath, 0);
    return std::move(walk).take();
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

std::unique_ptr<CodeSigningService> makeCodeSigningService(std::shared_ptr<base::Places> places) {
    return std::make_unique<FileCodeSigningService>(accessThrough(std::move(places)));
}

}  // namespace pinwell::codesign
