// The commands about keys and certificates: certify, rotate, check.
#pragma once

#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace pinwell::lumora {

/// What their command lines say, as text. Must outlive the parsing.
struct KeyVerbs {
    std::string directory;
    std::vector<std::string> words;  // after the directory
    std::string key;
    std::string rootDirectory;
    std::string requestFile;
    std::string warning = "30d";
    int exitStatus = 0;  // of the program, once the command has run
};

void declareKeyVerbs(CLI::App& app, KeyVerbs& verbs);

}  // namespace pinwell::lumora
