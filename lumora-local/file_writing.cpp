#include "file_writing.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <system_error>

#include "base/handle.h"
#include "failure.h"
#include "runtime/process.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::FileDescriptor;
using values::format;

/// Repeats a call while a signal interrupts it.
template <class Call>
auto uninterrupted(Call call) {
    for (;;) {
        const auto answer = call();
        if (answer >= 0 || errno != EINTR) return answer;
    }
}

Failure failureFromErrno(int exitStatus, std::string_view action, const std::string& path) {
    const std::string reason = std::generic_category().message(errno);
    return {exitStatus, format("cannot %@ %@: %@", action, path, reason)};
}

void writeAll(int descriptor, ByteView contents, const std::string& path) {
    while (!contents.empty()) {
        const ssize_t written =
            uninterrupted([&] { return ::write(descriptor, contents.data(), contents.size()); });
        if (written < 0) throw failureFromErrno(EX_IOERR, "write", path);
        contents = contents.subspan(static_cast<std::size_t>(written));
    }
    if (uninterrupted([&] { return ::fsync(descriptor); }) != 0)
        throw failureFromErrno(EX_IOERR, "flush", path);
}

std::string parentOf(const std::string& path) {
    const std::filesystem::path parent = std::filesystem::path(path).parent_path();
    return parent.empty() ? "." : parent.string();
}

std::string withoutTrailingSlashes(std::string path) {
    while (path.size() > 1 && path.back() == '/') path.pop_back();
    return path;
}

}  // namespace

void writeNewFile(const std::string& path, ByteView contents, mode_t mode) {
    constexpr int kFlags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;
    const FileDescriptor file(uninterrupted([&] { return ::open(path.c_str(), kFlags, mode); }));
    if (!file) throw failureFromErrno(EX_CANTCREAT, "create", path);
    try {
        writeAll(file.get(), contents, path);
    } catch (const Failure&) {
        ::unlink(path.c_str());
        throw;
    }
}

void replaceFile(const std::string& path, ByteView contents, mode_t mode) {
    const std::string temporary = temporarySiblingOf(path);
    try {
        writeNewFile(temporary, contents, mode);
        if (std::rename(temporary.c_str(), path.c_str()) != 0) {
            throw failureFromErrno(EX_CANTCREAT, "replace", path);
        }
    } catch (const Failure&) {
        ::unlink(temporary.c_str());
        throw;
    }
    flushDirectory(parentOf(path));
}

void makeDirectory(const std::string& path, mode_t mode) {
    if (::mkdir(path.c_str(), mode) != 0) throw failureFromErrno(EX_CANTCREAT, "create", path);
}

void makeLink(const std::string& path, const std::string& target) {
    if (::symlink(target.c_str(), path.c_str()) != 0) throw failureFromErrno(EX_CANTCREAT, "create", path);
}

void flushDirectory(const std::string& path) {
    constexpr int kFlags = O_RDONLY | O_DIRECTORY | O_CLOEXEC;
    const FileDescriptor directory(uninterrupted([&] { return ::open(path.c_str(), kFlags); }));
    if (!directory) throw failureFromErrno(EX_IOERR, "open", path);
    // Some file systems cannot flush a directory, and return this error.
    if (uninterrupted([&] { return ::fsync(directory.get()); }) != 0 && errno != EINVAL)
        throw failureFromErrno(EX_IOERR, "flush", path);
}

std::string temporarySiblingOf(const std::string& path) {
    const std::filesystem::path file(path);
    const std::string name = "." + file.filename().string() + "." + runtime::globallyUniqueString();
    return (file.parent_path() / name).string();
}

std::string freeName(const std::string& path, const std::string& suffix) {
    const std::string first = path + suffix;
    std::string name = first;
    std::error_code ignored;
    for (int attempt = 2; std::filesystem::exists(std::filesystem::symlink_status(name, ignored));
         ++attempt) {
        name = first + "." + std::to_string(attempt);
    }
    return name;
}

PendingDirectory::PendingDirectory(std::string finalPath, mode_t mode)
    : finalPath_(withoutTrailingSlashes(std::move(finalPath))), path_(temporarySiblingOf(finalPath_)) {
    // The rename at the end decides; this only spares the work, and names the cause.
    std::error_code error;
    const std::filesystem::file_status status = std::filesystem::symlink_status(finalPath_, error);
    const bool vacant = status.type() == std::filesystem::file_type::not_found ||
                        (status.type() == std::filesystem::file_type::directory &&
                         std::filesystem::is_empty(finalPath_, error) && !error);
    if (!vacant) throw Failure(EX_CANTCREAT, format("%@ exists already and is left as it is", finalPath_));
    makeDirectory(path_, mode);
}

PendingDirectory::~PendingDirectory() {
    std::error_code ignored;
    if (!published_) std::filesystem::remove_all(path_, ignored);
}

void PendingDirectory::publish() {
    if (std::rename(path_.c_str(), finalPath_.c_str()) != 0) {
        throw failureFromErrno(EX_CANTCREAT, "create", finalPath_);
    }
    path_ = finalPath_;  // to be removed if it cannot be flushed
    flushDirectory(parentOf(finalPath_));
    published_ = true;
}

}  // namespace pinwell::lumora
