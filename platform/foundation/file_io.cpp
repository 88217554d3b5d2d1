#include "foundation/file_io.h"
#include "foundation/bytes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <span>

namespace pinwell::foundation {
namespace {

constexpr std::size_t kChunk = 16 * 1024;

// 0 for a regular file, otherwise the errno value of the refusal.
int refusal(const struct stat& status) {
    if (S_ISREG(status.st_mode)) return 0;
    return S_ISDIR(status.st_mode) ? EISDIR : EINVAL;
}

// Returns up to the wanted number of bytes, 0 at the end, -1 with errno.
ssize_t readChunk(int file, std::span<std::byte> chunk) {
    ssize_t count = 0;
    do count = ::read(file, chunk.data(), chunk.size());
    while (count < 0 && errno == EINTR);
    return count;
}

}  // namespace

void FileDescriptor::reset() noexcept {
    if (number_ >= 0) ::close(number_);
    number_ = -1;
}

Result<Data> readSmallFile(const std::string& path, std::size_t limit) {
    if (path.find('\0') != std::string::npos) return Error::posix(EINVAL, path);
    // Checked before opening, because opening alone can have an effect on a device. Checked again afterwards,
    // because the name may lead elsewhere by then. O_NONBLOCK prevents blocking on a FIFO that appears in
    // between.
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) return Error::posix(errno, path);
    if (const int reason = refusal(status)) return Error::posix(reason, path);
    const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
    if (!file) return Error::posix(errno, path);
    return readSmallFile(file, path, limit);
}

Result<Data> readSmallFile(const FileDescriptor& file, const std::string& path, std::size_t limit) {
    struct stat status {};
    if (::fstat(file.get(), &status) != 0) return Error::posix(errno, path);
    if (const int reason = refusal(status)) return Error::posix(reason, path);

    Data contents;
    std::array<std::byte, kChunk> chunk;
    while (true) {
        const ssize_t count = readChunk(file.get(), chunk);
        if (count < 0) return Error::posix(errno, path);
        if (count == 0) return contents;
        const auto bytes = static_cast<std::size_t>(count);
        if (bytes > limit - contents.size()) return Error::posix(EFBIG, path);
        append(contents, std::span(chunk).first(bytes));
    }
}

std::string whyUnreadable(const Error& error) {
    if (error.code() == EINVAL) return "it is not a regular file";
    return error.localizedFailureReason();
}

}  // namespace pinwell::foundation
