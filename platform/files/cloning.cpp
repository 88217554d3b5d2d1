#include "files/cloning.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <unistd.h>

namespace pinwell::files {
namespace {

// How much of the file is cloned to find out: enough to be a whole number of blocks on every file system,
// little enough to be quick on a file of many extents.
constexpr off_t kProbeLength = off_t{1024} * 1024;

// A file that has no name, or loses it at once: whatever happens then, nothing is left.
Result<OpenFile> createNamelessFile(const std::string& directory) {
    FileDescriptor descriptor(uninterrupted(
        [&] { return open(directory.c_str(), O_TMPFILE | O_RDWR | O_CLOEXEC, S_IRUSR | S_IWUSR); }));
    if (descriptor) return OpenFile{std::move(descriptor), directory, {}};
    // What a file system without O_TMPFILE answers (EISDIR where even the kernel has not heard of it).
    if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) return lastError(directory);

    auto file = createTemporaryFile(directory);
    if (!file) return file;
    if (unlink(file->path.c_str()) != 0) return lastError(file->path);
    return file;
}

// Whether the errno says "not this file, here", rather than that something went wrong.
bool meansNo(int reason) {
    switch (reason) {
        case EOPNOTSUPP:
        case ENOTTY:
        case ENOSYS:
        case EXDEV:
        case EINVAL:
        case EPERM:  // not allowed by a sandbox, or the file is sealed against it
        case ETXTBSY:
            return true;  // a swap file
        default:
            return false;
    }
}

}  // namespace

Result<bool> fileSupportsCloning(const std::string& path) {
    const auto file = openRegularFile(path, O_RDONLY);
    if (!file) return file.error();
    const auto probe = createNamelessFile(directoryOf(path));
    if (!probe) return probe.error();

    file_clone_range range{};
    range.src_fd = file->number();
    // 0 is "to the end", which alone need not be a whole number of blocks.
    range.src_length = file->status.st_size > kProbeLength ? static_cast<std::uint64_t>(kProbeLength) : 0;
    if (uninterrupted([&] { return ioctl(probe->number(), FICLONERANGE, &range); }) == 0) return true;
    if (meansNo(errno)) return false;
    return lastError(path);
}

bool cloneFile(const OpenFile& from, const OpenFile& to) {
    return uninterrupted([&] { return ioctl(to.number(), FICLONE, from.number()); }) == 0;
}

}  // namespace pinwell::files
