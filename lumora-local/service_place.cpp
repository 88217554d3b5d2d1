#include "lumora-local/service_place.h"

#include <pwd.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <system_error>

#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

std::string directoryFromEnvironment() {
    const char* directory = std::getenv("LUMORA_DIR");
    return directory != nullptr ? directory : "";
}

bool isService(const std::string& path) {
    std::error_code ignored;
    return std::filesystem::exists(path + "/service/service.json", ignored);
}

}  // namespace

std::string requireDirectory(const std::string& given) {
    std::string directory = given.empty() ? directoryFromEnvironment() : given;
    if (directory.empty()) throw Failure(EX_USAGE, "no service: name its DIR, or set LUMORA_DIR");
    return directory;
}

void takeDirectory(std::string& directory, std::vector<std::string>& rest) {
    if (directory.empty() || directoryFromEnvironment().empty() || isService(directory)) return;
    rest.insert(rest.begin(), directory);
    directory.clear();
}

std::string nameOfCaller() {
    std::array<char, 4096> buffer{};
    passwd entry{};
    passwd* found = nullptr;
    const uid_t user = ::getuid();
    if (::getpwuid_r(user, &entry, buffer.data(), buffer.size(), &found) == 0 && found != nullptr) {
        return found->pw_name;
    }
    return "uid " + std::to_string(user);
}

}  // namespace pinwell::lumora
