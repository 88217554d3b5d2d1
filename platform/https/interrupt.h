// A flag that one thread raises, and for which another can wait together with its sockets.
#pragma once

#include <sys/eventfd.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <system_error>

#include "foundation/file_io.h"

namespace pinwell::https {

class Interrupt {
  public:
    Interrupt() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
        if (!event_) throw std::system_error(errno, std::generic_category(), "eventfd");
    }

    void raise() noexcept {
        raised_ = true;
        const std::uint64_t one = 1;
        // Fails only if the counter is full; then the descriptor is already readable.
        [[maybe_unused]] const ssize_t ignored = ::write(event_.get(), &one, sizeof one);
    }
    bool isRaised() const noexcept { return raised_; }

    /// Readable after it was raised.
    int descriptor() const noexcept { return event_.get(); }

  private:
    foundation::FileDescriptor event_;
    std::atomic<bool> raised_ = false;
};

}  // namespace pinwell::https
