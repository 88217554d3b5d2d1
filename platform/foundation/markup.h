// Texts of others, as people see them: on a screen, in XML and in HTML.
#pragma once

#include <string>
#include <string_view>

namespace pinwell::foundation {

/// As escapeForTerminal(), and characters that change the direction of writing as "\u202e": such a character
/// can make one name look like another.
std::string escapeForDisplay(std::string_view text);

/// In UTF-8, without control characters and without characters that change the direction of writing. Markup
/// characters become entities. For use between tags and in quoted attributes.
std::string markupText(std::string_view text);

}  // namespace pinwell::foundation
