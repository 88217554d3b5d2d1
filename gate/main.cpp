// pinwell-gate: whether software that was received may be let in.
#include <sysexits.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <csignal>
#include <cstdio>
#include <exception>
#include <map>
#include <string>
#include <vector>

#include "foundation/format.h"
#include "foundation/process.h"
#include "gate/judge.h"
#include "gate/render.h"
#include "src/host_platform.h"
#include "src/messages.h"

namespace {

using namespace pinwell;
using namespace pinwell::gate;

void complain(std::string_view text) {
    const std::string line = "pinwell-gate: " + std::string(text) + "\n";
    std::fwrite(line.data(), 1, line.size(), stderr);
}

bool write(const std::string& text) {
    return std::fwrite(text.data(), 1, text.size(), stdout) == text.size() && std::fflush(stdout) == 0;
}

int judgeAll(const Options& options) {
    // What the tool's own functions would say is among the checks.
    verboseLevel = kVerbosityQuiet;
    const HostPlatform host([](int) {});
    verify::Workers workers;
    const Judge judge(host.services(), options, workers);
    std::vector<Result> results(options.paths.size());
    workers.forEach(results.size(), [&](std::size_t i) { results[i] = judge.judge(options.paths[i]); });

    if (!write(options.format == Format::json ? renderJson(results) : renderText(results))) {
        complain("cannot write to standard output");
        return EX_IOERR;
    }
    const auto worst = std::max_element(results.begin(), results.end(), [](const Result& a, const Result& b) {
        return a.verdict < b.verdict;
    });
    return exitStatusOf(worst->verdict);
}

int run(int argc, char** argv) {
    Options options;
    CLI::App app("Judges software that was received: its ticket, and every byte that was signed.",
                 "pinwell-gate");
    app.set_version_flag("--version", "pinwell-gate " PINWELL_VERSION);
    app.add_option("PATH", options.paths, "A bundle, disk image or package")->required();
    app.add_flag_callback(
        "--offline", [&] { options.tickets = Options::Tickets::offline; }, "Judge the stapled ticket alone");
    app.add_flag("--shallow", options.isShallow, "Do what `pinwell validate` does: do not look at the bytes");
    const std::map<std::string, Format> formats{{"text", Format::text}, {"json", Format::json}};
    app.add_option("--format", options.format, "text or json")->transform(CLI::Transformer(formats));
    try {
        app.parse(argc, argv);
    } catch (const CLI::Success& request) {
        return app.exit(request);  // help, version
    } catch (const CLI::ParseError& error) {
        complain(foundation::escapeForTerminal(error.what()));
        return EX_USAGE;
    }
    if (options.tickets == Options::Tickets::online) {
        complain("asking the service is not built in yet; use --offline");
        return EX_USAGE;
    }
    return judgeAll(options);
}

}  // namespace

int main(int argc, char** argv) {
    foundation::occupyStandardStreams();
    // A reader that has gone away is a failed write.
    std::signal(SIGPIPE, SIG_IGN);
    try {
        return run(argc, argv);
    } catch (const std::exception& error) {
        complain(foundation::escapeForTerminal(error.what()));
        return EX_SOFTWARE;
    }
}
