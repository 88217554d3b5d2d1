// Chromium without a window, which reaches only loopback.
#pragma once

#include <unistd.h>

#include <string>
#include <utility>
#include <vector>

#include "support/process.h"

namespace pinwell::test {

inline bool hasBrowser() {
    return ::access(CHROMIUM_PROGRAM, X_OK) == 0;
}

/// `command` gives the executable and the environment, without arguments.
inline ProcessResult browse(Command command, const std::string& directory,
                            std::vector<std::string> arguments) {
    command.executable = CHROMIUM_PROGRAM;
    command.arguments = std::move(arguments);
    command.environment["HOME"] = directory;
    command.workingDirectory = directory;
    // The superuser has no sandbox. No name is looked up.
    for (const char* const option :
         {"--headless", "--no-sandbox", "--disable-gpu", "--no-first-run", "--disable-dev-shm-usage",
          "--disable-background-networking", "--disable-component-update", "--disable-extensions",
          "--host-resolver-rules=MAP * ~NOTFOUND, EXCLUDE 127.0.0.1", "--timeout=20000"})
        command.arguments.insert(command.arguments.begin(), option);
    command.arguments.insert(command.arguments.begin(), "--user-data-dir=" + directory + "/browser");
    return runProcess(command);
}

}  // namespace pinwell::test
