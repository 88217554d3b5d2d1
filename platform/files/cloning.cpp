#include "files/cloning.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>

namespace pinwell::files {
namespace {

// A block of every common file system, and small enough for every file system's limit.
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

bool cloneFile(const OpenFile& from, const OpenFile& to) {
    return uninterrupted([&] { return ioctl(to.number(), FICLONE, from.number()); }) == 0;
}

}  // namespace pinwell::files
