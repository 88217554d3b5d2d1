// The entry point: options, the operation and the path.

#include <getopt.h>
#include <malloc.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <string>
#include <string_view>

#include "runtime/process.h"
#include "runtime/queue.h"
#include "runtime/signals.h"
#include "sandbox/sandbox.h"
#include "src/DownloadDelegate.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"
#include "src/run.h"

namespace {

using namespace pinwell;

// The operation of the run, and the long options; process-wide, like the option scan.
std::uint8_t operation = kOperationNone;

constexpr option options[] = {
    {"help", no_argument, nullptr, '?'},
    {"quiet", no_argument, nullptr, 'q'},
    {"verbose", no_argument, nullptr, 'v'},
    {nullptr, 0, nullptr, 0},
};

void printUsage() {
    const std::string program = runtime::processName();
    const std::string usage = values::format(
        "Usage: %s staple [-q] [-v] path\n"
        "        Retrieves a ticket and attaches it to the supported file\n"
        "        format at path.\n"
        "\n"
        "Usage: %s validate [-q] [-v] path\n"
        "        Validates an existing stapled ticket.\n"
        "\n"
        "Supported file formats are: UDIF disk images, code-signed executable\n"
        "bundles, and signed \"flat\" installer packages.\n",
        program, program);
    // If standard error is closed, only the text is lost.
    [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, usage.data(), usage.size());
}

void scanOptions(int argc, char** argv) {
    unsetenv("POSIXLY_CORRECT");  // otherwise the scan would stop at the command word
    opterr = 0;                   // the usage text is enough
    for (int found = 0; (found = getopt_long(argc, argv, "qv", options, nullptr)) != -1;) {
        switch (found) {
            case 'q':
                verboseLevel = kVerbosityQuiet;
                break;
            case 'v':
                verboseLevel = kVerbosityVerbose;
                break;
            case '?':
                printUsage();
                break;
            default:
                break;
        }
    }
}

std::uint8_t operationForCommand(std::string_view command) {
    if (command == "validate") return kOperationValidate;
    if (operation == kOperationNone && command == "staple") return kOperationStaple;
    return kOperationNone;
}

}  // namespace

int main(int argc, char** argv) {
    // The threads of a run take turns: a second heap would only cost more new memory.
    mallopt(M_ARENA_MAX, 1);
    runtime::occupyStandardStreams();
    // A closed pipe must not stop a staple half-way.
    std::signal(SIGPIPE, SIG_IGN);
    // The same for a file that would exceed the caller's limit: the write then fails with an error.
    std::signal(SIGXFSZ, SIG_IGN);

    if (argc <= 2) {
        printUsage();
        return kExitUsage;
    }
    // Saved first: the option scan reorders the arguments.
    const std::string command = argv[1];
    const std::string path = argv[argc - 1];
    scanOptions(argc, argv);

    operation = operationForCommand(command);
    if (operation == kOperationNone) {
        printUsage();
        return kExitUsage;
    }
    const URL artefact = URL::fileURLWithPath(path);
    const HostPlatform host([](int status) { std::exit(status); });
    limitRun(artefact);
    const runtime::StackGuard guard;
    keepSecurityLibrary();
    for (const std::string& missing :
         sandbox::confine(confinementOfRun(operation, artefact, host.services().directory)))
        NoisyLog("%@.", missing);
    runtime::RunLoop mainRunLoop;
    return runOperation(operation, artefact, host.services(), [&] { mainRunLoop.run(); });
}
