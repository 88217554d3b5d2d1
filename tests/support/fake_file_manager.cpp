#include "support/fake_file_manager.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <map>
#include <mutex>
#include <optional>
#include <ostream>
#include <span>
#include <utility>

#include "base/bytes.h"
#include "support/temporary_directory.h"
#include "values/url.h"

namespace pinwell::test {

using base::Error;
using files::ByteView;
using files::Data;
using files::FileHandle;
using files::Result;
using files::URL;

namespace {

constexpr std::array<std::string_view, 9> kChanges{"createReplacementDirectory",
                                                   "copyItem",
                                                   "copyContents",
                                                   "removeItem",
                                                   "replaceItem",
                                                   "trashItem",
                                                   "writeFile",
                                                   "handle.write",
                                                   "handle.truncate"};

}  // namespace

// The operations so far and the failures to come; shared with the handles.
class RecordingFileManager::Record {
  public:
    // Records the operation; returns its error if it must fail.
    std::optional<Error> note(std::string name, std::string path, std::string destination = {}) {
        const std::lock_guard lock(mutex_);
        const std::size_t number = operations_.size();
        operations_.push_back({std::move(name), std::move(path), std::move(destination)});
        const FileOperation& operation = operations_.back();
        if (const auto found = failingNumbers_.find(number); found != failingNumbers_.end())
            return Error::posix(found->second, operation.path);
        if (const auto found = failingNames_.find(operation.name); found != failingNames_.end())
            return Error::posix(found->second, operation.path);
        return std::nullopt;
    }

    void fail(std::string_view name, int reason) {
        const std::lock_guard lock(mutex_);
        failingNames_.erase(std::string(name));
        if (reason != 0) failingNames_.emplace(name, reason);
    }

    void failOperation(std::size_t number, int reason) {
        const std::lock_guard lock(mutex_);
        failingNumbers_.insert_or_assign(number, reason);
    }

    void cutRead(std::size_t number, std::uint64_t length) {
        const std::lock_guard lock(mutex_);
        cutReads_.insert_or_assign(number, length);
    }

    // How much of `length` the last recorded operation may read.
    std::uint64_t readableOf(std::uint64_t length) const {
        const std::lock_guard lock(mutex_);
        const auto found = cutReads_.find(operations_.size() - 1);
        return found == cutReads_.end() ? length : std::min(length, found->second);
    }

    void answerCloning(bool answer) {
        const std::lock_guard lock(mutex_);
        cloning_ = answer;
    }

    std::optional<bool> cloning() const {
        const std::lock_guard lock(mutex_);
        return cloning_;
    }

    std::vector<FileOperation> operations() const {
        const std::lock_guard lock(mutex_);
        return operations_;
    }

    // A directory without name conflicts in the trash.
    std::string freshTrashDirectory() {
        const std::lock_guard lock(mutex_);
        if (!trash_) trash_.emplace();
        std::string place = *trash_ / std::to_string(trashed_++);
        std::filesystem::create_directory(place);
        return place;
    }

  private:
    mutable std::mutex mutex_;
    std::vector<FileOperation> operations_;
    std::map<std::string, int, std::less<>> failingNames_;
    std::map<std::size_t, int> failingNumbers_;
    std::map<std::size_t, std::uint64_t> cutReads_;
    std::optional<bool> cloning_;
    std::optional<TemporaryDirectory> trash_;
    std::size_t trashed_ = 0;
};

class RecordingFileManager::Handle final : public FileHandle {
  public:
    Handle(std::unique_ptr<FileHandle> real, std::string path, std::shared_ptr<Record> record)
        : real_(std::move(real)), path_(std::move(path)), record_(std::move(record)) {}

