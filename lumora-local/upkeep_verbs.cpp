#include <CLI/CLI.hpp>

#include "command_line.h"
#include "failure.h"
#include "service_directory.h"
#include "upkeep.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::Date;
using values::format;

ServiceDirectory openNamed(UpkeepVerbs& verbs) {
    takeDirectory(verbs.directory, verbs.words);
    return ServiceDirectory::open(requireDirectory(verbs.directory));
}

void print(const RotationReport& report) {
    for (const std::string& line : report) writeText(line + "\n");
}

void runRotate(UpkeepVerbs& verbs) {
    const ServiceDirectory directory = openNamed(verbs);
    if (verbs.words.size() != 1 || (verbs.words[0] != "signer" && verbs.words[0] != "server")) {
        throw Failure(EX_USAGE, "rotate needs one word, signer or server");
    }
    if (verbs.words[0] == "server") {
        if (!verbs.key.empty() || !verbs.requestFile.empty()) {
            throw Failure(EX_USAGE, "--key and --signer-csr go with rotate signer");
        }
        return print(rotateServer(directory, verbs.rootDirectory, Date::now()));
    }
    if (!verbs.rootDirectory.empty()) throw Failure(EX_USAGE, "--root goes with rotate server");
    if (!verbs.key.empty() && !verbs.requestFile.empty()) {
        throw Failure(EX_USAGE, "--signer-csr makes a key of its own and does not go with --key");
    }
    if (!verbs.key.empty() && !isTokenKey(verbs.key)) {
        throw Failure(EX_USAGE, format("%@ is not a pkcs11: URI", verbs.key));
    }
    print(rotateSigner(directory, {verbs.key, verbs.requestFile}, Date::now()));
}

void runCertify(UpkeepVerbs& verbs) {
    const ServiceDirectory directory = openNamed(verbs);
    if (verbs.words.size() != 1)
        throw Failure(EX_USAGE, "certify needs one file with the chain of certificates");
    print(certifySignerElsewhere(directory, verbs.words[0], verbs.key, Date::now()));
}

void runClientCertificate(UpkeepVerbs& verbs) {
    const ServiceDirectory directory = openNamed(verbs);
    if (verbs.words.size() != 1) throw Failure(EX_USAGE, "client-certificate needs one NAME");
    if (verbs.out.empty()) throw Failure(EX_USAGE, "client-certificate needs --out DIRECTORY");
    makeClientCertificate(directory, verbs.words[0], verbs.out, Date::now());
    writeText(
        format("Made %@/client.pem and %@/client.key for %@.\n"
               "Give it roles in:  %@/service/access.toml\n"
               "Admit it with:     serve --admin-listen ADDRESS:PORT --client-ca %@\n",
               verbs.out, verbs.out, verbs.words[0], directory.path(), clientAuthorityPath(directory)));
}

void runCheck(UpkeepVerbs& verbs) {
    const auto warning = parseDuration(verbs.warning);
    if (!warning)
        throw Failure(EX_USAGE, format("%@ is not a length of time: 12h, 30d or 8w", verbs.warning));
    const ServiceDirectory directory = ServiceDirectory::open(requireDirectory(verbs.directory));
    const std::vector<Finding> findings = checkService(directory, Date::now(), *warning);
    writeText(describeFindings(findings));
    verbs.exitStatus = exitStatusOf(findings);
}

void runBackup(UpkeepVerbs& verbs) {
    const ServiceDirectory directory = openNamed(verbs);
    if (verbs.words.size() != 1) throw Failure(EX_USAGE, "backup needs one FILE to make");
    backUp(directory, verbs.words[0]);
}

void runRestore(const UpkeepVerbs& verbs) {
    if (verbs.file.empty()) throw Failure(EX_USAGE, "restore needs a FILE that backup has made");
    const std::string directory = requireDirectory(verbs.directory);
    restore(verbs.file, directory);
    writeText(format("Restored the service to %@.\n", directory));
}

constexpr const char* kServiceHelpText = "The service (default: $LUMORA_DIR)";

}  // namespace

void declareUpkeepVerbs(CLI::App& app, UpkeepVerbs& verbs) {
    CLI::App* rotate = app.add_subcommand("rotate", "Replace the key of the signer or the server");
    rotate->add_option("DIR", verbs.directory, kServiceHelpText);
    rotate->add_option("signer|server", verbs.words, "The key to replace");
    rotate->add_option("--key", verbs.key, "signer: a pkcs11: URI of the key to use");
    rotate->add_option("--signer-csr", verbs.requestFile,
                       "signer: a new file, a request to another authority for a certificate");
    rotate->add_option("--root", verbs.rootDirectory, "server: the directory with root.key");
    rotate->callback([&verbs] { runRotate(verbs); });

    CLI::App* certify =
        app.add_subcommand("certify", "Install a signer's certificate from another authority");
    certify->add_option("DIR", verbs.directory, kServiceHelpText);
    certify->add_option("CHAIN", verbs.words,
                        "A PEM file: the certificates of signer, intermediate and root");
    certify->add_option("--key", verbs.key, "The certified key, a file or a pkcs11: URI");
    certify->callback([&verbs] { runCertify(verbs); });

    CLI::App* client =
        app.add_subcommand("client-certificate", "Make a certificate for a client of the admin listener");
    client->add_option("DIR", verbs.directory, kServiceHelpText);
    client->add_option("NAME", verbs.words, "The client's name, as in access.toml");
    client->add_option("--out", verbs.out, "The new directory, with client.pem and client.key");
    client->callback([&verbs] { runClientCertificate(verbs); });

    CLI::App* check = app.add_subcommand("check", "Check keys, certificates and records");
    check->add_option("DIR", verbs.directory, kServiceHelpText);
    check->add_option("--warn", verbs.warning, "Report a certificate that expires within this time")
        ->capture_default_str();
    check->callback([&verbs] { runCheck(verbs); });

    CLI::App* backup = app.add_subcommand("backup", "Write the whole service into one file, while it runs");
    backup->add_option("DIR", verbs.directory, kServiceHelpText);
    backup->add_option("FILE", verbs.words, "The new file");
    backup->callback([&verbs] { runBackup(verbs); });

    CLI::App* restore = app.add_subcommand("restore", "Make a service from a backup");
    restore->add_option("FILE", verbs.file, "A file made by backup");
    restore->add_option("DIR", verbs.directory, "The new directory (default: $LUMORA_DIR)");
    restore->callback([&verbs] { runRestore(verbs); });
}

}  // namespace pinwell::lumora
