// A temporary directory of the process's own, so that what a run leaves can be removed with it.
#pragma once

#include <string>

#include "foundation/error.h"

namespace pinwell::companion {

/// Makes a directory of mode 0700 in the user's temporary directory, and makes it the process's temporary
/// directory ($TMPDIR). To be made before there is a second thread.
class OwnTemporaryDirectory {
  public:
    /// `name` begins the directory's name.
    static foundation::Result<OwnTemporaryDirectory> make(const std::string& name);

    OwnTemporaryDirectory(OwnTemporaryDirectory&& other) noexcept;
    OwnTemporaryDirectory& operator=(OwnTemporaryDirectory&&) = delete;

    /// Removes it if it is empty.
    ~OwnTemporaryDirectory();

    const std::string& path() const noexcept { return path_; }

    /// Removes it with all that is in it.
    void remove();

    /// Whether there is something in it.
    bool holdsFiles() const;

  private:
    explicit OwnTemporaryDirectory(std::string path) : path_(std::move(path)) {}

    std::string path_;  // empty once it has been removed or moved from
};

}  // namespace pinwell::companion
