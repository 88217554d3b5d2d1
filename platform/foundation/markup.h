// Texts in XML and HTML.
#pragma once

#include <string>
#include <string_view>

namespace pinwell::foundation {

/// In UTF-8, without control characters and without characters that change the direction of writing. Markup
/// characters become entities. For use between tags and in quoted attributes.
std::string markupText(std::string_view text);

}  // namespace pinwell::foundation
