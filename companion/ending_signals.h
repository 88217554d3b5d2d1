// The signals that end a run, read one at a time instead of ending the process.
#pragma once

#include <functional>
#include <optional>
#include <thread>

#include "foundation/file_io.h"

namespace pinwell::companion {

/// The exit status after a signal is this plus its number.
inline constexpr int kSignalBase = 128;

/// Blocks SIGHUP, SIGINT and SIGTERM in the calling thread, and in the threads that it starts. Returns a
/// descriptor from which they can be read (signalfd(2)). A signal ignored from the start, for example by
/// nohup(1), stays ignored.
foundation::FileDescriptor takeEndingSignals();

/// The next pending signal; `nullopt` if there is none.
std::optional<int> nextEndingSignal(const foundation::FileDescriptor& signals);

/// A thread that waits for these signals while the others work.
class SignalWatch {
  public:
    /// `react` is called once, on the watch's thread, for the first signal that comes.
    SignalWatch(foundation::FileDescriptor signals, std::function<void(int number)> react);
    ~SignalWatch();
    SignalWatch(const SignalWatch&) = delete;
    SignalWatch& operator=(const SignalWatch&) = delete;

  private:
    foundation::FileDescriptor signals_;
    foundation::FileDescriptor end_;
    std::thread thread_;
};

}  // namespace pinwell::companion
