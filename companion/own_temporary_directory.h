// A temporary directory of the process's own, so that all files of a run can be removed with it.
#pragma once

#include <string>

#include "foundation/error.h"

namespace pinwell::companion {

/// Makes a directory of mode 0700 in the user's temporary directory, and makes it the process's temporary
/// directory ($TMPDIR). Make it before there is a second thread.
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

    /// Whether it is not empty.
    bool holdsFiles() const;

  private:
    explicit OwnTemporaryDirectory(std::string path) : path_(std::move(path)) {}

    std::string path_;  // empty after removal or a move
};

}  // namespace pinwell::companion
