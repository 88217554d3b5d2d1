#include "src/messages.h"

#include <unistd.h>

#include <cerrno>
#include <string_view>

namespace pinwell {

std::uint8_t verboseLevel = kVerbosityNormal;

void writeMessageLine(std::string line) {
    line += '\n';
    std::string_view rest = line;
    while (!rest.empty()) {
        const ssize_t written = ::write(STDOUT_FILENO, rest.data(), rest.size());
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return;  // a message is never worth a staple
        rest.remove_prefix(static_cast<std::size_t>(written));
    }
}

}  // namespace pinwell
