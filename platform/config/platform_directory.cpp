#include "config/platform_directory.h"

#include <arpa/inet.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <system_error>

#include "base/bytes.h"
#include "base/file_io.h"
#include "runtime/process.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::config {
namespace {

using base::Error;
using base::Result;
using values::Value;

constexpr std::size_t kLongestHostName = 253;  // RFC 1035, section 2.3.4, as text
constexpr std::size_t kLongestLabel = 63;

bool isASCIIDigit(char c) {
    return c >= '0' && c <= '9';
}
bool isLetterOrDigit(char c) {
    return isASCIIDigit(c) || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool isAddress(int family, std::string_view text) {
    in6_addr address{};  // the larger of the two
    return inet_pton(family, std::string(text).c_str(), &address) == 1;
}

bool isLabel(std::string_view label) {
    return !label.empty() && label.size() <= kLongestLabel && isLetterOrDigit(label.front()) &&
           isLetterOrDigit(label.back()) &&
           std::all_of(label.begin(), label.end(), [](char c) { return isLetterOrDigit(c) || c == '-'; });
}

// A host name as in RFC 1123, section 2.1. If its last label is a number, it must be an IPv4 address.
bool isHostName(std::string_view host) {
    if (host.size() > kLongestHostName) return false;
    const std::string_view last = host.substr(host.rfind('.') + 1);
    if (!last.empty() && std::all_of(last.begin(), last.end(), isASCIIDigit)) return isAddress(AF_INET, host);
    while (true) {
        const std::size_t dot = host.find('.');
        if (!isLabel(host.substr(0, dot))) return false;
        if (dot == std::string_view::npos) return true;
        host.remove_prefix(dot + 1);
    }
}

bool isPort(std::string_view port) {
    if (port.empty() || port.size() > 5 || !std::all_of(port.begin(), port.end(), isASCIIDigit)) return false;
    const int number = std::stoi(std::string(port));
    return number >= 1 && number <= 65535;
}

// HOST or HOST:PORT, an IPv6 address in brackets.
bool isHostAndPort(std::string_view text) {
    if (text.find('\0') != std::string_view::npos) return false;
    std::string_view rest;
    if (text.starts_with('[')) {
        const std::size_t close = text.find(']');
        if (close == std::string_view::npos || !isAddress(AF_INET6, text.substr(1, close - 1))) return false;
        rest = text.substr(close + 1);
    } else {
        const std::size_t colon = std::min(text.find(':'), text.size());
        if (!isHostName(text.substr(0, colon))) return false;
        rest = text.substr(colon);
    }
    return rest.empty() || (rest.front() == ':' && isPort(rest.substr(1)));
}

bool isRegularFile(const std::string& path) {
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

Result<std::string> hostFromSettings(const Value& settings) {
    const auto wrong = [](std::string text) {
        return Error(base::kDataErrorDomain, base::kMalformedDocument, std::move(text));
    };
    if (settings.dictionary() == nullptr) return wrong("The top level is not an object, at byte 0.");
    const Value& service = settings["lumora"];
    if (service.isNil()) return std::string(PINWELL_LUMORA_HOST);
    if (service.dictionary() == nullptr) return wrong("The value at lumora is not an object.");
    const Value& host = service["host"];
    if (host.isNil()) return std::string(PINWELL_LUMORA_HOST);
    if (host.string() == nullptr || !isHostAndPort(*host.string()))
        return wrong("The value at lumora.host is not HOST or HOST:PORT.");
    return *host.string();
}

}  // namespace

PlatformDirectory PlatformDirectory::current() {
    const std::optional<std::string> chosen = runtime::secureEnvironment("PINWELL_PLATFORM");
    return PlatformDirectory(chosen && !chosen->empty() ? *chosen : PINWELL_PLATFORM_DIRECTORY);
}

Result<std::string> PlatformDirectory::lumoraHost() const {
    const std::string file = path_ + "/platform.json";
    const Result<base::Data> document = base::readSmallFile(file, kMaximumPlatformSettings);
    if (!document) {
        const std::int64_t reason = document.error().code();
        if (reason == ENOENT || reason == ENOTDIR) return std::string(PINWELL_LUMORA_HOST);
        return document.error();
    }
    const Result<Value> settings = values::parseJSON(*document);
    if (!settings) return Error(settings.error()).withPath(file);
    Result<std::string> host = hostFromSettings(*settings);
    if (!host) return Error(host.error()).withPath(file);
    return host;
}

bool PlatformDirectory::allowsInternalSecurityPolicies() const {
    return isRegularFile(path_ + "/internal-security-policies");
}

std::vector<std::string> PlatformDirectory::pemFiles(std::string_view directory) const {
    std::vector<std::string> files;
    std::error_code failure;
    std::filesystem::directory_iterator entry(path_ + "/" + std::string(directory), failure);
    for (; !failure && entry != std::filesystem::directory_iterator(); entry.increment(failure)) {
        const std::string& file = entry->path().native();
        if (file.ends_with(".pem")) files.push_back(file);
    }
    std::sort(files.begin(), files.end());
    return files;
}

}  // namespace pinwell::config
