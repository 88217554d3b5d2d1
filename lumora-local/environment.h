// The two sets of records that a service keeps apart.
#pragma once

#include <optional>
#include <string_view>

namespace pinwell::lumora {

enum class Environment { production, development };

std::string_view toString(Environment environment);

/// `nullopt` for any other text.
std::optional<Environment> parseEnvironment(std::string_view text);

}  // namespace pinwell::lumora
