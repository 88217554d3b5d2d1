// The commands that maintain a service: client-certificate, rotate, certify, check, backup, restore.
#pragma once

#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace pinwell::lumora {

/// The values of their command lines, as text. Must outlive the parsing.
struct UpkeepVerbs {
    std::string directory;
    std::vector<std::string> words;  // after the directory
    std::string file;                // restore: the backup
    std::string key;
    std::string rootDirectory;
    std::string requestFile;
    std::string out;
    std::string warning = "30d";
    int exitStatus = 0;  // of the program, once the command has run
};

void declareUpkeepVerbs(CLI::App& app, UpkeepVerbs& verbs);

}  // namespace pinwell::lumora
