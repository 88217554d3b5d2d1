// Writing whole files so that a reader sees all of one or nothing, and never through a symbolic link.
#pragma once

#include <sys/types.h>

#include <string>

#include "foundation/bytes.h"

namespace pinwell::lumora {

/// Makes a file that must not exist yet, flushed to the disk before this returns. `mode` is subject to the
/// umask. Throws Failure (EX_CANTCREAT when it cannot be made, EX_IOERR when it cannot be written), and then
/// no file is left that was not there before.
void writeNewFile(const std::string& path, foundation::ByteView contents, mode_t mode);

/// Puts `contents` in the place of whatever file stands at `path`, by one rename of a flushed sibling.
/// Throws Failure, and then the old file is untouched.
void replaceFile(const std::string& path, foundation::ByteView contents, mode_t mode);

/// Makes one directory that must not exist yet. Throws Failure.
void makeDirectory(const std::string& path, mode_t mode);

/// Makes a symbolic link that must not exist yet. Throws Failure.
void makeLink(const std::string& path, const std::string& target);

/// Flushes a directory, so that the names in it survive a crash. Throws Failure.
void flushDirectory(const std::string& path);

/// A name for a hidden sibling of `path` that nothing else uses; nothing is made.
std::string temporarySiblingOf(const std::string& path);

/// `path` and `suffix`, with a number behind them where there is such a name already.
std::string freeName(const std::string& path, const std::string& suffix);

/// A directory under construction beside its final place. It is removed again unless it is published.
class PendingDirectory {
  public:
    /// Makes the directory. Throws Failure (EX_CANTCREAT) when it cannot, or when `finalPath` is taken by
    /// anything but an empty directory.
    PendingDirectory(std::string finalPath, mode_t mode);
    ~PendingDirectory();
    PendingDirectory(const PendingDirectory&) = delete;
    PendingDirectory& operator=(const PendingDirectory&) = delete;

    /// Where to build, until it is published.
    const std::string& path() const noexcept { return path_; }

    /// Moves it to its final place in one step. Throws Failure when that has been taken meanwhile, for a
    /// rename of a directory replaces nothing but an empty directory, or when the move cannot be made
    /// durable.
    void publish();

  private:
    std::string finalPath_;
    std::string path_;
    bool published_ = false;
};

}  // namespace pinwell::lumora
