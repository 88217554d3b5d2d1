#include "report_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <optional>
#include <system_error>

#include "companion/streams.h"

namespace pinwell::gate {

namespace {

namespace fs = std::filesystem;

base::Error cannotWrite(const std::string& name, int code) {
    const std::string reason = code == 0 ? std::string() : ": " + std::generic_category().message(code);
    return {base::kPOSIXErrorDomain, code, "cannot write to " + name + reason};
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

base::Result<void> ReportFile::open() {
    if (path_.empty()) return {};
    constexpr int kFlags = O_WRONLY | O_CREAT | O_CLOEXEC | O_NOCTTY;
    file_ = base::FileDescriptor(::open(path_.c_str(), kFlags, companion::kNewFileMode));
    if (!file_) return cannotWrite(path_, errno);
    return {};
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

base::Result<void> ReportFile::write(std::string_view document) {
    const int descriptor = path_.empty() ? STDOUT_FILENO : file_.get();
    const std::string name = path_.empty() ? std::string("standard output") : path_;
    if (!path_.empty() && regularFile(descriptor) && ::ftruncate(descriptor, 0) != 0)
        return cannotWrite(name, errno);
    companion::Output output(descriptor);
    output.write(document);
    if (output.hasFailed()) return cannotWrite(name, 0);
    // Some file systems report a failed write only on close.
    if (!path_.empty() && ::close(file_.release()) != 0) return cannotWrite(name, errno);
    return {};
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
