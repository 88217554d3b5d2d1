// File operations of the tool: properties of an item, safe copies and swaps, and file handles.
//
// All calls block and may be made from any thread; one handle serves one thread at a time. Errors are of
// kPOSIXErrorDomain and name the path; a URL that is not a file URL, or a path that contains a zero byte,
// gives EINVAL. No write follows a symbolic link in the last path component. Below a held item, a link that
// leads out of it is refused (EXDEV). Every file is opened close-on-exec.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "base/error.h"
#include "base/places.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell::files {

using base::ByteView;
using base::Data;
using base::Result;
using values::Dictionary;
using values::URL;

/// The facts about the path itself; a link in its last component is not followed.
struct ItemFacts {
    std::string name;  // last path component
    bool isDirectory = false;
    bool isRegularFile = false;
    bool isSymbolicLink = false;
    bool isExecutable = false;  // any execute bit
};

/// The state of an item, to detect later changes at its path: another file, another length, other contents.
/// Mode, links and attributes are not part of it. It misses a change of the same length within one tick of
/// the file system's clock (about 4 ms before Linux 6.13).
struct ItemState {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::uint64_t size = 0;
    std::int64_t modifiedSeconds = 0;  // since the epoch
    std::int64_t modifiedNanoseconds = 0;

    bool operator==(const ItemState&) const = default;
};

/// The type of an item, from the type service.
struct ItemType {
    std::string identifier;
    std::string localizedDescription;
    bool isPackage = false;
    bool isApplication = false;
};

/// The file manager's source of an item's type; passed in at construction.
using TypeNaming = std::function<ItemType(const ItemFacts&)>;

struct ResourceProperties {
    bool isDirectory = false;
    bool isPackage = false;
    bool isApplication = false;
    bool isSymbolicLink = false;
    std::string typeIdentifier;
    std::string localizedTypeDescription;

    /// All six under their names as above, for the verbose dump.
    Dictionary dictionary() const;
};

/// An open regular file: it is read at any offset, and can also be written, at a position of its own. A write
/// past its end leaves a hole. Its size() is that at opening. The operations throw base::FileFailure, whose
/// reason text names the operation and the file; the destructor closes the file and ignores errors.
class FileHandle : public base::ByteSource {
  public:
    /// Both return the new position for writing, in bytes from the start; it is 0 at first. A position past
    /// the end is allowed. Reading neither uses nor moves it.
    virtual std::uint64_t seekToEnd() = 0;
    virtual std::uint64_t seek(std::uint64_t position) = 0;
    virtual std::uint64_t position() = 0;

    /// Reserves space on the volume for the next `length` bytes from the position on, if the file system
    /// can. Does not change the file's length. So a full volume is detected here, before anything is
    /// overwritten.
    virtual void reserve(std::uint64_t length) = 0;

    /// Writes all of `bytes`.
    virtual void write(ByteView bytes) = 0;

    /// Cuts the file, or extends it with zeroes. The position does not change.
    virtual void truncate(std::uint64_t length) = 0;

    /// Returns when the file's data and metadata are on stable storage.
    virtual void synchronize() = 0;

    /// Closes and reports errors. Further calls are errors; closing twice is not.
    virtual void close() = 0;
};

/// An advisory lock on an item, until it is destroyed.
class ItemLock {
  public:
    virtual ~ItemLock() = default;
};

/// Longest file that is read whole: tickets and other such files are far smaller.
inline constexpr std::uint64_t kMaximumWholeFile = 64ULL * 1024 * 1024;

class FileManager {
  public:
    virtual ~FileManager() = default;

    /// The six properties in one request.
    virtual Result<ResourceProperties> resourceProperties(const URL& item) const = 0;

    /// The item itself, not the target of a link.
    virtual Result<bool> isRegularFile(const URL& item) const = 0;

    /// The item itself, not the target of a link.
    virtual Result<ItemState> stateOfItem(const URL& item) const = 0;

    /// An advisory lock (flock(2), exclusive) on the file or directory that the path names when the lock is
    /// taken, even if the path named another one when the wait began. It does not block processes that do not
    /// take it: file systems that would enforce it (CIFS, SMB) are refused with EOPNOTSUPP. Calls `waiting`
    /// once if another process holds the lock, and waits for at most a minute (EBUSY). Other errors mean that
    /// the item does not exist, or that its file system has no locks.
    virtual Result<std::unique_ptr<ItemLock>> lockItem(const URL& item,
                                                       const std::function<void()>& waiting) = 0;

