// The user's trash, as the freedesktop.org trash specification 1.0 describes it.
#include <fcntl.h>
#include <gio/gio.h>
#include <unistd.h>

#include <climits>
#include <memory>

#include "operations.h"
#include "runtime/process.h"
#include "values/value.h"

namespace pinwell::files {
namespace {

// The library's functions, found on first use.
struct Gio {
    Gio() {
        runtime::LazyLibrary library("libgio-2.0.so.0");
        library.find(vfsGetLocal, "g_vfs_get_local");
        library.find(vfsGetFileForPath, "g_vfs_get_file_for_path");
        library.find(fileTrash, "g_file_trash");
        library.find(objectUnref, "g_object_unref");
        library.find(errorFree, "g_error_free");
        library.find(quarkToString, "g_quark_to_string");
        library.find(ioErrorQuark, "g_io_error_quark");
        isThere = library.isComplete();
    }

    decltype(g_vfs_get_local)* vfsGetLocal = nullptr;
    decltype(g_vfs_get_file_for_path)* vfsGetFileForPath = nullptr;
    decltype(g_file_trash)* fileTrash = nullptr;
    decltype(g_object_unref)* objectUnref = nullptr;
    decltype(g_error_free)* errorFree = nullptr;
    decltype(g_quark_to_string)* quarkToString = nullptr;
    decltype(g_io_error_quark)* ioErrorQuark = nullptr;
    bool isThere = false;
};

const Gio& gio() {
    static const Gio functions;
    return functions;
}

struct ObjectRelease {
    void operator()(gpointer object) const noexcept { gio().objectUnref(object); }
};
struct ErrorRelease {
    void operator()(GError* error) const noexcept { gio().errorFree(error); }
};
using FilePointer = std::unique_ptr<GFile, ObjectRelease>;
using ErrorPointer = std::unique_ptr<GError, ErrorRelease>;

int errnoOf(const GError& error) {
    if (error.domain != gio().ioErrorQuark()) return EIO;
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

// The current path of the open item. The library does not return the new place; the kernel knows it, for any
// kind of trash.
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

Result<std::string> moveToTrash(const Place& place) {
    const std::string& path = place.path;
    const auto item = place.open(O_PATH);
    if (!item) return item.error();
    // Read before the move as well: if the place cannot be found afterwards, it is better not to move. Also,
    // the library removes ".." from the text of a path, which is wrong after a link; the kernel's path has no
    // "..".
    const auto before = currentPath(item->get(), path);
    if (!before) return before.error();

    if (!gio().isThere) return Error::posix(ENOSYS, path);
    // The local file system's objects; the default ones may come from a desktop's modules.
    const FilePointer file(gio().vfsGetFileForPath(gio().vfsGetLocal(), before->c_str()));
    GError* failure = nullptr;
    if (gio().fileTrash(file.get(), nullptr, &failure) == 0) {
        const ErrorPointer owned(failure);
        return Error::posix(errnoOf(*owned), path)
            .causedBy(Error(gio().quarkToString(owned->domain), owned->code, owned->message));
    }
    return currentPath(item->get(), path);
}

}  // namespace pinwell::files
