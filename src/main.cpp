// The entry point: options, the operation and the path, and the hand-off to the controller.

#include <getopt.h>
#include <malloc.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "foundation/process.h"
#include "foundation/run_loop.h"
#include "src/DownloadDelegate.h"
#include "src/host_platform.h"
#include "src/messages.h"

namespace {

using namespace pinwell;

constexpr int kExitNothingRecorded = 1;

// The operation of the run, and the long options; process-wide, as the option scan is.
std::uint8_t operation = kOperationNone;

constexpr option options[] = {
    {"help", no_argument, nullptr, '?'},
    {"quiet", no_argument, nullptr, 'q'},
    {"verbose", no_argument, nullptr, 'v'},
    {nullptr, 0, nullptr, 0},
};

void printUsage() {
    const std::string program = foundation::processName();
    const std::string usage = foundation::format(
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
    // A standard error that is closed loses the text and nothing else.
    [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, usage.data(), usage.size());
}

void scanOptions(int argc, char** argv) {
    opterr = 0;  // the usage text says it all
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

// False when another process has it. What cannot be locked, since there is no such file or its file system
// knows no locks, is left to those that come after: before they write, they look at what has changed in the
// meantime.
bool lockArtefact(const Platform& platform, const URL& path, std::unique_ptr<files::ItemLock>& lock) {
    auto locked = platform.files.lockItem(path);
    if (locked) {
        lock = *std::move(locked);
        return true;
    }
    if (locked.error().code() != EBUSY) return true;
    MessageLog("Another process keeps %@ locked. Nothing was written to it.", path.path());
    return false;
}

int run(const URL& path) {
    const HostPlatform host([](int status) { std::exit(status); });
    const Platform platform = host.services();

    // Held to the end: of two staples of one artefact, the second begins to read when the first has read back
    // what it wrote.
    std::unique_ptr<files::ItemLock> lock;
    if (operation == kOperationStaple && !lockArtefact(platform, path, lock)) return kExitCannotCreate;

    const auto hashedFile = PWHashedFile::initWithFileURL(path, platform);
    if (hashedFile == nullptr) return kExitNoInput;
    if (hashedFile->appropriateExitCode() != kExitOK) return hashedFile->appropriateExitCode();

    foundation::RunLoop mainRunLoop;
    DownloadDelegate controller(hashedFile, platform);
    controller.setOperation(operation);
    if (controller.grabTicket()) {
        mainRunLoop.run();
        return kExitOK;
    }
    const int code = controller.hashedFile()->appropriateExitCode();
    return code == kExitOK ? kExitNothingRecorded : code;
}

}  // namespace

int main(int argc, char** argv) {
    // The threads of a run take turns: a second heap would only be more fresh memory to fault in.
    mallopt(M_ARENA_MAX, 1);
    foundation::occupyStandardStreams();
    // A reader that has gone away must not stop a staple half-way.
    std::signal(SIGPIPE, SIG_IGN);
    // The same for a file that would grow beyond the caller's limit: the write then fails, and says so.
    std::signal(SIGXFSZ, SIG_IGN);

    if (argc <= 2) {
        printUsage();
        return kExitUsage;
    }
    // As passed: the option scan moves the arguments about.
    const std::string command = argv[1];
    const std::string path = argv[argc - 1];
    scanOptions(argc, argv);

    operation = operationForCommand(command);
    if (operation == kOperationNone) {
        printUsage();
        return kExitUsage;
    }
    return run(URL::fileURLWithPath(path));
}
