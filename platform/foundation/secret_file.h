// Reading keys and passphrases into room that is wiped. No other place gets the bytes.
#pragma once

#include <array>
#include <cstddef>
#include <span>
#include <string>

#include "foundation/error.h"
#include "foundation/file_io.h"

namespace pinwell::foundation {

/// Overwrites the bytes; the compiler cannot leave it out.
void wipe(std::span<std::byte> bytes) noexcept;

/// Room that is wiped when it goes.
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

/// Reads to the end of the file or of the room, and returns how many bytes there were. The error is of
/// kPOSIXErrorDomain and names the path.
Result<std::size_t> readSecret(const FileDescriptor& file, const std::string& path,
                               std::span<std::byte> room);

/// The same of a whole file that is shorter than the room. A longer one is an error (EFBIG).
Result<std::size_t> readSecretFile(const std::string& path, std::span<std::byte> room);

}  // namespace pinwell::foundation
