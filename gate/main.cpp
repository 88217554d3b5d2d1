// pinwell-gate: judges whether to accept received software.
#include <sysexits.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <filesystem>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "base/error.h"
#include "companion/command_line.h"
#include "companion/process.h"
#include "find.h"
#include "policy.h"
#include "render.h"
#include "report_file.h"
#include "run.h"
#include "sandbox/sandbox.h"
#include "src/DownloadDelegate.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"

namespace {

using namespace pinwell;
using namespace pinwell::gate;

constexpr std::string_view kProgramName = "pinwell-gate";

void complain(std::string_view text) {
    companion::complain(kProgramName, text);
}

/// Policy options of the command line, which override those of a file.
struct PolicyArguments {
    std::string file;
    std::string maximumTicketAge;
    std::vector<std::string> teams;
    std::vector<std::string> identifiers;
    bool requiresSecureTimestamp = false;

    base::Result<Policy> combined() const {
        base::Result<Policy> policy = file.empty() ? Policy() : readPolicyFile(file);
        if (!policy) return policy;
        if (!maximumTicketAge.empty()) policy->maximumTicketAge = ageFrom(maximumTicketAge);
        if (!teams.empty()) policy->teams = teams;
        if (!identifiers.empty()) policy->identifiers = identifiers;
        policy->requiresSecureTimestamp = policy->requiresSecureTimestamp || requiresSecureTimestamp;
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

/// Call it before untrusted data is read.
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
    // Missing restrictions on this kernel are not reported: the verdict is the same.
    static_cast<void>(sandbox::confine(rights));
}

/// The paths to judge. A directory without artefacts is a result of its own.
std::vector<std::string> expanded(const Options& options, const Platform& platform,
                                  std::vector<Result>& problems) {
    if (!options.isRecursive) return options.paths;
    std::vector<std::string> all;
    for (const std::string& path : options.paths) {
        FoundArtefacts found = findArtefacts(path, platform);
        if (found.paths.empty() && found.problem.empty() && std::filesystem::is_directory(path))
            found.problem = "There is no artefact in this directory";
        // A path that is not a directory is judged itself.
        if (found.paths.empty() && found.problem.empty()) found.paths.push_back(path);
        all.insert(all.end(), found.paths.begin(), found.paths.end());
        if (found.problem.empty()) continue;
        Result& problem = problems.emplace_back();
        problem.path = path;
        problem.conclusion = found.problem + ".";
    }
    return all;
}

/// Opens the output files of the run, and refuses its input files as outputs.
int openReports(const Options& options, ReportFile& report, ReportFile& attestation) {
    // A report in a bundle would be an unsealed file.
    for (const std::string& path : {options.output, options.attestation}) {
        if (path.empty() || options.isRecursive) continue;
        if (const std::string* const bundle = directoryAround(path, options.paths)) {
            complain(path + " is in " + *bundle + ", which is to be judged");
            return EX_USAGE;
        }
    }
    for (ReportFile* const file : {&report, &attestation}) {
        if (const auto opened = file->open(); !opened) {
            complain(opened.error().localizedFailureReason());
            return EX_CANTCREAT;
        }
    }
    if (report.isSameAs(attestation)) {
        complain(options.output + " cannot hold both the report and the statement");
        return EX_USAGE;
    }
    return EX_OK;
}

/// Whether an output file is one of the artefacts, which it would replace.
bool isArtefact(const ReportFile& file, const std::vector<std::string>& paths) {
    const std::string* const artefact = file.amongst(paths);
    if (artefact != nullptr) complain("the report would replace " + *artefact + ", which is to be judged");
    return artefact != nullptr;
}

int writeReports(const Options& options, const std::vector<Result>& results, ReportFile& report,
                 ReportFile& attestation) {
    base::Result<void> written = report.write(render(options.format, results));
    if (written && !options.attestation.empty()) {
        const auto now = std::chrono::system_clock::now().time_since_epoch();
        const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(now).count();
        written = attestation.write(renderAttestation(results, options, seconds));
    }
    if (written) return exitStatusOf(results);
    complain(written.error().localizedFailureReason());
    return EX_IOERR;
}

int gate(const Options& options) {
    // The checks contain the messages of the tool's own functions.
    verboseLevel = kVerbosityQuiet;
    const HostPlatform host([](int) {});
    const Platform platform = host.services();
    ReportFile report(options.output);
    ReportFile attestation(options.attestation);
    if (const int status = openReports(options, report, attestation); status != EX_OK) return status;
    confine(options, platform);

    std::optional<TicketDirectory> tickets;
    if (options.tickets == Options::Tickets::directory) {
        base::Result<TicketDirectory> opened = TicketDirectory::open(options.ticketDirectory);
        if (!opened) {
            complain("cannot read the tickets: " + opened.error().localizedFailureReason());
            return EX_NOINPUT;
        }
        tickets = *std::move(opened);
    }
    std::vector<Result> problems;
    const std::vector<std::string> paths = expanded(options, platform, problems);
    if (isArtefact(report, paths) || isArtefact(attestation, paths)) return EX_USAGE;
    std::vector<Result> results = judgeAll(paths, options, tickets ? &*tickets : nullptr, platform);
    results.insert(results.end(), problems.begin(), problems.end());
    return writeReports(options, results, report, attestation);
}

int run(int argc, char** argv) {
    Options options;
    PolicyArguments policy;
    CLI::App app("Judges software that was received: its ticket, and every byte that was signed.",
                 std::string(kProgramName));
    app.set_version_flag("--version", companion::versionText(kProgramName));
    addOptions(app, options, policy);
    if (const auto status = companion::parseLine(app, argc, argv)) return *status;
    if (options.output == "-") options.output.clear();
    base::Result<Policy> combined = policy.combined();
    if (!combined) {
        complain(combined.error().localizedFailureReason());
        return EX_CONFIG;
    }
    options.policy = *std::move(combined);
    return gate(options);
}

}  // namespace

int main(int argc, char** argv) {
    return companion::runMain(kProgramName, [&] { return run(argc, argv); });
}
