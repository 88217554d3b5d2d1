// What the tests of the file service share: a directory of their own, a file manager, and short words for
// looking at files.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "files/file_manager.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

bool isSuperuser();

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
};

struct stat statusOf(const std::string& path);
bool exists(const std::string& path);
mode_t permissionsOf(const std::string& path);

/// Names in the directory, sorted.
std::vector<std::string> namesIn(const std::string& directory);

/// Numbers of open files of the process.
std::size_t openFileCount();

void makeDirectory(const std::string& path, mode_t mode = 0755);
void makeLink(const std::string& target, const std::string& path);
void makeFifo(const std::string& path);
void setMode(const std::string& path, mode_t mode);
void setAttribute(const std::string& path, const std::string& name, std::string_view value);
std::optional<std::string> attribute(const std::string& path, const std::string& name);

/// An access control list (acl(5), "system.posix_acl_access") that lets user 12345 read: rw-, r--, mask r--,
/// ---.
std::string listThatLetsAnotherRead();

/// Bytes without any regularity that a copy could live on.
std::string irregularBytes(std::size_t count);

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
