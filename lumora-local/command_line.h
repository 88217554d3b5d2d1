// What all commands share: the service that a command is about, the user's name, and the output. Texts for
// the output are escaped already (values::format does that).
#pragma once

#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::lumora {

/// The directory on the command line, `given`, or $LUMORA_DIR if that is empty. Throws Failure (EX_USAGE)
/// without either.
std::string requireDirectory(const std::string& given);

/// For commands with more arguments after the directory. With $LUMORA_DIR, a first argument that is not a
/// service's directory belongs to `rest`, and `directory` becomes empty.
void takeDirectory(std::string& directory, std::vector<std::string>& rest);

/// The user of this program, for the log: the login name, or "uid 1000" if the account has none.
std::string nameOfCaller();

/// One whole line in one write, so that the lines of several threads do not mix.
void writeLine(std::FILE* stream, std::string_view line);

/// To standard output, and flushed. Throws Failure (EX_IOERR).
void writeText(const std::string& text);

/// Part of a longer text; its last part is flushed when the program ends well. Throws Failure (EX_IOERR).
void writePart(std::string_view text);

/// One line on standard error, after the program's name.
void complain(std::string_view text);

}  // namespace pinwell::lumora
