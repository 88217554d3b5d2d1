// The freedesktop.org shared MIME database, by file name alone: no file is ever opened.
#pragma once

#include <optional>
#include <string>

namespace pinwell::types {

/// The MIME type that the database declares for a file name ("text/plain"); nothing when it knows none.
std::optional<std::string> mimeTypeForName(const std::string& name);

/// The database's English description of the MIME type ("plain text document"), whatever the locale; nothing when it
/// has none.
std::optional<std::string> mimeTypeDescription(const std::string& mimeType);

}  // namespace pinwell::types
