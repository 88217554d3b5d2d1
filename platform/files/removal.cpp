// Removal of files and whole trees.
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <memory>
#include <string_view>
#include <utility>
#include <vector>

#include "operations.h"

namespace pinwell::files {
namespace {

constexpr int kDirectoryFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

struct DirectoryCloser {
    void operator()(DIR* directory) const noexcept { closedir(directory); }
};
using DirectoryStream = std::unique_ptr<DIR, DirectoryCloser>;

// One directory on the way down; the way back up must lead to the same one.
struct Step {
    std::string name;
    dev_t device;
    ino_t inode;
};

enum class Outcome { removed, directoryNotEmpty, failed };

// `at` is the directory that holds the entry. After `failed`, errno says why.
Outcome removeEntry(int at, const char* name) {
    if (unlinkat(at, name, 0) == 0) return Outcome::removed;
    if (errno != EISDIR) return Outcome::failed;
    if (unlinkat(at, name, AT_REMOVEDIR) == 0) return Outcome::removed;
    return errno == ENOTEMPTY || errno == EEXIST ? Outcome::directoryNotEmpty : Outcome::failed;
}

// Walks down with one directory open at a time, and up again through "..".
class TreeRemoval {
  public:
    TreeRemoval(FileDescriptor parent, std::string parentPath)
        : current_(std::move(parent)), rootPath_(std::move(parentPath)) {}

    // Removes `name`, which is a directory that is not empty, with its contents.
    Result<void> run(std::string name) {
        if (auto done = descend(std::move(name)); !done) return done;
        while (!way_.empty()) {
            const auto fuller = emptyCurrent();
            if (!fuller) return fuller.error();
            if (auto done = fuller->empty() ? ascendAndRemove() : descend(*fuller); !done) return done;
        }
        return {};
    }

  private:
    std::string pathOf(std::string_view name) const {
        std::string path = rootPath_;
        for (const Step& step : way_) path += "/" + step.name;
        return path + "/" + std::string(name);
    }

    Result<void> descend(std::string name) {
        FileDescriptor next(
            uninterrupted([&] { return openat(current_.get(), name.c_str(), kDirectoryFlags); }));
        struct stat status {};
        if (!next || fstat(current_.get(), &status) != 0) return lastError(pathOf(name));
        way_.push_back({std::move(name), status.st_dev, status.st_ino});
        current_ = std::move(next);
        return {};
    }

    // Removes the entries that can be removed at once. Returns the first directory that is not empty; an
    // empty text if all entries are removed.
    Result<std::string> emptyCurrent() {
        // Opened again: duplicates of an open directory share its position.
        FileDescriptor listed(uninterrupted([&] { return openat(current_.get(), ".", kDirectoryFlags); }));
        if (!listed) return lastError(pathOf("."));
        const DirectoryStream stream(fdopendir(listed.get()));
        if (!stream) return lastError(pathOf("."));
        static_cast<void>(listed.release());  // the stream owns it now

        for (;;) {
            errno = 0;
            const dirent* entry = readdir(stream.get());
            if (entry == nullptr) break;
            const std::string_view name(&entry->d_name[0]);
            if (name == "." || name == "..") continue;
            switch (removeEntry(current_.get(), name.data())) {
                case Outcome::removed:
                    break;
                case Outcome::directoryNotEmpty:
                    return std::string(name);
                case Outcome::failed:
                    return lastError(pathOf(name));
            }
        }
        if (errno != 0) return lastError(pathOf("."));
        return std::string();
    }

    Result<void> ascendAndRemove() {
        const Step step = std::move(way_.back());
        way_.pop_back();
        const std::string path = pathOf(step.name);
        FileDescriptor above(uninterrupted([&] { return openat(current_.get(), "..", kDirectoryFlags); }));
        struct stat status {};
        if (!above || fstat(above.get(), &status) != 0) return lastError(path);
        // Somebody has moved the directory: the items there are not ours to remove.
        if (status.st_dev != step.device || status.st_ino != step.inode) return Error::posix(EBUSY, path);
        current_ = std::move(above);
        if (unlinkat(current_.get(), step.name.c_str(), AT_REMOVEDIR) != 0) return lastError(path);
        return {};
    }

    FileDescriptor current_;
    std::string rootPath_;
    std::vector<Step> way_;
};

}  // namespace

Result<void> removeTree(const Place& place) {
    if (place.name == "..") return Error::posix(EINVAL, place.path);  // would empty the directory above

    switch (removeEntry(place.directory(), place.name.c_str())) {
        case Outcome::removed:
            return {};
        case Outcome::failed:
            return lastError(place.path);
        case Outcome::directoryNotEmpty:
            break;
    }
    const std::string directory = directoryOf(place.path);
    auto parent = openDirectory({place.parent, ".", directory});
    if (!parent) return parent.error();
    return TreeRemoval(std::move(*parent), directory == "/" ? std::string() : directory).run(place.name);
}

}  // namespace pinwell::files
