// The program's output. Texts are escaped already (foundation::format does that).
#pragma once

#include <cstdio>
#include <string>
#include <string_view>

namespace pinwell::lumora {

/// One whole line in one write, so that the lines of several threads do not mix.
void writeLine(std::FILE* stream, std::string_view line);

/// To standard output, and flushed. Throws Failure (EX_IOERR).
void writeText(const std::string& text);

/// Part of a longer text; its last part is flushed when the program ends well. Throws Failure (EX_IOERR).
void writePart(std::string_view text);

/// One line on standard error, after the program's name.
void complain(std::string_view text);

}  // namespace pinwell::lumora
