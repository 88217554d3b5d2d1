#include <fcntl.h>

#include <utility>

#include "files/bundle_executable.h"
#include "files/cloning.h"
#include "files/copy.h"
#include "files/file_handle.h"
#include "files/file_manager.h"
#include "files/item_lock.h"
#include "files/item_properties.h"
#include "files/posix.h"
#include "files/removal.h"
#include "files/replacement.h"
#include "files/trash.h"
#include "files/whole_file.h"
#include "foundation/process.h"

namespace pinwell::files {
namespace {

// The path of a URL that can name a file: the system would stop at a zero byte, and take another file.
Result<std::string> pathOf(const URL& url) {
    if (!url.isFileURL() || url.path().find('\0') != std::string::npos)
        return Error::posix(EINVAL, url.path());
    return url.path();
}

// What `operation` makes of the path, or why there is none.
template <class Operation>
auto onPath(const URL& url, Operation operation) -> decltype(operation(std::string())) {
    const auto path = pathOf(url);
    if (!path) return path.error();
    return operation(*path);
}

Result<URL> asURL(const Result<std::string>& path) {
    if (!path) return path.error();
    return URL::fileURLWithPath(*path);
}

class LocalFileManager final : public FileManager {
  public:
    explicit LocalFileManager(TypeNaming typeNaming) : typeNaming_(std::move(typeNaming)) {}

    Result<ResourceProperties> resourceProperties(const URL& item) override {
        return onPath(item, [&](const std::string&) { return resourcePropertiesOfItem(item, typeNaming_); });
    }

    Result<bool> isRegularFile(const URL& item) override { return onPath(item, itemIsRegularFile); }

    Result<ItemState> stateOfItem(const URL& item) override { return onPath(item, stateOfItemAt); }

    Result<std::unique_ptr<ItemLock>> lockItem(const URL& item) override {
        return onPath(item, [](const std::string& path) { return lockPath(path, kLockPatience); });
    }

    std::optional<URL> mainExecutableOfBundle(const URL& directory) override {
        return pathOf(directory) ? mainExecutableIn(directory) : std::nullopt;
    }

    Result<bool> volumeSupportsCloning(const URL& item) override { return onPath(item, fileSupportsCloning); }

    Result<URL> createReplacementDirectory(const URL& item) override {
        return asURL(onPath(item, makeReplacementDirectory));
    }

    Result<void> copyItem(const URL& source, const URL& destination) override {
        return onPath(source, [&](const std::string& from) {
            return onPath(destination, [&](const std::string& to) { return copyFile(from, to); });
        });
    }

    Result<void> copyContents(const URL& source, const URL& destination) override {
        return onPath(source, [&](const std::string& from) {
            return onPath(destination, [&](const std::string& to) { return copyFileContents(from, to); });
        });
    }

    Result<void> removeItem(const URL& item) override { return onPath(item, removeTree); }

    Result<void> replaceItem(const URL& original, const URL& replacement) override {
        return onPath(original, [&](const std::string& to) {
            return onPath(replacement, [&](const std::string& from) { return replaceFile(to, from); });
        });
    }

    Result<URL> trashItem(const URL& item) override { return asURL(onPath(item, moveToTrash)); }

    Result<Data> contentsOfFile(const URL& file) override { return onPath(file, readWholeFile); }

    Result<void> writeFile(ByteView contents, const URL& file, Writing writing) override {
        return onPath(file, [&](const std::string& path) {
            return writing == Writing::atomic ? writeFileAtomically(contents, path)
                                              : writeFilePlainly(contents, path);
        });
    }

    Result<std::unique_ptr<FileHandle>> openForReading(const URL& file) override {
        return onPath(file, [](const std::string& path) { return openFileHandle(path, O_RDONLY); });
    }

    Result<std::unique_ptr<FileHandle>> openForUpdating(const URL& file) override {
        return onPath(file, [](const std::string& path) { return openFileHandle(path, O_RDWR); });
    }

    URL temporaryDirectory() override { return foundation::temporaryDirectory(); }

  private:
    TypeNaming typeNaming_;
};

}  // namespace

std::unique_ptr<FileManager> makeLocalFileManager(TypeNaming typeNaming) {
    return std::make_unique<LocalFileManager>(std::move(typeNaming));
}

}  // namespace pinwell::files
