#include "src/messages.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>

namespace pinwell {

std::uint8_t verboseLevel = kVerbosityNormal;

namespace {

// Whoever shares the pipe may have made it non-blocking; a reader that lags is waited for all the same. False
// when there is nothing to wait for.
bool waitForReader() {
    pollfd output{STDOUT_FILENO, POLLOUT, 0};
    const int ready = ::poll(&output, 1, -1);
    return ready > 0 || (ready < 0 && errno == EINTR);
}

}  // namespace

void writeMessageLine(std::string line) {
    line += '\n';
    std::string_view rest = line;
    while (!rest.empty()) {
        const ssize_t written = ::write(STDOUT_FILENO, rest.data(), rest.size());
        if (written < 0 && (errno == EINTR || (errno == EAGAIN && waitForReader()))) continue;
        if (written <= 0) return;  // a message is never worth a staple
        rest.remove_prefix(static_cast<std::size_t>(written));
    }
}

}  // namespace pinwell
