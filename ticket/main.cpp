// pinwell-ticket: tickets as files.
#include <malloc.h>
#include <sysexits.h>

#include <array>
#include <csignal>
#include <exception>
#include <memory>
#include <string_view>
#include <utility>

#include "companion/command_line.h"
#include "crypto/crypto.h"
#include "foundation/process.h"
#include "foundation/utf8.h"
#include "https/client_identity.h"
#include "retrieval/ticket_request.h"
#include "sandbox/sandbox.h"
#include "src/DownloadDelegate.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"
#include "ticket/commands.h"

namespace {

using namespace pinwell;
using namespace pinwell::ticket_files;
using companion::Option;
using Wrong = std::optional<std::string>;

constexpr std::uint64_t kMostRetries = 1000;

Option flag(const char* name, char letter, const char* help, bool& value) {
    return {name, letter, "", help, [&value](const std::string&) {
                value = true;
                return Wrong();
            }};
}

Option text(const char* name, char letter, const char* argument, const char* help,
            std::optional<std::string>& value) {
    return {name, letter, argument, help, [&value](const std::string& given) -> Wrong {
                if (given.empty()) return "is empty";
                if (value) return "is given twice";
                value = given;
                return std::nullopt;
            }};
}

std::vector<Option> withCommon(std::vector<Option> options, Settings& settings) {
    options.push_back(flag("json", 0, "Print one JSON object each, on a line", settings.asJson));
    options.push_back({"color", 0, "WHEN", "Colour the lines: auto, always or never (default: auto)",
                       [&](const std::string& given) {
                           static constexpr std::array<std::string_view, 3> kWords{"auto", "always", "never"};
                           std::string word;
                           Wrong wrong = companion::takeWord(given, kWords, word);
                           settings.color = companion::colorWhenNamed(word);
                           return wrong;
                       }});
    options.push_back({"quiet", 'q', "", "Print nothing but JSON", [&](const std::string&) {
                           settings.isQuiet = true;
                           settings.isVerbose = false;
                           return Wrong();
                       }});
    options.push_back({"verbose", 'v', "", "Print all that pinwell -v says", [&](const std::string&) {
                           settings.isVerbose = true;
                           settings.isQuiet = false;
                           return Wrong();
                       }});
    return options;
}

// Of the commands that ask a service for many tickets and keep them.
std::vector<Option> manyOptions(Settings& settings) {
    return {
        text("from", 0, "FILE", "Read names from a file, one a line; - is standard input", settings.from),
        flag("null", '0', "A zero byte ends each name of that file, not a newline",
             settings.isZeroTerminated),
        text("out", 'o', "DIR", "The directory to put them in (needed)", settings.output),
        {"retries", 0, "N", "How often to try again what is out of reach (default: 5)",
         [&](const std::string& given) {
             std::uint64_t number = 0;
             Wrong wrong = companion::takeCount(given, 0, kMostRetries, number);
             settings.retry.retries = static_cast<unsigned>(number);
             return wrong;
         }},
        {"retry-delay", 0, "SECONDS", "Before the first of these tries; doubled each time (default: 1)",
         [&](const std::string& given) { return companion::takeSeconds(given, settings.retry.firstDelay); }},
        {"deadline", 0, "SECONDS", "The time that all of them may take",
         [&](const std::string& given) {
             return companion::takeSeconds(given, settings.deadline.emplace());
         }},
    };
}

std::vector<Option> fetchOptions(Settings& settings) {
    std::vector<Option> options = manyOptions(settings);
    options.push_back(
        {"wait", 0, "SECONDS", "Ask again for so long for tickets that are not issued yet",
         [&](const std::string& given) { return companion::takeSeconds(given, settings.wait); }});
    return options;
}

std::vector<Option> requestOptions(Settings& settings) {
    std::vector<Option> options{
        text("url", 0, "URL", "The service's administration listener: https://HOST:PORT (needed)",
             settings.url),
        text("cert", 0, "FILE", "This client's certificate, in PEM (needed)", settings.certificate),
        text("key", 0, "FILE", "Its private key, in PEM, unencrypted (needed)", settings.key),
        text("label", 0, "TEXT", "What the artefact is, for people (default: its file name)", settings.label),
        flag("reinstate", 0, "Issue even where the record is revoked; needs --comment", settings.reinstates),
        text("comment", 0, "TEXT", "For the service's log", settings.comment),
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
             withCommon({text("tickets", 0, "DIR", "A directory that fetch has filled", settings.tickets),
                         text("ticket", 0, "FILE", "One ticket, for all of the artefacts", settings.ticket)},
                        settings)},
            {"extract", "PATH", "Writes the ticket of an artefact to a new file.",
             withCommon({text("output", 'o', "FILE", "The file to make (default: named by the record)",
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
        if (one && !foundation::isUTF8(*one)) return refuse("--label and --comment are in UTF-8");
    return std::nullopt;
}

// What the options of a command do not say by themselves.
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

// What the command needs, and nothing else. Trash may be anywhere on an artefact's volume, and where the
// names of a list lead is not known yet.
sandbox::Confinement rightsFor(const std::string& command, const Settings& settings,
                               const foundation::PlatformDirectory& platform) {
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
        // It is made, unless it is there or is a link to another one.
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

// Before there is a second thread.
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

    // Lines are collected an artefact: what is not collected is not printed.
    verboseLevel = settings.isVerbose ? kVerbosityVerbose : kVerbosityQuiet;
    const HostPlatform host([](int) {}, HostPlatform::Connections::kept);
    // Read while its file may be: afterwards the program opens what artefacts and tickets need.
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
    foundation::occupyStandardStreams();
    // A reader that has gone away, and a file that would grow beyond the caller's limit, are failed writes.
    std::signal(SIGPIPE, SIG_IGN);
    std::signal(SIGXFSZ, SIG_IGN);
    try {
        return run(argc, argv);
    } catch (const std::exception& error) {
        companion::complain(kProgramName, error.what());
        return EX_SOFTWARE;
    }
}
