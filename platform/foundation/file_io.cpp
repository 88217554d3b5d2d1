#include "foundation/file_io.h"
#include "foundation/bytes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <span>

namespace pinwell::foundation {
namespace {

constexpr std::size_t kChunk = 16 * 1024;

// Without O_NONBLOCK, a FIFO that replaces the file between the check and the open would block us forever.
constexpr int kSafeFlags = O_CLOEXEC | O_NONBLOCK | O_NOCTTY;

// Returns up to the wanted number of bytes, 0 at the end, -1 with errno.
ssize_t readChunk(int file, std::span<std::byte> chunk) {
    ssize_t count = 0;
    do count = ::read(file, chunk.data(), chunk.size());
    while (count < 0 && errno == EINTR);
    return count;
}

Result<Data> readToTheEnd(const FileDescriptor& file, const std::string& path, std::size_t limit) {
    Data contents;
    std::array<std::byte, kChunk> chunk;
    while (true) {
        const ssize_t count = readChunk(file.get(), chunk);
        if (count < 0) return Error::posix(errno, path);
        if (count == 0) return contents;
        const auto bytes = static_cast<std::size_t>(count);
        if (bytes > limit - contents.size()) return Error::posix(EFBIG, path);
        foundation::append(contents, std::span(chunk).first(bytes));
    }
}

}  // namespace

void FileDescriptor::reset() noexcept {
    if (number_ >= 0) ::close(number_);
    number_ = -1;
}

int notRegularReason(mode_t mode) noexcept {
    if (S_ISREG(mode)) return 0;
    if (S_ISDIR(mode)) return EISDIR;
    return S_ISLNK(mode) ? ELOOP : EINVAL;
}

Result<RegularFile> openRegularFile(int directory, const std::string& name, int flags,
                                    const std::string& path, mode_t mode) {
    if (name.find('\0') != std::string::npos) return Error::posix(EINVAL, path);  // would name another file
    RegularFile file;
    const int ofLinks = (flags & O_NOFOLLOW) != 0 ? AT_SYMLINK_NOFOLLOW : 0;
    const bool exists = ::fstatat(directory, name.c_str(), &file.status, ofLinks) == 0;
    if (!exists && (errno != ENOENT || (flags & O_CREAT) == 0)) return Error::posix(errno, path);
    if (exists)
        if (const int reason = notRegularReason(file.status.st_mode)) return Error::posix(reason, path);

    int number = -1;
    do number = ::openat(directory, name.c_str(), flags | kSafeFlags, mode);
    while (number < 0 && errno == EINTR);
    file.descriptor = FileDescriptor(number);
    if (!file.descriptor || ::fstat(number, &file.status) != 0) return Error::posix(errno, path);
    if (const int reason = notRegularReason(file.status.st_mode)) return Error::posix(reason, path);
    return file;
}

Result<RegularFile> openRegularFile(const std::string& path, int flags, mode_t mode) {
    return openRegularFile(AT_FDCWD, path, flags, path, mode);
}

Result<Data> readSmallFile(const std::string& path, std::size_t limit) {
    const auto file = openRegularFile(path, O_RDONLY);
    if (!file) return file.error();
    return readToTheEnd(file->descriptor, path, limit);
}

Result<Data> readSmallFile(const FileDescriptor& file, const std::string& path, std::size_t limit) {
    struct stat status {};
    if (::fstat(file.get(), &status) != 0) return Error::posix(errno, path);
    if (const int reason = notRegularReason(status.st_mode)) return Error::posix(reason, path);
    return readToTheEnd(file, path, limit);
}

std::string whyUnreadable(const Error& error) {
    if (error.code() == EINVAL) return "it is not a regular file";
    return error.localizedFailureReason();
}

}  // namespace pinwell::foundation
