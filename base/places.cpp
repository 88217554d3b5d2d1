#include "base/places.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <deque>
#include <string_view>
#include <utility>

namespace pinwell::base {
namespace {

// The kernel's limit of links on one path.
constexpr int kMaximumLinks = 40;

// How often openat2(2) is repeated: with ".." on the path, it fails with EAGAIN if any directory is moved
// meanwhile. The walk does not.
constexpr int kMaximumTries = 16;

FileDescriptor opened(int directory, const char* name, int flags, mode_t mode) {
    for (;;) {
        FileDescriptor descriptor(openat(directory, name, flags | O_CLOEXEC, mode));
        if (descriptor || errno != EINTR) return descriptor;
    }
}

FileDescriptor failed(int reason) {
    errno = reason;
    return FileDescriptor();
}

std::optional<std::string> targetOf(int link) {
    std::array<char, PATH_MAX> target{};
    const ssize_t length = readlinkat(link, "", target.data(), target.size());
    if (length < 0) return std::nullopt;
    return std::string(target.data(), static_cast<std::size_t>(length));
}

class Walk {
  public:
    Walk(int root, int flags, mode_t mode) : root_(root), flags_(flags), mode_(mode) {}

    FileDescriptor run(const std::string& path) {
        if (!prepend(path)) return FileDescriptor();
        while (!components_.empty()) {
            const std::string name = std::exchange(components_.front(), {});
            components_.pop_front();
            if (name == "..") {
                if (way_.empty()) return failed(EXDEV);
                way_.pop_back();
                continue;
            }
            const bool last = components_.empty();
            if (last && (flags_ & O_NOFOLLOW) != 0) return opened(here(), name.c_str(), flags_, mode_);
            if (!enter(name, last)) return std::move(end_);
        }
        return opened(here(), ".", flags_ & ~O_NOFOLLOW, mode_);
    }

  private:
    int here() const { return way_.empty() ? root_ : way_.back().get(); }

    // Puts the path's components before the remaining ones. Returns false, with errno set, if that leads out.
    bool prepend(std::string_view path) {
        if (path.starts_with('/')) {
            errno = EXDEV;
            return false;
        }
        std::deque<std::string> more;
        while (!path.empty()) {
            const std::size_t end = std::min(path.find('/'), path.size());
            const std::string_view name = path.substr(0, end);
            if (!name.empty() && name != ".") more.emplace_back(name);
            path.remove_prefix(std::min(end + 1, path.size()));
        }
        components_.insert(components_.begin(), more.begin(), more.end());
        return true;
    }

    // Enters a directory, or follows a link. Returns false at the end of the walk: end_ is the result.
    bool enter(const std::string& name, bool last) {
        FileDescriptor next = opened(here(), name.c_str(), O_PATH | O_NOFOLLOW, 0);
        struct stat status {};
        const bool isMissing = !next && errno == ENOENT;
        if (last && isMissing) return finish(name);  // for O_CREAT
        if (!next || fstat(next.get(), &status) != 0) return false;
        if (S_ISLNK(status.st_mode)) {
            if (++links_ > kMaximumLinks) return stop(ELOOP);
            const auto target = targetOf(next.get());
            return target && prepend(*target);
        }
        if (last) return finish(name);
        if (!S_ISDIR(status.st_mode)) return stop(ENOTDIR);
        way_.push_back(std::move(next));
        return true;
    }

    bool finish(const std::string& name) {
        // If a link has replaced it since the check, it is refused.
        end_ = opened(here(), name.c_str(), flags_ | O_NOFOLLOW, mode_);
        return false;
    }

    static bool stop(int reason) {
        errno = reason;
        return false;
    }

