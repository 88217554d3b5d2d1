// A file manager for tests: real files, a record of all that was done to them, and failures on demand.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "files/file_manager.h"

namespace pinwell::test {

/// One call as the file manager or one of its handles saw it.
struct FileOperation {
    std::string
        name;  // the operation's own: "copyItem", "openForReading"; "handle.write", "handle.close", ...
    std::string path;         // the item; for a copy its source, for a replacement the original
    std::string destination;  // a copy's destination, the replacement; otherwise empty

    bool operator==(const FileOperation&) const = default;
};

void PrintTo(const FileOperation& operation, std::ostream* stream);

/// Directories are public.folder, links public.symlink, and all else is public.data.
files::ItemType plainTypeNaming(const files::ItemFacts& facts);

/// Passes every call on to a file manager that works on real files, writes it down first, and lets the test
/// decide that it fails instead. The trash is a directory of its own: what is trashed never leaves the test.
/// May be used from several threads once it is set up; its handles may outlive it.
class RecordingFileManager final : public files::FileManager {
  public:
    explicit RecordingFileManager(files::TypeNaming typeNaming = plainTypeNaming);
    explicit RecordingFileManager(std::unique_ptr<files::FileManager> real);
    ~RecordingFileManager() override;

    /// From now on every operation of that name fails, and does nothing. 0 lets it work again.
    void fail(std::string_view name, int reason);

    /// The operation of that number, counted from 0 over all that were recorded, fails and does nothing.
    void failOperation(std::size_t number, int reason);

    /// The operation of that number, counted the same way, is a handle's read and finds no more than `length`
    /// bytes.
    void cutRead(std::size_t number, std::uint64_t length);

    /// What volumeSupportsCloning answers, whatever the file system would say.
    void answerCloning(bool answer);

    /// Where trashItem says that an item is now, without moving it there.
    void answerTrash(const files::URL& location);

    /// What temporaryDirectory answers.
    void answerTemporaryDirectory(const files::URL& directory);

    /// How often that operation was called.
    std::size_t count(std::string_view name) const;

    /// All operations so far, in order, those that failed included.
    std::vector<FileOperation> operations() const;

    /// The same, names only.
    std::vector<std::string> names() const;

    /// Those alone that change something on disk (or would have). Empty says: nothing was written.
    std::vector<FileOperation> changes() const;

    files::Result<files::ResourceProperties> resourceProperties(const files::URL& item) override;
    files::Result<bool> isRegularFile(const files::URL& item) override;
    files::Result<files::ItemState> stateOfItem(const files::URL& item) override;
    files::Result<std::unique_ptr<files::ItemLock>> lockItem(const files::URL& item,
                                                             const std::function<void()>& waiting) override;
    /// Not written down: nothing is asked or changed by it.
    files::Result<foundation::Anchor> holdItem(const files::URL& item) override;
    std::optional<files::URL> mainExecutableOfBundle(const files::URL& directory) override;
    files::Result<bool> volumeSupportsCloning(const files::URL& item) override;
    files::Result<files::URL> createReplacementDirectory(const files::URL& item) override;
    files::Result<void> copyItem(const files::URL& source, const files::URL& destination) override;
    files::Result<void> copyContents(const files::URL& source, const files::URL& destination) override;
    files::Result<void> removeItem(const files::URL& item) override;
    files::Result<void> replaceItem(const files::URL& original, const files::URL& replacement) override;
    files::Result<files::URL> trashItem(const files::URL& item) override;
    files::Result<files::Data> contentsOfFile(const files::URL& file) override;
    files::Result<void> writeFile(files::ByteView contents, const files::URL& file, Writing writing) override;
    files::Result<std::unique_ptr<files::FileHandle>> openForReading(const files::URL& file) override;
    files::Result<std::unique_ptr<files::FileHandle>> openForUpdating(const files::URL& file) override;
    files::URL temporaryDirectory() override;

  private:
    class Record;
    class Handle;

    using OpenedHandle = files::Result<std::unique_ptr<files::FileHandle>>;
    OpenedHandle recordingHandle(OpenedHandle opened, const files::URL& file);

    std::unique_ptr<files::FileManager> real_;
    std::shared_ptr<Record> record_;
    std::optional<files::URL> trashLocation_;
    std::optional<files::URL> temporaryDirectory_;
};

}  // namespace pinwell::test
