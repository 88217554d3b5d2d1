// pinwell-ticket: tickets as files.
#include <malloc.h>
#include <sysexits.h>

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/text.h"
#include "commands.h"
#include "companion/command_line.h"
#include "companion/process.h"
#include "crypto/crypto.h"
#include "https/session.h"
#include "retrieval/ticket_request.h"
#include "sandbox/sandbox.h"
#include "src/DownloadDelegate.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"

namespace {

using namespace pinwell;
using namespace pinwell::ticket_files;
using companion::flagOption;
using companion::Option;
using companion::textOption;

constexpr std::uint64_t kMostRetries = 1000;

std::vector<Option> withCommon(std::vector<Option> options, Settings& settings) {
    options.push_back(flagOption("json", 0, "Print one JSON object each, on a line", settings.asJson));
    for (Option& option : companion::outputOptions(settings.color, settings.isQuiet, settings.isVerbose))
        options.push_back(std::move(option));
    return options;
}

// For the commands that ask a service for many tickets and keep them.
std::vector<Option> manyOptions(Settings& settings) {
    return {
        textOption("from", 0, "FILE", "Read names from a file, one a line; - is standard input",
                   settings.from),
        flagOption("null", '0', "A zero byte ends each name of that file, not a newline",
                   settings.isZeroTerminated),
        textOption("out", 'o', "DIR", "The directory to put them in (needed)", settings.output),
        companion::countOption("retries", 0, "N", "How often to try again what is out of reach (default: 5)",
                               0, kMostRetries, settings.retry.retries),
        companion::secondsOption("retry-delay",
                                 "Before the first of these tries; doubled each time (default: 1)",
                                 settings.retry.firstDelay),
        companion::secondsOption("deadline", "The time that all of them may take", settings.deadline),
    };
}

std::vector<Option> fetchOptions(Settings& settings) {
    std::vector<Option> options = manyOptions(settings);
    options.push_back(companion::secondsOption(
        "wait", "Ask again for so long for tickets that are not issued yet", settings.wait));
    return options;
}

std::vector<Option> requestOptions(Settings& settings) {
    std::vector<Option> options{
        textOption("url", 0, "URL", "The service's administration listener: https://HOST:PORT (needed)",
                   settings.url),
        textOption("cert", 0, "FILE", "This client's certificate, in PEM (needed)", settings.certificate),
        textOption("key", 0, "FILE", "Its private key, in PEM, unencrypted (needed)", settings.key),
        textOption("label", 0, "TEXT", "What the artefact is, for people (default: its file name)",
                   settings.label),
        flagOption("reinstate", 0, "Issue even where the record is revoked; needs --comment",
                   settings.reinstates),
        textOption("comment", 0, "TEXT", "For the service's log", settings.comment),
    };
    for (Option& option : manyOptions(settings)) options.push_back(std::move(option));
    return options;
}

companion::Program programFor(Settings& settings) {
    return {
        .name = kProgramName,
        .help =
            "Fetches tickets into files, and takes them from there to artefacts and back. Only fetch and "
            "request\n"
            "use the network.",
        .epilogue =
            "Exit status: the worst of all, as pinwell's: 77 revoked, 73 not written, 65 no good ticket,\n"
            "66 no artefact, 68 service out of reach, 0 all is well; 64 wrong usage.",
        .commands = {
            {"hash", "PATH...", "Prints the record name of each artefact.", withCommon({}, settings)},
            {"fetch", "NAME...", "Fetches tickets by record name, or for artefacts by their path.",
             withCommon(fetchOptions(settings), settings)},
            {"request", "PATH...", "Has a record service issue tickets for artefacts.",
             withCommon(requestOptions(settings), settings)},
            {"attach", "PATH...", "Attaches tickets from files.",
             withCommon(
                 {textOption("tickets", 0, "DIR", "A directory that fetch has filled", settings.tickets),
                  textOption("ticket", 0, "FILE", "One ticket, for all of the artefacts", settings.ticket)},
                 settings)},
            {"extract", "PATH", "Writes the ticket of an artefact to a new file.",
             withCommon({textOption("output", 'o', "FILE", "The file to make (default: named by the record)",
                                    settings.output)},
                        settings)},
            {"remove", "PATH...", "Removes the ticket of each artefact.", withCommon({}, settings)},
        }};
}

int refuse(const std::string& what) {
    companion::complain(kProgramName, what);
    return EX_USAGE;
}

std::optional<int> refuseRequest(const Settings& settings) {
    if (!settings.url || !settings.certificate || !settings.key || !settings.output)
        return refuse("request needs --url URL, --cert FILE, --key FILE and --out DIR");
    if (!retrieval::serviceURLOf(*settings.url))
        return refuse("--url: it is no https://HOST:PORT, or holds more than that and a path");
    if (settings.label && (settings.from || settings.arguments.size() > 1))
        return refuse("--label is for one artefact");
    if (settings.reinstates && !settings.comment) return refuse("--reinstate needs --comment TEXT");
    for (const auto& one : {settings.label, settings.comment})
        if (one && !base::isUTF8(*one)) return refuse("--label and --comment are in UTF-8");
    return std::nullopt;
}

// Checks the rules between the options and the arguments of a command.
std::optional<int> refuseUsage(const std::string& command, const Settings& settings) {
    if (settings.arguments.empty() && !settings.from)
        return refuse(command == "fetch" ? "no name is given; name some, or a list of them with --from"
                                         : "no path is given");
    if (command == "fetch" && !settings.output) return refuse("fetch needs --out DIR");
    if (command == "request") return refuseRequest(settings);
    if (command == "attach" && !settings.tickets && !settings.ticket)
        return refuse("attach needs --tickets DIR or --ticket FILE");
    if (command == "attach" && settings.tickets && settings.ticket)
        return refuse("attach takes --tickets or --ticket, not both");
    if (command == "extract" && settings.arguments.size() > 1) return refuse("extract takes one path");
    return std::nullopt;
}

// Only the rights that the command needs. The trash may be anywhere on an artefact's volume, and the paths of
// a list are not known yet.
sandbox::Confinement rightsFor(const std::string& command, const Settings& settings,
                               const config::PlatformDirectory& platform) {
    using sandbox::Access;
    const auto directoryOf = [](const std::string& path) {
        return URL::fileURLWithPath(path).deletingLastPathComponent().path();
    };
    if (command == "hash") return confinementOfReading(settings.arguments, platform);
    if (command == "extract") {
        sandbox::Confinement rights = confinementOfReading(settings.arguments, platform);
        rights.calls = sandbox::Calls::service;
        rights.files.push_back({settings.output ? directoryOf(*settings.output) : ".", Access::write});
        return rights;
    }
    if (command == "fetch" || command == "request") {
        sandbox::Confinement rights = confinementOfRuns(kOperationValidate, settings.arguments, platform);
        if (settings.from) rights.files.push_back({"/", Access::read});
        // The directory is made if it is missing; it may be a link.
        rights.files.push_back({directoryOf(*settings.output), Access::write});
        rights.files.push_back({*settings.output, Access::write});
        return rights;
    }
    sandbox::Confinement rights = confinementOfRuns(kOperationStaple, settings.arguments, platform);
    rights.network = sandbox::Network::none;
    if (settings.tickets) sandbox::append(rights.files, sandbox::filesWithLinks(*settings.tickets));
    if (settings.ticket) rights.files.push_back({*settings.ticket, Access::read});
    if (command == "remove") rights.files.push_back({"/", Access::write});
    return rights;
}

// Call it before there is a second thread.
void giveUpRights(const std::string& command, const Settings& settings, const Platform& platform) {
    keepSecurityLibrary();
    platform.systemLog.connect();
    for (const std::string& missing : sandbox::confine(rightsFor(command, settings, platform.directory)))
        if (settings.isVerbose) companion::complain(kProgramName, missing);
}

int run(int argc, char** argv) {
    Settings settings;
    const companion::Program program = programFor(settings);
    companion::Parsed parsed = companion::parseCommand(program, argc, argv);
    if (parsed.exitStatus) return *parsed.exitStatus;
    settings.arguments = std::move(parsed.arguments);
    const std::string& command = parsed.command->name;
    if (const auto status = refuseUsage(command, settings)) return *status;

    // Messages are collected for each artefact: no other line is printed.
    verboseLevel = settings.isVerbose ? kVerbosityVerbose : kVerbosityQuiet;
    const HostPlatform host([](int) {}, HostPlatform::Connections::kept);
    // Read before the rights are given up: they do not include this file.
    std::shared_ptr<const https::ClientIdentity> identity;
    if (command == "request") {
        sandbox::forbidCoreDumps();  // they would hold the key
        auto read = https::ClientIdentity::read(*settings.certificate, *settings.key);
        if (!read) {
            companion::complain(kProgramName, read.error().localizedDescription());
            return EX_NOINPUT;
        }
        identity = *std::move(read);
    }
    giveUpRights(command, settings, host.services());
    if (command == "hash") return hash(settings, host.services());
    if (command == "fetch") return fetch(settings, host.services());
    if (command == "request") return request(settings, host.services(), std::move(identity));
    if (command == "attach") return attach(settings, host.services());
    if (command == "extract") return extract(settings, host.services());
    return ticket_files::remove(settings, host.services());
}

}  // namespace

int main(int argc, char** argv) {
    mallopt(M_ARENA_MAX, 1);
    crypto::wipeWhatOpenSSLFrees();
    return companion::runMain(kProgramName, [&] { return run(argc, argv); });
}
