// One writer of an item at a time.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/vfs.h>

#include <algorithm>
#include <array>
#include <thread>
#include <utility>

#include "operations.h"

namespace pinwell::files {
namespace {

using Clock = std::chrono::steady_clock;

// flock(2) has no time limit, and an alarm to interrupt it would affect the whole process.
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

Result<FileDescriptor> openToLock(const Place& place) {
    const auto status = place.status();
    if (!status) return status.error();
    if (S_ISDIR(status->st_mode)) return openDirectory(place);
    auto file = openRegularFile(place, O_RDONLY);
    if (!file) return file.error();
    return std::move(file->descriptor);
}

Result<void> refuseMandatoryLocks(int descriptor, const std::string& path) {
    struct statfs fileSystem {};
    if (uninterrupted([&] { return fstatfs(descriptor, &fileSystem); }) != 0) return lastError(path);
    if (hasMandatoryLocks(fileSystem.f_type)) return Error::posix(EOPNOTSUPP, path);
    return {};
}

Result<void> lockBefore(Clock::time_point deadline, int descriptor, const std::string& path,
                        const std::function<void()>& waiting, bool& hasWaited) {
    while (uninterrupted([&] { return flock(descriptor, LOCK_EX | LOCK_NB); }) != 0) {
        if (errno != EWOULDBLOCK) return lastError(path);
        if (!std::exchange(hasWaited, true)) waiting();
        if (Clock::now() >= deadline) return Error::posix(EBUSY, path);
        std::this_thread::sleep_for(kRetryInterval);
    }
    return {};
}

}  // namespace

bool hasMandatoryLocks(std::int64_t fileSystemType) {
    // From linux/magic.h, in 32 bits: the field is signed on some processors.
    constexpr std::array<std::uint32_t, 3> kTypes{0x517B, 0xFF534D42, 0xFE534D42};  // SMB, CIFS, SMB2
    return std::find(kTypes.begin(), kTypes.end(), static_cast<std::uint32_t>(fileSystemType)) !=
           kTypes.end();
}

Result<std::unique_ptr<ItemLock>> lockPath(const Places& places, const std::string& path,
                                           std::chrono::milliseconds patience,
                                           const std::function<void()>& waiting) {
    const auto deadline = Clock::now() + patience;
    bool hasWaited = false;
    for (;;) {
        const auto place = places.find(path);
        if (!place) return place.error();
        auto descriptor = openToLock(*place);
        if (!descriptor) return descriptor.error();
        if (auto done = refuseMandatoryLocks(descriptor->get(), path); !done) return done.error();
        if (auto done = lockBefore(deadline, descriptor->get(), path, waiting, hasWaited); !done)
            return done.error();

        // The previous holder may have replaced this file by another one, which is then not locked at all.
        struct stat locked {};
        if (fstat(descriptor->get(), &locked) != 0) return lastError(path);
        const auto named = place->status();
        if (!named) return named.error();
        if (isSameItem(locked, *named))
            return std::unique_ptr<ItemLock>(std::make_unique<DescriptorLock>(*std::move(descriptor)));
    }
}

}  // namespace pinwell::files
