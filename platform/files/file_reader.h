// Reads an open regular file, piece by piece: the half of a file handle that parsers need.
//
// All calls block; one reader serves one thread at a time.
#pragma once

#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>

#include "base/bytes.h"
#include "base/error.h"

namespace pinwell::files {

/// A reader's or a file handle's failure. `what()` is the reason text: the operation, the file, and the
/// system's reason.
class FileHandleError : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

/// An open regular file. The operations throw FileHandleError.
class FileReader {
  public:
    virtual ~FileReader() = default;

    /// Both return the new position, in bytes from the start. A position past the end is allowed.
    virtual std::uint64_t seekToEnd() = 0;
    virtual std::uint64_t seek(std::uint64_t position) = 0;
    virtual std::uint64_t position() = 0;

    /// Up to `length` bytes; fewer only at the end of the file. Memory grows with the bytes really read.
    virtual base::Data read(std::uint64_t length) = 0;

    /// The first position from `position` on that may have non-zero bytes: in a sparse file the end of a
    /// hole. The read position does not change.
    virtual std::uint64_t nextData(std::uint64_t position) { return position; }
};

/// Up to `length` bytes from the position on; fewer only at the end of the file. For lengths that a file
/// claims: memory is taken only for non-zero bytes, not for holes. Throws FileHandleError.
base::SharedBytes readShared(FileReader& file, std::uint64_t length);

/// A buffer of that length. Throws FileHandleError if there is no address space for it.
base::SparseBuffer makeBuffer(std::uint64_t length);

/// The regular file at `path`, opened close-on-exec. Follows no link in the last component and never blocks
/// on anything but a regular file (EINVAL, EISDIR, ELOOP).
base::Result<std::unique_ptr<FileReader>> openReader(const std::string& path);

/// A reader of a descriptor that stays the caller's: it must be open for reading as long as the reader lives,
/// and its own position is neither used nor moved. Anything but a regular file is
/// refused as above, and an unreadable descriptor with EBADF. Errors call the file
/// `name`.
base::Result<std::unique_ptr<FileReader>> readerOf(int descriptor, std::string name);

}  // namespace pinwell::files