    std::uint64_t seekToEnd() override { return note("seekToEnd"), real_->seekToEnd(); }
    std::uint64_t seek(std::uint64_t position) override { return note("seek"), real_->seek(position); }
    std::uint64_t position() override { return note("position"), real_->position(); }
    std::uint64_t size() const override { return noteReading("size"), real_->size(); }
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override {
        noteReading("read");
        return real_->readAt(offset, buffer.first(record_->readableOf(buffer.size())));
    }
    std::uint64_t nextData(std::uint64_t offset) const override { return real_->nextData(offset); }
    void reserve(std::uint64_t length) override { note("reserve"), real_->reserve(length); }
    void write(ByteView bytes) override { note("write"), real_->write(bytes); }
    void truncate(std::uint64_t length) override { note("truncate"), real_->truncate(length); }
    void synchronize() override { note("synchronize"), real_->synchronize(); }
    void close() override { note("close"), real_->close(); }

  private:
    // Records the operation; returns the reason text if it must fail.
    std::optional<std::string> failureOf(const char* name) const {
        const auto failure = record_->note(std::string("handle.") + name, path_);
        if (!failure) return std::nullopt;
        return std::string("Cannot ") + name + " " + failure->localizedDescription();
    }

    void note(const char* name) {
        if (const auto reason = failureOf(name)) throw base::FileFailure(*reason);
    }

    void noteReading(const char* name) const {
        if (const auto reason = failureOf(name))
            throw base::ReadFailure(base::ReadFailure::Kind::unreadable, *reason);
    }

