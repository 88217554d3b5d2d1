// Files as the tool handles them: questions about an item, safe copies and swaps, and file handles.
//
// All calls block and may be made from any thread; one handle serves one thread at a time. Errors are of
// kPOSIXErrorDomain and name the path; a URL that is no file's, or a path with a zero byte in it, is EINVAL.
// Nothing is ever written through a symbolic link in the last path component, and nothing below a held item
// is reached through one that leads out of it (EXDEV). Every file is opened close-on-exec.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "files/file_reader.h"
#include "foundation/bytes.h"
#include "foundation/error.h"
#include "foundation/places.h"
#include "foundation/url.h"
#include "foundation/value_fwd.h"

namespace pinwell::files {

using foundation::ByteView;
using foundation::Data;
using foundation::Dictionary;
using foundation::Result;
using foundation::URL;

/// What the path itself is; its last component's link is not followed.
struct ItemFacts {
    std::string name;  // last path component
    bool isDirectory = false;
    bool isRegularFile = false;
    bool isSymbolicLink = false;
    bool isExecutable = false;  // any execute bit
};

/// What tells an item as it is now from the same path later: another file in its place, another length, other
/// contents. Its mode, its links and its attributes do not count. A change that keeps the length, in the same
/// tick of the file system's clock as the one before it (4 ms or so before Linux 6.13), does not show.
struct ItemState {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::uint64_t size = 0;
    std::int64_t modifiedSeconds = 0;  // since the epoch
    std::int64_t modifiedNanoseconds = 0;

    bool operator==(const ItemState&) const = default;
};

/// What the type service says of an item.
struct ItemType {
    std::string identifier;
    std::string localizedDescription;
    bool isPackage = false;
    bool isApplication = false;
};

/// How the file manager asks for an item's type; put in by whoever builds it.
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

/// An open regular file that can be written to as well; what is written past its end leaves a hole. The
/// operations throw FileHandleError; the destructor closes, and swallows what goes wrong then.
class FileHandle : public FileReader {
  public:
    /// Sees to it that the next `length` bytes from the position on will find room on the volume, where the
    /// file system can promise that; the file is as long as before. A volume that is full says so here, while
    /// nothing has been overwritten yet.
    virtual void reserve(std::uint64_t length) = 0;

    /// Writes all of `bytes`.
    virtual void write(ByteView bytes) = 0;

    /// Cuts the file, or extends it with zeroes. The position stays where it is.
    virtual void truncate(std::uint64_t length) = 0;

    /// Returns when the file's data and metadata are on stable storage.
    virtual void synchronize() = 0;

    /// Closes and reports. Further calls are errors; closing twice is none.
    virtual void close() = 0;
};

/// Holds an item against other writers that ask, until it dies.
class ItemLock {
  public:
    virtual ~ItemLock() = default;
};

/// Longest file that is ever read whole: no ticket, nor anything else that is read so, comes near it.
inline constexpr std::uint64_t kMaximumWholeFile = 64ULL * 1024 * 1024;

class FileManager {
  public:
    virtual ~FileManager() = default;

    /// The six properties in one request.
    virtual Result<ResourceProperties> resourceProperties(const URL& item) = 0;

    /// The item itself, not what a link leads to.
    virtual Result<bool> isRegularFile(const URL& item) = 0;

    /// The item itself, not what a link leads to.
    virtual Result<ItemState> stateOfItem(const URL& item) = 0;

    /// An advisory lock (flock(2), exclusive) on the file or directory that the path names once the lock is
    /// had, whatever stood there when the waiting began. It does not block processes that do not take it:
    /// file systems that would make it do so (CIFS, SMB) are refused with EOPNOTSUPP. Calls `waiting` once if
    /// another process holds the lock, and waits for a minute at most (EBUSY). Other errors say that there is
    /// nothing to lock, or that its file system knows no locks.
    virtual Result<std::unique_ptr<ItemLock>> lockItem(const URL& item,
                                                       const std::function<void()>& waiting) = 0;

