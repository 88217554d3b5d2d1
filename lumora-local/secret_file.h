// Reading keys and passphrases into room that their reader wipes. No other place gets the bytes.
#pragma once

#include <cstddef>
#include <span>
#include <string>

#include "foundation/file_io.h"

namespace pinwell::lumora {

/// Opens it without waiting for the other end of a pipe. Throws Failure (EX_NOINPUT) that names the path.
foundation::FileDescriptor openSecret(const std::string& path);

/// Reads to the end of the file or of the room, and returns how many bytes there were. Throws Failure
/// (EX_NOINPUT) that names the path.
std::size_t readSecret(const foundation::FileDescriptor& file, const std::string& path,
                       std::span<std::byte> room);

/// Throws the Failure (EX_NOINPUT) of a secret that cannot be read for this reason of errno(3).
[[noreturn]] void failToReadSecret(const std::string& path, int reason);

}  // namespace pinwell::lumora
