#include "src/messages.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>
#include <utility>

namespace pinwell {

std::uint8_t verboseLevel = kVerbosityNormal;

namespace {

thread_local const MessageReceiver* receiverOfThread = nullptr;

// Another user of the pipe may have made it non-blocking; a slow reader is still waited for. Returns false if
// there is nothing to wait for.
bool waitForReader() {
    pollfd output{STDOUT_FILENO, POLLOUT, 0};
    const int ready = ::poll(&output, 1, -1);
    return ready > 0 || (ready < 0 && errno == EINTR);
}

}  // namespace

MessageRedirection::MessageRedirection(MessageReceiver receiver)
    : receiver_(std::move(receiver)), before_(std::exchange(receiverOfThread, &receiver_)) {}

MessageRedirection::~MessageRedirection() {
    receiverOfThread = before_;
}

bool messagesAreRedirected() noexcept {
    return receiverOfThread != nullptr;
}

void writeMessageLine(std::string line) {
    if (receiverOfThread != nullptr) {
        (*receiverOfThread)(std::move(line));
        return;
    }
    line += '\n';
    std::string_view rest = line;
    while (!rest.empty()) {
        const ssize_t written = ::write(STDOUT_FILENO, rest.data(), rest.size());
        if (written < 0 && (errno == EINTR || (errno == EAGAIN && waitForReader()))) continue;
        if (written <= 0) return;  // a lost message must not stop a staple
        rest.remove_prefix(static_cast<std::size_t>(written));
    }
}

Diagnostics noisyDiagnostics() {
    return verboseLevel == kVerbosityVerbose ? Diagnostics(writeMessageLine) : Diagnostics();
}

}  // namespace pinwell
