#include "foundation/process.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <system_error>

#include "foundation/bytes.h"
#include "foundation/utf8.h"

namespace pinwell::foundation {
namespace {

constexpr std::size_t kLongestSafeName = 200;

}  // namespace

std::string processName() {
    return program_invocation_short_name;
}

void occupyStandardStreams() {
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO})
        if (fcntl(stream, F_GETFD) < 0 && errno == EBADF) open("/dev/null", O_RDWR);
}

std::string globallyUniqueString() {
    std::array<std::byte, 16> random{};
    if (getentropy(random.data(), random.size()) != 0)
        throw std::system_error(errno, std::generic_category(), "getentropy");
    random[6] = (random[6] & std::byte{0x0F}) | std::byte{0x40};  // version 4
    random[8] = (random[8] & std::byte{0x3F}) | std::byte{0x80};  // variant 10
    std::string text;
    for (std::size_t i = 0; i < random.size(); ++i) {
        if (i == 4 || i == 6 || i == 8 || i == 10) text += '-';
        text += fmt::format("{:02X}", std::to_integer<unsigned>(random[i]));
    }
    return text;
}

URL temporaryDirectory() {
    const std::optional<std::string> path = secureEnvironment("TMPDIR");
    return URL::fileURLWithPath(path && path->starts_with('/') ? *path : "/tmp");
}

std::optional<std::string> secureEnvironment(const char* name) {
    const char* value = secure_getenv(name);
    if (value == nullptr) return std::nullopt;
    return value;
}

bool isSafeFileName(std::string_view identifier) {
    if (identifier.empty() || identifier.size() > kLongestSafeName) return false;
    if (identifier == "." || identifier == "..") return false;
    if (identifier.find('/') != std::string_view::npos) return false;
    while (!identifier.empty()) {
        const std::string_view character =
            identifier.substr(0, std::max<std::size_t>(utf8SequenceLength(identifier), 1));
        if (isControlCharacter(character)) return false;
        identifier.remove_prefix(character.size());
    }
    return true;
}

}  // namespace pinwell::foundation
