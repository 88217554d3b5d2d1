// What the service manager is told: sd_notify(3), one small datagram each.
//
// The protocol is documented and stable, and this is all of it that a service needs; the library for it would
// be the larger part of what is loaded.
#pragma once

#include <chrono>
#include <optional>
#include <string_view>

#include "foundation/file_io.h"

namespace pinwell::lumora {

/// May be used from any thread.
class ServiceManager {
  public:
    /// Takes the manager's address from $NOTIFY_SOCKET. Without it, with one that is no such address, and
    /// after the manager has gone, nobody is told anything. To be made before the process gives up its
    /// rights.
    ServiceManager();

    /// Variables of sd_notify(3), one a line: "READY=1".
    void tell(std::string_view state) const noexcept;

    /// How often the manager wants a sign of life, halved; `nullopt` if it wants none ($WATCHDOG_USEC,
    /// $WATCHDOG_PID).
    std::optional<std::chrono::microseconds> signOfLife() const noexcept { return signOfLife_; }

  private:
    foundation::FileDescriptor socket_;
    std::optional<std::chrono::microseconds> signOfLife_;
};

/// Becomes readable every `interval`; each time is read as eight bytes. Throws Failure.
foundation::FileDescriptor makeTicker(std::chrono::microseconds interval);

}  // namespace pinwell::lumora
