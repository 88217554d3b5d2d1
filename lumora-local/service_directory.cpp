#include "service_directory.h"

#include <fcntl.h>
#include <sys/file.h>

#include <filesystem>
#include <optional>
#include <system_error>

#include "authority.h"
#include "base/bytes.h"
#include "base/file_io.h"
#include "config/platform_directory.h"
#include "failure.h"
#include "file_writing.h"
#include "key_file.h"
#include "sqlite_store.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using base::Result;
using values::Array;
using values::Dictionary;
using values::format;
using values::Value;

constexpr std::size_t kMaximumDescriptionSize = 1024 * 1024;

constexpr std::string_view kHostsKey = "hosts";
constexpr std::string_view kPassphraseFileKey = "passphraseFile";
constexpr std::string_view kSignerKey = "signer";
constexpr std::string_view kRequestedKey = "requested";
constexpr const char* kFirstSignerKey = "ticket-signer.key";
constexpr std::string_view kLumoraKey = "lumora";
constexpr std::string_view kHostKey = "host";

Data jsonDocument(const Value& value) {
    Result<Data> document = values::serializeJSON(value);
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    document->push_back(std::byte{'\n'});
    return *std::move(document);
}

Value parseJson(const Data& bytes, const std::string& path) {
    Result<Value> value = values::parseJSON(bytes, values::EqualKeys::refused);
    if (!value) throw Failure(EX_CONFIG, format("%@: %@", path, value.error().localizedDescription()));
    return *std::move(value);
}

Value readJson(const std::string& path) {
    const Result<Data> bytes = base::readSmallFile(path, kMaximumDescriptionSize);
    if (!bytes) throw Failure(EX_CONFIG, bytes.error().localizedDescription());
    return parseJson(*bytes, path);
}

Value platformDescription(const Endpoint& endpoint) {
    return Dictionary{{std::string(kLumoraKey), Dictionary{{std::string(kHostKey), toString(endpoint)}}}};
}

void writeCertificate(const std::string& directory, const std::string& name, const Identity& identity) {
    writeNewFile(directory + "/" + name + ".pem", base::asBytes(identity.certificate), kPublicFileMode);
}

void writeIdentity(const std::string& directory, const std::string& name, const Identity& identity) {
    writeCertificate(directory, name, identity);
    writeNewFile(directory + "/" + name + ".key", base::asBytes(identity.privateKey), kPrivateFileMode);
}

void buildPlatform(const std::string& directory, const Authority& authority, const Endpoint& endpoint) {
    makeDirectory(directory, kPublicDirectoryMode);
    makeDirectory(directory + "/roots", kPublicDirectoryMode);
    writeNewFile(directory + "/roots/lumora-local.pem", base::asBytes(authority.root.certificate),
                 kPublicFileMode);
    writeNewFile(directory + "/platform.json", jsonDocument(platformDescription(endpoint)), kPublicFileMode);
    flushDirectory(directory + "/roots");
    flushDirectory(directory);
}

/// The file may be read from another working directory.
std::string absolutePlace(const std::string& place) {
    return place.empty() || isCredential(place) ? place : std::filesystem::absolute(place).string();
}

Dictionary describeService(const NewService& service, const std::vector<std::string>& hosts) {
    Dictionary description{{std::string(kHostsKey), Value(Array(hosts.begin(), hosts.end()))}};
    if (!service.passphraseFile.empty()) {
        description[std::string(kPassphraseFileKey)] = absolutePlace(service.passphraseFile);
    }
    if (!service.signerRequest.empty()) {
        description[std::string(kSignerKey)] = Dictionary{{std::string(kRequestedKey), kFirstSignerKey}};
    }
    return description;
}

void buildService(const std::string& directory, const Authority& authority, const NewService& service,
                  const Value& description) {
    makeDirectory(directory, kPrivateDirectoryMode);
    if (service.rootDirectory.empty()) {
        writeIdentity(directory, "root", authority.root);
    } else {
        writeCertificate(directory, "root", authority.root);
    }
    if (service.signerRequest.empty()) {
        writeIdentity(directory, "ticket-intermediate", authority.ticketIntermediate);
        writeIdentity(directory, "ticket-signer", authority.ticketSigner);
    }
    writeIdentity(directory, "server", authority.server);
    writeNewFile(directory + "/service.json", jsonDocument(description), kPublicFileMode);
    SqliteStore::create(directory + "/records.sqlite");
    flushDirectory(directory);
}

/// The files that init makes beside the service's directory. They are removed again if the service cannot be
/// made.
class Surroundings {
  public:
    Surroundings(const NewService& service, const Authority& authority) : service_(service) {
        if (service_.rootDirectory.empty()) return;
        root_.emplace(service_.rootDirectory, kPrivateDirectoryMode);
        writeIdentity(root_->path(), "root", authority.root);
        flushDirectory(root_->path());
    }

