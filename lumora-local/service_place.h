// Which service a command is about: the directory on the command line, or else $LUMORA_DIR.
#pragma once

#include <string>
#include <vector>

namespace pinwell::lumora {

/// `given`, or $LUMORA_DIR if that is empty. Throws Failure (EX_USAGE) without either.
std::string requireDirectory(const std::string& given);

/// For commands with more arguments after the directory. With $LUMORA_DIR, a first argument that is not a
/// service's directory belongs to `rest`, and `directory` becomes empty.
void takeDirectory(std::string& directory, std::vector<std::string>& rest);

/// The user of this program, for the log: the login name, or "uid 1000" if the account has none.
std::string nameOfCaller();

}  // namespace pinwell::lumora
