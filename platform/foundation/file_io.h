// Small whole-file reads for configuration, certificates and property lists.
#pragma once

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

/// The whole of a regular file of at most `limit` bytes. Follows symbolic links; refuses anything but a
/// regular file without blocking (EINVAL; EISDIR for a directory), and a longer file (EFBIG). Memory grows
/// with the bytes really read, never with the file's claims. The error is of kPOSIXErrorDomain and names the
/// path.
Result<Data> readSmallFile(const std::string& path, std::size_t limit);

/// The same for an open file, from its position on. Errors name it `path`.
Result<Data> readSmallFile(const FileDescriptor& file, const std::string& path, std::size_t limit);

/// Why readSmallFile() failed, for people: "it is not a regular file", or as the system calls it.
std::string whyUnreadable(const Error& error);

}  // namespace pinwell::foundation
