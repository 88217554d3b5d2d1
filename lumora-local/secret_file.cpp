#include "lumora-local/secret_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "foundation/error.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {

foundation::FileDescriptor openSecret(const std::string& path) {
    foundation::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    if (!file) failToReadSecret(path, errno);
    return file;
}

std::size_t readSecret(const foundation::FileDescriptor& file, const std::string& path,
                       std::span<std::byte> room) {
    std::size_t length = 0;
    while (length < room.size()) {
        const ssize_t count = ::read(file.get(), room.data() + length, room.size() - length);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) failToReadSecret(path, errno);
        if (count == 0) break;
        length += static_cast<std::size_t>(count);
    }
    return length;
}

void failToReadSecret(const std::string& path, int reason) {
    throw Failure(EX_NOINPUT, foundation::Error::posix(reason, path).localizedDescription());
}

}  // namespace pinwell::lumora
