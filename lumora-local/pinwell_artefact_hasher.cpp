#include "lumora-local/pinwell_artefact_hasher.h"

#include <filesystem>
#include <system_error>

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/messages.h"
#include "src/platform.h"
#include "src/type_naming.h"

namespace pinwell::lumora {
namespace {

using foundation::Data;
using foundation::format;
using foundation::URL;

/// The services that hashing needs, and those that the tool's model asks for besides.
class PinwellArtefactHasher final : public ArtefactHasher {
  public:
    PinwellArtefactHasher()
        : files_(files::makeLocalFileManager(
              [this](const files::ItemFacts& f) { return nameType(*types_, f); })) {}

    Artefact examine(const std::string& path) override {
        std::error_code error;
        if (!std::filesystem::exists(std::filesystem::symlink_status(path, error))) {
            throw Failure(EX_NOINPUT, format("%@: there is no such file", path));
        }
        const URL url = URL::fileURLWithPath(path);
        Artefact artefact;
        artefact.label = url.lastPathComponent();
        artefact.own = ownHash(url, path);
        artefact.hashes = hashesForTicket(artefact.own, allHashes(url));
        return artefact;
    }

  private:
    CodeHash ownHash(const URL& url, const std::string& path) {
        const Platform platform{*files_,        *types_,     *codeSigning_, *trust_,   *https_,
                                *userDefaults_, *systemLog_, directory_,    [](int) {}};
        const std::shared_ptr<PWHashedFile> file = PWHashedFile::initWithFileURL(url, platform);
        if (file == nullptr)
            throw Failure(EX_DATAERR, format("%@ is of no kind that can have a ticket", path));
        if (file->appropriateExitCode() != kExitOK) {
            throw Failure(file->appropriateExitCode(), format("%@ cannot be read as an artefact", path));
        }
        std::optional<Data> hash = file->cdHash();
        if (!hash || hash->empty())
            throw Failure(EX_DATAERR, format("%@ has no valid signature to vouch for", path));
        return {file->digestAlgorithm(), *std::move(hash)};
    }

    /// An unsigned disk image or a package has none beside its own.
    std::vector<CodeHash> allHashes(const URL& url) {
        std::vector<codesign::SigningInformation> all;
        if (codeSigning_->copyAllCodeHashes(url, all) != codesign::kSuccess) return {};
        std::vector<CodeHash> hashes;
        for (const codesign::SigningInformation& code : all) {
            for (std::size_t i = 0; i < code.cdHashes.size() && i < code.digestAlgorithms.size(); ++i) {
                hashes.push_back({code.digestAlgorithms[i], code.cdHashes[i]});
            }
        }
        return hashes;
    }

    foundation::PlatformDirectory directory_ = foundation::PlatformDirectory::current();
    std::unique_ptr<syslog::SystemLog> systemLog_ = syslog::makeSystemLog();
    std::unique_ptr<types::TypeService> types_ = types::makeTypeService();
    std::unique_ptr<files::FileManager> files_;
    std::unique_ptr<codesign::CodeSigningService> codeSigning_ = codesign::makeCodeSigningService();
    std::unique_ptr<trust::TrustService> trust_ =
        trust::makeTrustService(directory_, [this](std::string_view line) { systemLog_->error(line); });
    std::unique_ptr<https::SessionService> https_ = https::makeSessionService(*trust_);
    std::unique_ptr<defaults::UserDefaultsService> userDefaults_ = defaults::makeUserDefaultsService();
};

}  // namespace

std::unique_ptr<ArtefactHasher> makePinwellArtefactHasher() {
    verboseLevel = kVerbosityQuiet;
    return std::make_unique<PinwellArtefactHasher>();
}

}  // namespace pinwell::lumora
