#include "batch/command_line.h"

#include <sysexits.h>

#include <array>
#include <charconv>
#include <string_view>
#include <thread>
#include <utility>

#include "companion/command_line.h"
#include "src/DownloadDelegate.h"

namespace pinwell::batch {
namespace {

using companion::Option;
using companion::takeCount;
using companion::takeSeconds;
using Wrong = std::optional<std::string>;

constexpr std::uint64_t kMostJobs = 1024;
constexpr std::uint64_t kMostRetries = 1000;
constexpr std::uint64_t kMostShards = 1'000'000;

Wrong takeShard(const std::string& text, Settings& settings) {
    const std::size_t slash = text.find('/');
    if (slash == std::string::npos) return "is not I/N";
    if (takeCount(text.substr(slash + 1), 1, kMostShards, settings.shards) ||
        takeCount(text.substr(0, slash), 1, settings.shards, settings.shard))
        return "is not I/N with I from 1 to N";
    return std::nullopt;
}

Option flag(const char* name, char letter, const char* help, bool& value) {
    return {name, letter, "", help, [&value](const std::string&) {
                value = true;
                return Wrong();
            }};
}

Option text(const char* name, const char* argument, const char* help, std::optional<std::string>& value) {
    return {name, 0, argument, help, [&value](const std::string& given) -> Wrong {
                if (given.empty()) return "is empty";
                if (value) return "is given twice";
                value = given;
                return std::nullopt;
            }};
}

Option seconds(const char* name, const char* help, std::optional<Seconds>& value) {
    return {name, 0, "SECONDS", help,
            [&value](const std::string& given) { return takeSeconds(given, value.emplace()); }};
}

std::vector<Option> optionsOf(Settings& settings) {
    return {
        text("from", "FILE", "Read paths from a file, one a line; - is standard input", settings.from),
        flag("null", '0', "A zero byte ends each path of that file, not a newline",
             settings.isZeroTerminated),
        {"shard", 0, "I/N", "Work on the I-th of N parts of the list",
         [&](const std::string& given) { return takeShard(given, settings); }},
        {"jobs", 'j', "N", "How many at once (default: one a processor)",
         [&](const std::string& given) { return takeCount(given, 1, kMostJobs, settings.jobs); }},
        {"retries", 0, "N", "How often to try again what is out of reach (default: 5)",
         [&](const std::string& given) {
             std::uint64_t number = 0;
             Wrong wrong = takeCount(given, 0, kMostRetries, number);
             settings.retry.retries = static_cast<unsigned>(number);
             return wrong;
         }},
        {"retry-delay", 0, "SECONDS", "Before the first of these tries; doubled each time (default: 1)",
         [&](const std::string& given) { return takeSeconds(given, settings.retry.firstDelay); }},
        {"wait", 0, "SECONDS", "Ask again for so long for tickets that are not issued yet",
         [&](const std::string& given) { return takeSeconds(given, settings.wait); }},
        seconds("timeout", "The time that one artefact may take", settings.timeout),
        seconds("deadline", "The time that all of them may take", settings.deadline),
        text("resume", "FILE", "Keep a journal there, and leave out what it says is done", settings.journal),
        flag("keep", 0, "Keep the tickets and copies in the temporary directory",
             settings.keepsTemporaryFiles),
        flag("json", 0, "Print one JSON object an artefact, each on a line", settings.asJson),
        text("junit", "FILE", "Write a JUnit report there", settings.junit),
        {"color", 0, "WHEN", "Colour the lines: auto, always or never (default: auto)",
         [&](const std::string& given) {
             static constexpr std::array<std::string_view, 3> kWords{"auto", "always", "never"};
             std::string word;
             Wrong wrong = companion::takeWord(given, kWords, word);
             settings.color = companion::colorWhenNamed(word);
             return wrong;
         }},
        {"quiet", 'q', "", "Print nothing but JSON",
         [&](const std::string&) {
             settings.isQuiet = true;
             settings.isVerbose = false;
             return Wrong();
         }},
        {"verbose", 'v', "", "Print all that pinwell -v says",
         [&](const std::string&) {
             settings.isVerbose = true;
             settings.isQuiet = false;
             return Wrong();
         }},
    };
}

}  // namespace

std::optional<int> readCommandLine(int argc, char** argv, Settings& settings) {
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
    if (parsed.exitStatus) return parsed.exitStatus;
    settings.operation = parsed.command->name == "staple" ? kOperationStaple : kOperationValidate;
    settings.paths = std::move(parsed.arguments);
    if (settings.paths.empty() && !settings.from) {
        companion::complain(kProgramName, "no path is given; name some, or a list of them with --from");
        return EX_USAGE;
    }
    return std::nullopt;
}

}  // namespace pinwell::batch
