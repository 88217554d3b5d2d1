#include "companion/output.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>

namespace pinwell::companion {
namespace {

bool isSet(const char* value) {
    return value != nullptr && *value != '\0';
}

}  // namespace

ColorWhen colorWhenNamed(std::string_view name) noexcept {
    if (name == "always") return ColorWhen::always;
    if (name == "never") return ColorWhen::never;
    return ColorWhen::automatic;
}

bool wantsColor(ColorWhen when, int descriptor) {
    if (when != ColorWhen::automatic) return when == ColorWhen::always;
    const char* const force = std::getenv("CLICOLOR_FORCE");
    if (isSet(std::getenv("NO_COLOR"))) return false;
    if (isSet(force) && std::string_view(force) != "0") return true;
    const char* const terminal = std::getenv("TERM");
    const bool isDumb = terminal != nullptr && std::string_view(terminal) == "dumb";
    return ::isatty(descriptor) == 1 && !isDumb;
}

void Output::write(std::string_view text) {
    while (!text.empty() && !closed_ && !failed_) {
        const ssize_t written = ::write(descriptor_, text.data(), text.size());
        if (written > 0) {
            text.remove_prefix(static_cast<std::size_t>(written));
            continue;
        }
        if (written < 0 && errno == EINTR) continue;
        if (written < 0 && errno == EAGAIN) {
            pollfd output{descriptor_, POLLOUT, 0};
            static_cast<void>(::poll(&output, 1, -1));
            continue;
        }
        if (written < 0 && errno == EPIPE)
            closed_ = true;
        else
            failed_ = true;
    }
}

}  // namespace pinwell::companion
