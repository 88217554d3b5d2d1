// The freedesktop.org shared MIME database, by extension. Loaded on first use. May be used from any thread.
// Opens only the database's own files.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace pinwell::types {

/// The type, such as "text/plain", of files whose name ends in a dot and `extension`; `nullopt` if the
/// database has none.
std::optional<std::string> mimeTypeForExtension(std::string_view extension);

/// The database's untranslated comment on a type, "plain text document"; `nullopt` if there is none.
///
/// Read from the database directly: the library's own look-up translates by the environment's language, and
/// the environment cannot be changed safely in a process with threads.
std::optional<std::string> mimeDescription(const std::string& mimeType);

}  // namespace pinwell::types
