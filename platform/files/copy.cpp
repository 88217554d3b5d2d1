#include "files/copy.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>

#include "files/cloning.h"
#include "files/metadata.h"
#include "files/posix.h"

namespace pinwell::files {
namespace {

// Bytes of the file from `begin` up to `end`.
struct Extent {
    off_t begin;
    off_t end;
};

constexpr off_t kMaximumKernelCopy = off_t{1} << 30U;  // a call's limit is slightly larger

// Lets the kernel copy as much as it can; returns where it stopped. The reason does not matter: reading and
// writing from there would meet the same error, and can tell which file it is from.
off_t copyInKernel(const OpenFile& from, const OpenFile& to, Extent extent) {
    off_t in = extent.begin;
    off_t out = extent.begin;
    while (in < extent.end) {
        const auto length = static_cast<std::size_t>(std::min(extent.end - in, kMaximumKernelCopy));
        const ssize_t count =
            uninterrupted([&] { return copy_file_range(from.number(), &in, to.number(), &out, length, 0); });
        if (count <= 0) break;
    }
    return in;
}

Result<void> writeAt(const OpenFile& to, ByteView bytes, off_t at) {
    while (!bytes.empty()) {
        const ssize_t count =
            uninterrupted([&] { return pwrite(to.number(), bytes.data(), bytes.size(), at); });
        if (count < 0) return lastError(to.path());
        bytes = bytes.subspan(static_cast<std::size_t>(count));
        at += count;
    }
    return {};
}

Result<void> copyByHand(const OpenFile& from, const OpenFile& to, Extent extent) {
    Data piece(kPieceSize);
    for (off_t at = extent.begin; at < extent.end;) {
        const std::size_t length = std::min(static_cast<std::size_t>(extent.end - at), piece.size());
        const ssize_t count = uninterrupted([&] { return pread(from.number(), piece.data(), length, at); });
        if (count < 0) return lastError(from.path());
        // The file was truncated after it was opened, so the copy so far is not its contents.
        if (count == 0) return Error::posix(EIO, from.path());
        const auto bytes = ByteView(piece).first(static_cast<std::size_t>(count));
        if (auto done = writeAt(to, bytes, at); !done) return done;
        at += count;
    }
    return {};
}

// The next extent with data at or after `at`; an empty one at `size` if only a hole is left.
Result<Extent> nextExtent(const OpenFile& from, off_t at, off_t size) {
    const off_t begin = uninterrupted([&] { return lseek(from.number(), at, SEEK_DATA); });
    if (begin < 0) {
        if (errno == ENXIO) return Extent{size, size};
        if (errno == EINVAL || errno == EOPNOTSUPP)
            return Extent{at, size};  // this file system knows no holes
        return lastError(from.path());
    }
    const off_t end = uninterrupted([&] { return lseek(from.number(), begin, SEEK_HOLE); });
    if (end < 0) return lastError(from.path());
    return Extent{std::min(begin, size), std::min(end, size)};
}

Result<void> copyContents(const OpenFile& from, const OpenFile& to) {
    if (cloneFile(from, to)) return {};

    const off_t size = from.status.st_size;
    for (off_t at = 0; at < size;) {
        const auto extent = nextExtent(from, at, size);
        if (!extent) return extent.error();
        const off_t reached = copyInKernel(from, to, *extent);
        if (auto done = copyByHand(from, to, {reached, extent->end}); !done) return done;
        at = extent->end;
    }
    if (uninterrupted([&] { return ftruncate(to.number(), size); }) != 0) return lastError(to.path());
    return {};
}

}  // namespace

Result<void> copyFile(const Place& source, const Place& destination) {
    const auto from = openRegularFile(source, O_RDONLY);
    if (!from) return from.error();
    auto to = createFile(destination);
    if (!to) return to.error();

    HalfMadeFile halfMade(destination);
    if (auto done = copyContents(*from, *to); !done) return done;
    if (auto done = carryMetadata(*from, *to); !done) return done;
    if (auto done = carryTimes(*from, *to); !done) return done;
    if (auto done = closeReporting(*to); !done) return done;
    halfMade.keep();
    return {};
}

Result<void> copyFileContents(const Place& source, const Place& destination) {
    const auto from = openRegularFile(source, O_RDONLY);
    if (!from) return from.error();
    auto to = createFile(destination, kOrdinaryFile);
    if (!to) return to.error();

    HalfMadeFile halfMade(destination);
    if (auto done = copyContents(*from, *to); !done) return done;
    if (auto done = flush(to->number(), destination.path); !done) return done;
    if (auto done = closeReporting(*to); !done) return done;
    if (auto done = flushDirectoryOf(destination); !done) return done;
    halfMade.keep();
    return {};
}

}  // namespace pinwell::files
