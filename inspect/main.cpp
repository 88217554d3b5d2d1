// pinwell-inspect: shows everything about an artefact that concerns its ticket. Only reads; no network.
#include <sysexits.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <atomic>
#include <cstdint>
#include <string>
#include <vector>

#include "companion/command_line.h"
#include "companion/process.h"
#include "companion/streams.h"
#include "gather.h"
#include "render_json.h"
#include "render_text.h"
#include "runtime/signals.h"
#include "sandbox/sandbox.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"

namespace {

using namespace pinwell;

struct Arguments {
    std::vector<std::string> paths;
    bool asJson = false;
    companion::ColorWhen color = companion::ColorWhen::automatic;
};

constexpr std::string_view kProgramName = "pinwell-inspect";

void complain(std::string_view text) {
    companion::complain(kProgramName, text);
}

/// After this, the process only reads the given paths: it writes nothing, starts nothing and connects to
/// nothing. On a kernel without support the run goes on without the restrictions.
void giveUpRights(const Arguments& arguments, const Platform& platform) {
    keepSecurityLibrary();
    platform.systemLog.connect();
    static_cast<void>(sandbox::confine(confinementOfReading(arguments.paths, platform.directory)));
}

void limitRunaways(const Arguments& arguments) {
    static const std::atomic<std::int32_t> status{EX_NOINPUT};
    std::uint64_t seconds = 0;
    for (const std::string& path : arguments.paths)
        seconds += processorSecondsForArtefact(values::URL::fileURLWithPath(path));
    sandbox::limitRunaways(seconds,
                           {STDERR_FILENO, "pinwell-inspect: gave up: it takes too much processor time",
                            "pinwell-inspect: gave up: something is nested too deeply", &status});
}

int inspectAll(const Arguments& arguments) {
    // The report contains the messages of the tool's own functions.
    verboseLevel = kVerbosityQuiet;
    const HostPlatform host([](int) {});
    limitRunaways(arguments);
    const runtime::StackGuard guard;
    giveUpRights(arguments, host.services());
    const inspect::Inspector inspector(host.services());
    const bool inColor = companion::wantsColor(arguments.color, STDOUT_FILENO);
    companion::Output output(STDOUT_FILENO);
    int worst = EX_OK;
    bool first = true;
    for (const std::string& path : arguments.paths) {
        const inspect::Report report = inspector.inspect(path);
        const std::string text = arguments.asJson
                                     ? inspect::renderJson(report)
                                     : (first ? "" : "\n") + inspect::renderText(report, inColor);
        first = false;
        output.write(text);
        if (output.hasFailed()) {
            complain("cannot write to standard output");
            return EX_IOERR;
        }
        worst = std::max(worst, inspect::exitStatusOf(report.outcome));
    }
    return worst;
}

int run(int argc, char** argv) {
    Arguments arguments;
    CLI::App app(
        "Shows everything about an artefact that bears on its ticket: the code signature, where the "
        "ticket sits, what it says, and whether it is good. Changes nothing and uses no network.",
        std::string(kProgramName));
    app.set_version_flag("--version", companion::versionText(kProgramName));
    std::string color = "auto";
    app.add_option("--color", color, "Colour the text: auto, always or never")
        ->check(CLI::IsMember({"auto", "always", "never"}))
        ->capture_default_str();
    app.add_option("PATH", arguments.paths, "A bundle, disk image or package, or a ticket file by itself")
        ->required();
    app.add_flag("--json", arguments.asJson, "Print one JSON object a path, each on a line");
    app.footer(
        "Exit status: 0 every ticket is good; 65 a ticket is missing or not acceptable; 66 a path cannot\n"
        "be read, is nothing that carries a ticket, or has no valid signature; 64 wrong usage. Of several\n"
        "paths the highest counts.");
    if (const auto status = companion::parseLine(app, argc, argv)) return *status;
    arguments.color = companion::colorWhenNamed(color);
    return inspectAll(arguments);
}

}  // namespace

int main(int argc, char** argv) {
    return companion::runMain(kProgramName, [&] { return run(argc, argv); });
}
