// Detects that a thread has used up its stack.
//
// A thread that exceeds its stack faults, and its fault handler has no stack to run on. A guard gives the
// thread a second stack for handlers, and remembers the end of its own stack, so that a handler can recognise
// this fault.
#pragma once

#include <cstddef>
#include <memory>

namespace pinwell::foundation {

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

}  // namespace pinwell::foundation
