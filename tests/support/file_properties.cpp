#include "support/file_properties.h"

#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <filesystem>
#include <random>
#include <system_error>

namespace pinwell::test {
namespace {

void must(bool done, const std::string& what) {
    if (!done) throw std::system_error(errno, std::generic_category(), what);
}

void appendLittleEndian(std::string& bytes, std::uint32_t value, unsigned count) {
    for (unsigned i = 0; i < count; ++i) bytes += static_cast<char>(value >> (8 * i));
}

}  // namespace

bool isSuperuser() {
    return geteuid() == 0;
}

void giveToOrdinaryUser(const std::string& path) {
    if (!isSuperuser()) return;
    must(lchown(path.c_str(), kOrdinaryUser, kOrdinaryUser) == 0, path);
    if (!S_ISDIR(statusOf(path).st_mode)) return;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path))
        must(lchown(entry.path().c_str(), kOrdinaryUser, kOrdinaryUser) == 0, entry.path());
}

struct stat statusOf(const std::string& path) {
    struct stat status {};
    must(lstat(path.c_str(), &status) == 0, path);
    return status;
}

bool exists(const std::string& path) {
    struct stat status {};
    return lstat(path.c_str(), &status) == 0;
}

mode_t permissionsOf(const std::string& path) {
    return statusOf(path).st_mode & 07777U;
}

std::vector<std::string> namesIn(const std::string& directory) {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(directory))
        names.push_back(entry.path().filename().native());
    std::sort(names.begin(), names.end());
    return names;
}

void makeDirectory(const std::string& path, mode_t mode) {
    must(mkdir(path.c_str(), 0700) == 0 && chmod(path.c_str(), mode) == 0, path);
}

void makeLink(const std::string& target, const std::string& path) {
    must(symlink(target.c_str(), path.c_str()) == 0, path);
}

void makeFifo(const std::string& path) {
    must(mkfifo(path.c_str(), 0600) == 0, path);
}

void setMode(const std::string& path, mode_t mode) {
    must(chmod(path.c_str(), mode) == 0, path);
}

void setAttribute(const std::string& path, const std::string& name, std::string_view value) {
    must(setxattr(path.c_str(), name.c_str(), value.data(), value.size(), 0) == 0, path + " " + name);
}

std::optional<std::string> attribute(const std::string& path, const std::string& name) {
    std::string value(65536, '\0');
    const ssize_t length = getxattr(path.c_str(), name.c_str(), value.data(), value.size());
    if (length < 0) return std::nullopt;
    value.resize(static_cast<std::size_t>(length));
    return value;
}

std::string listThatLetsAnotherRead() {
    struct Entry {
        std::uint32_t tag, permissions, id;
    };
    constexpr std::uint32_t kNoId = 0xFFFFFFFF;
    std::string list;
    appendLittleEndian(list, 2, 4);  // version
    for (const Entry entry : {Entry{0x01, 6, kNoId}, Entry{0x02, 4, 12345}, Entry{0x04, 0, kNoId},
                              Entry{0x10, 4, kNoId}, Entry{0x20, 0, kNoId}}) {
        appendLittleEndian(list, entry.tag, 2);
        appendLittleEndian(list, entry.permissions, 2);
        appendLittleEndian(list, entry.id, 4);
    }
    return list;
}

std::string irregularBytes(std::size_t count) {
    std::mt19937 numbers(20261120);
    std::string bytes(count, '\0');
    for (char& byte : bytes) byte = static_cast<char>(numbers());
    return bytes;
}

}  // namespace pinwell::test
