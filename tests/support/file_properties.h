// Short functions to make files of every kind and to read their properties. They throw std::system_error on
// failure.
#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::test {

bool isSuperuser();

/// The user for tests of permissions, which do not hold for the superuser.
inline constexpr uid_t kOrdinaryUser = 65534;

/// If the superuser runs the tests, makes that user the owner of `path` and everything below it; otherwise it
/// does nothing.
void giveToOrdinaryUser(const std::string& path);

struct stat statusOf(const std::string& path);
bool exists(const std::string& path);
mode_t permissionsOf(const std::string& path);

/// Names in the directory, sorted.
std::vector<std::string> namesIn(const std::string& directory);

void makeDirectory(const std::string& path, mode_t mode = 0755);
void makeLink(const std::string& target, const std::string& path);
void makeFifo(const std::string& path);
void setMode(const std::string& path, mode_t mode);
void setAttribute(const std::string& path, const std::string& name, std::string_view value);
std::optional<std::string> attribute(const std::string& path, const std::string& name);

/// An access control list (acl(5), "system.posix_acl_access") that gives user 12345 read access: rw-, r--,
/// mask r--, ---.
std::string listThatLetsAnotherRead();

/// Bytes without any regularity that could hide a faulty copy.
std::string irregularBytes(std::size_t count);

}  // namespace pinwell::test
