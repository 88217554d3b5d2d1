#include "files/posix.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <system_error>
#include <utility>

namespace pinwell::files {
namespace {

// Without O_NONBLOCK, a FIFO that replaces the file between the check and the open would block us
// forever.
constexpr int kSafeFlags = O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;

Result<OpenFile> regularFile(FileDescriptor descriptor, Place place) {
    OpenFile file{std::move(descriptor), std::move(place), {}};
    if (fstat(file.number(), &file.status) != 0) return lastError(file.path());
    if (const int reason = notRegularReason(file.status.st_mode); reason != 0)
        return Error::posix(reason, file.path());
    return file;
}

}  // namespace

std::string directoryOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

Result<struct stat> statusOfItem(const Place& place) {
    struct stat status {};
    const int done = uninterrupted(
        [&] { return fstatat(place.directory(), place.name.c_str(), &status, AT_SYMLINK_NOFOLLOW); });
    if (done != 0) return lastError(place.path);
    return status;
}

int notRegularReason(mode_t mode) {
    if (S_ISREG(mode)) return 0;
    if (S_ISDIR(mode)) return EISDIR;
    return S_ISLNK(mode) ? ELOOP : EINVAL;
}

Result<OpenFile> openRegularFile(const Place& place, int access) {
    // Opening alone can start a device, so the check comes first.
    const auto before = statusOfItem(place);
    if (!before) return before.error();
    if (const int reason = notRegularReason(before->st_mode); reason != 0)
        return Error::posix(reason, place.path);

    FileDescriptor descriptor(
        uninterrupted([&] { return openat(place.directory(), place.name.c_str(), access | kSafeFlags); }));
    if (!descriptor) return lastError(place.path);
    return regularFile(std::move(descriptor), place);
}

Result<OpenFile> createFile(const Place& place, mode_t mode) {
    constexpr int kFlags = O_WRONLY | O_CREAT | O_EXCL | kSafeFlags;
    FileDescriptor descriptor(
        uninterrupted([&] { return openat(place.directory(), place.name.c_str(), kFlags, mode); }));
    if (!descriptor) return lastError(place.path);
    HalfMadeFile halfMade(place);
    auto file = regularFile(std::move(descriptor), place);
    if (file) halfMade.keep();
    return file;
}

Result<OpenFile> createTemporaryFileBeside(const Place& place) {
    constexpr int kFlags = O_RDWR | O_CREAT | O_EXCL | kSafeFlags;
    Place temporary{place.parent, {}, {}};
    FileDescriptor descriptor(underFreshName(".pinwell-", temporary.name, [&](const char* name) {
        return openat(place.directory(), name, kFlags, kPrivateFile);
    }));
    const std::string directory = directoryOf(place.path);
    if (!descriptor) return lastError(directory);
    temporary.path = directory + "/" + temporary.name;
    HalfMadeFile halfMade(temporary);
    auto file = regularFile(std::move(descriptor), std::move(temporary));
    if (file) halfMade.keep();
    return file;
}

std::string freshName(std::string_view prefix) {
    constexpr std::string_view kLetters = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789";
    std::array<unsigned char, kRandomLetters> random{};
    if (getentropy(random.data(), random.size()) != 0)
        throw std::system_error(errno, std::generic_category(), "getentropy");
    std::string name(prefix);
    // The distribution is not uniform and need not be: the name must be hard to guess, not secret.
    for (const unsigned char byte : random) name += kLetters[byte % kLetters.size()];
    return name;
}

Result<FileDescriptor> openDirectory(const Place& place) {
    constexpr int kFlags = O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NOFOLLOW;
    FileDescriptor descriptor(
        uninterrupted([&] { return openat(place.directory(), place.name.c_str(), kFlags); }));
    if (!descriptor) return lastError(place.path);
    return descriptor;
}

Result<void> renameItem(const Place& from, const Place& to) {
    const int done = uninterrupted(
        [&] { return renameat(from.directory(), from.name.c_str(), to.directory(), to.name.c_str()); });
    if (done != 0) return lastError(to.path);
    return {};
}

Result<void> writeAll(const OpenFile& file, ByteView bytes) {
    while (!bytes.empty()) {
        const auto piece = bytes.first(std::min(bytes.size(), kPieceSize));
        const ssize_t count =
            uninterrupted([&] { return ::write(file.number(), piece.data(), piece.size()); });
        if (count < 0) return lastError(file.path());
        bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return {};
}

Result<Data> readUpTo(const OpenFile& file, std::uint64_t length) {
    auto data = readPieces(
        length, [&](std::byte* into, std::size_t size) { return ::read(file.number(), into, size); });
    if (!data) return lastError(file.path());
    return *std::move(data);
}

Result<void> flush(int descriptor, const std::string& path) {
    if (uninterrupted([&] { return fsync(descriptor); }) != 0) return lastError(path);
    return {};
}

Result<void> flushDirectoryOf(const Place& place) {
    const Place parent{place.parent, ".", directoryOf(place.path)};
    const auto directory = openDirectory(parent);
    if (!directory) {
        // A directory may be writable but not readable.
        if (directory.error().code() == EACCES) return {};
        return directory.error();
    }
    auto done = flush(directory->get(), parent.path);
    // EINVAL: a file system that cannot flush directories, for example of shared folders; see fsync(2).
    if (!done && done.error().code() == EINVAL) return {};
    return done;
}

Result<void> closeReporting(OpenFile& file) {
    // Never repeated after EINTR: on Linux the number is free then, and may be another thread's new file.
    if (::close(file.descriptor.release()) != 0 && errno != EINTR) return lastError(file.path());
    return {};
}

HalfMadeFile::~HalfMadeFile() {
    if (kept_) return;
    const int reason = errno;
    unlinkat(place_.directory(), place_.name.c_str(), 0);
    errno = reason;
}

}  // namespace pinwell::files
