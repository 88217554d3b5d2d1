// Locations: files on this machine, and web addresses.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace pinwell::values {

/// An absolute location. A file URL is stored as its path, byte for byte (file names need not be UTF-8), and
/// is percent-encoded only for display. Any other URL is stored as its original text. Immutable; copies are
/// cheap enough to pass by value.
class URL {
  public:
    /// A relative path starts at the current directory, or at "/proc/self/cwd" if that has no path. Trailing
    /// slashes, doubled slashes and "." components are dropped; ".." stays, because its meaning depends on
    /// links. An empty path stays empty and names nothing.
    static URL fileURLWithPath(std::string_view path);

    /// Returns `nullopt` if `text` has no scheme, or contains a space, a control character, a character that
    /// RFC 3986 never allows, or a malformed percent escape, or if a web address has no host.
    static std::optional<URL> fromString(std::string_view text);

    bool isFileURL() const noexcept { return isFile_; }

    /// The file-system path of a file URL; for another URL, its path component, still percent-encoded.
    const std::string& path() const noexcept { return path_; }

    /// "file:///a%20b" for a file, otherwise the original text.
    std::string absoluteString() const;

    /// The scheme in lower case.
    const std::string& scheme() const noexcept { return scheme_; }

    /// The host without brackets, in lower case; empty for a file.
    const std::string& host() const noexcept { return host_; }

    std::string lastPathComponent() const;

    /// The last component's extension, as in pathExtensionOfName.
    std::string pathExtension() const;

    /// A URL that names nothing is returned unchanged. The component is a file name, not percent-encoded.
    URL appendingPathComponent(std::string_view component) const;

    /// For a file; another URL is returned unchanged.
    URL deletingLastPathComponent() const;

    bool operator==(const URL&) const = default;

  private:
    URL() = default;

    bool isFile_ = false;
    std::string scheme_;
    std::string host_;
    std::string path_;
    std::string text_;  // empty for a file
};

/// The part of a file name after its last dot, without the dot; empty if there is none, or if the last dot
/// begins or ends the name.
std::string_view pathExtensionOfName(std::string_view name) noexcept;

/// Percent encoding (RFC 3986, section 2.1) of all bytes except letters, digits, "-._~" and those in `plain`.
std::string percentEncoded(std::string_view bytes, std::string_view plain = {});

}  // namespace pinwell::values
