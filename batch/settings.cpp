#include "settings.h"

#include <sysexits.h>

#include <algorithm>
#include <thread>
#include <utility>

#include "src/DownloadDelegate.h"

namespace pinwell::batch {
namespace {

using companion::countOption;
using companion::flagOption;
using companion::Option;
using companion::readCount;
using companion::secondsOption;
using companion::textOption;

constexpr std::uint64_t kMostJobs = 1024;
constexpr std::uint64_t kMostRetries = 1000;
constexpr std::uint64_t kMostShards = 1'000'000;

base::Result<void> takeShard(const std::string& text, Settings& settings) {
    const std::size_t slash = text.find('/');
    if (slash == std::string::npos) return companion::wrongValue("is not I/N");
    const auto shards = readCount(text.substr(slash + 1), 1, kMostShards);
    const auto shard = readCount(text.substr(0, slash), 1, shards ? *shards : 1);
    if (!shards || !shard) return companion::wrongValue("is not I/N with I from 1 to N");
    settings.shard = *shard;
    settings.shards = *shards;
    return {};
}

std::vector<Option> optionsOf(Settings& settings) {
    std::vector<Option> options{
        textOption("from", 0, "FILE", "Read paths from a file, one a line; - is standard input",
                   settings.from),
        flagOption("null", '0', "A zero byte ends each path of that file, not a newline",
                   settings.isZeroTerminated),
        {"shard", 0, "I/N", "Work on the I-th of N parts of the list",
         [&](const std::string& given) { return takeShard(given, settings); }},
        countOption("jobs", 'j', "N", "How many at once (default: one a processor)", 1, kMostJobs,
                    settings.jobs),
        countOption("retries", 0, "N", "How often to try again what is out of reach (default: 5)", 0,
                    kMostRetries, settings.retry.retries),
        secondsOption("retry-delay", "Before the first of these tries; doubled each time (default: 1)",
                      settings.retry.firstDelay),
        secondsOption("wait", "Ask again for so long for tickets that are not issued yet", settings.wait),
        secondsOption("timeout", "The time that one artefact may take", settings.timeout),
        secondsOption("deadline", "The time that all of them may take", settings.deadline),
        textOption("resume", 0, "FILE", "Keep a journal there, and leave out what it says is done",
                   settings.journal),
        flagOption("keep", 0, "Keep the tickets and copies in the temporary directory",
                   settings.keepsTemporaryFiles),
        flagOption("json", 0, "Print one JSON object an artefact, each on a line", settings.asJson),
        textOption("junit", 0, "FILE", "Write a JUnit report there", settings.junit),
    };
    for (Option& option : companion::outputOptions(settings.color, settings.isQuiet, settings.isVerbose))
        options.push_back(std::move(option));
    return options;
}

}  // namespace

CommandLine readCommandLine(int argc, char** argv) {
    CommandLine line;
    Settings& settings = line.settings;
    settings.jobs = std::max(std::thread::hardware_concurrency(), 1U);
    const companion::Program program{
        .name = kProgramName,
        .help = "Staples or validates many artefacts at once, as pinwell does each of them.",
        .epilogue =
            "Exit status: the worst of all artefacts, in the order 77 revoked, 73 not written, 65 no good\n"
            "ticket, 66 no artefact, 68 service out of reach or time up, 0 all is well; 64 wrong usage;\n"
            "130 and 143 after SIGINT and SIGTERM.",
        .commands = {{"staple", "PATH...", "Retrieves a ticket for each artefact and attaches it.",
                      optionsOf(settings)},
                     {"validate", "PATH...", "Validates the ticket that is stapled to each artefact.",
                      optionsOf(settings)}}};
    companion::Parsed parsed = companion::parseCommand(program, argc, argv);
    line.exitStatus = parsed.exitStatus;
    if (line.exitStatus) return line;
    settings.operation = parsed.command->name == "staple" ? kOperationStaple : kOperationValidate;
    settings.paths = std::move(parsed.arguments);
    if (settings.paths.empty() && !settings.from) {
        companion::complain(kProgramName, "no path is given; name some, or a list of them with --from");
        line.exitStatus = EX_USAGE;
    }
    return line;
}

}  // namespace pinwell::batch
