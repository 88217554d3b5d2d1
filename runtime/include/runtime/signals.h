// Handlers of signals: deferring those that would end the process, and recognising a stack that is used up.
#pragma once

#include <cstddef>
#include <memory>

namespace pinwell::runtime {

/// Defers signals that would end the process until a write or another critical step is complete. While it
/// lives, SIGHUP, SIGINT, SIGTERM and SIGXCPU have no effect; signals that came take effect when it
/// is destroyed. A signal that the process ignores stays ignored.
///
/// It changes the signals' handlers, not the masks. Each thread has its own mask, and a signal ends the
/// process through any thread that does not block it, for example a waiting main thread. A process has one
/// set of handlers, so there must be only one deferral at a time.
class SignalDeferral {
  public:
    SignalDeferral();
    ~SignalDeferral();
    SignalDeferral(const SignalDeferral&) = delete;
    SignalDeferral& operator=(const SignalDeferral&) = delete;
};

/// Detects that a thread has used up its stack. A thread that exceeds its stack faults, and its fault handler
/// has no stack to run on. A guard gives the thread a second stack for handlers, and remembers the end of its
/// own stack, so that a handler can recognise this fault.
///
/// Guards the thread that makes it, while it lives. One for each thread. A main thread's guard uses the stack
/// limit at that time, and does not work without a limit. Does nothing in builds with sanitizers, which have
/// their own handler stacks.
class StackGuard {
  public:
    StackGuard();
    ~StackGuard();
    StackGuard(const StackGuard&) = delete;
    StackGuard& operator=(const StackGuard&) = delete;

    /// Whether a fault at `address` means that the calling thread exceeded its stack. False for a thread
    /// without a guard. May be called in a signal handler.
    static bool isBeyondStack(const void* address) noexcept;

  private:
    std::unique_ptr<std::byte[]> handlerStack_;
};

}  // namespace pinwell::runtime
