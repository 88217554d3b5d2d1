// The freedesktop.org shared MIME database, asked by extension. It is loaded by the first question. May be
// used from any thread. No file but the database's own is opened.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace pinwell::types {

/// The type, as "text/plain", of files whose name ends in a dot and `extension`; nothing when the database
/// has none.
std::optional<std::string> mimeTypeForExtension(std::string_view extension);

/// The database's untranslated comment on a type, "plain text document"; nothing when there is none.
///
/// Read from the database directly: the library's own look-up translates by the environment's language, and
/// the environment cannot be changed safely in a process with threads.
std::optional<std::string> mimeDescription(const std::string& mimeType);

}  // namespace pinwell::types
