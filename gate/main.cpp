// pinwell-gate: whether software that was received may be let in.
#include <sysexits.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "codesign/code_error.h"
#include "companion/command_line.h"
#include "companion/parse_errors.h"
#include "companion/version.h"
#include "foundation/format.h"
#include "foundation/process.h"
#include "gate/find.h"
#include "gate/policy.h"
#include "gate/render.h"
#include "gate/run.h"
#include "sandbox/sandbox.h"
#include "src/DownloadDelegate.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"

namespace {

using namespace pinwell;
using namespace pinwell::gate;

void complain(std::string_view text) {
    companion::complain("pinwell-gate", text);
}

/// A document that goes to a file, which is opened before any artefact is read, or to standard output.
class Output {
  public:
    /// Empty: standard output.
    explicit Output(std::string path) : path_(std::move(path)) {}

    /// Makes the file, or empties it.
    bool open() {
        if (path_.empty()) return true;
        file_.reset(std::fopen(path_.c_str(), "we"));
        if (!file_) complain("cannot write to " + path_);
        return file_ != nullptr;
    }

    bool write(const std::string& text) {
        std::FILE* const target = path_.empty() ? stdout : file_.get();
        const bool isWritten =
            std::fwrite(text.data(), 1, text.size(), target) == text.size() && std::fflush(target) == 0;
        if (!isWritten)
            complain("cannot write to " + (path_.empty() ? std::string("standard output") : path_));
        return isWritten;
    }

  private:
    struct Close {
        void operator()(std::FILE* file) const noexcept { static_cast<void>(std::fclose(file)); }
    };

    std::string path_;
    std::unique_ptr<std::FILE, Close> file_;
};

/// Policy options of the command line, over those of a file.
struct PolicyArguments {
    std::string file;
    std::string maximumTicketAge;
    std::vector<std::string> teams;
    std::vector<std::string> identifiers;
    bool requiresSecureTimestamp = false;

