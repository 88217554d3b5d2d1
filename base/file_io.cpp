#include "base/file_io.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

#include "base/text.h"

namespace pinwell::base {
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
        base::append(contents, std::span(chunk).first(bytes));
    }
}

constexpr std::size_t kLongestSafeName = 200;

}  // namespace

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

void wipe(std::span<std::byte> bytes) noexcept {
    ::explicit_bzero(bytes.data(), bytes.size());
}

Result<FileDescriptor> openSecret(const std::string& path) {
    FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    if (!file) return Error::posix(errno, path);
    return file;
}

Result<std::size_t> readSecret(const FileDescriptor& file, const std::string& path,
                               std::span<std::byte> room) {
    std::size_t length = 0;
    while (length < room.size()) {
        const ssize_t count = ::read(file.get(), room.data() + length, room.size() - length);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return Error::posix(errno, path);
        if (count == 0) break;
        length += static_cast<std::size_t>(count);
    }
    return length;
}

Result<std::size_t> readSecretFile(const std::string& path, std::span<std::byte> room) {
    const Result<FileDescriptor> file = openSecret(path);
    if (!file) return file.error();
    Result<std::size_t> length = readSecret(*file, path, room);
    if (length && *length == room.size()) return Error::posix(EFBIG, path);
    return length;
}

bool isSafeFileName(std::string_view identifier) {
    if (identifier.empty() || identifier.size() > kLongestSafeName) return false;
    if (identifier == "." || identifier == "..") return false;
    if (identifier.find('/') != std::string_view::npos) return false;
    while (!identifier.empty()) {
        const std::string_view character =
            identifier.substr(0, std::max<std::size_t>(utf8SequenceLength(identifier), 1));
        if (isControlCharacter(character)) return false;
        identifier.remove_prefix(character.size());
    }
    return true;
}

}  // namespace pinwell::base
