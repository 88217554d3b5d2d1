#include "files/posix.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <utility>

namespace pinwell::files {
namespace {

// Without O_NONBLOCK, a FIFO that takes the file's place between the look and the open would block us for
// good.
constexpr int kSafeFlags = O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;

Result<OpenFile> regularFile(FileDescriptor descriptor, const std::string& path) {
    OpenFile file{std::move(descriptor), path, {}};
    if (fstat(file.number(), &file.status) != 0) return lastError(path);
    if (const int reason = notRegularReason(file.status.st_mode); reason != 0)
        return Error::posix(reason, path);
    return file;
}

}  // namespace

std::string directoryOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

Result<struct stat> statusOfItem(const std::string& path) {
    struct stat status {};
    if (uninterrupted([&] { return lstat(path.c_str(), &status); }) != 0) return lastError(path);
    return status;
}

int notRegularReason(mode_t mode) {
    if (S_ISREG(mode)) return 0;
    if (S_ISDIR(mode)) return EISDIR;
    return S_ISLNK(mode) ? ELOOP : EINVAL;
}

Result<OpenFile> openRegularFile(const std::string& path, int access) {
    // Opening alone can set a device to work, so the look comes first.
    const auto before = statusOfItem(path);
    if (!before) return before.error();
    if (const int reason = notRegularReason(before->st_mode); reason != 0) return Error::posix(reason, path);

    FileDescriptor descriptor(uninterrupted([&] { return open(path.c_str(), access | kSafeFlags); }));
    if (!descriptor) return lastError(path);
    return regularFile(std::move(descriptor), path);
}

Result<OpenFile> createFile(const std::string& path, mode_t mode) {
    FileDescriptor descriptor(
        uninterrupted([&] { return open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | kSafeFlags, mode); }));
    if (!descriptor) return lastError(path);
    HalfMadeFile halfMade(path);
    auto file = regularFile(std::move(descriptor), path);
    if (file) halfMade.keep();
    return file;
}

Result<OpenFile> createTemporaryFile(const std::string& directory) {
    std::string path;
    FileDescriptor descriptor(uninterrupted([&] {
        path = directory + "/.pinwell-XXXXXX";  // anew each time: a failure, too, uses the pattern up
        return mkostemp(path.data(), O_CLOEXEC);
    }));
    if (!descriptor) return lastError(directory);
    HalfMadeFile halfMade(path);
    auto file = regularFile(std::move(descriptor), path);
    if (file) halfMade.keep();
    return file;
}

Result<FileDescriptor> openDirectory(const std::string& path, LastLink link) {
    const int flags = O_RDONLY | O_DIRECTORY | O_CLOEXEC | (link == LastLink::refused ? O_NOFOLLOW : 0);
    FileDescriptor descriptor(uninterrupted([&] { return open(path.c_str(), flags); }));
    if (!descriptor) return lastError(path);
    return descriptor;
}

Result<void> writeAll(const OpenFile& file, ByteView bytes) {
    while (!bytes.empty()) {
        const auto piece = bytes.first(std::min(bytes.size(), kPieceSize));
        const ssize_t count =
            uninterrupted([&] { return ::write(file.number(), piece.data(), piece.size()); });
        if (count < 0) return lastError(file.path);
        bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return {};
}

Result<Data> readUpTo(const OpenFile& file, std::uint64_t length) {
    auto data = readPieces(
        length, [&](std::byte* into, std::size_t size) { return ::read(file.number(), into, size); });
    if (!data) return lastError(file.path);
    return *std::move(data);
}

Result<void> flush(int descriptor, const std::string& path) {
    if (uninterrupted([&] { return fsync(descriptor); }) != 0) return lastError(path);
    return {};
}

Result<void> flushDirectoryOf(const std::string& path) {
    const std::string directoryPath = directoryOf(path);
    const auto directory = openDirectory(directoryPath, LastLink::followed);
    if (!directory) {
        // One may write to a directory that one may not read.
        if (directory.error().code() == EACCES) return {};
        return directory.error();
    }
    auto done = flush(directory->get(), directoryPath);
    // EINVAL: a file system (of shared folders, say) that cannot flush directories, fsync(2).
    if (!done && done.error().code() == EINVAL) return {};
    return done;
}

Result<void> closeReporting(OpenFile& file) {
    // Never again after EINTR: on Linux the number is free by then, and may be another thread's new file.
    if (::close(file.descriptor.release()) != 0 && errno != EINTR) return lastError(file.path);
    return {};
}

HalfMadeFile::~HalfMadeFile() {
    if (kept_) return;
    const int reason = errno;
    unlink(path_.c_str());
    errno = reason;
}

}  // namespace pinwell::files
