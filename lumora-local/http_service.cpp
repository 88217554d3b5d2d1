#include "lumora-local/http_service.h"

#include <algorithm>

namespace pinwell::lumora {

std::string_view pathOf(std::string_view target) {
    return target.substr(0, target.find_first_of("?#"));
}

bool isJson(std::string_view contentType) {
    std::string_view type = contentType.substr(0, contentType.find(';'));
    while (!type.empty() && (type.back() == ' ' || type.back() == '\t')) type.remove_suffix(1);
    constexpr std::string_view kWanted = "application/json";
    return std::equal(type.begin(), type.end(), kWanted.begin(), kWanted.end(), [](char given, char wanted) {
        return given == wanted || (given >= 'A' && given <= 'Z' && given - 'A' + 'a' == wanted);
    });
}

}  // namespace pinwell::lumora
