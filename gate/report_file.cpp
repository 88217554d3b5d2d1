#include "gate/report_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <system_error>

#include "companion/streams.h"

namespace pinwell::gate {

namespace {

namespace fs = std::filesystem;

std::string reasonOf(int code) {
    return std::generic_category().message(code);
}

/// The status of a descriptor's regular file; `nullopt` for anything else.
std::optional<struct stat> regularFile(int descriptor) {
    struct stat status {};
    if (::fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
    return status;
}

bool isSame(const struct stat& a, const struct stat& b) {
    return a.st_dev == b.st_dev && a.st_ino == b.st_ino;
}

}  // namespace

std::optional<std::string> ReportFile::open() {
    if (path_.empty()) return std::nullopt;
    constexpr mode_t kMode = 0666;
    file_ =
        foundation::FileDescriptor(::open(path_.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC | O_NOCTTY, kMode));
    if (file_) return std::nullopt;
    return "cannot write to " + path_ + ": " + reasonOf(errno);
}

const std::string* ReportFile::amongst(const std::vector<std::string>& paths) const {
    const auto own = regularFile(file_.get());
    if (!own) return nullptr;
    const auto found = std::find_if(paths.begin(), paths.end(), [&](const std::string& path) {
        struct stat status {};
        return ::stat(path.c_str(), &status) == 0 && isSame(status, *own);
    });
    return found == paths.end() ? nullptr : &*found;
}

bool ReportFile::isSameAs(const ReportFile& other) const {
    const auto a = regularFile(file_.get());
    const auto b = regularFile(other.file_.get());
    return a && b && isSame(*a, *b);
}

std::optional<std::string> ReportFile::write(std::string_view document) {
    const int descriptor = path_.empty() ? STDOUT_FILENO : file_.get();
    const std::string name = path_.empty() ? std::string("standard output") : path_;
    if (!path_.empty() && regularFile(descriptor) && ::ftruncate(descriptor, 0) != 0)
        return "cannot write to " + name + ": " + reasonOf(errno);
    companion::Output output(descriptor);
    output.write(document);
    if (output.hasFailed()) return "cannot write to " + name;
    // Some file systems report a failed write only on close.
    if (!path_.empty() && ::close(file_.release()) != 0)
        return "cannot write to " + name + ": " + reasonOf(errno);
    return std::nullopt;
}

const std::string* directoryAround(const std::string& path, const std::vector<std::string>& directories) {
    std::error_code error;
    const fs::path inside = fs::weakly_canonical(path, error);
    if (error) return nullptr;
    const auto found = std::find_if(directories.begin(), directories.end(), [&](const std::string& one) {
        const fs::path outside = fs::canonical(one, error);
        if (error || !fs::is_directory(outside, error)) return false;
        return std::mismatch(outside.begin(), outside.end(), inside.begin(), inside.end()).first ==
               outside.end();
    });
    return found == directories.end() ? nullptr : &*found;
}

}  // namespace pinwell::gate
