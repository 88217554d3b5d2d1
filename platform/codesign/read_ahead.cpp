#include "codesign/read_ahead.h"

#include <algorithm>
#include <system_error>

namespace pinwell::codesign {

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
