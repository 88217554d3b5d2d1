// Locations: files on this machine, and web addresses.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace pinwell::foundation {

/// An absolute location. A file URL is kept as its path, byte for byte (file names need not be UTF-8), and is
/// percent-encoded only when it is described. Any other URL is kept as the text it was made from.
/// Immutable; copies are cheap enough to pass by value.
class URL {
  public:
    /// A relative path is taken against the current directory, under "/proc/self/cwd" when that has no path.
    /// Trailing slashes, doubled slashes and "." components are dropped; ".." stays, since what it means
    /// depends on links. An empty path stays empty and names nothing.
    static URL fileURLWithPath(std::string_view path);

    /// Nothing when `text` has no scheme, or holds a space, a control character, a character that RFC 3986
    /// allows nowhere, or a malformed percent escape; nor when a web address has no host.
    static std::optional<URL> fromString(std::string_view text);

    bool isFileURL() const noexcept { return isFile_; }

    /// The file-system path of a file URL; of another URL, its path component, still percent-encoded.
    const std::string& path() const noexcept { return path_; }

    /// "file:///a%20b" for a file, the text it was made from otherwise.
    std::string absoluteString() const;

    /// The scheme in lower case.
    const std::string& scheme() const noexcept { return scheme_; }

    /// The host without brackets, in lower case; empty for a file.
    const std::string& host() const noexcept { return host_; }

    std::string lastPathComponent() const;

    /// The last component's, as pathExtensionOfName has it.
    std::string pathExtension() const;

    /// A URL that names nothing stays as it is. The component is a name as the file system has it.
    URL appendingPathComponent(std::string_view component) const;

    /// Of a file; another URL stays as it is.
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

/// Of a file name: the part behind its last dot, without the dot; empty when there is none, or when the last
/// dot begins or ends the name.
std::string_view pathExtensionOfName(std::string_view name) noexcept;

}  // namespace pinwell::foundation
