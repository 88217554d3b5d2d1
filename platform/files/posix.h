// Wrappers of the system's file calls: they repeat interrupted calls, finish short ones, and never lose an
// errno. For this folder only.
#pragma once

#include <sys/stat.h>

#include <cerrno>
#include <string>
#include <utility>

#include "base/bytes.h"
#include "base/handle.h"
#include "base/places.h"
#include "files/file_manager.h"

namespace pinwell::files {

using base::Error;
using base::FileDescriptor;
using base::Place;
using base::Places;

/// Maximum number of bytes in one read or write.
inline constexpr std::size_t kPieceSize = std::size_t{256} * 1024;

/// The result of `call`, repeated while a signal interrupts it.
template <class Call>
auto uninterrupted(Call call) {
    for (;;) {
        const auto answer = call();
        if (answer != -1 || errno != EINTR) return answer;
    }
}

/// The error of the last call.
inline Error lastError(const std::string& path) {
    return Error::posix(errno, path);
}

/// An open regular file, its place, which errors name, and its status at opening.
struct OpenFile {
    FileDescriptor descriptor;
    Place place;
    struct stat status {};

    int number() const noexcept { return descriptor.get(); }
    const std::string& path() const noexcept { return place.path; }
};

/// The directory of a path's last component.
std::string directoryOf(const std::string& path);

/// Modes of a new file: for the owner alone, or for everybody as the umask allows.
inline constexpr mode_t kPrivateFile = S_IRUSR | S_IWUSR;
inline constexpr mode_t kOrdinaryFile = S_IRUSR | S_IWUSR | S_IRGRP | S_IWGRP | S_IROTH | S_IWOTH;

/// Like Place::openRegularFile().
Result<OpenFile> openRegularFile(const Place& place, int flags, mode_t mode = kPrivateFile);

/// Creates and opens a file for writing; `place` must not exist yet.
Result<OpenFile> createFile(const Place& place, mode_t mode = kPrivateFile);

/// Opens the directory itself, without following a link.
Result<FileDescriptor> openDirectory(const Place& place);

Result<void> writeAll(const OpenFile& file, ByteView bytes);

/// Returns when the file or directory of `descriptor` is on stable storage.
Result<void> flush(int descriptor, const std::string& path);

/// The same for an item's directory, and so for the name of a new item; succeeds if the file system does not
/// support it, or the directory is not readable.
Result<void> flushDirectoryOf(const Place& place);

/// Closes, and reports errors that the file system has delayed.
Result<void> closeReporting(OpenFile& file);

/// Unlinks an unfinished file, so that a failure leaves no partial file behind.
class HalfMadeFile {
  public:
    explicit HalfMadeFile(Place place) : place_(std::move(place)) {}
    ~HalfMadeFile();
    HalfMadeFile(const HalfMadeFile&) = delete;
    HalfMadeFile& operator=(const HalfMadeFile&) = delete;

    void keep() noexcept { kept_ = true; }

  private:
    Place place_;
    bool kept_ = false;
};

}  // namespace pinwell::files
