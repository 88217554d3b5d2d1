#include "codesign/byte_source.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <new>
#include <vector>

#include "codesign/code_error.h"

namespace pinwell::codesign {

Status statusOfLookup(std::int64_t reason) {
    switch (reason) {
        case ENOENT:
        case ENOTDIR:
        case ELOOP:  // a link, with O_NOFOLLOW
        case EXDEV:  // a link that leads out of the bundle
        case ENXIO:  // a socket, or a pipe without a writer
            return kStaticCodeNotFound;
        default:
            return kIOError;
    }
}

namespace {

/// Read at once: large enough for usual signatures.
constexpr std::uint64_t kPiece = 1024 * 1024;

foundation::SparseBuffer bufferFor(std::uint64_t length) {
    try {
        return foundation::SparseBuffer(length);
    } catch (const std::bad_alloc&) {
        throw CodeError(kIOError, "there is no room to hold the signature");
    }
}

foundation::FileDescriptor openToRead(const foundation::Places& places, const std::string& path) {
    const auto place = places.find(path);
    if (!place) throw CodeError(statusOfLookup(place.error().code()), "cannot open the file");
    auto file = place->open(O_RDONLY | O_NONBLOCK | O_NOCTTY);
    if (!file) throw CodeError(statusOfLookup(file.error().code()), "cannot open the file");
    return *std::move(file);
}

}  // namespace

Data ByteSource::read(std::uint64_t offset, std::size_t length) const {
    checkRange(offset, length);
    Data bytes(length);
    readAll(offset, bytes);
    return bytes;
}

SharedBytes ByteSource::readShared(std::uint64_t offset, std::uint64_t length) const {
    checkRange(offset, length);
    if (length <= kPiece) return read(offset, static_cast<std::size_t>(length));
    foundation::SparseBuffer buffer = bufferFor(length);
    std::vector<std::byte> piece(kPiece);
    for (std::uint64_t done = 0; done < length;) {
        done = std::min(std::max(nextData(offset + done), offset + done) - offset, length);
        const std::span<std::byte> part =
            std::span(piece).first(std::min<std::uint64_t>(kPiece, length - done));
        readAll(offset + done, part);
        buffer.put(done, part);
        done += part.size();
    }
    return buffer;
}

void ByteSource::read(std::uint64_t offset, std::span<std::byte> buffer) const {
    checkRange(offset, buffer.size());
    readAll(offset, buffer);
}

void ByteSource::checkRange(std::uint64_t offset, std::uint64_t length) const {
    if (offset > size() || length > size() - offset) refuse("a range reaches past the end of the file");
}

void ByteSource::readAll(std::uint64_t offset, std::span<std::byte> buffer) const {
    if (readAt(offset, buffer) != buffer.size()) throw CodeError(kIOError, "the file became shorter");
}

FileSource::FileSource(const foundation::Places& places, const std::string& path)
    : file_(openToRead(places, path)) {
    struct stat status = {};
    if (fstat(file_.get(), &status) != 0) throw CodeError(kIOError, "cannot examine the file");
    if (!S_ISREG(status.st_mode)) throw CodeError(kStaticCodeNotFound, "not a regular file");
    size_ = static_cast<std::uint64_t>(status.st_size);
}

void FileSource::expectSequentialReads() const {
    posix_fadvise(file_.get(), 0, 0, POSIX_FADV_SEQUENTIAL);
}

std::uint64_t FileSource::nextData(std::uint64_t offset) const {
    const off_t data = lseek(file_.get(), static_cast<off_t>(offset), SEEK_DATA);
    if (data >= 0) return static_cast<std::uint64_t>(data);
    return errno == ENXIO ? size_ : offset;  // a hole up to the end; or no support for holes
}

std::size_t FileSource::readAt(std::uint64_t offset, std::span<std::byte> buffer) const {
    std::size_t done = 0;
    while (done < buffer.size()) {
        const ssize_t count =
            pread(file_.get(), buffer.data() + done, buffer.size() - done, static_cast<off_t>(offset + done));
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) throw CodeError(kIOError, "cannot read the file");
        if (count == 0) break;
        done += static_cast<std::size_t>(count);
    }
    return done;
}

std::size_t MemorySource::readAt(std::uint64_t offset, std::span<std::byte> buffer) const {
    const ByteView rest = ByteView(bytes_).subspan(static_cast<std::size_t>(offset));
    const std::size_t count = std::min(rest.size(), buffer.size());
    std::copy_n(rest.begin(), count, buffer.begin());
    return count;
}

}  // namespace pinwell::codesign
