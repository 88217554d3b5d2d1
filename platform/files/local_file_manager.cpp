#include <fcntl.h>

#include <mutex>
#include <utility>
#include <vector>

#include "operations.h"
#include "runtime/process.h"
#include "values/bundle.h"
#include "values/value.h"

namespace pinwell::files {
namespace {

// The path of a URL that can name a file. A zero byte is refused: the system would stop there, and use
// another file.
Result<std::string> pathOf(const URL& url) {
    if (!url.isFileURL() || url.path().find('\0') != std::string::npos)
        return Error::posix(EINVAL, url.path());
    return url.path();
}

// `name` is the last component of the item's path.
Result<ResourceProperties> resourcePropertiesOfItem(const Place& place, const std::string& name,
                                                    const TypeNaming& typeNaming) {
    const auto status = place.status();
    if (!status) return status.error();

    ItemFacts facts;
    facts.name = name;
    facts.isDirectory = S_ISDIR(status->st_mode);
    facts.isRegularFile = S_ISREG(status->st_mode);
    facts.isSymbolicLink = S_ISLNK(status->st_mode);
    facts.isExecutable = (status->st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)) != 0;

    const ItemType type = typeNaming(facts);
    return ResourceProperties{facts.isDirectory,    type.isPackage,  type.isApplication,
                              facts.isSymbolicLink, type.identifier, type.localizedDescription};
}

Result<ItemState> stateOfItemAt(const Place& place) {
    const auto status = place.status();
    if (!status) return status.error();
    return ItemState{.device = status->st_dev,
                     .inode = status->st_ino,
                     .size = static_cast<std::uint64_t>(status->st_size),
                     .modifiedSeconds = status->st_mtim.tv_sec,
                     .modifiedNanoseconds = status->st_mtim.tv_nsec};
}

Result<bool> itemIsRegularFile(const Place& place) {
    const auto status = place.status();
    if (!status) return status.error();
    return S_ISREG(status->st_mode);
}

class LocalFileManager final : public FileManager {
  public:
    LocalFileManager(TypeNaming typeNaming, std::shared_ptr<Places> places)
        : typeNaming_(std::move(typeNaming)), places_(std::move(places)) {}

    Result<ResourceProperties> resourceProperties(const URL& item) const override {
        return at(item, [&](const Place& place) {
            return resourcePropertiesOfItem(place, item.lastPathComponent(), typeNaming_);
        });
    }

    Result<bool> isRegularFile(const URL& item) const override { return at(item, itemIsRegularFile); }

    Result<ItemState> stateOfItem(const URL& item) const override { return at(item, stateOfItemAt); }

    Result<std::unique_ptr<ItemLock>> lockItem(const URL& item,
                                               const std::function<void()>& waiting) override {
        const auto path = pathOf(item);
        if (!path) return path.error();
        return lockPath(*places_, *path, kLockPatience, waiting);
    }

    Result<base::Anchor> holdItem(const URL& item) override {
        const auto path = pathOf(item);
        if (!path) return path.error();
        return places_->hold(*path);
    }

    std::optional<URL> mainExecutableOfBundle(const URL& directory) const override {
        const auto path = pathOf(directory);
        if (!path) return std::nullopt;
        const auto executable = values::mainExecutableOfBundle(*places_, *path);
        if (!executable) return std::nullopt;
        return URL::fileURLWithPath(*executable);
    }

    Result<bool> volumeSupportsCloning(const URL& item) const override {
        return at(item, fileSupportsCloning);
    }

    Result<URL> createReplacementDirectory(const URL& item) override {
        const auto made = at(item, makeReplacementDirectory);
        if (!made) return made.error();
        // Files in it are found again even if somebody moves the directory's parents meanwhile.
        if (auto held = places_->hold(*made)) {
            const std::lock_guard lock(mutex_);
            replacementDirectories_.push_back(*std::move(held));
        }
        return URL::fileURLWithPath(*made);
    }

    Result<void> copyItem(const URL& source, const URL& destination) override {
        return between(source, destination, copyFile);
    }

    Result<void> copyContents(const URL& source, const URL& destination) override {
        return between(source, destination, copyFileContents);
    }

    Result<void> removeItem(const URL& item) override {
        letGo(item);
        return at(item, removeTree);
    }

    Result<void> replaceItem(const URL& original, const URL& replacement) override {
        return between(original, replacement, [&](const Place& to, const Place& from) {
            const URL emptied = replacement.deletingLastPathComponent();
            letGo(emptied);
            return at(emptied, [&](const Place& directory) { return replaceFile(to, from, directory); });
        });
    }

    Result<URL> trashItem(const URL& item) override {
        const auto trashed = at(item, moveToTrash);
        if (!trashed) return trashed.error();
        return URL::fileURLWithPath(*trashed);
    }

    Result<Data> contentsOfFile(const URL& file) const override { return at(file, readWholeFile); }

    Result<void> writeFile(ByteView contents, const URL& file, Writing writing) override {
        return at(file, [&](const Place& place) {
            return writing == Writing::atomic ? writeFileAtomically(contents, place)
                                              : writeFilePlainly(contents, place);
        });
    }

    Result<std::unique_ptr<FileHandle>> openForReading(const URL& file) override {
        return at(file, [](const Place& place) { return openFileHandle(place, O_RDONLY); });
    }

    Result<std::unique_ptr<FileHandle>> openForUpdating(const URL& file) override {
        return at(file, [](const Place& place) { return openFileHandle(place, O_RDWR); });
    }

    URL temporaryDirectory() const override { return runtime::temporaryDirectory(); }

  private:
    // The result of `operation` for the URL's place, or the error if there is none.
    template <class Operation>
    auto at(const URL& url, Operation operation) const -> decltype(operation(std::declval<const Place&>())) {
        const auto path = pathOf(url);
        if (!path) return path.error();
        const auto place = places_->find(*path);
        if (!place) return place.error();
        return operation(*place);
    }

    template <class Operation>
    Result<void> between(const URL& one, const URL& other, Operation operation) const {
        return at(one, [&](const Place& first) {
            return at(other, [&](const Place& second) { return operation(first, second); });
        });
    }

    // To remove a replacement directory, it is resolved as an entry of its parent.
    void letGo(const URL& directory) {
        const std::lock_guard lock(mutex_);
        std::erase_if(replacementDirectories_,
                      [&](const auto& anchor) { return anchor->item() == directory.path(); });
    }

    TypeNaming typeNaming_;
    std::shared_ptr<Places> places_;
    std::mutex mutex_;
    std::vector<base::Anchor> replacementDirectories_;
};

}  // namespace

Dictionary ResourceProperties::dictionary() const {
    return {{"isDirectory", isDirectory},       {"isPackage", isPackage},
            {"isApplication", isApplication},   {"isSymbolicLink", isSymbolicLink},
            {"typeIdentifier", typeIdentifier}, {"localizedTypeDescription", localizedTypeDescription}};
}

std::unique_ptr<FileManager> makeLocalFileManager(TypeNaming typeNaming, std::shared_ptr<Places> places) {
    return std::make_unique<LocalFileManager>(std::move(typeNaming), std::move(places));
}

}  // namespace pinwell::files
