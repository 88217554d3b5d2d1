// Reports to the service manager: sd_notify(3), one small datagram each.
//
// The protocol is documented and stable, and this is the whole part that a service needs. Its library would
// be the larger part of the loaded code.
#pragma once

#include <chrono>
#include <optional>
#include <string_view>

#include "foundation/file_io.h"

namespace pinwell::lumora {

/// For any thread.
class ServiceManager {
  public:
    /// Takes the manager's address from $NOTIFY_SOCKET. Without it, with an invalid address, and
    /// after the manager has gone, it sends nothing. Make it before the process gives up its
    /// rights.
    ServiceManager();

    /// Variables of sd_notify(3), one a line: "READY=1".
    void tell(std::string_view state) const noexcept;

    /// Half of the interval at which the manager expects a notification; `nullopt` if it expects none
    /// ($WATCHDOG_USEC, $WATCHDOG_PID).
    std::optional<std::chrono::microseconds> signOfLife() const noexcept { return signOfLife_; }

  private:
    foundation::FileDescriptor socket_;
    std::optional<std::chrono::microseconds> signOfLife_;
};

/// Becomes readable every `interval`; each time is read as eight bytes. Throws Failure.
foundation::FileDescriptor makeTicker(std::chrono::microseconds interval);

}  // namespace pinwell::lumora
