#include "base/byte_source.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <limits>
#include <new>
#include <system_error>
#include <utility>

namespace pinwell::base {
namespace {

using Kind = ReadFailure::Kind;

constexpr std::uint64_t kLastPosition = std::numeric_limits<off_t>::max();

[[noreturn]] void failToRead(const std::string& attempt, std::uint64_t offset, int number) {
    const std::string reason = Error::posix(number).localizedFailureReason();
    throw ReadFailure(Kind::unreadable, attempt.empty() ? "cannot read the file" : attempt + ": " + reason,
                      offset, number);
}

void requireWithin(const ByteSource& source, std::uint64_t offset, std::uint64_t length) {
    const std::uint64_t size = source.size();
    if (offset > size || length > size - offset)
        throw ReadFailure(Kind::pastEnd, "a range reaches past the end of the file", offset);
}

void requireWhole(std::uint64_t offset, std::uint64_t had, std::uint64_t length) {
    if (had != length) throw ReadFailure(Kind::cutShort, "the file became shorter", offset);
}

}  // namespace

SparseBuffer makeBuffer(std::uint64_t length) {
    try {
        return SparseBuffer(length);
    } catch (const std::bad_alloc&) {
        throw ReadFailure(Kind::noRoom, "Cannot hold " + std::to_string(length) + " bytes");
    }
}

Data ByteSource::read(std::uint64_t offset, std::size_t length) const {
    requireWithin(*this, offset, length);
    Data bytes(length);
    requireWhole(offset, readAt(offset, bytes), length);
    return bytes;
}

void ByteSource::read(std::uint64_t offset, std::span<std::byte> buffer) const {
    requireWithin(*this, offset, buffer.size());
    requireWhole(offset, readAt(offset, buffer), buffer.size());
}

SharedBytes ByteSource::readShared(std::uint64_t offset, std::uint64_t length) const {
    requireWithin(*this, offset, length);
    SharedBytes bytes = readSharedUpTo(offset, length);
    requireWhole(offset, bytes.size(), length);
    return bytes;
}

Data ByteSource::readUpTo(std::uint64_t offset, std::uint64_t length) const {
    Data bytes;
    while (bytes.size() < length) {
        const std::size_t had = bytes.size();
        const auto wanted = static_cast<std::size_t>(std::min(length - had, kReadAtOnce));
        bytes.resize(had + wanted);
        const std::size_t count = readAt(offset + had, std::span(bytes).subspan(had));
        bytes.resize(had + count);
        if (count < wanted) break;
    }
    return bytes;
}

SharedBytes ByteSource::readSharedUpTo(std::uint64_t offset, std::uint64_t length) const {
    if (length <= kReadAtOnce) return readUpTo(offset, length);
    SparseBuffer buffer = makeBuffer(length);
    Data piece(kReadAtOnce);
    for (std::uint64_t done = 0; done < length;) {
        done = std::min(std::max(nextData(offset + done), offset + done) - offset, length);
        const auto wanted = static_cast<std::size_t>(std::min(length - done, kReadAtOnce));
        const std::size_t count = readAt(offset + done, std::span(piece).first(wanted));
        buffer.put(done, ByteView(piece).first(count));
        done += count;
        if (count < wanted) {
            const SharedBytes whole = std::move(buffer);
            return whole.share(whole.view().first(done));
        }
    }
    return buffer;
}

std::size_t readAt(int descriptor, std::uint64_t offset, std::span<std::byte> buffer,
                   const std::string& attempt) {
    std::size_t done = 0;
    while (done < buffer.size()) {
        const std::uint64_t from = offset + done;
        if (from > kLastPosition) failToRead(attempt, from, EOVERFLOW);
        const ssize_t count =
            ::pread(descriptor, buffer.data() + done, buffer.size() - done, static_cast<off_t>(from));
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) failToRead(attempt, from, errno);
        if (count == 0) break;
        done += static_cast<std::size_t>(count);
    }
    return done;
}

std::uint64_t nextData(int descriptor, std::uint64_t offset) {
    if (offset > kLastPosition) return offset;
    const off_t data = ::lseek(descriptor, static_cast<off_t>(offset), SEEK_DATA);
    if (data >= 0) return static_cast<std::uint64_t>(data);
    struct stat status {};
    // ENXIO: a hole up to the end, or the end itself. All others: no support for holes.
    if (errno != ENXIO || ::fstat(descriptor, &status) != 0) return offset;
    return std::max(offset, static_cast<std::uint64_t>(status.st_size));
}

FileSource::FileSource(int descriptor, const struct stat& status, std::string attempt)
    : descriptor_(descriptor),
      size_(static_cast<std::uint64_t>(status.st_size)),
      hasExecuteBit_((status.st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)) != 0),
      attempt_(std::move(attempt)) {}

FileSource::FileSource(RegularFile file, std::string attempt)
    : FileSource(file.descriptor.get(), file.status, std::move(attempt)) {
    owned_ = std::move(file.descriptor);
}

Result<FileSource> FileSource::open(const Places& places, const std::string& path) {
    if (path.find('\0') != std::string::npos) return Error::posix(EINVAL, path);
    const auto place = places.find(path);
    if (!place) return place.error();
    auto file = place->openRegularFile(O_RDONLY);
    if (!file) return file.error();
    return FileSource(*std::move(file));
}

Result<FileSource> FileSource::borrow(int descriptor) {
    const int flags = ::fcntl(descriptor, F_GETFL);
    if (flags < 0) return Error::posix(errno);
    if ((flags & O_ACCMODE) == O_WRONLY || (flags & O_PATH) != 0) return Error::posix(EBADF);
    struct stat status {};
    if (::fstat(descriptor, &status) != 0) return Error::posix(errno);
    if (const int reason = notRegularReason(status.st_mode)) return Error::posix(reason);
    return FileSource(descriptor, status, {});
}

std::size_t FileSource::readAt(std::uint64_t offset, std::span<std::byte> buffer) const {
    return base::readAt(descriptor_, offset, buffer, attempt_);
}

// The search for data would move a borrowed descriptor.
std::uint64_t FileSource::nextData(std::uint64_t offset) const {
    return owned_ ? base::nextData(descriptor_, offset) : offset;
}

void FileSource::expectSequentialReads() const {
    ::posix_fadvise(descriptor_, 0, 0, POSIX_FADV_SEQUENTIAL);
}

std::size_t MemorySource::readAt(std::uint64_t offset, std::span<std::byte> buffer) const {
    const ByteView all(bytes_);
    const ByteView rest = all.subspan(static_cast<std::size_t>(std::min<std::uint64_t>(offset, all.size())));
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

}  // namespace pinwell::base
