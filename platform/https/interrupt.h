// A flag that one thread raises and another one can wait for together with its sockets.
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
        // Fails only when the counter is full, and then the descriptor is readable already.
        [[maybe_unused]] const ssize_t ignored = ::write(event_.get(), &one, sizeof one);
    }
    bool isRaised() const noexcept { return raised_; }

    /// Readable from when it was raised.
    int descriptor() const noexcept { return event_.get(); }

  private:
    foundation::FileDescriptor event_;
    std::atomic<bool> raised_ = false;
};

}  // namespace pinwell::https
