#include "gate/markup.h"

#include "foundation/description.h"

namespace pinwell::gate {

std::string markupText(std::string_view text) {
    std::string result;
    for (const char c : foundation::escapeForTerminal(text)) {
        switch (c) {
            case '&':
                result += "&amp;";
                break;
            case '<':
                result += "&lt;";
                break;
            case '>':
                result += "&gt;";
                break;
            case '"':
                result += "&quot;";
                break;
            case '\'':
                result += "&#39;";
                break;
            default:
                result += c;
        }
    }
    // Two code points that XML has no place for, and that UTF-8 can say.
    for (const std::string_view none : {"\xEF\xBF\xBE", "\xEF\xBF\xBF"})
        for (std::size_t at = 0; (at = result.find(none, at)) != std::string::npos;)
            result.replace(at, none.size(), "\xEF\xBF\xBD");
    return result;
}

}  // namespace pinwell::gate
