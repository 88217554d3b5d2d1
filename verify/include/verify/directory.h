// An open directory inside an artefact. Everything is opened from it, name by name, and no link is ever
// followed. So nothing outside the artefact is opened, even if its paths change meanwhile.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/byte_source.h"
#include "base/handle.h"

namespace pinwell::verify {

enum class EntryKind { file, directory, link, other };

struct Entry {
    std::string name;
    EntryKind kind = EntryKind::other;
};

/// Immutable; may be used from any number of threads. Every method throws codesign::CodeError: kIOError if
/// something cannot be read, kStaticCodeNotFound if it does not exist or is of another kind.
class OpenDirectory;
using DirectoryRef = std::shared_ptr<const OpenDirectory>;

class OpenDirectory {
  public:
    /// The directory at the caller's path. Only the last component must not be a link.
    static DirectoryRef atPath(const std::string& path);

    /// In byte order of the names. At most `limit`; throws kUnimplemented for more.
    std::vector<Entry> entries(std::size_t limit) const;

    std::optional<EntryKind> kindOf(const std::string& name) const;
    DirectoryRef directory(const std::string& name) const;
    std::unique_ptr<base::FileSource> file(const std::string& name) const;
    std::string linkTarget(const std::string& name) const;

    /// The same by a path of names with slashes between; each name except the last is a directory.
    std::unique_ptr<base::FileSource> fileAt(std::string_view relativePath) const;
    DirectoryRef directoryAt(std::string_view relativePath) const;

  private:
    explicit OpenDirectory(base::FileDescriptor directory) : directory_(std::move(directory)) {}

    base::FileDescriptor directory_;
};

/// Whether the link at `path` below `root` leads to `root` or below it, also through other links. A target
/// that does not exist is inside if its path never leaves the root. Throws codesign::CodeError if a step
/// cannot be read.
bool leadsInside(const DirectoryRef& root, std::string_view path);

}  // namespace pinwell::verify
