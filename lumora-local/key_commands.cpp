#include <algorithm>
#include <filesystem>
#include <system_error>

#include "authority.h"
#include "certificates.h"
#include "config/platform_directory.h"
#include "failure.h"
#include "file_writing.h"
#include "key_file.h"
#include "rfc3339.h"
#include "tls_context.h"
#include "upkeep.h"
#include "values/format.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using values::Array;
using values::Date;
using values::Dictionary;
using values::format;

std::string retiredHint(const std::string& key) {
    return format("The earlier key is still in %@; remove it once nothing reads it.", key);
}

/// "ticket-signer-20261122T081500Z": an unused name in the service's folder.
std::string freshName(const ServiceDirectory& directory, const std::string& stem, Date now) {
    std::string stamp = toRfc3339(now);
    std::erase_if(stamp, [](char c) { return c == '-' || c == ':'; });
    const std::string first = stem + "-" + stamp;
    std::string name = first;
    const auto taken = [&](const char* suffix) {
        std::error_code ignored;
        return std::filesystem::exists(directory.servicePath(name + suffix), ignored);
    };
    for (int attempt = 2; taken(".key") || taken(".pem"); ++attempt)
        name = first + "-" + std::to_string(attempt);
    return name;
}

/// Files that are removed again unless everything succeeds.
class NewFiles {
  public:
    explicit NewFiles(const ServiceDirectory& directory) : directory_(directory) {}
    ~NewFiles() {
        std::error_code ignored;
        for (const std::string& path : kept_ ? std::vector<std::string>() : paths_) {
            std::filesystem::remove(path, ignored);
        }
    }
    NewFiles(const NewFiles&) = delete;
    NewFiles& operator=(const NewFiles&) = delete;

    /// Returns `name`, as service.json gives it.
    std::string write(const std::string& name, const std::string& contents, mode_t mode) {
        writeAt(directory_.servicePath(name), contents, mode);
        return name;
    }

    void writeAt(const std::string& path, const std::string& contents, mode_t mode) {
        writeNewFile(path, base::asBytes(contents), mode);
        paths_.push_back(path);
    }

    void flush() const { flushDirectory(directory_.path() + "/service"); }
    void keep() noexcept { kept_ = true; }

  private:
    const ServiceDirectory& directory_;
    std::vector<std::string> paths_;
    bool kept_ = false;
};

void readPassphrase(const ServiceDirectory& directory, Passphrase& passphrase) {
    if (!directory.settings().passphraseFile.empty()) passphrase.read(directory.settings().passphraseFile);
}

IssuerFiles ownIntermediate(const ServiceDirectory& directory) {
    const std::vector<std::string>& chain = directory.signerChainPaths();
    IssuerFiles files{chain.size() > 1 ? chain[1] : "", directory.servicePath("ticket-intermediate.key"),
                      directory.settings().passphraseFile};
    std::error_code ignored;
    if (files.certificate.empty() || !std::filesystem::exists(files.key, ignored)) {
        throw Failure(EX_CONFIG,
                      format("%@ is not there: this signer is certified elsewhere. Ask for the next "
                             "certificate with --signer-csr FILE",
                             files.key));
    }
    return files;
}

/// A path as service.json gives it: without the service's folder, or else absolute.
std::string nameInService(const ServiceDirectory& directory, const std::string& path) {
    const std::string folder = directory.servicePath("");
    if (path.starts_with(folder)) return path.substr(folder.size());
    return isTokenKey(path) ? path : std::filesystem::absolute(path).string();
}

Array namesInService(const ServiceDirectory& directory, const std::vector<std::string>& paths) {
    Array names;
    for (const std::string& path : paths) names.emplace_back(nameInService(directory, path));
    return names;
}

/// The chain of service.json with another first certificate.
Array chainWith(const ServiceDirectory& directory, const std::string& certificate) {
    Array chain = namesInService(directory, directory.signerChainPaths());
    chain.at(0) = certificate;
    return chain;
}

/// Writes key and chain into service.json; a waiting request remains unless it is fulfilled.
void nameSigner(const ServiceDirectory& directory, const std::string& key, const Array& chain,
                bool answersRequest) {
    directory.changeSettings([&](Dictionary& settings) {
        const Dictionary* old = settings["signer"].dictionary();
        Dictionary signer = old != nullptr ? *old : Dictionary{};
        signer["key"] = key;
        signer["chain"] = chain;
        if (answersRequest) signer.erase("requested");
        settings["signer"] = std::move(signer);
    });
}

