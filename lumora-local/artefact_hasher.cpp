#include "artefact_hasher.h"

#include <filesystem>
#include <system_error>

#include "base/bytes.h"
#include "failure.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/cdhash_extract.h"
#include "src/host_platform.h"
#include "src/messages.h"
#include "src/platform.h"
#include "values/format.h"
#include "values/url.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using values::format;
using values::URL;

class PinwellArtefactHasher final : public ArtefactHasher {
  public:
    Artefact examine(const std::string& path) override {
        std::error_code error;
        if (!std::filesystem::exists(std::filesystem::symlink_status(path, error))) {
            throw Failure(EX_NOINPUT, format("%@: there is no such file", path));
        }
        const URL url = URL::fileURLWithPath(path);
        Artefact artefact;
        artefact.label = url.lastPathComponent();
        artefact.own = ownHash(url, path);
        artefact.hashes = listableHashes(artefact.own, url, host_.services().codeSigning);
        return artefact;
    }

  private:
    CodeHash ownHash(const URL& url, const std::string& path) {
        const std::shared_ptr<PWHashedFile> file = PWHashedFile::initWithFileURL(url, host_.services());
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

    // Hashing ends no process.
    const HostPlatform host_{[](int) {}};
};

}  // namespace

std::unique_ptr<ArtefactHasher> makePinwellArtefactHasher() {
    verboseLevel = kVerbosityQuiet;
    return std::make_unique<PinwellArtefactHasher>();
}

}  // namespace pinwell::lumora
