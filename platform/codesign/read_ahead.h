// Reads a source piece by piece on its own thread while the caller works on earlier pieces. Memory
// is fixed: kReadAheadPieces buffers of kReadAheadPieceSize bytes, for any size of the
// source.
#pragma once

#include <array>
#include <condition_variable>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <thread>

#include "codesign/byte_source.h"

namespace pinwell::codesign {

/// Large enough that passing pieces is cheap compared with reading them, small enough to stay in the
/// processor's caches between the two threads.
inline constexpr std::size_t kReadAheadPieceSize = 512 * 1024;
inline constexpr std::size_t kReadAheadPieces = 4;

/// For one thread, the caller's. It reads on that thread if the source fits into one piece, or if no other
/// thread can be started.
class ReadAhead {
  public:
    /// Reads the bytes of `source`, which must outlive this object, from the first to before `end`.
    ReadAhead(const ByteSource& source, std::uint64_t end);

    /// Stops reading; unused pieces are dropped.
    ~ReadAhead();
    ReadAhead(const ReadAhead&) = delete;
    ReadAhead& operator=(const ReadAhead&) = delete;

    /// The next piece, valid until the next call; an empty one at the end. Throws like ByteSource::read; then
    /// do not call it again.
    ByteView next();

  private:
    using Buffer = std::unique_ptr<std::byte[]>;

    std::span<std::byte> piece(std::uint64_t number) const;
    void read(std::uint64_t number) const;
    void run() noexcept;
    void waitUntilRead(std::uint64_t number);

    const ByteSource& source_;
    const std::uint64_t end_;
    const std::uint64_t count_;
    std::array<Buffer, kReadAheadPieces> buffers_;  // piece n is in n modulo their number
    std::uint64_t asked_ = 0;                       // pieces that the caller has requested

    std::mutex mutex_;
    std::condition_variable changed_;
    std::uint64_t read_ = 0;      // pieces that have been read
    std::uint64_t returned_ = 0;  // pieces that the caller has finished
    bool stopping_ = false;
    std::exception_ptr failure_;
    std::thread reader_;  // last: it uses all of the above
};

}  // namespace pinwell::codesign
