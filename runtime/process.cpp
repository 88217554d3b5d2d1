#include "runtime/process.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <fmt/format.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <system_error>

namespace pinwell::runtime {

using values::URL;

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

LazyLibrary::LazyLibrary(const char* name)
    : handle_(dlopen(name, RTLD_LAZY)), complete_(handle_ != nullptr) {}

void* LazyLibrary::address(const char* name) {
    void* const found = handle_ == nullptr ? nullptr : dlsym(handle_, name);
    complete_ = complete_ && found != nullptr;
    return found;
}

}  // namespace pinwell::runtime
