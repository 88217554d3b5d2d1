// Landlock: gives up rights to files and TCP permanently.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <system_error>

#include "base/handle.h"
#include "facilities.h"

namespace pinwell::sandbox {
namespace {

using base::Error;
using base::FileDescriptor;
using base::Result;

// The kernel's numbers (include/uapi/linux/landlock.h). Defined here because the headers of Linux 6.1, on
// Debian 12, lack some of them.
enum FileRight : std::uint64_t {
    execute = 1U << 0U,
    writeFile = 1U << 1U,
    readFile = 1U << 2U,
    readDirectory = 1U << 3U,
    removeDirectory = 1U << 4U,
    removeFile = 1U << 5U,
    makeDevice = 1U << 6U,
    makeDirectory = 1U << 7U,
    makeRegular = 1U << 8U,
    makeSocket = 1U << 9U,
    makeFifo = 1U << 10U,
    makeBlock = 1U << 11U,
    makeSymbolicLink = 1U << 12U,
    refer = 1U << 13U,          // version 2: renames from one directory to another
    truncateFile = 1U << 14U,   // version 3
    deviceControl = 1U << 15U,  // version 5
};
enum NetworkRight : std::uint64_t { bindTcp = 1U << 0U, connectTcp = 1U << 1U };      // version 4
enum Scope : std::uint64_t { abstractSockets = 1U << 0U, signalSending = 1U << 1U };  // version 6

constexpr int kVersionWithRenames = 2;
constexpr int kVersionWithTruncation = 3;
constexpr int kVersionWithNetwork = 4;
constexpr int kVersionWithDeviceControl = 5;
constexpr int kVersionWithScopes = 6;

struct RulesetAttributes {
    std::uint64_t files = 0;
    std::uint64_t network = 0;
    std::uint64_t scopes = 0;
};

struct [[gnu::packed]] PathRule {
    std::uint64_t rights = 0;
    std::int32_t parent = -1;
};

constexpr unsigned kVersionQuestion = 1;
constexpr int kPathRule = 1;

constexpr std::uint64_t kReadRights = readFile | readDirectory;
constexpr std::uint64_t kWriteRights = kReadRights | writeFile | truncateFile | removeDirectory | removeFile |
                                       makeDirectory | makeRegular | refer;
// Rights that a rule on anything but a directory may give.
constexpr std::uint64_t kRightsToOneFile = execute | writeFile | readFile | truncateFile | deviceControl;

std::uint64_t knownFileRights(int version) {
    std::uint64_t rights = refer - 1U;  // all of the first version
    if (version >= kVersionWithRenames) rights |= refer;
    if (version >= kVersionWithTruncation) rights |= truncateFile;
    if (version >= kVersionWithDeviceControl) rights |= deviceControl;
    return rights;
}

std::uint64_t deniedNetworkRights(int version, Network network) {
    if (version < kVersionWithNetwork || network == Network::listen) return 0;
    return network == Network::connect ? std::uint64_t{bindTcp} : bindTcp | connectTcp;
}

// The last call's error, for the file of a rule or for Landlock itself.
Error lastError(const std::string& about = {}) {
    const int reason = errno;
    const std::string text = std::generic_category().message(reason);
    return {base::kPOSIXErrorDomain, reason, about.empty() ? text : about + ": " + text};
}

// A rule is for one inode. Network file systems of this type may give a file a new inode at any time.
bool keepsInodes(int place) {
    constexpr std::uint32_t kPlan9 = 0x01021997;  // linux/magic.h
    struct statfs fileSystem {};
    return fstatfs(place, &fileSystem) != 0 || static_cast<std::uint32_t>(fileSystem.f_type) != kPlan9;
}

Result<void> addRule(int ruleset, const FileRule& rule, std::uint64_t known) {
    const FileDescriptor place(open(rule.path.c_str(), O_PATH | O_CLOEXEC));
    struct stat status {};
    if (!place || fstat(place.get(), &status) != 0) return {};  // it does not exist
    if (!keepsInodes(place.get()))
        return Error(base::kPOSIXErrorDomain, EOPNOTSUPP,
                     rule.path + ": the file system (9P) does not keep it");
    PathRule added;
    added.rights = (rule.access == Access::write ? kWriteRights : kReadRights) & known;
    if (!S_ISDIR(status.st_mode)) added.rights &= kRightsToOneFile;
    added.parent = place.get();
    if (syscall(SYS_landlock_add_rule, ruleset, kPathRule, &added, 0U) == 0) return {};
    if (errno == EBADFD) return {};  // a pipe or a socket: always readable
    return lastError(rule.path);
}

// Version of the kernel's Landlock; 0, with errno set, without it.
int landlockVersion() {
    const long version = syscall(SYS_landlock_create_ruleset, nullptr, std::size_t{0}, kVersionQuestion);
    return version < 0 ? 0 : static_cast<int>(version);
}

}  // namespace

Result<void> restrictFiles(const FileRules& files, Network network) {
    const int version = landlockVersion();
    if (version == 0) return lastError();
    // The first version forbids every rename between directories, but replacing a file needs one.
    const bool writes = std::any_of(files.begin(), files.end(),
                                    [](const FileRule& rule) { return rule.access == Access::write; });
    if (writes && version < kVersionWithRenames)
        return Error(base::kPOSIXErrorDomain, EOPNOTSUPP,
                     "this kernel's version of it forbids renaming files");

    RulesetAttributes attributes;
    attributes.files = knownFileRights(version);
    attributes.network = deniedNetworkRights(version, network);
    if (version >= kVersionWithScopes) attributes.scopes = abstractSockets | signalSending;
    const FileDescriptor ruleset(
        static_cast<int>(syscall(SYS_landlock_create_ruleset, &attributes, sizeof attributes, 0U)));
    if (!ruleset) return lastError();
    for (const FileRule& rule : files)
        if (auto added = addRule(ruleset.get(), rule, attributes.files); !added) return added;
    if (syscall(SYS_landlock_restrict_self, ruleset.get(), 0U) != 0) return lastError();
    return {};
}

}  // namespace pinwell::sandbox
