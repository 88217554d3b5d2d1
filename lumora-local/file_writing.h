// Writes whole files: a reader sees all of a file or no file. Never follows a symbolic link.
#pragma once

#include <sys/types.h>

#include <string>

#include "base/bytes.h"

namespace pinwell::lumora {

// The modes of new files and directories. "Private" means for the service's own user.
inline constexpr mode_t kPublicFileMode = 0644;
inline constexpr mode_t kPrivateFileMode = 0600;
inline constexpr mode_t kProgramFileMode = 0755;
inline constexpr mode_t kPublicDirectoryMode = 0755;
inline constexpr mode_t kPrivateDirectoryMode = 0700;

/// Makes a new file, and flushes it to the disk before it returns. `mode` is subject to the umask. Throws
/// Failure (EX_CANTCREAT if it cannot be made, EX_IOERR if it cannot be written). Then no new file
/// remains.
void writeNewFile(const std::string& path, base::ByteView contents, mode_t mode);

/// Replaces the file at `path` by `contents`, by one rename of a flushed sibling. If it throws Failure, the
/// old file is unchanged.
void replaceFile(const std::string& path, base::ByteView contents, mode_t mode);

/// Makes a new directory. Throws Failure.
void makeDirectory(const std::string& path, mode_t mode);

/// Makes a new symbolic link. Throws Failure.
void makeLink(const std::string& path, const std::string& target);

/// Flushes a directory, so that the names in it survive a crash. Throws Failure.
void flushDirectory(const std::string& path);

/// An unused name for a hidden sibling of `path`; nothing is made.
std::string temporarySiblingOf(const std::string& path);

/// `path` and `suffix`, followed by a number if this name exists already.
std::string freeName(const std::string& path, const std::string& suffix);

/// A directory under construction beside its final place. It is removed again unless it is published.
class PendingDirectory {
  public:
    /// Makes the directory. Throws Failure (EX_CANTCREAT) if it cannot, or if `finalPath` is anything except
    /// an empty directory.
    PendingDirectory(std::string finalPath, mode_t mode);
    ~PendingDirectory();
    PendingDirectory(const PendingDirectory&) = delete;
    PendingDirectory& operator=(const PendingDirectory&) = delete;

    /// The place to build in, until it is published.
    const std::string& path() const noexcept { return path_; }

    /// Moves it to its final place in one step. Throws Failure if the place has been taken,
    /// because a rename replaces only an empty directory, or if the move cannot be made
    /// durable.
    void publish();

  private:
    std::string finalPath_;
    std::string path_;
    bool published_ = false;
};

}  // namespace pinwell::lumora
