#include "record_name.h"

#include "base/text.h"
#include "formats/tm_ticket.h"

namespace pinwell::lumora {
std::optional<std::size_t> hashLength(std::uint32_t algorithm) {
    const std::size_t length = tm_cdhash_algorithm_get_size(algorithm);
    if (length == 0) return std::nullopt;
    return length;
}

std::string recordName(const CodeHash& hash) {
    const std::string hex = base::toHex(hash.hash);
    return hash.algorithm == 0 ? "1/" + hex : "2/" + std::to_string(hash.algorithm) + "/" + hex;
}

std::optional<CodeHash> parseRecordName(std::string_view name) {
    CodeHash parsed;
    if (name.starts_with("1/")) {
        name.remove_prefix(2);
    } else {
        // Every known digest type is one digit.
        if (name.size() < 4 || !name.starts_with("2/") || name[2] < '1' || name[2] > '9' || name[3] != '/') {
            return std::nullopt;
        }
        parsed.algorithm = static_cast<std::uint32_t>(name[2] - '0');
        name.remove_prefix(4);
    }
    const std::optional<std::size_t> length = hashLength(parsed.algorithm);
    if (!length || name.size() != 2 * *length) return std::nullopt;
    std::optional<base::Data> hash = base::parseHex(name);
    if (!hash) return std::nullopt;
    parsed.hash = *std::move(hash);
    return parsed;
}

std::string_view toString(Environment environment) {
    return environment == Environment::production ? "production" : "development";
}

std::optional<Environment> parseEnvironment(std::string_view text) {
    if (text == toString(Environment::production)) return Environment::production;
    if (text == toString(Environment::development)) return Environment::development;
    return std::nullopt;
}

}  // namespace pinwell::lumora