    const int root_;
    const int flags_;
    const mode_t mode_;
    std::deque<std::string> components_;
    std::vector<FileDescriptor> way_;
    int links_ = 0;
    FileDescriptor end_;
};

bool mayHaveMode(int flags) {
    return (flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
}

constexpr int kDirectoryToSearch = O_PATH | O_DIRECTORY | O_CLOEXEC;

struct Split {
    std::string directory;
    std::string name;
};

// Splits a path into its last component and the rest; "." for a path without components.
Split split(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return {".", path};
    std::string name = path.substr(slash + 1);
    if (name.empty()) name = ".";
    return {slash == 0 ? "/" : path.substr(0, slash), std::move(name)};
}

// The result of `call`, repeated while a signal interrupts it.
template <class Call>
int uninterrupted(Call call) {
    for (;;) {
        const int answer = call();
        if (answer != -1 || errno != EINTR) return answer;
    }
}

Place placeIn(FileDescriptor directory, std::string name, const std::string& path) {
    return {std::make_shared<FileDescriptor>(std::move(directory)), std::move(name), path};
}

}  // namespace

FileDescriptor openBeneathByWalking(int root, const std::string& path, int flags, mode_t mode) {
    return Walk(root, flags, mode).run(path);
}

FileDescriptor openBeneath(int root, const std::string& path, int flags, mode_t mode) {
    open_how how{};
    how.flags = static_cast<unsigned>(flags | O_CLOEXEC);
    how.mode = mayHaveMode(flags) ? mode : 0;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_MAGICLINKS;
    const char* const name = path.empty() ? "." : path.c_str();
    for (int tries = 0; tries < kMaximumTries;) {
        const long number = syscall(SYS_openat2, root, name, &how, sizeof how);
        if (number >= 0) return FileDescriptor(static_cast<int>(number));
        if (errno == EINTR) continue;
        // EPERM: the error of older container runtimes for unknown calls.
        if (errno == ENOSYS || errno == EPERM) break;
        if (errno != EAGAIN) return FileDescriptor();
        ++tries;
    }
    return openBeneathByWalking(root, path, flags, mode);
}

Result<struct stat> Place::status() const {
    struct stat status {};
    const int done =
        uninterrupted([&] { return fstatat(directory(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW); });
    if (done != 0) return Error::posix(errno, path);
    return status;
}

Result<FileDescriptor> Place::open(int flags, mode_t mode) const {
    FileDescriptor descriptor(uninterrupted(
        [&] { return openat(directory(), name.c_str(), flags | O_NOFOLLOW | O_CLOEXEC, mode); }));
    if (!descriptor) return Error::posix(errno, path);
    return descriptor;
}

Result<RegularFile> Place::openRegularFile(int flags, mode_t mode) const {
    return base::openRegularFile(directory(), name, flags | O_NOFOLLOW, path, mode);
}

std::optional<std::string> HeldPlace::relative(const std::string& path) const {
    if (path == directory_) return isTree_ ? std::optional(std::string()) : std::nullopt;
    const std::string prefix = directory_ == "/" ? directory_ : directory_ + "/";
    if (!path.starts_with(prefix)) return std::nullopt;
    std::string rest = path.substr(prefix.size());
    if (!isTree_ && rest.find('/') != std::string::npos) return std::nullopt;
    return rest;
}

Result<FileDescriptor> HeldPlace::open(const std::string& relative, int flags) const {
    FileDescriptor descriptor = openBeneath(descriptor_->get(), relative, flags);
    if (!descriptor) return Error::posix(errno, directory_ + "/" + relative);
    return descriptor;
}

std::vector<Anchor> Places::held() const {
    const std::lock_guard lock(mutex_);
    std::erase_if(held_, [](const auto& one) { return one.expired(); });
    std::vector<Anchor> anchors;
    for (const auto& one : held_)
        if (Anchor anchor = one.lock()) anchors.push_back(std::move(anchor));
    return anchors;
}

Result<Anchor> Places::hold(const std::string& path) {
    for (Anchor& anchor : held())
        if (anchor->item() == path) return Result<Anchor>(std::move(anchor));

    const auto place = find(path);
    if (!place) return place.error();
    const auto status = place->status();
    if (!status) return status.error();
    const bool isDirectory = S_ISDIR(status->st_mode);
    auto descriptor = isDirectory ? place->open(kDirectoryToSearch)
                                  : Place{place->parent, ".", path}.open(kDirectoryToSearch);
    if (!descriptor) return descriptor.error();
    auto anchor = std::make_shared<const HeldPlace>(path, isDirectory ? path : split(path).directory,
                                                    isDirectory, *std::move(descriptor));
    const std::lock_guard lock(mutex_);
    held_.push_back(anchor);
    return Anchor(std::move(anchor));
}

Result<Place> Places::find(const std::string& path) const {
    // Like the kernel, which here sees only parts of the path.
    if (path.size() >= PATH_MAX) return Error::posix(ENAMETOOLONG, path);
    // The nearest one, if there are several.
    Anchor from;
    for (Anchor& anchor : held())
        if (anchor->relative(path) && (!from || anchor->directory().size() > from->directory().size()))
            from = std::move(anchor);
    if (!from) {
        Split parts = split(path);
        FileDescriptor directory(
            uninterrupted([&] { return ::open(parts.directory.c_str(), kDirectoryToSearch); }));
        if (!directory) return Error::posix(errno, path);
        return placeIn(std::move(directory), std::move(parts.name), path);
    }

    const std::string relative = *from->relative(path);
    if (relative.find('/') == std::string::npos)
        return Place{from->descriptor(), relative.empty() ? "." : relative, path};
    Split parts = split(relative);
    FileDescriptor directory = openBeneath(from->descriptor()->get(), parts.directory, O_PATH | O_DIRECTORY);
    if (!directory) return Error::posix(errno, path);
    return placeIn(std::move(directory), std::move(parts.name), path);
}

}  // namespace pinwell::base