RotationReport requestNextSigner(const ServiceDirectory& directory, const std::string& requestFile,
                                 Date now) {
    Passphrase passphrase;
    readPassphrase(directory, passphrase);
    NewFiles files(directory);
    const Identity signer = requestSigner(passphrase.text());
    const std::string key =
        files.write(freshName(directory, "ticket-signer", now) + ".key", signer.privateKey, kPrivateFileMode);
    files.writeAt(requestFile, signer.certificate, kPublicFileMode);
    files.flush();
    directory.changeSettings([&](Dictionary& settings) {
        const Dictionary* old = settings["signer"].dictionary();
        Dictionary description = old != nullptr ? *old : Dictionary{};
        if (old == nullptr) {
            const SignerSettings& present = directory.settings().signer;
            description["key"] = nameInService(directory, present.key);
            description["chain"] = namesInService(directory, present.chain);
        }
        description["requested"] = key;
        settings["signer"] = std::move(description);
    });
    files.keep();
    return {format("Wrote a request for the signer's certificate to %@.", requestFile),
            format("Install it with: lumora-local certify %@ CHAIN", directory.path())};
}

/// Adds a missing root to the platform directory, and reports it.
void publishRoot(const ServiceDirectory& directory, X509* root, const std::string& name, NewFiles& files,
                 RotationReport& report) {
    for (const std::string& path :
         config::PlatformDirectory(directory.platformPath()).rootCertificateFiles()) {
        if (X509_cmp(readCertificateFile(path).get(), root) == 0) return;
    }
    const std::string path = directory.platformPath() + "/roots/" + name + ".pem";
    files.writeAt(path, encodeCertificate(root), kPublicFileMode);
    flushDirectory(directory.platformPath() + "/roots");
    report.push_back(format("Added the root %@ to the platform directory: %@", nameOf(root), path));
    report.emplace_back("Clients need it before they accept tickets that are signed from now on.");
}

}  // namespace

RotationReport rotateSigner(const ServiceDirectory& directory, const SignerRotation& rotation, Date now) {
    if (!rotation.requestFile.empty()) return requestNextSigner(directory, rotation.requestFile, now);
    const IssuerFiles issuer = ownIntermediate(directory);
    const std::string name = freshName(directory, "ticket-signer", now);
    const std::string& oldKey = directory.signerKeyPath();
    NewFiles files(directory);
    std::string key = rotation.tokenKey;
    std::string certificate;
    if (key.empty()) {
        Passphrase passphrase;
        readPassphrase(directory, passphrase);
        const Identity signer = issueSigner(issuer, now, passphrase.text());
        key = files.write(name + ".key", signer.privateKey, kPrivateFileMode);
        certificate = files.write(name + ".pem", signer.certificate, kPublicFileMode);
    } else {
        const auto token = openSigningKey(key, {});
        certificate =
            files.write(name + ".pem", certifySigner(issuer, token->publicKey(), now), kPublicFileMode);
    }
    files.flush();
    nameSigner(directory, key, chainWith(directory, certificate), false);
    files.keep();
    RotationReport report{
        "Tickets are signed with the new key from now on; those that were issued stay valid."};
    if (!isTokenKey(oldKey)) report.push_back(retiredHint(oldKey));
    return report;
}

RotationReport rotateServer(const ServiceDirectory& directory, const std::string& rootDirectory, Date now) {
    const std::string rootKey =
        rootDirectory.empty() ? directory.servicePath("root.key") : rootDirectory + "/root.key";
    const std::string& oldKey = directory.serverKeyPath();
    std::error_code ignored;
    if (!std::filesystem::exists(rootKey, ignored)) {
        throw Failure(EX_CONFIG,
                      format("%@ is not there; --root DIR names where the root's key is", rootKey));
    }
    Passphrase passphrase;
    readPassphrase(directory, passphrase);
    const Identity server =
        issueServer({directory.rootCertificatePath(), rootKey, directory.settings().passphraseFile},
                    directory.hosts(), now, passphrase.text());
    const std::string name = freshName(directory, "server", now);
    NewFiles files(directory);
    const std::string key = files.write(name + ".key", server.privateKey, kPrivateFileMode);
    const std::string certificate = files.write(name + ".pem", server.certificate, kPublicFileMode);
    files.flush();
    directory.changeSettings([&](Dictionary& settings) {
        settings["server"] = Dictionary{{"key", key}, {"certificate", certificate}};
    });
    files.keep();
    return {"New connections get the new certificate once the running service gets SIGHUP.",
            retiredHint(oldKey)};
}

