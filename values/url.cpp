#include "values/url.h"

#include <algorithm>
#include <filesystem>

namespace pinwell::values {
namespace {

bool isAlpha(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}
bool isDigit(char c) {
    return c >= '0' && c <= '9';
}
bool isHexDigit(char c) {
    return isDigit(c) || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
}

// RFC 3986, section 2: reserved and unreserved characters.
bool isUnreserved(char c) {
    return isAlpha(c) || isDigit(c) || std::string_view("-._~").find(c) != std::string_view::npos;
}
bool isReserved(char c) {
    return std::string_view(":/?#[]@!$&'()*+,;=").find(c) != std::string_view::npos;
}

std::string percentEncodedPath(std::string_view path) {
    return percentEncoded(path, "/!$&'()*+,;=:@");
}

std::string lowerCase(std::string_view text) {
    std::string lower(text);
    for (char& c : lower)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    return lower;
}

bool isWellFormed(std::string_view text) {
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '%') {
            if (text.size() - i < 3 || !isHexDigit(text[i + 1]) || !isHexDigit(text[i + 2])) return false;
        } else if (!isUnreserved(text[i]) && !isReserved(text[i])) {
            return false;
        }
    }
    return true;
}

// The path without empty and "." components.
std::string tidyPath(std::string_view path) {
    std::string tidy;
    std::size_t at = 0;
    while (at < path.size()) {
        const std::size_t end = std::min(path.find('/', at), path.size());
        const std::string_view component = path.substr(at, end - at);
        if (!component.empty() && component != ".") {
            tidy += '/';
            tidy += component;
        }
        at = end + 1;
    }
    return tidy.empty() ? "/" : tidy;
}

}  // namespace

URL URL::fileURLWithPath(std::string_view path) {
    URL url;
    url.isFile_ = true;
    url.scheme_ = "file";
    if (path.empty()) return url;
    if (path.front() == '/') {
        url.path_ = tidyPath(path);
    } else {
        std::error_code failure;
        const std::filesystem::path current = std::filesystem::current_path(failure);
        // A removed directory no longer has a path. The kernel's link to it leads to the same place as a
        // relative path; relative to the root, the path could name another file.
        url.path_ = tidyPath((failure ? "/proc/self/cwd" : current.native()) + "/" + std::string(path));
    }
    return url;
}

std::optional<URL> URL::fromString(std::string_view text) {
    const std::size_t colon = text.find(':');
    if (colon == std::string_view::npos || colon == 0 || !isAlpha(text[0])) return std::nullopt;
    const auto schemeCharacter = [](char c) {
        return isAlpha(c) || isDigit(c) || c == '+' || c == '-' || c == '.';
    };
    if (!std::all_of(text.begin(), text.begin() + static_cast<std::ptrdiff_t>(colon), schemeCharacter))
        return std::nullopt;
    if (!isWellFormed(text)) return std::nullopt;

    URL url;
    url.scheme_ = lowerCase(text.substr(0, colon));
    url.text_ = text;
    std::string_view rest = text.substr(colon + 1);
    if (rest.starts_with("//")) {
        rest.remove_prefix(2);
        std::string_view authority = rest.substr(0, rest.find_first_of("/?#"));
        rest.remove_prefix(authority.size());
        if (const std::size_t at = authority.rfind('@'); at != std::string_view::npos)
            authority.remove_prefix(at + 1);
        if (authority.starts_with('[')) {
            const std::size_t close = authority.find(']');
            if (close == std::string_view::npos) return std::nullopt;
            url.host_ = lowerCase(authority.substr(1, close - 1));
        } else {
            url.host_ = lowerCase(authority.substr(0, authority.find(':')));
        }
    }
    const bool isWeb = url.scheme_ == "http" || url.scheme_ == "https";
    if (isWeb && url.host_.empty()) return std::nullopt;
    url.path_ = rest.substr(0, rest.find_first_of("?#"));
    return url;
}

std::string URL::absoluteString() const {
    return isFile_ ? "file://" + percentEncodedPath(path_) : text_;
}

std::string URL::lastPathComponent() const {
    if (path_ == "/") return "/";
    const std::size_t slash = path_.rfind('/');
    return slash == std::string::npos ? path_ : path_.substr(slash + 1);
}

std::string URL::pathExtension() const {
    return std::string(pathExtensionOfName(lastPathComponent()));
}

std::string_view pathExtensionOfName(std::string_view name) noexcept {
    const std::size_t dot = name.rfind('.');
    if (dot == std::string_view::npos || dot == 0 || dot + 1 == name.size()) return {};
    return name.substr(dot + 1);
}

URL URL::appendingPathComponent(std::string_view component) const {
    URL url = *this;
    if (isFile_) {
        if (path_.empty()) return url;
        url.path_ = tidyPath(path_ + "/" + std::string(component));
        return url;
    }
    const std::size_t pathEnd = std::min(text_.find_first_of("?#"), text_.size());
    std::string added;
    if (!path_.ends_with('/')) added += '/';
    added += percentEncodedPath(component);
    url.text_.insert(pathEnd, added);
    url.path_ += added;
    return url;
}

URL URL::deletingLastPathComponent() const {
    URL url = *this;
    const std::size_t slash = path_.rfind('/');
    if (!isFile_ || slash == std::string::npos) return url;
    url.path_ = slash == 0 ? "/" : path_.substr(0, slash);
    return url;
}

std::string percentEncoded(std::string_view bytes, std::string_view plain) {
    constexpr std::string_view kDigits = "0123456789ABCDEF";
    std::string text;
    text.reserve(bytes.size());
    for (const char c : bytes) {
        if (isUnreserved(c) || plain.find(c) != std::string_view::npos) {
            text += c;
            continue;
        }
        const auto byte = static_cast<unsigned char>(c);
        text += '%';
        text += kDigits[byte >> 4U];
        text += kDigits[byte & 0xFU];
    }
    return text;
}

}  // namespace pinwell::values
