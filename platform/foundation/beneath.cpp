#include "foundation/beneath.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <deque>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

namespace pinwell::foundation {
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

}  // namespace pinwell::foundation
