// Texts in XML and HTML.
#pragma once

#include <string>
#include <string_view>

namespace pinwell::foundation {

/// In UTF-8, without control characters and without what turns the direction of writing, with the characters
/// of markup as entities: good between tags and in quoted attributes.
std::string markupText(std::string_view text);

}  // namespace pinwell::foundation
