#include "files/item_lock.h"

#include <fcntl.h>
#include <sys/file.h>

#include <thread>
#include <utility>

#include "files/posix.h"

namespace pinwell::files {
namespace {

using Clock = std::chrono::steady_clock;

// flock(2) has no time limit of its own, and an alarm that could end it would be the whole process's.
constexpr std::chrono::milliseconds kRetryInterval{10};

class DescriptorLock final : public ItemLock {
  public:
    explicit DescriptorLock(FileDescriptor descriptor) : descriptor_(std::move(descriptor)) {}

  private:
    FileDescriptor descriptor_;
};

bool isSameItem(const struct stat& one, const struct stat& other) {
    return one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

Result<FileDescriptor> openToLock(const std::string& path) {
    const auto status = statusOfItem(path);
    if (!status) return status.error();
    if (S_ISDIR(status->st_mode)) return openDirectory(path, LastLink::refused);
    auto file = openRegularFile(path, O_RDONLY);
    if (!file) return file.error();
    return std::move(file->descriptor);
}

Result<void> lockBefore(Clock::time_point deadline, int descriptor, const std::string& path) {
    while (uninterrupted([&] { return flock(descriptor, LOCK_EX | LOCK_NB); }) != 0) {
        if (errno != EWOULDBLOCK) return lastError(path);
        if (Clock::now() >= deadline) return Error::posix(EBUSY, path);
        std::this_thread::sleep_for(kRetryInterval);
    }
    return {};
}

}  // namespace

Result<std::unique_ptr<ItemLock>> lockPath(const std::string& path, std::chrono::milliseconds patience) {
    const auto deadline = Clock::now() + patience;
    for (;;) {
        auto descriptor = openToLock(path);
        if (!descriptor) return descriptor.error();
        if (auto done = lockBefore(deadline, descriptor->get(), path); !done) return done.error();

        // Who held the lock may have put another file in this one's place, which is then not locked at all.
        struct stat locked {};
        if (fstat(descriptor->get(), &locked) != 0) return lastError(path);
        const auto named = statusOfItem(path);
        if (!named) return named.error();
        if (isSameItem(locked, *named))
            return std::unique_ptr<ItemLock>(std::make_unique<DescriptorLock>(*std::move(descriptor)));
    }
}

}  // namespace pinwell::files
