// Paths or names, read during the work: first from the command line, then from a file.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "foundation/error.h"
#include "foundation/file_io.h"

namespace pinwell::companion {

/// Longer paths cannot exist (PATH_MAX), and are cut to this length.
inline constexpr std::size_t kLongestPath = 4096;

class PathList {
  public:
    /// `from` is a file, "-" is standard input. An error names a file that cannot be opened.
    static foundation::Result<PathList> open(std::vector<std::string> paths,
                                             const std::optional<std::string>& from, bool isZeroTerminated);

    enum class State : std::uint8_t {
        path,
        end,
        wait,   // standard input has nothing yet: poll descriptor()
        broken  // reading failed: error()
    };

    /// The next path. Empty lines are skipped. Never blocks.
    State next(std::string& path);

    /// The same, but blocks if next() returns `wait`.
    State nextOrWait(std::string& path);

    /// For `wait`: readable when there is more.
    int descriptor() const noexcept { return file_.get(); }

    /// For `broken`.
    const std::optional<foundation::Error>& error() const noexcept { return error_; }

  private:
    PathList(std::vector<std::string> paths, foundation::FileDescriptor file, std::string name,
             char separator);
    std::optional<std::string> takeLine();
    State fill();

    std::vector<std::string> paths_;
    std::size_t nextPath_ = 0;

    foundation::FileDescriptor file_;
    std::string name_;
    char separator_;
    std::vector<char> buffer_;
    std::size_t begin_ = 0;
    std::size_t end_ = 0;
    bool ended_ = false;
    std::string line_;  // the part of the next line read so far
    std::optional<foundation::Error> error_;
};

}  // namespace pinwell::companion
