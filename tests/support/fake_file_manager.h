// A file manager for tests: real files, a record of all operations, and failures on demand.
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

/// Records every call and passes it on to a file manager on real files. The test can make a call fail
/// instead. The trash is a separate directory: trashed items never leave the test. For several threads after
/// the setup; its handles may outlive it.
class RecordingFileManager final : public files::FileManager {
  public:
    explicit RecordingFileManager(files::TypeNaming typeNaming = plainTypeNaming);
    explicit RecordingFileManager(std::unique_ptr<files::FileManager> real);
    ~RecordingFileManager() override;

    /// After this call, every operation of that name fails, and does nothing. 0 lets it work again.
    void fail(std::string_view name, int reason);

    /// The operation of that number, counted from 0 over all recorded ones, fails and does nothing.
    void failOperation(std::size_t number, int reason);

    /// The operation of that number, counted the same way, is a handle's read and finds no more than `length`
    /// bytes.
    void cutRead(std::size_t number, std::uint64_t length);

    /// The result of volumeSupportsCloning, on any file system.
    void answerCloning(bool answer);

    /// The location that trashItem reports, without moving the item.
    void answerTrash(const files::URL& location);

    /// The result of temporaryDirectory.
    void answerTemporaryDirectory(const files::URL& directory);

    /// The number of calls of that operation.
    std::size_t count(std::string_view name) const;

    /// All operations so far, in order, with the failed ones.
    std::vector<FileOperation> operations() const;

    /// The same, names only.
    std::vector<std::string> names() const;

    /// Only operations that change files on disk, with the failed ones. If empty, nothing was written.
    std::vector<FileOperation> changes() const;

    files::Result<files::ResourceProperties> resourceProperties(const files::URL& item) const override;
    files::Result<bool> isRegularFile(const files::URL& item) const override;
    files::Result<files::ItemState> stateOfItem(const files::URL& item) const override;
    files::Result<std::unique_ptr<files::ItemLock>> lockItem(const files::URL& item,
                                                             const std::function<void()>& waiting) override;
    /// Not recorded: it reads and changes nothing.
    files::Result<base::Anchor> holdItem(const files::URL& item) override;
    std::optional<files::URL> mainExecutableOfBundle(const files::URL& directory) const override;
    files::Result<bool> volumeSupportsCloning(const files::URL& item) const override;
    files::Result<files::URL> createReplacementDirectory(const files::URL& item) override;
    files::Result<void> copyItem(const files::URL& source, const files::URL& destination) override;
    files::Result<void> copyContents(const files::URL& source, const files::URL& destination) override;
    files::Result<void> removeItem(const files::URL& item) override;
    files::Result<void> replaceItem(const files::URL& original, const files::URL& replacement) override;
    files::Result<files::URL> trashItem(const files::URL& item) override;
    files::Result<files::Data> contentsOfFile(const files::URL& file) const override;
    files::Result<void> writeFile(files::ByteView contents, const files::URL& file, Writing writing) override;
    files::Result<std::unique_ptr<files::FileHandle>> openForReading(const files::URL& file) override;
    files::Result<std::unique_ptr<files::FileHandle>> openForUpdating(const files::URL& file) override;
    files::URL temporaryDirectory() const override;

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