    /// Holds the item: until the result is destroyed, this manager resolves it, and all paths below a
    /// directory, from the descriptor opened now (base::Places).
    virtual Result<base::Anchor> holdItem(const URL& item) = 0;

    /// Main executable of the directory, opened as a bundle.
    virtual std::optional<URL> mainExecutableOfBundle(const URL& directory) const = 0;

    /// Whether the file system can clone that file (reflink). The probe creates no file, except an
    /// unnamed one if the item is another user's and is only readable. Returns an error if the probe
    /// itself fails.
    virtual Result<bool> volumeSupportsCloning(const URL& item) const = 0;

    /// A fresh directory of mode 0700 beside `item`, named `.pinwell-replacement-` and six random characters.
    virtual Result<URL> createReplacementDirectory(const URL& item) = 0;

    /// A copy at `destination`, which must not exist (EEXIST): a clone if possible. Copies mode, owner if
    /// permitted, extended attributes, access control list and times, as far as the volume can store them. A
    /// failed copy leaves nothing there. Regular files only (EINVAL, EISDIR, ELOOP). Not flushed to stable
    /// storage.
    virtual Result<void> copyItem(const URL& source, const URL& destination) = 0;

    /// A new file at `destination`, which must not exist, with only the source's bytes: mode and owner are
    /// those of any new file there. The file and its name are on stable storage when this returns. A failed
    /// copy leaves nothing there. Regular files only.
    virtual Result<void> copyContents(const URL& source, const URL& destination) = 0;

    /// Removes a file, a link, or a directory with its contents; follows no link. After an error, the item
    /// that it names still exists, and maybe others.
    virtual Result<void> removeItem(const URL& item) = 0;

    /// Replaces `original` by `replacement` with one rename, durable before it returns. First copies
    /// the original's mode, owner, extended attributes and access control list (not its times: the
    /// contents are new). Both are regular files, and not the same one. Afterwards the replacement's
    /// old path is empty. Its directory is removed if it is from createReplacementDirectory and is
    /// empty. An error leaves both files in place, except if the directory's flush after the swap
    /// fails.
    virtual Result<void> replaceItem(const URL& original, const URL& replacement) = 0;

    /// Moves the item (a link itself) to the user's freedesktop.org trash, or to the volume's own if it is
    /// not on the home directory's volume. Returns its new place. An error leaves it in place, unless only
    /// the new place is unknown; the user information has the underlying error.
    virtual Result<URL> trashItem(const URL& item) = 0;

    /// The whole of a regular file of at most kMaximumWholeFile bytes (EFBIG). Follows no link in the last
    /// component (ELOOP), never blocks on anything but a regular file (EINVAL, EISDIR).
    virtual Result<Data> contentsOfFile(const URL& file) const = 0;

    /// Writes a file of mode 0600 and flushes its contents to stable storage. `atomic` writes a file beside
    /// it and renames it into place; only a directory is not replaced. A failure leaves no file behind.
    /// `plain` makes a new file, with its name on stable storage too, and removes it on failure; or
    /// overwrites an existing regular file, which a failure leaves half written.
    enum class Writing { plain, atomic };
    virtual Result<void> writeFile(ByteView contents, const URL& file, Writing writing) = 0;

    /// Regular files only (EINVAL, EISDIR, ELOOP); never blocks on anything else. The file must exist.
    virtual Result<std::unique_ptr<FileHandle>> openForReading(const URL& file) = 0;
    virtual Result<std::unique_ptr<FileHandle>> openForUpdating(const URL& file) = 0;

    /// $TMPDIR if it is an absolute path, otherwise /tmp.
    virtual URL temporaryDirectory() const = 0;
};

/// The file manager of this machine. `typeNaming` must be callable from any thread. Paths are resolved
/// through `places`, which other services may share.
std::unique_ptr<FileManager> makeLocalFileManager(
    TypeNaming typeNaming, std::shared_ptr<base::Places> places = std::make_shared<base::Places>());

}  // namespace pinwell::files
