// Wakes a thread that waits in poll(2).
#pragma once

#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <system_error>

#include "foundation/file_io.h"

namespace pinwell::batch {

class WakeUp {
  public:
    WakeUp() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
        if (!event_) throw std::system_error(errno, std::generic_category(), "eventfd");
    }

    /// From any thread.
    void raise() noexcept {
        const std::uint64_t one = 1;
        // Fails only if the counter is full; then the descriptor is already readable.
        [[maybe_unused]] const ssize_t ignored = ::write(event_.get(), &one, sizeof one);
    }

    /// Resets it.
    void clear() noexcept {
        std::uint64_t count = 0;
        [[maybe_unused]] const ssize_t ignored = ::read(event_.get(), &count, sizeof count);
    }

    /// Readable from raise() to clear().
    int descriptor() const noexcept { return event_.get(); }

  private:
    foundation::FileDescriptor event_;
};

}  // namespace pinwell::batch
