// What the tests of the file service share: a directory of their own, a file manager, and short words for
// looking at files.
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

/// The extended attribute that an access control list is kept in.
inline constexpr const char* kAccessControlList = "system.posix_acl_access";

/// Rights of an ordinary user for as long as it lives, with `directories` given to that user. Nothing is
/// changed in a test run that is an ordinary user's anyway.
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
    ~FilesTest() override;  // opens what a test has closed, so that all can be removed

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
    return arg.error().domain() == foundation::kPOSIXErrorDomain && arg.error().code() == reason &&
           arg.error().localizedDescription().starts_with(std::string(path) + ": ");
}

/// Matches a success; says why it is none.
MATCHER(Succeeds, "succeeds") {
    if (!arg) *result_listener << arg.error().localizedDescription();
    return arg.has_value();
}

}  // namespace pinwell::test
