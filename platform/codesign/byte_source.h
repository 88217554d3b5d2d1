// Random access to the bytes of an artefact, without ever holding all of them.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "codesign/code_signing.h"
#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "foundation/places.h"
#include "foundation/sparse_bytes.h"

namespace pinwell::codesign {

using foundation::ByteView;
using foundation::Data;
using foundation::SharedBytes;

/// What the service says of a file that cannot be looked up or opened, by the errno value.
Status statusOfLookup(std::int64_t reason);

/// Bytes with a size that was fixed when the source was made. A file may change afterwards; a read that no
/// longer finds its bytes then fails, and nothing else happens.
class ByteSource {
  public:
    virtual ~ByteSource() = default;

    virtual std::uint64_t size() const = 0;

    /// Exactly `length` bytes from `offset`. Throws CodeError: kInvalidSignature when the range does not lie
    /// within size(), kIOError when the bytes cannot be read. Callers hold `length` against a named maximum
    /// first.
    Data read(std::uint64_t offset, std::size_t length) const;

    /// The same for a length that the file itself claims: memory is taken for what is there, not for holes
    /// and zeros. Throws CodeError (kIOError) also if there is no address space for it.
    SharedBytes readShared(std::uint64_t offset, std::uint64_t length) const;

    /// The same into a buffer of the caller's, all of which is filled.
    void read(std::uint64_t offset, std::span<std::byte> buffer) const;

    /// A hint that all of it is about to be read, from the first byte to the last.
    virtual void expectSequentialReads() const {}

  protected:
    /// The first position from `offset` on that may have something other than zeros; the size where none has.
    virtual std::uint64_t nextData(std::uint64_t offset) const { return offset; }

    /// Fills as much of `buffer` as there are bytes at `offset` and answers how much that was.
    virtual std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const = 0;

  private:
    void checkRange(std::uint64_t offset, std::uint64_t length) const;
    void readAll(std::uint64_t offset, std::span<std::byte> buffer) const;
};

/// A regular file, held open: a path that is replaced later does not matter any more.
class FileSource final : public ByteSource {
  public:
    /// Never follows a link in the last component and never blocks on a pipe or device. Throws CodeError:
    /// kStaticCodeNotFound when no regular file is there, kIOError when it cannot be opened.
    FileSource(const foundation::Places& places, const std::string& path);

    std::uint64_t size() const override { return size_; }

    /// Has the kernel read further ahead.
    void expectSequentialReads() const override;

  private:
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override;
    std::uint64_t nextData(std::uint64_t offset) const override;

    foundation::FileDescriptor file_;
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

}  // namespace pinwell::codesign
