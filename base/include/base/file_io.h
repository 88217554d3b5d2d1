// Regular files, opened safely; files that are read whole: configuration, certificates, property lists, keys
// and passphrases; and safe names of files.
#pragma once

#include <sys/stat.h>

#include <array>
#include <cstddef>
#include <span>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "base/error.h"
#include "base/handle.h"

namespace pinwell::base {

/// An open regular file, and its status when it was opened.
struct RegularFile {
    FileDescriptor descriptor;
    struct stat status {};
};

/// The errno value for an item of this type instead of a regular file: EISDIR for a directory, ELOOP for a
/// symbolic link, EINVAL for any other; 0 for a regular file.
int notRegularReason(mode_t mode) noexcept;

/// Opens the regular file `name` in `directory` (as openat(2) does), close-on-exec. Refuses anything else
/// with notRegularReason(), and never blocks on it. Checks the type before opening, because opening alone can
/// have an effect on a device. Checks it again afterwards, because the name may lead elsewhere by then.
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

/// Overwrites the bytes; the compiler cannot remove the call.
void wipe(std::span<std::byte> bytes) noexcept;

/// A buffer that is wiped when it is destroyed.
template <std::size_t count>
class WipedRoom {
  public:
    WipedRoom() = default;
    ~WipedRoom() { wipe(bytes_); }
    WipedRoom(const WipedRoom&) = delete;
    WipedRoom& operator=(const WipedRoom&) = delete;

    std::span<std::byte> bytes() noexcept { return bytes_; }

  private:
    std::array<std::byte, count> bytes_{};
};

/// Opens it without waiting for the other end of a pipe. The error is of kPOSIXErrorDomain and names the
/// path.
Result<FileDescriptor> openSecret(const std::string& path);

/// Reads to the end of the file or of the buffer, and returns the number of bytes. The error is of
/// kPOSIXErrorDomain and names the path.
Result<std::size_t> readSecret(const FileDescriptor& file, const std::string& path,
                               std::span<std::byte> room);

/// The same for a whole file that is shorter than the buffer. A longer file is an error (EFBIG).
Result<std::size_t> readSecretFile(const std::string& path, std::span<std::byte> room);

/// Whether `identifier` can be one file name here: not empty, at most 200 bytes, not "." or "..", without a
/// slash or a control character. Text from a server must pass before it becomes part of a path.
bool isSafeFileName(std::string_view identifier);

}  // namespace pinwell::base