    /// Holds the item: until the result dies, this manager finds it, and for a directory all below it, from
    /// the descriptor that is opened now (foundation::Places).
    virtual Result<foundation::Anchor> holdItem(const URL& item) = 0;

    /// Main executable of the directory, opened as a bundle.
    virtual std::optional<URL> mainExecutableOfBundle(const URL& directory) = 0;

    /// Whether the file system can clone that very file (reflink), found by asking it without making a file
    /// (but for a file without a name where the item is another user's and may only be read). An error is a
    /// question that could not be put.
    virtual Result<bool> volumeSupportsCloning(const URL& item) = 0;

    /// A fresh directory of mode 0700 beside `item`, named `.pinwell-replacement-` and six random characters.
    virtual Result<URL> createReplacementDirectory(const URL& item) = 0;

    /// A copy at `destination`, which must not exist (EEXIST): a clone where that can be; carries mode, owner
    /// where permitted, extended attributes, access control list and times, as far as the volume can keep
    /// them. A failed copy leaves nothing there. Regular files only (EINVAL, EISDIR, ELOOP). Not flushed to
    /// stable storage.
    virtual Result<void> copyItem(const URL& source, const URL& destination) = 0;

    /// A new file at `destination`, which must not exist, with the source's bytes and nothing else of it:
    /// mode and owner are those of any file newly made there. On stable storage, its name too, when this
    /// returns. A failed copy leaves nothing there. Regular files only.
    virtual Result<void> copyContents(const URL& source, const URL& destination) = 0;

    /// Removes a file, a link, or a directory with all that is in it; follows no link. What an error names is
    /// still there, and so may be more.
    virtual Result<void> removeItem(const URL& item) = 0;

    /// Puts `replacement` in the place of `original` with one rename, durable before it returns, after
    /// carrying over the original's mode, owner, extended attributes and access control list (not its times:
    /// the contents are new). Both are regular files, and not the same one. Afterwards the replacement's old
    /// path holds nothing, and the directory it stood in is gone when it is one of
    /// createReplacementDirectory's and holds nothing else. An error leaves both files where they were,
    /// except when it is the directory's flush after the swap that fails.
    virtual Result<void> replaceItem(const URL& original, const URL& replacement) = 0;

    /// Moves the item (a link itself) to the user's freedesktop.org trash, the volume's own where it is not
    /// the home directory's; answers where it is now. An error leaves it where it was, except when it is
    /// where it went that cannot be told; what is beneath is the user information's underlying error.
    virtual Result<URL> trashItem(const URL& item) = 0;

    /// The whole of a regular file of at most kMaximumWholeFile bytes (EFBIG). Follows no link in the last
    /// component (ELOOP), never blocks on what is not a regular file (EINVAL, EISDIR).
    virtual Result<Data> contentsOfFile(const URL& file) = 0;

    /// Writes a file of mode 0600 and flushes its contents to stable storage. Atomically: to a file beside it
    /// that is then renamed into place, replacing whatever non-directory is there; a failure leaves nothing
    /// behind. Otherwise plainly: a new file, which a failure removes, and whose name is on stable storage
    /// too; or an existing regular file overwritten, which a failure leaves half written.
    enum class Writing { plain, atomic };
    virtual Result<void> writeFile(ByteView contents, const URL& file, Writing writing) = 0;

    /// Regular files only (EINVAL, EISDIR, ELOOP); never blocks on anything else. The file must exist.
    virtual Result<std::unique_ptr<FileHandle>> openForReading(const URL& file) = 0;
    virtual Result<std::unique_ptr<FileHandle>> openForUpdating(const URL& file) = 0;

    /// $TMPDIR when it is an absolute path, else /tmp.
    virtual URL temporaryDirectory() = 0;
};

/// The file manager of this machine. `typeNaming` must be callable, from any thread. Files are found through
/// `places`, which other services may share.
std::unique_ptr<FileManager> makeLocalFileManager(
    TypeNaming typeNaming,
    std::shared_ptr<foundation::Places> places = std::make_shared<foundation::Places>());

}  // namespace pinwell::files