    Policy combined() const {
        Policy policy = file.empty() ? Policy() : readPolicyFile(file);
        if (!maximumTicketAge.empty()) policy.maximumTicketAge = ageFrom(maximumTicketAge);
        if (!teams.empty()) policy.teams = teams;
        if (!identifiers.empty()) policy.identifiers = identifiers;
        policy.requiresSecureTimestamp = policy.requiresSecureTimestamp || requiresSecureTimestamp;
        return policy;
    }
};

std::string requireAge(const std::string& text) {
    return ageFrom(text) ? std::string() : "must be a number and one of s, m, h, d, w, such as 90d";
}

std::string requireText(const std::string& text) {
    return text.empty() ? "must not be empty" : std::string();
}

void addOptions(CLI::App& app, Options& options, PolicyArguments& policy) {
    using Tickets = Options::Tickets;
    app.add_option("PATH", options.paths, "A bundle, disk image or package")->required();
    CLI::Option_group* const tickets = app.add_option_group("Tickets");
    tickets->require_option(0, 1);
    tickets->add_flag_callback(
        "--online", [&] { options.tickets = Tickets::online; },
        "Ask the record service for the ticket of today, too (default)");
    tickets->add_flag_callback(
        "--offline", [&] { options.tickets = Tickets::offline; }, "Go by the stapled ticket alone");
    tickets
        ->add_option_function<std::string>(
            "--tickets",
            [&](const std::string& directory) {
                options.tickets = Tickets::directory;
                options.ticketDirectory = directory;
            },
            "Take the tickets of today from this directory (2-2-HEX.ticket)")
        ->type_name("DIR")
        ->check(requireText);
    app.add_flag("--shallow", options.isShallow, "Judge the tickets as `pinwell validate` does, and no more");
    app.add_flag("--recursive,-r", options.isRecursive, "Judge every artefact in the directories");

    CLI::Option_group* const group = app.add_option_group("Policy");
    group->add_option("--policy", policy.file, "Read the policy from a file in TOML")->type_name("FILE");
    group->add_option("--max-ticket-age", policy.maximumTicketAge, "Refuse older tickets: 90d, 12h")
        ->type_name("AGE")
        ->check(requireAge);
    group->add_option("--require-team", policy.teams, "Refuse code of other teams")
        ->type_name("ID")
        ->check(requireText)
        ->allow_extra_args(false);
    group->add_option("--require-identifier", policy.identifiers, "Refuse code with other identifiers")
        ->type_name("GLOB")
        ->check(requireText)
        ->allow_extra_args(false);
    group->add_flag("--require-secure-timestamp", policy.requiresSecureTimestamp,
                    "Refuse code whose signature has no secure timestamp");

    const std::map<std::string, Format> formats{{"text", Format::text},
                                                {"json", Format::json},
                                                {"sarif", Format::sarif},
                                                {"junit", Format::junit},
                                                {"html", Format::html}};
    app.add_option("--format", options.format, "text, json, sarif, junit or html")
        ->type_name("FORMAT")
        ->transform(CLI::Transformer(formats));
    app.add_option("-o,--output", options.output, "Write the report to a file")
        ->type_name("FILE")
        ->check(requireText);
    app.add_option("--attest", options.attestation, "Write an in-toto statement, to be signed by others")
        ->type_name("FILE")
        ->check(requireText);
    app.footer(
        "Exit status: 0 all is as it was signed and every ticket is good; 65 something is not; 66 a path "
        "cannot be\n"
        "read, is of no supported kind, or has no signature; 68 the service cannot be reached; 77 a ticket "
        "is\n"
        "revoked; 64 wrong usage; 78 wrong policy. Of several paths the first in the order 77, 65, 66, 68, "
        "0.");
}

/// What is read from here on is not trusted.
void confine(const Options& options, const Platform& platform) {
    using sandbox::Access;
    keepSecurityLibrary();
    platform.systemLog.connect();
    sandbox::Confinement rights =
        options.tickets == Options::Tickets::online
            ? confinementOfRuns(kOperationValidate, options.paths, platform.directory)
            : confinementOfReading(options.paths, platform.directory);
    for (const std::string& path : options.paths) rights.files.push_back({path, Access::read});
    if (!options.ticketDirectory.empty()) rights.files.push_back({options.ticketDirectory, Access::read});
    // What is not in force on this kernel is none of the caller's business: the verdict is the same.
    static_cast<void>(sandbox::confine(rights));
}

/// The paths to judge. A directory of no artefacts is a result of its own.
std::vector<std::string> expanded(const Options& options, const Platform& platform,
                                  std::vector<Result>& problems) {
    if (!options.isRecursive) return options.paths;
    std::vector<std::string> all;
    for (const std::string& path : options.paths) {
        FoundArtefacts found = findArtefacts(path, platform);
        if (found.paths.empty() && found.problem.empty() && std::filesystem::is_directory(path))
            found.problem = "There is no artefact in this directory";
        // A path that is no directory speaks for itself.
        if (found.paths.empty() && found.problem.empty()) found.paths.push_back(path);
        all.insert(all.end(), found.paths.begin(), found.paths.end());
        if (found.problem.empty()) continue;
        Result& problem = problems.emplace_back();
        problem.path = path;
        problem.conclusion = found.problem + ".";
    }
    return all;
}

int gate(const Options& options) {
    // What the tool's own functions would say is among the checks.
    verboseLevel = kVerbosityQuiet;
    const HostPlatform host([](int) {});
    const Platform platform = host.services();
    Output report(options.output);
    Output attestation(options.attestation);
    if (!report.open()) return EX_CANTCREAT;
    if (!options.attestation.empty() && !attestation.open()) return EX_CANTCREAT;
    confine(options, platform);

    std::unique_ptr<const TicketDirectory> tickets;
    if (options.tickets == Options::Tickets::directory) {
        try {
            tickets = std::make_unique<TicketDirectory>(options.ticketDirectory);
        } catch (const codesign::CodeError& error) {
            complain(std::string("cannot read the tickets: ") + error.what());
            return EX_NOINPUT;
        }
    }
    std::vector<Result> problems;
    std::vector<Result> results =
        judgeAll(expanded(options, platform, problems), options, tickets.get(), platform);
    results.insert(results.end(), problems.begin(), problems.end());

    if (!report.write(render(options.format, results))) return EX_IOERR;
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(now).count();
    if (!options.attestation.empty() && !attestation.write(renderAttestation(results, options, seconds)))
        return EX_IOERR;
    return exitStatusOf(results);
}

int run(int argc, char** argv) {
    Options options;
    PolicyArguments policy;
    CLI::App app("Judges software that was received: its ticket, and every byte that was signed.",
                 "pinwell-gate");
    app.set_version_flag("--version", companion::versionText("pinwell-gate"));
    addOptions(app, options, policy);
    try {
        app.parse(argc, argv);
    } catch (const CLI::Success& request) {
        return app.exit(request);  // help, version
    } catch (const CLI::ParseError& error) {
        complain(companion::describe(app, error));
        return EX_USAGE;
    }
    try {
        options.policy = policy.combined();
    } catch (const PolicyError& error) {
        complain(error.what());
        return EX_CONFIG;
    }
    return gate(options);
}

}  // namespace

int main(int argc, char** argv) {
    foundation::occupyStandardStreams();
    // A reader that has gone away is a failed write.
    std::signal(SIGPIPE, SIG_IGN);
    try {
        return run(argc, argv);
    } catch (const std::exception& error) {
        complain(error.what());
        return EX_SOFTWARE;
    }
}
