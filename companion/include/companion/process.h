// The process of a run: its main, the signals that end it, and its temporary directory.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <thread>

#include "base/error.h"
#include "base/handle.h"

namespace pinwell::companion {

/// The main of a companion: calls `run` and returns its exit status. Before that, it opens missing standard
/// streams, and makes failed writes of a closed pipe and of a file over the caller's limit (RLIMIT_FSIZE). An
/// exception becomes a line on standard error and EX_SOFTWARE.
int runMain(std::string_view program, const std::function<int()>& run);

/// The exit status after a signal is this plus its number.
inline constexpr int kSignalBase = 128;

/// Blocks SIGHUP, SIGINT and SIGTERM in the calling thread, and in the threads that it starts. Returns a
/// descriptor from which they can be read (signalfd(2)). A signal ignored from the start, for example by
/// nohup(1), stays ignored.
base::FileDescriptor takeEndingSignals();

/// The next pending signal; `nullopt` if there is none.
std::optional<int> nextEndingSignal(const base::FileDescriptor& signals);

/// A thread that waits for these signals while the others work.
class SignalWatch {
  public:
    /// `react` is called once, on the watch's thread, for the first signal that comes.
    SignalWatch(base::FileDescriptor signals, std::function<void(int number)> react);
    ~SignalWatch();
    SignalWatch(const SignalWatch&) = delete;
    SignalWatch& operator=(const SignalWatch&) = delete;

  private:
    base::FileDescriptor signals_;
    base::FileDescriptor end_;
    std::thread thread_;
};

/// A directory of mode 0700 in the user's temporary directory, which becomes the process's temporary
/// directory ($TMPDIR): all files of a run can be removed with it. Make it before there is a second thread.
class OwnTemporaryDirectory {
  public:
    /// `name` begins the directory's name.
    static base::Result<OwnTemporaryDirectory> make(const std::string& name);

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
