// Stacks that tell when they are used up.
//
// A thread that goes beyond its stack faults, and its fault handler has nowhere to run. A guard gives the
// thread a second stack for handlers, and remembers where its own one ends, so that a handler can tell this
// fault from others.
#pragma once

#include <cstddef>
#include <memory>

namespace pinwell::foundation {

/// Guards the thread that makes it, for as long as it lives. One a thread. A main thread's guard goes by the
/// limit on stacks at that time, and cannot tell the end of a stack without a limit. Does nothing in builds
/// with sanitizers, which have such stacks of their own.
class StackGuard {
  public:
    StackGuard();
    ~StackGuard();
    StackGuard(const StackGuard&) = delete;
    StackGuard& operator=(const StackGuard&) = delete;

    /// Whether `address` is where the calling thread faults when it goes beyond its stack. False for a thread
    /// without a guard. May be called in a signal handler.
    static bool isBeyondStack(const void* address) noexcept;

  private:
    std::unique_ptr<std::byte[]> handlerStack_;
};

}  // namespace pinwell::foundation
