// Positional reading of an artefact's bytes, without loading all of them: from an open file or from memory.
//
// read() is for lengths that the caller has compared with a named maximum. Lengths that only a file claims
// are for readShared(): a range above kReadAtOnce takes memory only for non-zero bytes.
#pragma once

#include <array>
#include <condition_variable>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <span>
#include <stdexcept>
#include <string>
#include <thread>

#include "base/bytes.h"
#include "base/error.h"
#include "base/file_io.h"
#include "base/handle.h"
#include "base/places.h"

namespace pinwell::base {

/// A failed operation on an open file. `what()` is the reason text: what was attempted, and the system's
/// reason.
class FileFailure : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

/// A failed read.
class ReadFailure : public FileFailure {
  public:
    enum class Kind {
        pastEnd,     // the range is not within the source
        cutShort,    // the file became shorter
        unreadable,  // the system cannot read the bytes; number() is its reason
        noRoom,      // there is no address space for the bytes
    };

    ReadFailure(Kind kind, const std::string& text, std::uint64_t offset = 0, int number = 0)
        : FileFailure(text), kind_(kind), offset_(offset), number_(number) {}

    Kind kind() const noexcept { return kind_; }

    /// The start of the range, in the source.
    std::uint64_t offset() const noexcept { return offset_; }

    /// The errno value; 0 for all kinds but unreadable.
    int number() const noexcept { return number_; }

  private:
    Kind kind_;
    std::uint64_t offset_;
    int number_;
};

/// A buffer of that length. Throws ReadFailure (noRoom).
SparseBuffer makeBuffer(std::uint64_t length);

/// Longest piece that is read at once: large enough for usual signatures and tickets.
inline constexpr std::uint64_t kReadAtOnce = std::uint64_t{1024} * 1024;

/// Bytes with a size fixed at construction. A file may change afterwards; then a read beyond its end fails or
/// is short, without other effects.
class ByteSource {
  public:
    virtual ~ByteSource() = default;

    /// Throws ReadFailure (unreadable) if the size cannot be found out.
    virtual std::uint64_t size() const = 0;

    /// Exactly `length` bytes from `offset`. Throws ReadFailure: pastEnd if the range is not within size(),
    /// cutShort, unreadable. Callers first compare `length` with a named maximum.
    Data read(std::uint64_t offset, std::size_t length) const;

    /// The same into the caller's buffer, which is filled completely.
    void read(std::uint64_t offset, std::span<std::byte> buffer) const;

    /// The same for a length that the file itself claims: memory is taken only for non-zero bytes, not for
    /// holes. Throws ReadFailure (noRoom) also if there is no address space for it.
    SharedBytes readShared(std::uint64_t offset, std::uint64_t length) const;

    /// Up to `length` bytes from `offset`; fewer only at the end. Memory grows with the bytes really read.
    /// Throws ReadFailure (unreadable).
    Data readUpTo(std::uint64_t offset, std::uint64_t length) const;

    /// The same for a length that the file itself claims. Throws ReadFailure (unreadable, noRoom).
    SharedBytes readSharedUpTo(std::uint64_t offset, std::uint64_t length) const;

    /// Fills `buffer` with the bytes at `offset`, as many as there are, and returns their number. Throws
    /// ReadFailure (unreadable).
    virtual std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const = 0;

    /// The first position from `offset` on that may have a non-zero byte: in a sparse file the end of a hole;
    /// the size if there is none.
    virtual std::uint64_t nextData(std::uint64_t offset) const { return offset; }

    /// A hint that the caller will read all bytes, from the first to the last.
    virtual void expectSequentialReads() const {}
};

/// The bytes at `offset` of an open descriptor, as ByteSource::readAt(). The descriptor's own position is
/// neither used nor moved. The reason text of a failure is `attempt`, a colon and the system's reason.
std::size_t readAt(int descriptor, std::uint64_t offset, std::span<std::byte> buffer,
                   const std::string& attempt);

/// As ByteSource::nextData(), for an open descriptor. Moves the descriptor's own position.
std::uint64_t nextData(int descriptor, std::uint64_t offset);

/// A regular file, kept open: a later change of its path has no effect. For any number of threads.
class FileSource final : public ByteSource {
  public:
    /// The reason text of a failed read is `attempt`, a colon and the system's reason; "cannot read the file"
    /// if it is empty.
    explicit FileSource(RegularFile file, std::string attempt = {});

    /// The regular file at `path`. Follows no link in the last component (ELOOP), and never blocks on
    /// anything but a regular file (EINVAL, EISDIR). EINVAL also for a path with a zero byte.
    static Result<FileSource> open(const Places& places, const std::string& path);

    /// A descriptor that stays the caller's: it must be open for reading as long as the source lives, and its
    /// own position is neither used nor moved. Anything but a regular file is refused as above, and an
    /// unreadable descriptor with EBADF.
    static Result<FileSource> borrow(int descriptor);

    std::uint64_t size() const override { return size_; }
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override;
    std::uint64_t nextData(std::uint64_t offset) const override;

    /// Makes the kernel read further ahead.
    void expectSequentialReads() const override;

    /// Whether anybody may execute the file.
    bool hasExecuteBit() const noexcept { return hasExecuteBit_; }

  private:
    FileSource(int descriptor, const struct stat& status, std::string attempt);

    FileDescriptor owned_;  // none if the descriptor is borrowed
    int descriptor_;
    std::uint64_t size_;
    bool hasExecuteBit_;
    std::string attempt_;
};

/// Bytes in memory, which the source owns.
class MemorySource final : public ByteSource {
  public:
    explicit MemorySource(Data bytes) : bytes_(std::move(bytes)) {}

    std::uint64_t size() const override { return bytes_.size(); }
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override;

  private:
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

}  // namespace pinwell::base
