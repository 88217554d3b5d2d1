#include "verify/directory.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstring>

#include "base/handle.h"
#include "codesign/code_error.h"

namespace pinwell::verify {

using base::FileDescriptor;
using codesign::CodeError;

namespace {

[[noreturn]] void fail(int number, const std::string& name) {
    const bool isNotThere = number == ENOENT || number == ENOTDIR || number == ELOOP || number == ENXIO;
    const std::string reason = std::strerror(number);
    throw CodeError(isNotThere ? codesign::kStaticCodeNotFound : codesign::kIOError, name + ": " + reason);
}

bool isName(std::string_view name) {
    return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
           name.find('\0') == std::string_view::npos;
}

void requireName(const std::string& name) {
    if (!isName(name)) throw CodeError(codesign::kStaticCodeNotFound, "no name of a file");
}

EntryKind kindFrom(mode_t mode) {
    switch (mode & S_IFMT) {
        case S_IFREG:
            return EntryKind::file;
        case S_IFDIR:
            return EntryKind::directory;
        case S_IFLNK:
            return EntryKind::link;
        default:
            return EntryKind::other;
    }
}

using Listing = base::Handle<DIR, closedir>;

// Splits off the last name; the rest may be empty.
std::pair<std::string_view, std::string_view> splitLast(std::string_view path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string_view::npos) return {{}, path};
    return {path.substr(0, slash), path.substr(slash + 1)};
}

/// The kernel's limit.
constexpr unsigned kMaximumLinks = 40;

/// Adds the names of a path to the pending names, which are kept in reverse.
void pushNames(std::string_view path, std::vector<std::string>& pending) {
    while (!path.empty()) {
        const std::size_t slash = path.rfind('/');
        const std::string_view name = slash == std::string_view::npos ? path : path.substr(slash + 1);
        if (!name.empty() && name != ".") pending.emplace_back(name);
        path = slash == std::string_view::npos ? std::string_view() : path.substr(0, slash);
    }
}

/// Whether the pending names, after a missing one, stay inside: none leads above.
bool staysBelow(const std::vector<std::string>& pending) {
    for (const std::string& name : pending)
        if (name == "..") return false;
    return true;
}

}  // namespace

DirectoryRef OpenDirectory::atPath(const std::string& path) {
    FileDescriptor opened(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_DIRECTORY | O_CLOEXEC));
    if (!opened) fail(errno, path);
    return DirectoryRef(new OpenDirectory(std::move(opened)));
}

std::vector<Entry> OpenDirectory::entries(std::size_t limit) const {
    // With its own position, so that several threads may list at once.
    FileDescriptor own(openat(directory_.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!own) fail(errno, "the directory");
    const Listing listing(fdopendir(own.get()));
    if (!listing) fail(errno, "the directory");
    own.release();

    std::vector<Entry> found;
    for (;;) {
        errno = 0;
        const dirent* const entry = readdir(listing.get());
        if (entry == nullptr) {
            if (errno != 0) fail(errno, "the directory");
            break;
        }
        const std::string_view name = entry->d_name;
        if (name == "." || name == "..") continue;
        if (found.size() == limit) throw CodeError(codesign::kUnimplemented, "too many files");
        struct stat status = {};
        if (fstatat(directory_.get(), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0)
            fail(errno, std::string(name));
        found.push_back({std::string(name), kindFrom(status.st_mode)});
    }
    std::sort(found.begin(), found.end(), [](const Entry& a, const Entry& b) { return a.name < b.name; });
    return found;
}

std::optional<EntryKind> OpenDirectory::kindOf(const std::string& name) const {
    struct stat status = {};
    if (!isName(name)) return std::nullopt;
    if (fstatat(directory_.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0)
        return kindFrom(status.st_mode);
    if (errno == ENOENT || errno == ENOTDIR) return std::nullopt;
    fail(errno, name);
}

DirectoryRef OpenDirectory::directory(const std::string& name) const {
    requireName(name);
    for (;;) {
        FileDescriptor opened(
            openat(directory_.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
        if (opened) return DirectoryRef(new OpenDirectory(std::move(opened)));
        if (errno != EINTR) fail(errno, name);
    }
}

std::unique_ptr<base::FileSource> OpenDirectory::file(const std::string& name) const {
    requireName(name);
    auto opened = base::openRegularFile(directory_.get(), name, O_RDONLY | O_NOFOLLOW, name);
    if (opened) return std::make_unique<base::FileSource>(*std::move(opened), "the file");
    const auto reason = static_cast<int>(opened.error().code());
    if (reason == EISDIR || reason == EINVAL)
        throw CodeError(codesign::kStaticCodeNotFound, "not a regular file");
    fail(reason, name);
}

std::string OpenDirectory::linkTarget(const std::string& name) const {
    requireName(name);
    std::array<char, PATH_MAX> target{};
    const ssize_t length = readlinkat(directory_.get(), name.c_str(), target.data(), target.size());
    if (length < 0) fail(errno, name);
    return {target.data(), static_cast<std::size_t>(length)};
}

std::unique_ptr<base::FileSource> OpenDirectory::fileAt(std::string_view relativePath) const {
    const auto [parents, name] = splitLast(relativePath);
    if (parents.empty()) return file(std::string(name));
    return directoryAt(parents)->file(std::string(name));
}

DirectoryRef OpenDirectory::directoryAt(std::string_view relativePath) const {
    DirectoryRef current;
    while (!relativePath.empty()) {
        const std::size_t slash = relativePath.find('/');
        const std::string name(relativePath.substr(0, slash));
        current = (current ? *current : *this).directory(name);
        relativePath = slash == std::string_view::npos ? std::string_view() : relativePath.substr(slash + 1);
    }
    if (!current) throw CodeError(codesign::kStaticCodeNotFound, "no path of a directory");
    return current;
}

bool leadsInside(const DirectoryRef& root, std::string_view path) {
    std::vector<DirectoryRef> opened{root};
    std::vector<std::string> pending;
    pushNames(path, pending);
    unsigned links = 0;
    while (!pending.empty()) {
        const std::string name = std::move(pending.back());
        pending.pop_back();
        if (name == "..") {
            if (opened.size() == 1) return false;
            opened.pop_back();
            continue;
        }
        const auto kind = opened.back()->kindOf(name);
        if (kind == EntryKind::link) {
            const std::string target = opened.back()->linkTarget(name);
            if (++links > kMaximumLinks || target.starts_with('/')) return false;
            pushNames(target, pending);
        } else if (kind == EntryKind::directory) {
            opened.push_back(opened.back()->directory(name));
        } else {
            return staysBelow(pending);
        }
    }
    return true;
}

}  // namespace pinwell::verify
