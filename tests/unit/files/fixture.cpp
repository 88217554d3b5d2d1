#include "fixture.h"

#include <grp.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <system_error>

#include "support/fake_file_manager.h"

namespace pinwell::test {
namespace {

void must(bool done, const std::string& what) {
    if (!done) throw std::system_error(errno, std::generic_category(), what);
}

void openDirectoriesIn(const std::string& directory) {
    for (const auto& entry : std::filesystem::directory_iterator(directory)) {
        if (entry.is_symlink() || !entry.is_directory()) continue;
        setMode(entry.path(), 0700);
        openDirectoriesIn(entry.path());
    }
}

}  // namespace

void AsOrdinaryUser::give(const std::string& directory) {
    must(chown(directory.c_str(), kOrdinaryUser, kOrdinaryUser) == 0, directory);
}

void AsOrdinaryUser::dropRights() {
    // A superuser's login is also in the superuser's group, and an ordinary user must not have that group's
    // rights.
    const int count = getgroups(0, nullptr);
    must(count >= 0, "counting the groups");
    groups_.resize(static_cast<std::size_t>(count));
    must(getgroups(count, groups_.data()) == count && setgroups(0, nullptr) == 0, "leaving the groups");
    must(setegid(kOrdinaryUser) == 0 && seteuid(kOrdinaryUser) == 0, "becoming an ordinary user");
    changed_ = true;
}

AsOrdinaryUser::~AsOrdinaryUser() {
    if (changed_ && (seteuid(0) != 0 || setegid(0) != 0 || setgroups(groups_.size(), groups_.data()) != 0))
        std::abort();
}

std::size_t openFileCount() {
    return namesIn("/proc/self/fd").size();
}

FilesTest::~FilesTest() {
    openDirectoriesIn(directory.path());
}

FilesTest::FilesTest() : manager(files::makeLocalFileManager(plainTypeNaming)) {}

}  // namespace pinwell::test
