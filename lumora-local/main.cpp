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

#include "artefact_hasher.h"
#include "base/text.h"
#include "command_line.h"
#include "commands.h"
#include "companion/command_line.h"
#include "config/platform_directory.h"
#include "crypto/crypto.h"
#include "event.h"
#include "failure.h"
#include "rfc3339.h"
#include "runtime/process.h"
#include "samples.h"
#include "sandbox/sandbox.h"
#include "serve_command.h"
#include "service_directory.h"
#include "service_store.h"
#include "src/confinement.h"
#include "upkeep.h"
#include "values/date.h"
#include "values/format.h"

namespace {

using namespace pinwell;
using namespace pinwell::lumora;

/// The command line's values, as text.
struct Arguments {
    std::string directory;
    std::vector<std::string> hosts;
    std::string passphraseFile;
    std::string rootDirectory;
    std::string signerRequest;
    std::vector<std::string> subjects;
    std::vector<std::string> recordNames;
    std::string label;
    std::string reason = std::string(toString(Reason::unspecified));
    std::string comment;
    std::string environment = "production";
    std::string record;
    std::string since;
    std::string head;
    std::string to;
    std::string listen;
    std::string adminListen;
    std::string clientAuthorities;
    std::string readyFile;
    std::string metricsListen;
    UpkeepVerbs upkeep;
    std::uint16_t port = kDefaultPort;
    bool reinstates = false;
    bool asAsset = false;
    bool asJson = false;
    bool showsHead = false;
    bool verifies = false;
    bool updatePlatform = false;
};

void runInit(const Arguments& arguments) {
    NewService service;
    service.port = arguments.port;
    service.passphraseFile = arguments.passphraseFile;
    service.rootDirectory = arguments.rootDirectory;
    service.signerRequest = arguments.signerRequest;
    for (const std::string& host : arguments.hosts) {
        const std::optional<std::string> canonical = canonicalHost(host);
        if (!canonical || isWildcard(*canonical)) {
            throw Failure(EX_USAGE, values::format("%@ is neither a host name nor an address", host));
        }
        service.hosts.push_back(*canonical);
    }
    const std::string directoryPath = requireDirectory(arguments.directory);
    const auto directory = ServiceDirectory::create(directoryPath, service, values::Date::now());
    writeText(
        values::format("Made a record service for %@.\n"
                       "Start it:         lumora-local serve %@\n"
                       "Point pinwell at: PINWELL_PLATFORM=%@\n",
                       toString(directory.advertisedEndpoint()), directoryPath, directory.platformPath()));
    if (!service.rootDirectory.empty()) {
        writeText(values::format("The root's key:   %@/root.key (keep it on a machine without a service)\n",
                                 service.rootDirectory));
    }
    if (!service.signerRequest.empty()) {
        writeText(
            values::format("Signer's request: %@; once it is certified: lumora-local certify %@ CHAIN\n",
                           service.signerRequest, directoryPath));
    }
}

ServiceDirectory openService(const Arguments& arguments) {
    return ServiceDirectory::open(requireDirectory(arguments.directory));
}

/// The process that reads artefacts also has the signing key. So it first gives up all rights except for the
/// files of service and artefacts. It needs no network.
void giveUpRights(const Arguments& arguments, const ServiceDirectory& directory) {
    using sandbox::Access;
    keepSecurityLibrary();
    sandbox::Confinement rights =
        confinementOfReading(arguments.subjects, config::PlatformDirectory::current());
    rights.calls = sandbox::Calls::service;
    rights.files.push_back({directory.path(), Access::write});
    addStoreRights(rights, directory);
    rights.files.push_back({runtime::temporaryDirectory().path(), Access::write});  // of the store
    static_cast<void>(sandbox::confine(rights));
}

/// Runs one of the commands that change records.
template <class Command>
void withRegistry(const Arguments& arguments, Command&& command) {
    const auto directory = openService(arguments);
    requireChangesAllowed(directory);
    const TicketSigner signer = directory.openSigner();
    const std::unique_ptr<RecordStore> store = openStore(directory);
    const std::unique_ptr<ArtefactHasher> hasher = makePinwellArtefactHasher();
    const Registry registry{*store, signer, *hasher, parseEnvironment(arguments.environment).value(),
                            nameOfCaller()};
    giveUpRights(arguments, directory);
    const std::vector<Record> records = command(registry);
    writeText(arguments.asJson ? recordsAsJson(records) : describeRecords(records));
}

void runIssue(Arguments& arguments) {
    takeDirectory(arguments.directory, arguments.subjects);
    if (arguments.subjects.empty() && arguments.recordNames.empty()) {
        throw Failure(EX_USAGE, "issue needs an ARTEFACT or --record");
    }
    if (arguments.recordNames.empty() && !arguments.label.empty()) {
        throw Failure(EX_USAGE, "--label goes with --record");
    }
    if (arguments.reinstates && isBlank(arguments.comment)) {
        throw Failure(EX_USAGE, "--reinstate needs --comment TEXT");
    }
    const IssueRequest request{arguments.subjects, arguments.recordNames, arguments.label,
                               arguments.asAsset,  arguments.reinstates,  arguments.comment};
    withRegistry(arguments, [&](const Registry& registry) { return issue(registry, request); });
}

void runRevoke(Arguments& arguments) {
    takeDirectory(arguments.directory, arguments.subjects);
    if (arguments.subjects.empty()) throw Failure(EX_USAGE, "revoke needs an ARTEFACT or a RECORDNAME");
    const RevokeRequest request{arguments.subjects, parseReason(arguments.reason).value(), arguments.comment};
    withRegistry(arguments, [&](const Registry& registry) { return revoke(registry, request); });
}

void runList(const Arguments& arguments) {
    const auto records =
        openStore(openService(arguments))->list(parseEnvironment(arguments.environment).value());
    writeText(arguments.asJson ? recordsAsJson(records) : describeRecords(records));
}

/// `--head DIR` means the directory: a hash has a known form.
void sortOutHead(Arguments& arguments) {
    const bool isHash = arguments.head.size() == hashBeforeTheFirstEvent().size() &&
                        arguments.head.find_first_not_of("0123456789abcdef") == std::string::npos;
    if (isHash || arguments.head.empty()) return;
    if (!arguments.directory.empty()) {
        throw Failure(EX_USAGE, values::format("%@ is not the hash of an event", arguments.head));
    }
    arguments.directory = std::move(arguments.head);
    arguments.head.clear();
}

void runLog(Arguments& arguments) {
    sortOutHead(arguments);
    if (!arguments.head.empty() && !arguments.verifies) {
        throw Failure(EX_USAGE, "--head HASH goes with --verify; --head alone prints the last event's hash");
    }
    EventQuery query;
    if (!arguments.record.empty()) query.record = arguments.record;
    if (!arguments.since.empty()) {
        query.since = parseRfc3339(arguments.since);
        if (!query.since) {
            throw Failure(EX_USAGE, values::format("%@ is not a time: 2026-11-20 or 2026-11-20T19:55:00Z",
                                                   arguments.since));
        }
    }
    const std::unique_ptr<RecordStore> store = openStore(openService(arguments));
    if (arguments.verifies) {
        const std::optional<std::string> known =
            arguments.head.empty() ? std::nullopt : std::optional(arguments.head);
        const HistorySummary summary = verifyHistory(*store, known);
        if (arguments.showsHead && arguments.head.empty()) {
            writeText(summary.head + "\n");
        } else {
            writeText(values::format("%zu events, the chain is whole and ends with %s\n", summary.events,
                                     summary.head));
        }
    } else if (arguments.showsHead) {
        writeText(store->headHash() + "\n");
    } else {
        writeEvents(*store, query, arguments.asJson, writePart);
    }
}

void runMigrate(const Arguments& arguments) {
    if (arguments.to.empty()) throw Failure(EX_USAGE, "migrate needs --to URL");
    const ServiceDirectory directory = openService(arguments);
    const Migration migration = migrate(directory, arguments.to);
    writeText(
        values::format("Copied %zu records and %zu events, and compared them; the chain ends with %s.\n"
                       "%@ names the database now; the earlier one is %@.\n"
                       "Start the service again if it runs: it answers no lookups until then.\n",
                       migration.records, migration.events, migration.head, directory.descriptionPath(),
                       migration.oldDescription));
}

void runSample(const Arguments& arguments) {
    for (const std::string& path : writeSamples(arguments.directory, values::Date::now())) {
        writeText(values::format("%@\n", path));
    }
}

void runServe(const Arguments& arguments) {
    ServeOptions options;
    if (!arguments.listen.empty()) {
        options.listen = parseEndpoint(arguments.listen, kDefaultPort);
        if (!options.listen) {
            throw Failure(EX_USAGE, values::format("%@ is not ADDRESS:PORT", arguments.listen));
        }
    }
    if (arguments.adminListen.empty() != arguments.clientAuthorities.empty()) {
        throw Failure(EX_USAGE, "--admin-listen and --client-ca go together");
    }
    if (!arguments.adminListen.empty()) {
        const auto endpoint = parseEndpoint(arguments.adminListen, kDefaultAdminPort);
        if (!endpoint) {
            throw Failure(EX_USAGE, values::format("%@ is not ADDRESS:PORT", arguments.adminListen));
        }
        options.admin = AdminOptions{*endpoint, arguments.clientAuthorities};
    }
    if (!arguments.readyFile.empty()) options.readyFile = arguments.readyFile;
    options.updatePlatform = arguments.updatePlatform;
    options.version = companion::versionNumber();
    if (!arguments.metricsListen.empty()) {
        options.metricsListen = parseEndpoint(arguments.metricsListen, kDefaultMetricsPort);
        if (!options.metricsListen) {
            throw Failure(EX_USAGE, values::format("%@ is not ADDRESS:PORT", arguments.metricsListen));
        }
    }

    const ServeSignals signals = catchServeSignals();
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
    serve(openService(arguments), options, output, signals);
}

constexpr const char* kServiceHelp = "The service (default: $LUMORA_DIR)";

void addEnvironment(CLI::App& command, Arguments& arguments) {
    command
        .add_option("--environment", arguments.environment, "The set of records: production or development")
        ->check(CLI::IsMember({"production", "development"}))
        ->capture_default_str();
}

void addJson(CLI::App& command, Arguments& arguments) {
    command.add_flag("--json", arguments.asJson, "As one JSON document");
}

void addComment(CLI::App& command, Arguments& arguments) {
    command.add_option("--comment", arguments.comment, "Text for the log");
}

void declareIssue(CLI::App& issue, Arguments& arguments) {
    issue.add_option("ARTEFACT", arguments.subjects, "A bundle, disk image or package");
    issue
        .add_option("--record", arguments.recordNames,
                    "The name of a record, for an artefact on another machine: 2/2/HEX")
        ->allow_extra_args(false);
    issue.add_option("--label", arguments.label, "The label of the --record (default: its name)");
    issue.add_flag("--asset", arguments.asAsset, "Deliver by download, as for every ticket over 1 MiB");
    issue.add_flag("--reinstate", arguments.reinstates, "Make revoked records valid again; needs --comment");
    addComment(issue, arguments);
    addJson(issue, arguments);
    addEnvironment(issue, arguments);
}

void declareRevoke(CLI::App& revoke, Arguments& arguments) {
    revoke.add_option("ARTEFACT|RECORDNAME", arguments.subjects,
                      "An issued artefact, or the name of its record");
    revoke.add_option("--reason", arguments.reason, "The reason, for the log")
        ->check(CLI::IsMember(reasonNames()))
        ->capture_default_str();
    addComment(revoke, arguments);
    addJson(revoke, arguments);
    addEnvironment(revoke, arguments);
}

void declareLog(CLI::App& log, Arguments& arguments) {
    log.add_option("--record", arguments.record, "Only events about this record");
    log.add_option("--since", arguments.since,
                   "Only events of this time and later: 2026-11-20 or 2026-11-20T19:55:00Z");
    addJson(log, arguments);
    log.add_flag("--verify", arguments.verifies, "Check the whole log; 78 if it is broken");
    log.add_option("--head", arguments.head,
                   "Print the hash of the last event; with --verify: an event that the log must have")
        ->expected(0, 1);
}

void declareCommands(CLI::App& app, Arguments& arguments) {
    const auto add = [&](const char* name, const char* help, const char* directoryHelp, auto run) {
        CLI::App* command = app.add_subcommand(name, help);
        command->add_option("DIR", arguments.directory, directoryHelp);
        command->callback([&arguments, command, run] {
            const CLI::Option* head = command->get_option_no_throw("--head");
            arguments.showsHead = head != nullptr && head->count() > 0;
            run(arguments);
        });
        return command;
    };
    CLI::App* init = add("init", "Make a service: keys, certificates, an empty store",
                         "The new directory, empty or missing", runInit);
    init->add_option("--host", arguments.hosts,
                     "A DNS name or address of the service (default: localhost, 127.0.0.1, ::1)")
        ->allow_extra_args(false);
    init->add_option("--port", arguments.port, "The port for clients")
        ->check(CLI::Range(1, 65535))
        ->capture_default_str();
    init->add_option("--passphrase-file", arguments.passphraseFile,
                     "Encrypt the keys with the first line of this file, or credential:NAME");
    init->add_option("--root-out", arguments.rootDirectory,
                     "A new directory for the root's key, outside of the service");
    init->add_option("--signer-csr", arguments.signerRequest,
                     "A new file: a request to another authority for the signer's certificate");

    declareIssue(*add("issue", "Issue a ticket for each artefact", kServiceHelp, runIssue), arguments);
    declareRevoke(*add("revoke", "Replace issued tickets by revoked ones", kServiceHelp, runRevoke),
                  arguments);

    CLI::App* list = add("list", "List the records", kServiceHelp, runList);
    addJson(*list, arguments);
    addEnvironment(*list, arguments);

    declareLog(*add("log", "Show the log of changes, or check it", kServiceHelp, runLog), arguments);

    add("migrate", "Move the records into a PostgreSQL database", kServiceHelp, runMigrate)
        ->add_option("--to", arguments.to, "Its URL: postgresql://...");

    add("sample", "Write a sample of each kind of artefact", "The directory for them", runSample);

    CLI::App* serve =
        add("serve", "Serve lookups over HTTPS until SIGTERM or SIGINT", kServiceHelp, runServe);
    serve->add_option("--listen", arguments.listen,
                      "ADDRESS:PORT instead of the host in platform.json; port 0: any free one");
    serve->add_option("--metrics-listen", arguments.metricsListen,
                      "ADDRESS:PORT for metrics over plain HTTP, for Prometheus (default: none)");
    serve->add_option("--admin-listen", arguments.adminListen,
                      "ADDRESS:PORT where clients with certificates issue and revoke; needs --client-ca");
    serve->add_option("--client-ca", arguments.clientAuthorities,
                      "PEM file: the authorities of those clients' certificates");
    serve->add_option("--ready-file", arguments.readyFile,
                      "A file for the service's URL, written once it listens");
    serve->add_flag("--update-platform", arguments.updatePlatform,
                    "Write the service's host and port into platform.json");
    declareUpkeepVerbs(app, arguments.upkeep);
    app.require_subcommand(1);
}

int run(int argc, char** argv) {
    Arguments arguments;
    CLI::App app("A record service: issues tickets for artefacts and serves lookups for them.",
                 "lumora-local");
    app.set_version_flag("--version", companion::versionText("lumora-local"));
    declareCommands(app, arguments);
    const std::optional<int> status = companion::parseLine(app, argc, argv);
    return status.value_or(arguments.upkeep.exitStatus);
}

}  // namespace

int main(int argc, char** argv) {
    crypto::wipeWhatOpenSSLFrees();
    runtime::occupyStandardStreams();
    sandbox::forbidCoreDumps();  // they would contain the keys
    // A client that has gone away is an error of one write, not the end of the service.
    std::signal(SIGPIPE, SIG_IGN);
    // A file over the size limit is also an error, not a signal.
    std::signal(SIGXFSZ, SIG_IGN);
    try {
        return run(argc, argv);
    } catch (const Failure& failure) {
        complain(failure.what());
        return failure.exitStatus();
    } catch (const std::exception& error) {
        complain(base::escapeForDisplay(error.what()));
        return EX_SOFTWARE;
    }
}
