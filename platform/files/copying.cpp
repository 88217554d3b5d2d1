// Copies of regular files: clones, which share their blocks with the original until one of them is written
// (reflinks, see ioctl_ficlonerange(2)), or copies piece by piece.
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>

#include "operations.h"

namespace pinwell::files {
namespace {

// Common file systems share whole blocks of this size, and no file system limits a request to less.
constexpr std::uint64_t kRange = 4096;

// Refused because the feature is missing, before the arguments are checked.
bool meansNo(int reason) {
    switch (reason) {
        case EOPNOTSUPP:
        case ENOTTY:
        case ENOSYS:
        case EXDEV:
            return true;
        default:
            return false;
    }
}

// The error of a file system with the feature, for two overlapping ranges or a file without a block.
bool meansYes(int reason) {
    return reason == EINVAL;
}

enum class Answer { yes, no, unknown };

// file_dedupe_range of linux/fs.h with one destination; the kernel's header has an array of open length.
struct SharingQuestion {
    std::uint64_t offset;
    std::uint64_t length;
    std::uint16_t destinationCount;
    std::uint16_t reserved1;
    std::uint32_t reserved2;
    std::int64_t destination;
    std::uint64_t destinationOffset;
    std::uint64_t shared;
    std::int32_t status;
    std::uint32_t reserved3;
};
static_assert(sizeof(SharingQuestion) == sizeof(file_dedupe_range) + sizeof(file_dedupe_range_info));

// ioctl_fideduperange(2) of the file's beginning with itself. A file open for reading is enough.
Answer askForSharing(const OpenFile& file) {
    // The kernel does not ask the file system for an empty range, or a range past the end.
    if (file.status.st_size == 0) return Answer::unknown;
    SharingQuestion question{};
    question.length = std::min(kRange, static_cast<std::uint64_t>(file.status.st_size));
    question.destinationCount = 1;
    question.destination = file.number();
    // The file system has no such operation at all.
    if (uninterrupted([&] { return ioctl(file.number(), FIDEDUPERANGE, &question); }) != 0)
        return meansNo(errno) || errno == EINVAL ? Answer::no : Answer::unknown;
    const int status = question.status;
    if (status >= 0 || meansYes(-status)) return Answer::yes;
    // EOPNOTSUPP is also returned if files can be cloned but not compared first (NFS, CIFS), and EPERM if the
    // file is another user's.
    return Answer::unknown;
}

// ioctl_ficlonerange(2) of the file's beginning into itself. The file must be open for writing.
Result<bool> askForCloning(const Place& place) {
    const auto file = openRegularFile(place, O_RDWR);
    if (!file) return file.error();
    file_clone_range range{};
    range.src_fd = file->number();
    range.src_length = kRange;
    if (uninterrupted([&] { return ioctl(file->number(), FICLONERANGE, &range); }) == 0) return true;
    if (meansYes(errno)) return true;
    if (meansNo(errno)) return false;
    return lastError(place.path);
}

// Clones the file's beginning into an unnamed file in the same directory. This is the last way if the file is
// another user's and only readable: its directory then decides whether it can be replaced.
Result<bool> tryCloning(const OpenFile& file) {
    const Place& place = file.place;
    const FileDescriptor probe(uninterrupted(
        [&] { return openat(place.directory(), ".", O_TMPFILE | O_RDWR | O_CLOEXEC, S_IRUSR | S_IWUSR); }));
    if (!probe) return lastError(directoryOf(place.path));
    file_clone_range range{};
    range.src_fd = file.number();
    range.src_length = file.status.st_size > static_cast<off_t>(kRange) ? kRange : 0;  // 0: to the end
    if (uninterrupted([&] { return ioctl(probe.get(), FICLONERANGE, &range); }) == 0) return true;
    if (meansNo(errno) || meansYes(errno)) return false;
    return lastError(place.path);
}

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

// Makes the empty file `to` a clone of `from`. Returns false, without any change, if that is not possible.
bool cloneFile(const OpenFile& from, const OpenFile& to) {
    return uninterrupted([&] { return ioctl(to.number(), FICLONE, from.number()); }) == 0;
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

Result<bool> fileSupportsCloning(const Place& place) {
    const auto file = openRegularFile(place, O_RDONLY);
    if (!file) return file.error();
    switch (askForSharing(*file)) {
        case Answer::yes:
            return true;
        case Answer::no:
            return false;
        case Answer::unknown:
            break;
    }
    auto answer = askForCloning(place);
    if (!answer && answer.error().code() == EACCES) return tryCloning(*file);
    return answer;
}

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
