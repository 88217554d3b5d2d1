// Reads keys and passphrases into buffers that are wiped. No other memory gets the bytes.
#pragma once

#include <array>
#include <cstddef>
#include <span>
#include <string>

#include "foundation/error.h"
#include "foundation/file_io.h"

namespace pinwell::foundation {

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

}  // namespace pinwell::foundation
