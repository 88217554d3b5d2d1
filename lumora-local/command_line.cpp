#include "command_line.h"

#include <pwd.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <system_error>

#include "failure.h"

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

void writeLine(std::FILE* stream, std::string_view line) {
    const std::string text = std::string(line) + "\n";
    std::fwrite(text.data(), 1, text.size(), stream);
    std::fflush(stream);
}

void writeText(const std::string& text) {
    const bool written = std::fwrite(text.data(), 1, text.size(), stdout) == text.size();
    if (!written || std::fflush(stdout) != 0) throw Failure(EX_IOERR, "cannot write to standard output");
}

void writePart(std::string_view text) {
    if (text.empty()) return;  // its data may be null, which fwrite does not allow
    if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size()) {
        throw Failure(EX_IOERR, "cannot write to standard output");
    }
}

void complain(std::string_view text) {
    writeLine(stderr, "lumora-local: " + std::string(text));
}

}  // namespace pinwell::lumora
