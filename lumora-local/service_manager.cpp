#include "lumora-local/service_manager.h"

#include <sys/socket.h>
#include <sys/timerfd.h>
#include <sys/un.h>
#include <unistd.h>

#include <charconv>
#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

template <class Number>
std::optional<Number> numberIn(const char* text) {
    if (text == nullptr) return std::nullopt;
    Number number = 0;
    const char* end = text + std::strlen(text);
    const auto [stop, error] = std::from_chars(text, end, number);
    if (error != std::errc{} || stop != end || number <= 0) return std::nullopt;
    return number;
}

foundation::FileDescriptor connectTo(std::string_view name) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const bool usable = name.size() > 1 && name.size() < sizeof address.sun_path;
    if (!usable || (name[0] != '/' && name[0] != '@')) return {};
    std::memcpy(address.sun_path, name.data(), name.size());
    if (name[0] == '@') address.sun_path[0] = '\0';  // an abstract name, which has no end mark
    const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size());
    foundation::FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    // The socket interface's own cast: every address family shares this header.
    const auto* generic = reinterpret_cast<const sockaddr*>(&address);
    if (!socket || ::connect(socket.get(), generic, length) != 0) return {};
    return socket;
}

}  // namespace

ServiceManager::ServiceManager() {
    const char* name = std::getenv("NOTIFY_SOCKET");
    if (name == nullptr) return;
    socket_ = connectTo(name);
    const auto interval = numberIn<std::int64_t>(std::getenv("WATCHDOG_USEC"));
    const char* process = std::getenv("WATCHDOG_PID");
    const bool ours = process == nullptr || numberIn<pid_t>(process) == ::getpid();
    if (socket_ && interval && ours) signOfLife_ = std::chrono::microseconds(*interval / 2 + 1);
}

void ServiceManager::tell(std::string_view state) const noexcept {
    if (socket_) ::send(socket_.get(), state.data(), state.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
}

foundation::FileDescriptor makeTicker(std::chrono::microseconds interval) {
    constexpr std::int64_t kMillion = 1'000'000;
    foundation::FileDescriptor timer(::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK));
    const timespec step{interval.count() / kMillion, interval.count() % kMillion * 1000};
    const itimerspec times{step, step};
    if (!timer || ::timerfd_settime(timer.get(), 0, &times, nullptr) != 0) {
        throw Failure(EX_OSERR, "cannot make a timer");
    }
    return timer;
}

}  // namespace pinwell::lumora
