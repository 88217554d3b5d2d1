// Random access to the bytes of an artefact, without loading all of them.
#pragma once

#include <array>
#include <condition_variable>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <span>
#include <string>
#include <thread>

#include "base/bytes.h"
#include "base/handle.h"
#include "base/places.h"
#include "codesign/code_signing.h"

namespace pinwell::codesign {

using base::ByteView;
using base::Data;
using base::SharedBytes;

/// The service's status for a file that cannot be found or opened, by the errno value.
Status statusOfLookup(std::int64_t reason);

/// Bytes with a size fixed at construction. A file may change afterwards; then a read beyond its end fails,
/// without other effects.
class ByteSource {
  public:
    virtual ~ByteSource() = default;

    virtual std::uint64_t size() const = 0;

    /// Exactly `length` bytes from `offset`. Throws CodeError: kInvalidSignature if the range is not
    /// within size(), kIOError if the bytes cannot be read. Callers first compare `length` with a named
    /// maximum.
    Data read(std::uint64_t offset, std::size_t length) const;

    /// The same for a length that the file itself claims: memory is taken only for non-zero bytes, not for
    /// holes. Throws CodeError (kIOError) also if there is no address space for it.
    SharedBytes readShared(std::uint64_t offset, std::uint64_t length) const;

    /// The same into the caller's buffer, which is filled completely.
    void read(std::uint64_t offset, std::span<std::byte> buffer) const;

    /// A hint that the caller will read all bytes, from the first to the last.
    virtual void expectSequentialReads() const {}

  protected:
    /// The first position from `offset` on that may have a non-zero byte; the size if there is none.
    virtual std::uint64_t nextData(std::uint64_t offset) const { return offset; }

    /// Fills `buffer` with the bytes at `offset`, as many as there are, and returns their number.
    virtual std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const = 0;

  private:
    void checkRange(std::uint64_t offset, std::uint64_t length) const;
    void readAll(std::uint64_t offset, std::span<std::byte> buffer) const;
};

/// A regular file, kept open: a later change of its path has no effect.
class FileSource final : public ByteSource {
  public:
    /// Never follows a link in the last component and never blocks on a pipe or device. Throws CodeError:
    /// kStaticCodeNotFound if there is no regular file, kIOError if it cannot be opened.
    FileSource(const base::Places& places, const std::string& path);

    std::uint64_t size() const override { return size_; }

    /// Makes the kernel read further ahead.
    void expectSequentialReads() const override;

  private:
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override;
    std::uint64_t nextData(std::uint64_t offset) const override;

    base::FileDescriptor file_;
    std::uint64_t size_ = 0;
};

/// Bytes in memory, which the source owns.
class MemorySource final : public ByteSource {
  public:
    explicit MemorySource(Data bytes) : bytes_(std::move(bytes)) {}

    std::uint64_t size() const override { return bytes_.size(); }

  private:
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override;

    Data bytes_;
};

// Reads a source piece by piece on its own thread while the caller works on earlier pieces. Memory
// is fixed: kReadAheadPieces buffers of kReadAheadPieceSize bytes, for any size of the
// source.

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