    std::unique_ptr<FileHandle> real_;
    std::string path_;
    std::shared_ptr<Record> record_;
};

void PrintTo(const FileOperation& operation, std::ostream* stream) {
    *stream << operation.name << ' ' << operation.path;
    if (!operation.destination.empty()) *stream << " -> " << operation.destination;
}

files::ItemType plainTypeNaming(const files::ItemFacts& facts) {
    if (facts.isDirectory) return {"public.folder", "folder", false, false};
    if (facts.isSymbolicLink) return {"public.symlink", "alias", false, false};
    return {"public.data", "document", false, false};
}

RecordingFileManager::RecordingFileManager(files::TypeNaming typeNaming)
    : RecordingFileManager(files::makeLocalFileManager(std::move(typeNaming))) {}

RecordingFileManager::RecordingFileManager(std::unique_ptr<files::FileManager> real)
    : real_(std::move(real)), record_(std::make_shared<Record>()) {}

RecordingFileManager::~RecordingFileManager() = default;

void RecordingFileManager::fail(std::string_view name, int reason) {
    record_->fail(name, reason);
}

void RecordingFileManager::failOperation(std::size_t number, int reason) {
    record_->failOperation(number, reason);
}

void RecordingFileManager::cutRead(std::size_t number, std::uint64_t length) {
    record_->cutRead(number, length);
}

void RecordingFileManager::answerCloning(bool answer) {
    record_->answerCloning(answer);
}

void RecordingFileManager::answerTrash(const URL& location) {
    trashLocation_ = location;
}

void RecordingFileManager::answerTemporaryDirectory(const URL& directory) {
    temporaryDirectory_ = directory;
}

std::size_t RecordingFileManager::count(std::string_view name) const {
    const auto all = record_->operations();
    return static_cast<std::size_t>(std::count_if(
        all.begin(), all.end(), [&](const FileOperation& operation) { return operation.name == name; }));
}

std::vector<FileOperation> RecordingFileManager::operations() const {
    return record_->operations();
}

std::vector<std::string> RecordingFileManager::names() const {
    std::vector<std::string> names;
    for (FileOperation& operation : record_->operations()) names.push_back(std::move(operation.name));
    return names;
}

std::vector<FileOperation> RecordingFileManager::changes() const {
    auto all = record_->operations();
    std::erase_if(all, [](const FileOperation& operation) {
        return std::find(kChanges.begin(), kChanges.end(), operation.name) == kChanges.end();
    });
    return all;
}

Result<files::ResourceProperties> RecordingFileManager::resourceProperties(const URL& item) const {
    if (auto failure = record_->note("resourceProperties", item.path())) return *failure;
    return real_->resourceProperties(item);
}

Result<bool> RecordingFileManager::isRegularFile(const URL& item) const {
    if (auto failure = record_->note("isRegularFile", item.path())) return *failure;
    return real_->isRegularFile(item);
}

Result<files::ItemState> RecordingFileManager::stateOfItem(const URL& item) const {
    if (auto failure = record_->note("stateOfItem", item.path())) return *failure;
    return real_->stateOfItem(item);
}

Result<std::unique_ptr<files::ItemLock>> RecordingFileManager::lockItem(
    const URL& item, const std::function<void()>& waiting) {
    if (auto failure = record_->note("lockItem", item.path())) return *failure;
    return real_->lockItem(item, waiting);
}

Result<base::Anchor> RecordingFileManager::holdItem(const URL& item) {
    return real_->holdItem(item);
}

std::optional<URL> RecordingFileManager::mainExecutableOfBundle(const URL& directory) const {
    if (record_->note("mainExecutableOfBundle", directory.path())) return std::nullopt;
    return real_->mainExecutableOfBundle(directory);
}

Result<bool> RecordingFileManager::volumeSupportsCloning(const URL& item) const {
    if (auto failure = record_->note("volumeSupportsCloning", item.path())) return *failure;
    if (const auto answer = record_->cloning()) return *answer;
    return real_->volumeSupportsCloning(item);
}

Result<URL> RecordingFileManager::createReplacementDirectory(const URL& item) {
    if (auto failure = record_->note("createReplacementDirectory", item.path())) return *failure;
    return real_->createReplacementDirectory(item);
}

Result<void> RecordingFileManager::copyItem(const URL& source, const URL& destination) {
    if (auto failure = record_->note("copyItem", source.path(), destination.path())) return *failure;
    return real_->copyItem(source, destination);
}

Result<void> RecordingFileManager::copyContents(const URL& source, const URL& destination) {
    if (auto failure = record_->note("copyContents", source.path(), destination.path())) return *failure;
    return real_->copyContents(source, destination);
}

Result<void> RecordingFileManager::removeItem(const URL& item) {
    if (auto failure = record_->note("removeItem", item.path())) return *failure;
    return real_->removeItem(item);
}

Result<void> RecordingFileManager::replaceItem(const URL& original, const URL& replacement) {
    if (auto failure = record_->note("replaceItem", original.path(), replacement.path())) return *failure;
    return real_->replaceItem(original, replacement);
}

Result<URL> RecordingFileManager::trashItem(const URL& item) {
    if (auto failure = record_->note("trashItem", item.path())) return *failure;
    if (trashLocation_) return *trashLocation_;
    const URL place =
        URL::fileURLWithPath(record_->freshTrashDirectory()).appendingPathComponent(item.lastPathComponent());
    if (std::rename(item.path().c_str(), place.path().c_str()) != 0) return Error::posix(errno, item.path());
    return place;
}

Result<Data> RecordingFileManager::contentsOfFile(const URL& file) const {
    if (auto failure = record_->note("contentsOfFile", file.path())) return *failure;
    return real_->contentsOfFile(file);
}

Result<void> RecordingFileManager::writeFile(ByteView contents, const URL& file, Writing writing) {
    if (auto failure = record_->note("writeFile", file.path())) return *failure;
    return real_->writeFile(contents, file, writing);
}

RecordingFileManager::OpenedHandle RecordingFileManager::openForReading(const URL& file) {
    if (auto failure = record_->note("openForReading", file.path())) return *failure;
    return recordingHandle(real_->openForReading(file), file);
}

RecordingFileManager::OpenedHandle RecordingFileManager::openForUpdating(const URL& file) {
    if (auto failure = record_->note("openForUpdating", file.path())) return *failure;
    return recordingHandle(real_->openForUpdating(file), file);
}

URL RecordingFileManager::temporaryDirectory() const {
    return temporaryDirectory_ ? *temporaryDirectory_ : real_->temporaryDirectory();
}

RecordingFileManager::OpenedHandle RecordingFileManager::recordingHandle(OpenedHandle opened,
                                                                         const URL& file) {
    if (!opened) return opened;
    return std::unique_ptr<FileHandle>(std::make_unique<Handle>(std::move(*opened), file.path(), record_));
}

}  // namespace pinwell::test
