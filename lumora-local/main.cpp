// lumora-local: a record service of one's own, for development, tests and sites without a network.
#include <CLI/CLI.hpp>
#include <csignal>
#include <cstdio>
#include <exception>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "foundation/format.h"
#include "foundation/process.h"
#include "lumora-local/commands.h"
#include "lumora-local/failure.h"
#include "lumora-local/pinwell_artefact_hasher.h"
#include "lumora-local/samples.h"
#include "lumora-local/serve_command.h"
#include "lumora-local/service_directory.h"

namespace {

using namespace pinwell;
using namespace pinwell::lumora;

/// What the command line says, as text.
struct Arguments {
    std::string directory;
    std::vector<std::string> hosts;
    std::uint16_t port = kDefaultPort;
    std::vector<std::string> subjects;
    std::string environment = "production";
    bool asAsset = false;
    bool asJson = false;
    std::string listen;
    std::string readyFile;
    bool updatePlatform = false;
};

/// One whole line in one write, so that the lines of several threads do not mix.
void writeLine(std::FILE* stream, std::string_view line) {
    const std::string text = std::string(line) + "\n";
    std::fwrite(text.data(), 1, text.size(), stream);
    std::fflush(stream);
}

void writeText(const std::string& text) {
    const bool written = std::fwrite(text.data(), 1, text.size(), stdout) == text.size();
    if (!written || std::fflush(stdout) != 0) throw Failure(EX_IOERR, "cannot write to standard output");
}

void complain(std::string_view text) {
    writeLine(stderr, "lumora-local: " + std::string(text));
}

void runInit(const Arguments& arguments) {
    NewService service;
    service.port = arguments.port;
    for (const std::string& host : arguments.hosts) {
        const std::optional<std::string> canonical = canonicalHost(host);
        if (!canonical || isWildcard(*canonical)) {
            throw Failure(EX_USAGE, foundation::format("%@ is neither a host name nor an address", host));
        }
        service.hosts.push_back(*canonical);
    }
    const auto directory = ServiceDirectory::create(arguments.directory, service, foundation::Date::now());
    writeText(foundation::format(
        "Made a record service for %@.\n"
        "Start it:         lumora-local serve %@\n"
        "Point pinwell at: PINWELL_PLATFORM=%@\n",
        toString(directory.advertisedEndpoint()), arguments.directory, directory.platformPath()));
}

/// Runs one of the commands that work on records.
template <class Command>
void withRegistry(const Arguments& arguments, Command&& command) {
    const auto directory = ServiceDirectory::open(arguments.directory);
    const TicketSigner signer(directory.signerKeyPath(), directory.signerChainPaths());
    RecordStore store(directory.storePath());
    const std::unique_ptr<ArtefactHasher> hasher = makePinwellArtefactHasher();
    const Registry registry{store, signer, *hasher, parseEnvironment(arguments.environment).value()};
    writeText(describeRecords(command(registry)));
}

void runIssue(const Arguments& arguments) {
    withRegistry(arguments, [&](const Registry& registry) {
        return issue(registry, arguments.subjects, arguments.asAsset);
    });
}

void runRevoke(const Arguments& arguments) {
    withRegistry(arguments, [&](const Registry& registry) { return revoke(registry, arguments.subjects); });
}

void runList(const Arguments& arguments) {
    RecordStore store(ServiceDirectory::open(arguments.directory).storePath());
    const auto records = store.list(parseEnvironment(arguments.environment).value());
    writeText(arguments.asJson ? recordsAsJson(records) : describeRecords(records));
}

void runSample(const Arguments& arguments) {
    for (const std::string& path : writeSamples(arguments.directory, foundation::Date::now())) {
        writeText(foundation::format("%@\n", path));
    }
}

void runServe(const Arguments& arguments) {
    ServeOptions options;
    if (!arguments.listen.empty()) {
        options.listen = parseEndpoint(arguments.listen, kDefaultPort);
        if (!options.listen) {
            throw Failure(EX_USAGE, foundation::format("%@ is not ADDRESS:PORT", arguments.listen));
        }
    }
    if (!arguments.readyFile.empty()) options.readyFile = arguments.readyFile;
    options.updatePlatform = arguments.updatePlatform;

    const foundation::FileDescriptor stop = stopOnSignals();
    std::mutex mutex;
    const ServeOutput output{.out =
                                 [&](std::string_view line) {
                                     const std::lock_guard lock(mutex);
                                     writeLine(stdout, line);
                                 },
                             .err =
                                 [&](std::string_view line) {
                                     const std::lock_guard lock(mutex);
                                     complain(line);
                                 }};
    serve(ServiceDirectory::open(arguments.directory), options, output, stop.get());
}

void addEnvironment(CLI::App* command, Arguments& arguments) {
    command
        ->add_option("--environment", arguments.environment, "The set of records: production or development")
        ->check(CLI::IsMember({"production", "development"}))
        ->capture_default_str();
}

void declareCommands(CLI::App& app, Arguments& arguments) {
    const auto add = [&](const char* name, const char* help, const char* directoryHelp, auto run) {
        CLI::App* command = app.add_subcommand(name, help);
        command->add_option("DIR", arguments.directory, directoryHelp)->required();
        command->callback([&arguments, run] { run(arguments); });
        return command;
    };
    CLI::App* init = add("init", "Make a service: keys, certificates, an empty store",
                         "The directory to make; nothing that exists is overwritten", runInit);
    init->add_option("--host", arguments.hosts,
                     "A DNS name or address the service goes by (default: localhost, 127.0.0.1, ::1)")
        ->allow_extra_args(false);
    init->add_option("--port", arguments.port, "The port clients are sent to")
        ->check(CLI::Range(1, 65535))
        ->capture_default_str();

    CLI::App* issue = add("issue", "Issue a ticket for each artefact", "The service", runIssue);
    issue->add_option("ARTEFACT", arguments.subjects, "A bundle, disk image or package")->required();
    issue->add_flag("--asset", arguments.asAsset, "Deliver by download (always so above 1 MiB)");
    addEnvironment(issue, arguments);

    CLI::App* revoke = add("revoke", "Replace issued tickets by revoked ones", "The service", runRevoke);
    revoke
        ->add_option("ARTEFACT|RECORDNAME", arguments.subjects, "What was issued, or the name of its record")
        ->required();
    addEnvironment(revoke, arguments);

    CLI::App* list = add("list", "List the records", "The service", runList);
    list->add_flag("--json", arguments.asJson, "As one JSON document");
    addEnvironment(list, arguments);

    add("sample", "Write a sample of each kind of artefact", "Where to write them", runSample);

    CLI::App* serve =
        add("serve", "Answer lookups over HTTPS until SIGTERM or SIGINT", "The service", runServe);
    serve->add_option("--listen", arguments.listen,
                      "ADDRESS:PORT instead of what platform.json says; port 0: any free one");
    serve->add_option("--ready-file", arguments.readyFile, "Gets the service's URL once it listens");
    serve->add_flag("--update-platform", arguments.updatePlatform,
                    "Let platform.json name this very service");
    app.require_subcommand(1);
}

int run(int argc, char** argv) {
    Arguments arguments;
    CLI::App app("A record service of one's own: issues tickets for artefacts and answers lookups for them.",
                 "lumora-local");
    app.set_version_flag("--version", "lumora-local " PINWELL_VERSION);
    declareCommands(app, arguments);
    try {
        app.parse(argc, argv);
        return EX_OK;
    } catch (const CLI::Success& request) {
        return app.exit(request);  // help, version
    } catch (const CLI::ParseError& error) {
        complain(foundation::escapeForTerminal(error.what()));
        return EX_USAGE;
    }
}

}  // namespace

int main(int argc, char** argv) {
    foundation::occupyStandardStreams();
    // A client that has gone away is an error of one write, not the end of the service.
    std::signal(SIGPIPE, SIG_IGN);
    try {
        return run(argc, argv);
    } catch (const Failure& failure) {
        complain(failure.what());
        return failure.exitStatus();
    } catch (const std::exception& error) {
        complain(foundation::escapeForTerminal(error.what()));
        return EX_SOFTWARE;
    }
}
