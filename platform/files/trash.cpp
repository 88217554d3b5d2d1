#include "files/trash.h"

#include <fcntl.h>
#include <gio/gio.h>
#include <unistd.h>

#include <climits>
#include <memory>

#include "files/posix.h"

namespace pinwell::files {
namespace {

struct ObjectRelease {
    void operator()(gpointer object) const noexcept { g_object_unref(object); }
};
struct ErrorRelease {
    void operator()(GError* error) const noexcept { g_error_free(error); }
};
using FilePointer = std::unique_ptr<GFile, ObjectRelease>;
using ErrorPointer = std::unique_ptr<GError, ErrorRelease>;

int errnoOf(const GError& error) {
    if (error.domain != G_IO_ERROR) return EIO;
    switch (error.code) {
        case G_IO_ERROR_NOT_FOUND:
            return ENOENT;
        case G_IO_ERROR_PERMISSION_DENIED:
            return EACCES;
        case G_IO_ERROR_READ_ONLY:
            return EROFS;
        case G_IO_ERROR_NO_SPACE:
            return ENOSPC;
        case G_IO_ERROR_FILENAME_TOO_LONG:
            return ENAMETOOLONG;
        case G_IO_ERROR_NOT_DIRECTORY:
            return ENOTDIR;
        case G_IO_ERROR_BUSY:
            return EBUSY;
        case G_IO_ERROR_NOT_SUPPORTED:
            return EOPNOTSUPP;
        default:
            return EIO;
    }
}

// Where the open item is now. The library does not tell where it put it; the kernel does, for any kind of
// trash.
Result<std::string> currentPath(int item, const std::string& path) {
    const std::string link = "/proc/self/fd/" + std::to_string(item);
    std::string target(PATH_MAX, '\0');
    const ssize_t length =
        uninterrupted([&] { return readlink(link.c_str(), target.data(), target.size()); });
    if (length < 0) return lastError(path);
    target.resize(static_cast<std::size_t>(length));
    return target;
}

}  // namespace

Result<std::string> moveToTrash(const std::string& path) {
    const FileDescriptor item(
        uninterrupted([&] { return open(path.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC); }));
    if (!item) return lastError(path);
    // Asked before as well: what could not be told afterwards is better not moved.
    if (const auto before = currentPath(item.get(), path); !before) return before.error();

    // The local file system's own objects; the default ones may come from a desktop's modules.
    const FilePointer file(g_vfs_get_file_for_path(g_vfs_get_local(), path.c_str()));
    GError* failure = nullptr;
    if (g_file_trash(file.get(), nullptr, &failure) == 0) {
        const ErrorPointer owned(failure);
        return Error::posix(errnoOf(*owned), path)
            .with(foundation::kUnderlyingErrorKey,
                  Error(g_quark_to_string(owned->domain), owned->code, owned->message));
    }
    return currentPath(item.get(), path);
}

}  // namespace pinwell::files
