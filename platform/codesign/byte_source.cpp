#include "codesign/byte_source.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <new>
#include <system_error>
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

base::SparseBuffer bufferFor(std::uint64_t length) {
    try {
        return base::SparseBuffer(length);
    } catch (const std::bad_alloc&) {
        throw CodeError(kIOError, "there is no room to hold the signature");
    }
}

base::FileDescriptor openToRead(const base::Places& places, const std::string& path) {
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
    base::SparseBuffer buffer = bufferFor(length);
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

FileSource::FileSource(const base::Places& places, const std::string& path)
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

ReadAhead::ReadAhead(const ByteSource& source, std::uint64_t end)
    : source_(source), end_(end), count_(end / kReadAheadPieceSize + (end % kReadAheadPieceSize != 0)) {
    for (std::uint64_t number = 0; number < std::min<std::uint64_t>(count_, kReadAheadPieces); ++number)
        buffers_[number] = std::make_unique_for_overwrite<std::byte[]>(kReadAheadPieceSize);
    source_.expectSequentialReads();
    if (count_ <= 1) return;
    try {
        reader_ = std::thread([this] { run(); });
    } catch (const std::system_error&) {
        // No more threads for this user or in this container: it is only slower.
    }
}

ReadAhead::~ReadAhead() {
    if (!reader_.joinable()) return;
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_one();
    reader_.join();
}

ByteView ReadAhead::next() {
    if (asked_ == count_) return {};
    const std::uint64_t number = asked_++;
    if (reader_.joinable())
        waitUntilRead(number);
    else
        read(number);
    return piece(number);
}

std::span<std::byte> ReadAhead::piece(std::uint64_t number) const {
    const std::uint64_t rest = end_ - number * kReadAheadPieceSize;
    const auto length = static_cast<std::size_t>(std::min<std::uint64_t>(rest, kReadAheadPieceSize));
    return {buffers_[number % kReadAheadPieces].get(), length};
}

void ReadAhead::read(std::uint64_t number) const {
    source_.read(number * kReadAheadPieceSize, piece(number));
}

// The caller has finished all pieces before this one.
void ReadAhead::waitUntilRead(std::uint64_t number) {
    std::unique_lock lock(mutex_);
    returned_ = number;
    changed_.notify_one();
    changed_.wait(lock, [&] { return read_ > number || failure_ != nullptr; });
    if (read_ <= number) std::rethrow_exception(failure_);
}

void ReadAhead::run() noexcept {
    for (std::uint64_t number = 0; number < count_; ++number) {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [&] { return stopping_ || number - returned_ < kReadAheadPieces; });
        if (stopping_) return;
        lock.unlock();

        std::exception_ptr failure;
        try {
            read(number);
        } catch (...) {
            failure = std::current_exception();
        }

        lock.lock();
        if (failure == nullptr) ++read_;
        failure_ = failure;
        changed_.notify_one();
        if (failure != nullptr) return;
    }
}

}  // namespace pinwell::codesign
