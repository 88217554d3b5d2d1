#include "sandbox/sandbox.h"

#include <sys/prctl.h>
#include <sys/resource.h>

#include <iterator>
#include <utility>

#include "facilities.h"
#include "runtime/process.h"

namespace pinwell::sandbox {

#ifdef PINWELL_SANDBOX

std::vector<std::string> confine(const Confinement& confinement) {
    std::vector<std::string> missing;
    // Both facilities require it unless the process is the superuser's.
    if (prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) missing.emplace_back("no_new_privs is not in force");
    FileRules rules = confinement.files;
#ifdef PINWELL_COUNTS_DIRECTORY
    rules.push_back({PINWELL_COUNTS_DIRECTORY, Access::write});  // for a build that counts executed lines
#endif
    const auto files = restrictFiles(rules, confinement.network);
    if (!files) missing.push_back("Landlock is not in force: " + files.error().localizedFailureReason());
    const auto calls =
        restrictCalls(confinement.calls, confinement.network, files ? FilesAre::restricted : FilesAre::open);
    if (!calls) missing.push_back("seccomp is not in force: " + calls.error().localizedFailureReason());
    return missing;
}

#else

std::vector<std::string> confine(const Confinement&) {
    return {"Landlock and seccomp are not in force: this program was built without them"};
}

#endif

void forbidCoreDumps() {
    const rlimit none{0, 0};
    setrlimit(RLIMIT_CORE, &none);
    // The leak checker of a sanitized build traces the process at its end.
    if (!runtime::kSanitized) prctl(PR_SET_DUMPABLE, 0, 0, 0, 0);
}

void append(FileRules& rules, FileRules more) {
    rules.insert(rules.end(), std::make_move_iterator(more.begin()), std::make_move_iterator(more.end()));
}

}  // namespace pinwell::sandbox
