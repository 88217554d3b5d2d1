#include "support/volume.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

#include "base/handle.h"

namespace pinwell::test {
namespace {

using namespace std::string_view_literals;

bool runs(const std::string& command) {
    return std::system((command + " >/dev/null 2>&1").c_str()) == 0;  // NOLINT: a test's own fixed commands
}

constexpr std::uintmax_t kRoomInMemory = std::uintmax_t{2} << 30U;  // bytes, for several volumes at once

/// A new file, in memory if there is room: a flush of the volume then waits for no disk. It needs no name
/// after the mount.
struct BackingFile {
    explicit BackingFile(std::string onDisk) : path(std::move(onDisk)) {
        std::error_code none;
        const std::filesystem::space_info memory = std::filesystem::space("/dev/shm", none);
        if (none || memory.available < kRoomInMemory) return;
        std::string pattern = "/dev/shm/pinwell-volume-XXXXXX";
        const base::FileDescriptor file(mkostemp(pattern.data(), O_CLOEXEC));
        if (file) path = pattern;
    }
    ~BackingFile() { ::unlink(path.c_str()); }
    BackingFile(const BackingFile&) = delete;
    BackingFile& operator=(const BackingFile&) = delete;

    std::string path;
};

}  // namespace

Volume::Volume(const std::string& fileSystem) : path_(directory_ / "volume") {
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing changes the environment meanwhile
    if (const char* const kind = std::getenv("PINWELL_TEST_KIND"); kind != nullptr && kind != "volume"sv)
        throw std::logic_error("a test of the kind \"" + std::string(kind) +
                               "\" mounts a volume: name it in VOLUMES of its program");
    if (geteuid() != 0) {
        missing_ = "only the superuser may mount volumes";
        return;
    }
    if (unshare(CLONE_NEWNS) != 0 || mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
        missing_ = "no mount namespace of our own to be had";
        return;
    }
    if (mkdir(path_.c_str(), 0755) != 0) throw std::runtime_error(path_);
    if (fileSystem == "tmpfs") {
        if (mount("none", path_.c_str(), "tmpfs", 0, "size=1m") != 0) missing_ = "tmpfs cannot be mounted";
        return;
    }
    const BackingFile file(directory_ / "image");
    const std::string& image = file.path;
    const std::string_view kind = std::string_view(fileSystem).substr(0, fileSystem.find(' '));
    const std::string make =
        "mkfs." + fileSystem + (kind == "btrfs" ? " -q --nodiscard " : " -q -K ") + image;
    if (!runs("truncate -s 320M " + image) || !runs(make)) {
        missing_ = "mkfs." + fileSystem + " does not work here";
    } else if (!runs("mount -t " + std::string(kind) + " -o loop " + image + " " + path_)) {
        missing_ = "no loop device, or the kernel cannot mount " + fileSystem;
    }
}

Volume::~Volume() {
    if (!missing_) umount2(path_.c_str(), MNT_DETACH);
}

}  // namespace pinwell::test
