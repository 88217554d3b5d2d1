#include "foundation/places.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <utility>

#include "foundation/beneath.h"

namespace pinwell::foundation {

namespace {

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

Result<FileDescriptor> Place::openParent() const {
    return Place{parent, ".", path}.open(O_RDONLY | O_DIRECTORY);
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
        if (anchor->item() == path) return std::move(anchor);

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

}  // namespace pinwell::foundation
