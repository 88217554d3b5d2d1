// Describes the fault of a command line that CLI11 refused, in one line.
#pragma once

#include <string>

namespace CLI {
class App;
class ParseError;
}  // namespace CLI

namespace pinwell::companion {

/// The library's error. For an unknown command or option, its name and the nearest existing one. Without a
/// line end; control characters are escaped.
std::string describe(const CLI::App& app, const CLI::ParseError& error);

}  // namespace pinwell::companion
