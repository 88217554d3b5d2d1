#include "posix.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <utility>

namespace pinwell::files {
std::string directoryOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

Result<OpenFile> openRegularFile(const Place& place, int flags, mode_t mode) {
    auto file = place.openRegularFile(flags, mode);
    if (!file) return file.error();
    return OpenFile{std::move(file->descriptor), place, file->status};
}

Result<OpenFile> createFile(const Place& place, mode_t mode) {
    auto descriptor = place.open(O_WRONLY | O_CREAT | O_EXCL, mode);
    if (!descriptor) return descriptor.error();
    HalfMadeFile halfMade(place);
    OpenFile file{*std::move(descriptor), place, {}};
    if (fstat(file.number(), &file.status) != 0) return lastError(file.path());
    halfMade.keep();
    return file;
}

Result<FileDescriptor> openDirectory(const Place& place) {
    return place.open(O_RDONLY | O_DIRECTORY);
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
