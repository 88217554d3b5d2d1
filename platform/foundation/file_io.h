// Opens regular files safely, and reads small ones whole: configuration, certificates, property lists.
#pragma once

#include <sys/stat.h>

#include <string>
#include <utility>

#include "foundation/bytes.h"
#include "foundation/error.h"

namespace pinwell::foundation {

/// Owns a file descriptor; -1 is none.
class FileDescriptor {
  public:
    FileDescriptor() = default;
    explicit FileDescriptor(int number) noexcept : number_(number) {}
    FileDescriptor(FileDescriptor&& other) noexcept : number_(std::exchange(other.number_, -1)) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        if (this != &other) {
            reset();
            number_ = std::exchange(other.number_, -1);
        }
        return *this;
    }
    ~FileDescriptor() { reset(); }

    int get() const noexcept { return number_; }
    explicit operator bool() const noexcept { return number_ >= 0; }
    int release() noexcept { return std::exchange(number_, -1); }
    void reset() noexcept;

  private:
    int number_ = -1;
};

/// An open regular file, and its status when it was opened.
struct RegularFile {
    FileDescriptor descriptor;
    struct stat status {};
};

/// The errno value for an item of this type instead of a regular file: EISDIR for a directory, ELOOP for a
/// symbolic link, EINVAL for any other; 0 for a regular file.
int notRegularReason(mode_t mode) noexcept;

/// Opens the regular file `name` in `directory` (as openat(2) does), close-on-exec. Refuses anything else with
/// notRegularReason(), and never blocks on it. Checks the type before opening, because opening alone can have
/// an effect on a device. Checks it again afterwards, because the name may lead elsewhere by then.
///
/// `flags` and `mode` are those of open(2). O_NOFOLLOW refuses a symbolic link in the last component. With
/// O_CREAT a missing file is made. The error is of kPOSIXErrorDomain and names `path`.
Result<RegularFile> openRegularFile(int directory, const std::string& name, int flags,
                                    const std::string& path, mode_t mode = 0);

/// The same for a path of its own.
Result<RegularFile> openRegularFile(const std::string& path, int flags, mode_t mode = 0);

/// The whole of a regular file of at most `limit` bytes. Follows symbolic links; refuses anything but a
/// regular file as above, and a longer file (EFBIG). Memory grows with the bytes really read, never with the
/// file's claims. The error is of kPOSIXErrorDomain and names the path.
Result<Data> readSmallFile(const std::string& path, std::size_t limit);

/// The same for an open file, from its position on. Errors name it `path`.
Result<Data> readSmallFile(const FileDescriptor& file, const std::string& path, std::size_t limit);

/// Why readSmallFile() failed, for people: "it is not a regular file", or as the system calls it.
std::string whyUnreadable(const Error& error);

}  // namespace pinwell::foundation
