#include "foundation/secret_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace pinwell::foundation {

void wipe(std::span<std::byte> bytes) noexcept {
    ::explicit_bzero(bytes.data(), bytes.size());
}

Result<FileDescriptor> openSecret(const std::string& path) {
    FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    if (!file) return Error::posix(errno, path);
    return file;
}

Result<std::size_t> readSecret(const FileDescriptor& file, const std::string& path,
                               std::span<std::byte> room) {
    std::size_t length = 0;
    while (length < room.size()) {
        const ssize_t count = ::read(file.get(), room.data() + length, room.size() - length);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return Error::posix(errno, path);
        if (count == 0) break;
        length += static_cast<std::size_t>(count);
    }
    return length;
}

Result<std::size_t> readSecretFile(const std::string& path, std::span<std::byte> room) {
    const Result<FileDescriptor> file = openSecret(path);
    if (!file) return file.error();
    const Result<std::size_t> length = readSecret(*file, path, room);
    if (length && *length == room.size()) return Error::posix(EFBIG, path);
    return length;
}

}  // namespace pinwell::foundation
