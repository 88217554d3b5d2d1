#include "src/confinement.h"

#include <sys/stat.h>
#include <unistd.h>

#include <optional>

#include "defaults/user_defaults.h"
#include "runtime/process.h"
#include "sandbox/sandbox.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"
#include "src/ticket_record.h"
#include "trust/trust_service.h"

namespace pinwell {
namespace {

using sandbox::Access;
using sandbox::FileRules;
using values::URL;

// How much of a bundle is read (its executable's signature, property lists, the ticket) is not known before.
// An executable of this size has a signature of 5 MiB.
constexpr std::uint64_t kReadOfABundle = std::uint64_t{512} * 1024 * 1024;

// Of the path itself: a link in the last component is not followed.
std::optional<struct stat> statusOf(const std::string& path) {
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0) return std::nullopt;
    return status;
}

// A file is replaced by a new one made beside it, and other programs may do that at any time.
void addArtefact(FileRules& rules, const URL& artefact, Access access) {
    const auto status = statusOf(artefact.path());
    if (!status || S_ISLNK(status->st_mode)) return;
    rules.push_back(
        {(S_ISDIR(status->st_mode) ? artefact : artefact.deletingLastPathComponent()).path(), access});
}

FileRules commonFiles(const config::PlatformDirectory& platform) {
    FileRules rules = sandbox::filesWithLinks(platform.path());
    append(rules, sandbox::libraryFiles());
    append(rules, sandbox::typeDatabaseFiles());
    return rules;
}

// The rights of a program that asks the record service.
sandbox::Confinement withNetwork(const config::PlatformDirectory& platform) {
    sandbox::Confinement confinement;
    confinement.network = sandbox::Network::connect;
    confinement.files = commonFiles(platform);
    append(confinement.files, sandbox::nameResolutionFiles());
    confinement.files.push_back({runtime::temporaryDirectory().path(), Access::write});
    if (auto defaults = defaults::domainFile(kDefaultsDomain))
        confinement.files.push_back({*std::move(defaults), Access::read});
    return confinement;
}

Access accessOf(std::uint8_t operation) {
    return operation == kOperationStaple ? Access::write : Access::read;
}

}  // namespace

sandbox::Confinement confinementOfRun(std::uint8_t operation, const URL& artefact,
                                      const config::PlatformDirectory& platform) {
    sandbox::Confinement confinement = withNetwork(platform);
    addArtefact(confinement.files, artefact, accessOf(operation));
    return confinement;
}

sandbox::Confinement confinementOfRuns(std::uint8_t operation, const std::vector<std::string>& artefacts,
                                       const config::PlatformDirectory& platform) {
    sandbox::Confinement confinement = withNetwork(platform);
    for (const std::string& path : artefacts)
        addArtefact(confinement.files, URL::fileURLWithPath(path), accessOf(operation));
    return confinement;
}

sandbox::Confinement confinementOfReading(const std::vector<std::string>& artefacts,
                                          const config::PlatformDirectory& platform) {
    sandbox::Confinement confinement;
    confinement.calls = sandbox::Calls::reading;
    confinement.files = commonFiles(platform);
    // With the paths as opened, for example without a slash at the end.
    for (const std::string& path : artefacts)
        confinement.files.push_back({URL::fileURLWithPath(path).path(), Access::read});
    return confinement;
}

void keepSecurityLibrary() {
    static const runtime::LazyLibrary library(trust::kSecurityLibrary);
}

std::uint64_t processorSecondsForArtefact(const URL& artefact) {
    const auto status = statusOf(artefact.path());
    if (!status || !S_ISREG(status->st_mode)) return sandbox::processorSecondsFor(kReadOfABundle);
    return sandbox::processorSecondsFor(static_cast<std::uint64_t>(status->st_size));
}

void limitRun(const URL& artefact) {
    sandbox::RunawayEnd end;
    end.descriptor = verboseLevel == kVerbosityQuiet ? -1 : STDOUT_FILENO;
    end.processorTime = values::format("Gave up on %@: it takes too much processor time.", artefact.path());
    end.stack = values::format("Gave up on %@: it is nested too deeply.", artefact.path());
    end.exitStatus = &lastRecordedFailure();
    sandbox::limitRunaways(processorSecondsForArtefact(artefact), std::move(end));
}

}  // namespace pinwell
