// The input and the output of the companions.
//
// Input is a list of paths or names, read during the work: first from the command line, then from a file.
// Output is whole lines, in colour only on a terminal.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/error.h"
#include "base/handle.h"

namespace pinwell::companion {

/// Longer paths cannot exist (PATH_MAX), and are cut to this length.
inline constexpr std::size_t kLongestPath = 4096;

class PathList {
  public:
    /// `from` is a file, "-" is standard input. An error names a file that cannot be opened.
    static base::Result<PathList> open(std::vector<std::string> paths, const std::optional<std::string>& from,
                                       bool isZeroTerminated);

    enum class State : std::uint8_t {
        path,
        end,
        wait,   // standard input has nothing yet: poll descriptor()
        broken  // reading failed: error()
    };

    struct Entry {
        State state = State::end;
        std::string path{};  // empty unless the state is `path`
    };

    /// The next path. Empty lines are skipped. Never blocks.
    Entry next();

    /// The same, but blocks until the state is not `wait`.
    Entry nextOrWait();

    /// For `wait`: readable when there is more.
    int descriptor() const noexcept { return file_.get(); }

    /// For `broken`.
    const std::optional<base::Error>& error() const noexcept { return error_; }

  private:
    PathList(std::vector<std::string> paths, base::FileDescriptor file, std::string name, char separator);
    std::optional<std::string> takeLine();
    State fill();

    std::vector<std::string> paths_;
    std::size_t nextPath_ = 0;

    base::FileDescriptor file_;
    std::string name_;
    char separator_;
    std::vector<char> buffer_;
    std::size_t begin_ = 0;
    std::size_t end_ = 0;
    bool ended_ = false;
    std::string line_;  // the part of the next line read so far
    std::optional<base::Error> error_;
};

enum class ColorWhen { automatic, always, never };

/// "auto", "always" and "never", as --color has them.
ColorWhen colorWhenNamed(std::string_view name) noexcept;

/// Whether to colour the output to this descriptor. --color decides first, then NO_COLOR and CLICOLOR_FORCE
/// (https://no-color.org, https://bixense.com/clicolors/), then whether it is a terminal.
bool wantsColor(ColorWhen when, int descriptor);

/// Standard output, or another descriptor. A closed pipe is not an error: the rest of the output is dropped.
/// For one thread.
class Output {
  public:
    explicit Output(int descriptor) : descriptor_(descriptor) {}

    /// Writes the whole text, and waits for a slow reader.
    void write(std::string_view text);

    /// Whether a write failed for another reason than a closed pipe, for example a full disk.
    bool hasFailed() const noexcept { return failed_; }

  private:
    const int descriptor_;
    bool closed_ = false;
    bool failed_ = false;
};

/// The mode of new files, without the bits of the user's mask.
inline constexpr mode_t kNewFileMode = 0666;

/// A new file that is to replace another.
struct FileBeside {
    std::string path;
    base::FileDescriptor file;
};

/// Makes a file beside `path`, with `path` and a random ending as its name, and with the mode that a new file
/// gets. Reads the user's mask by setting it, so no other thread may create files meanwhile.
base::Result<FileBeside> makeFileBeside(const std::string& path);

}  // namespace pinwell::companion
