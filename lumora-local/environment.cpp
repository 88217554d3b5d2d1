#include "lumora-local/environment.h"

namespace pinwell::lumora {

std::string_view toString(Environment environment) {
    return environment == Environment::production ? "production" : "development";
}

std::optional<Environment> parseEnvironment(std::string_view text) {
    if (text == toString(Environment::production)) return Environment::production;
    if (text == toString(Environment::development)) return Environment::development;
    return std::nullopt;
}

}  // namespace pinwell::lumora
