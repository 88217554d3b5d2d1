#include "ticket/file_writing.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "foundation/bytes.h"
#include "foundation/file_io.h"

namespace pinwell::ticket_files {
namespace {

using foundation::Error;
using foundation::FileDescriptor;
using foundation::Result;

constexpr mode_t kFileMode = 0666;  // less the user's mask

bool writeAll(const FileDescriptor& file, foundation::ByteView bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::write(file.get(), bytes.data(), bytes.size());
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return false;
        bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return ::fsync(file.get()) == 0;
}

bool flushFolderOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash + 1);
    const FileDescriptor opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    // A folder that may not be read is flushed by nobody.
    return !opened || ::fsync(opened.get()) == 0 || errno == EINVAL;
}

}  // namespace

Result<void> writeNewFile(foundation::ByteView contents, const std::string& path) {
    const FileDescriptor file(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kFileMode));
    if (!file) return Error::posix(errno, path);
    if (writeAll(file, contents) && flushFolderOf(path)) return {};
    const Error error = Error::posix(errno, path);
    ::unlink(path.c_str());
    return error;
}

Result<void> replaceFile(foundation::ByteView contents, const std::string& path) {
    std::string temporary = path + ".XXXXXX";
    const FileDescriptor file(::mkostemp(temporary.data(), O_CLOEXEC));
    if (!file) return Error::posix(errno, path);
    const mode_t mask = ::umask(0);
    ::umask(mask);
    if (::fchmod(file.get(), kFileMode & ~mask) == 0 && writeAll(file, contents) &&
        std::rename(temporary.c_str(), path.c_str()) == 0) {
        if (flushFolderOf(path)) return {};
        return Error::posix(errno, path);
    }
    const Error error = Error::posix(errno, path);
    ::unlink(temporary.c_str());
    return error;
}

}  // namespace pinwell::ticket_files