    /// Writes the signer's request, whose key goes into `directory`, and moves all files to their places.
    void publish(const std::string& directory, std::string_view passphrase) {
        if (!service_.signerRequest.empty()) {
            const Identity signer = requestSigner(passphrase);
            writeNewFile(directory + "/service/" + kFirstSignerKey, base::asBytes(signer.privateKey),
                         kPrivateFileMode);
            writeNewFile(service_.signerRequest, base::asBytes(signer.certificate), kPublicFileMode);
            requestWritten_ = true;
        }
        if (root_) root_->publish();
        rootPublished_ = root_.has_value();
    }

    void keep() noexcept { kept_ = true; }

    ~Surroundings() {
        std::error_code ignored;
        if (!kept_ && requestWritten_) std::filesystem::remove(service_.signerRequest, ignored);
        if (!kept_ && rootPublished_) std::filesystem::remove_all(service_.rootDirectory, ignored);
    }
    Surroundings(const Surroundings&) = delete;
    Surroundings& operator=(const Surroundings&) = delete;

  private:
    const NewService& service_;
    std::optional<PendingDirectory> root_;
    bool requestWritten_ = false;
    bool rootPublished_ = false;
    bool kept_ = false;
};

}  // namespace

ServiceDirectory ServiceDirectory::create(const std::string& path, const NewService& service,
                                          values::Date now) {
    std::vector<std::string> hosts = service.hosts;
    if (hosts.empty()) hosts = {"localhost", "127.0.0.1", "::1"};
    Passphrase passphrase;
    if (!service.passphraseFile.empty()) passphrase.read(service.passphraseFile);
    PendingDirectory pending(path, kPublicDirectoryMode);
    const Authority authority = createAuthority(hosts, now, passphrase.text());
    buildPlatform(pending.path() + "/platform", authority, {hosts.front(), service.port});
    buildService(pending.path() + "/service", authority, service, Value(describeService(service, hosts)));
    Surroundings surroundings(service, authority);
    surroundings.publish(pending.path(), passphrase.text());
    flushDirectory(pending.path() + "/service");
    flushDirectory(pending.path());
    pending.publish();
    surroundings.keep();
    return open(path);
}

ServiceDirectory ServiceDirectory::open(const std::string& path) {
    const std::string description = path + "/service/service.json";
    const Result<Data> bytes = base::readSmallFile(description, kMaximumDescriptionSize);
    if (!bytes) {
        throw Failure(EX_NOINPUT, format("%@ has no readable record service: %@", path,
                                         bytes.error().localizedDescription()));
    }
    return {path, parseServiceSettings(parseJson(*bytes, description), description)};
}

TicketSigner ServiceDirectory::openSigner() const {
    const SignerSettings& signer = settings_.signer;
    if (signer.chain.empty()) {
        throw Failure(EX_CONFIG, format("the signer has no certificate yet; once it is there: "
                                        "lumora-local certify %@ CHAIN",
                                        path_));
    }
    return {openSigningKey(signer.key, settings_.passphraseFile), signer.chain};
}

void ServiceDirectory::changeSettings(const std::function<void(Dictionary&)>& change) const {
    const std::string folder = path_ + "/service";
    const base::FileDescriptor lock(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!lock || ::flock(lock.get(), LOCK_EX) != 0) {
        throw Failure(EX_NOPERM, format("cannot lock %@", folder));
    }
    const Value old = readJson(descriptionPath());
    Dictionary description = old.dictionary() != nullptr ? *old.dictionary() : Dictionary{};
    change(description);
    const Value changed(std::move(description));
    static_cast<void>(parseServiceSettings(changed, descriptionPath()));
    // The directory keeps others out. A service of another account reads the file.
    replaceFile(descriptionPath(), jsonDocument(changed), kPublicFileMode);
}

std::string ServiceDirectory::moveStore(const std::string& url) const {
    std::string kept = freeName(descriptionPath(), ".before-migration");
    writeNewFile(kept, jsonDocument(readJson(descriptionPath())), kPublicFileMode);
    changeSettings([&](Dictionary& settings) { settings["store"] = url; });
    return kept;
}

Endpoint ServiceDirectory::advertisedEndpoint() const {
    const Result<std::string> host = config::PlatformDirectory(platformPath()).lumoraHost();
    if (!host) throw Failure(EX_CONFIG, host.error().localizedDescription());
    const std::optional<Endpoint> endpoint = parseEndpoint(*host, kHttpsPort);
    if (!endpoint) throw Failure(EX_CONFIG, format("%@ is not a HOST:PORT to listen on", *host));
    return *endpoint;
}

void ServiceDirectory::advertise(const Endpoint& endpoint) const {
    const std::string path = platformPath() + "/platform.json";
    const Value old = readJson(path);
    Dictionary description = old.dictionary() != nullptr ? *old.dictionary() : Dictionary{};
    const Dictionary* lumora = description[std::string(kLumoraKey)].dictionary();
    Dictionary replacement = lumora != nullptr ? *lumora : Dictionary{};
    replacement[std::string(kHostKey)] = toString(endpoint);
    description[std::string(kLumoraKey)] = std::move(replacement);
    replaceFile(path, jsonDocument(Value(std::move(description))), kPublicFileMode);
}

}  // namespace pinwell::lumora
