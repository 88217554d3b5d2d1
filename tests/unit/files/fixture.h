// Shared code of the tests of the file service: a temporary directory, a file manager, and short functions to
// read files.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/types.h>

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "files/file_manager.h"
#include "support/file_properties.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

/// The extended attribute with an access control list.
inline constexpr const char* kAccessControlList = "system.posix_acl_access";

/// Has an ordinary user's rights during its life, and gives `directories` to that user. It changes nothing if
/// an ordinary user runs the tests.
class AsOrdinaryUser {
  public:
    template <class... Directories>
    explicit AsOrdinaryUser(const Directories&... directories) {
        if (!isSuperuser()) return;
        (give(directories), ...);
        dropRights();
    }
    ~AsOrdinaryUser();
    AsOrdinaryUser(const AsOrdinaryUser&) = delete;
    AsOrdinaryUser& operator=(const AsOrdinaryUser&) = delete;

  private:
    static void give(const std::string& directory);
    void dropRights();

    bool changed_ = false;
    std::vector<gid_t> groups_;
};

/// Numbers of open files of the process.
std::size_t openFileCount();

class FilesTest : public testing::Test {
  protected:
    FilesTest();
    ~FilesTest() override;  // makes a test's closed directories readable, to remove them

    std::string path(std::string_view name) const { return directory / name; }
    files::URL url(std::string_view name) const { return directory.url(name); }

    TemporaryDirectory directory;
    std::unique_ptr<files::FileManager> manager;
};

/// Matches a failure with that errno that names that path.
MATCHER_P2(FailsWith, reason, path, "fails with errno " + testing::PrintToString(reason) + " for " + path) {
    if (arg) {
        *result_listener << "succeeded";
        return false;
    }
    *result_listener << "failed with " << arg.error().localizedDescription();
    return arg.error().domain() == base::kPOSIXErrorDomain && arg.error().code() == reason &&
           arg.error().localizedDescription().starts_with(std::string(path) + ": ");
}

/// Matches a success; otherwise prints the error.
MATCHER(Succeeds, "succeeds") {
    if (!arg) *result_listener << arg.error().localizedDescription();
    return arg.has_value();
}

}  // namespace pinwell::test
