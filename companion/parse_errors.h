// Command lines that CLI11 reads: what is wrong with one, in one line.
#pragma once

#include <string>

namespace CLI {
class App;
class ParseError;
}  // namespace CLI

namespace pinwell::companion {

/// What the library found, or, for a command or an option that does not exist, its name and the nearest one
/// that does. Without a line end; control characters are escaped.
std::string describe(const CLI::App& app, const CLI::ParseError& error);

}  // namespace pinwell::companion