RotationReport certifySignerElsewhere(const ServiceDirectory& directory, const std::string& chainFile,
                                      const std::string& key, Date now) {
    constexpr std::size_t kOneTooMany = 4;
    const std::vector<CertificateHandle> chain = readCertificateFiles(chainFile, kOneTooMany);
    if (const auto fault = faultOfSignerChain(chain))
        throw Failure(EX_DATAERR, format("%@: %@", chainFile, *fault));

    const SignerSettings& present = directory.settings().signer;
    std::string chosen = key.empty() ? present.requested : key;
    if (chosen.empty()) chosen = present.key;
    NewFiles files(directory);
    const std::string name = freshName(directory, "ticket-signer", now);
    const std::string signer = files.write(name + ".pem", encodeCertificate(chain[0].get()), kPublicFileMode);
    Array names{signer};
    for (std::size_t i = 1; i < chain.size(); ++i) {
        const std::string suffix = i == 1 ? "-intermediate.pem" : "-root.pem";
        names.emplace_back(files.write(name + suffix, encodeCertificate(chain[i].get()), kPublicFileMode));
    }
    const std::shared_ptr<const SigningKey> opened =
        openSigningKey(chosen, directory.settings().passphraseFile);
    try {
        static_cast<void>(TicketSigner(opened, {directory.servicePath(signer)}));
    } catch (const Failure&) {
        throw Failure(EX_DATAERR, format("%@: %@ is not for the key in %@", chainFile, nameOf(chain[0].get()),
                                         chosen.substr(0, chosen.find('?'))));
    }
    RotationReport report;
    publishRoot(directory, chain[2].get(), name + "-root", files, report);
    files.flush();
    nameSigner(directory, nameInService(directory, chosen), names, chosen == present.requested);
    files.keep();
    report.emplace_back(
        "Tickets are signed with this certificate from now on; those that were issued stay valid.");
    return report;
}

namespace {

/// Certificate and key under these names, both or none.
void writePair(const std::string& folder, const std::string& name, const Identity& identity) {
    PendingDirectory pending(folder, kPrivateDirectoryMode);
    writeNewFile(pending.path() + "/" + name + ".pem", base::asBytes(identity.certificate), kPublicFileMode);
    writeNewFile(pending.path() + "/" + name + ".key", base::asBytes(identity.privateKey), kPrivateFileMode);
    flushDirectory(pending.path());
    pending.publish();
}

bool exists(const std::string& path) {
    std::error_code ignored;
    return std::filesystem::exists(path, ignored);
}

IssuerFiles requireAuthority(const ServiceDirectory& directory, values::Date now) {
    const std::string folder = directory.servicePath("clients");
    if (!exists(clientAuthorityPath(directory))) {
        Passphrase passphrase;
        if (!directory.settings().passphraseFile.empty())
            passphrase.read(directory.settings().passphraseFile);
        try {
            writePair(folder, "ca", createClientAuthority(now, passphrase.text()));
        } catch (const Failure&) {
            if (!exists(clientAuthorityPath(directory))) throw;  // another process was faster
        }
    }
    return {clientAuthorityPath(directory), folder + "/ca.key", directory.settings().passphraseFile};
}

}  // namespace

std::string clientAuthorityPath(const ServiceDirectory& directory) {
    return directory.servicePath("clients/ca.pem");
}

void makeClientCertificate(const ServiceDirectory& directory, const std::string& name,
                           const std::string& folder, values::Date now) {
    if (!canNameAClient(name)) {
        throw Failure(EX_USAGE, format("%@ is not a client's name: 1 to %zu bytes without control characters",
                                       name, kMaximumClientName));
    }
    const IssuerFiles authority = requireAuthority(directory, now);
    writePair(folder, "client", issueClient(authority, name, now));
}

}  // namespace pinwell::lumora
