#include "lumora-local/service_directory.h"

#include <filesystem>
#include <system_error>

#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "foundation/format.h"
#include "foundation/json.h"
#include "foundation/platform_directory.h"
#include "foundation/value.h"
#include "lumora-local/authority.h"
#include "lumora-local/failure.h"
#include "lumora-local/file_writing.h"
#include "lumora-local/sqlite_store.h"

namespace pinwell::lumora {
namespace {

using foundation::Array;
using foundation::Data;
using foundation::Dictionary;
using foundation::format;
using foundation::Result;
using foundation::Value;

constexpr mode_t kPublicDirectoryMode = 0755;
constexpr mode_t kPrivateDirectoryMode = 0700;
constexpr mode_t kPublicFileMode = 0644;
constexpr mode_t kPrivateFileMode = 0600;
constexpr std::size_t kMaximumDescriptionSize = 1024 * 1024;

constexpr std::string_view kHostsKey = "hosts";
constexpr std::string_view kStoreKey = "store";
constexpr std::string_view kRoleKey = "role";
constexpr std::string_view kLumoraKey = "lumora";
constexpr std::string_view kHostKey = "host";

Data jsonDocument(const Value& value) {
    Result<Data> document = foundation::serializeJSON(value);
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    document->push_back(std::byte{'\n'});
    return *std::move(document);
}

Value readJson(const std::string& path) {
    const Result<Data> bytes = foundation::readSmallFile(path, kMaximumDescriptionSize);
    if (!bytes) throw Failure(EX_CONFIG, bytes.error().localizedDescription());
    Result<Value> value = foundation::parseJSON(*bytes);
    if (!value) throw Failure(EX_CONFIG, format("%@: %@", path, value.error().localizedDescription()));
    return *std::move(value);
}

Value platformDescription(const Endpoint& endpoint) {
    return Dictionary{{std::string(kLumoraKey), Dictionary{{std::string(kHostKey), toString(endpoint)}}}};
}

/// `nullopt` if the description has none.
std::optional<std::string> storeUrlIn(const Value& value, const std::string& description) {
    if (value.dictionary() == nullptr || !value.dictionary()->contains(std::string(kStoreKey)))
        return std::nullopt;
    const std::string* url = value[kStoreKey].string();
    const std::string place = description + ": \"store\"";
    requireStoreUrl(url != nullptr ? *url : "", place);
    return *url;
}

Role roleIn(const Value& value, const std::string& description) {
    if (value.dictionary() == nullptr || !value.dictionary()->contains(std::string(kRoleKey)))
        return Role::full;
    const std::string* role = value[kRoleKey].string();
    if (role == nullptr || *role != "lookup") {
        throw Failure(EX_CONFIG, format("%@: \"role\" is %@; it can be \"lookup\" or absent", description,
                                        value[kRoleKey]));
    }
    return Role::lookup;
}

/// A name beside `path` that nothing has.
std::string freeNameBeside(const std::string& path) {
    const std::string first = path + ".before-migration";
    std::string name = first;
    std::error_code ignored;
    for (int attempt = 2; std::filesystem::exists(std::filesystem::symlink_status(name, ignored));
         ++attempt) {
        name = first + "." + std::to_string(attempt);
    }
    return name;
}

void writeIdentity(const std::string& directory, const std::string& name, const Identity& identity) {
    writeNewFile(directory + "/" + name + ".pem", foundation::asBytes(identity.certificate), kPublicFileMode);
    writeNewFile(directory + "/" + name + ".key", foundation::asBytes(identity.privateKey), kPrivateFileMode);
}

void buildPlatform(const std::string& directory, const Authority& authority, const Endpoint& endpoint) {
    makeDirectory(directory, kPublicDirectoryMode);
    makeDirectory(directory + "/roots", kPublicDirectoryMode);
    writeNewFile(directory + "/roots/lumora-local.pem", foundation::asBytes(authority.root.certificate),
                 kPublicFileMode);
    writeNewFile(directory + "/platform.json", jsonDocument(platformDescription(endpoint)), kPublicFileMode);
    flushDirectory(directory + "/roots");
    flushDirectory(directory);
}

void buildService(const std::string& directory, const Authority& authority,
                  const std::vector<std::string>& hosts) {
    makeDirectory(directory, kPrivateDirectoryMode);
    writeIdentity(directory, "root", authority.root);
    writeIdentity(directory, "ticket-intermediate", authority.ticketIntermediate);
    writeIdentity(directory, "ticket-signer", authority.ticketSigner);
    writeIdentity(directory, "server", authority.server);
    const Value description = Dictionary{{std::string(kHostsKey), Value(Array(hosts.begin(), hosts.end()))}};
    writeNewFile(directory + "/service.json", jsonDocument(description), kPublicFileMode);
    SqliteStore::create(directory + "/records.sqlite");
    flushDirectory(directory);
}

}  // namespace

void requireStoreUrl(const std::string& url, const std::string& place) {
    const bool known = url.starts_with("postgresql://") || url.starts_with("postgres://");
    // The text is not repeated: it may hold a password.
    if (!known || url.find('\0') != std::string::npos) {
        throw Failure(EX_CONFIG, format("%@ is not a URL that begins with postgresql://", place));
    }
}

ServiceDirectory ServiceDirectory::create(const std::string& path, const NewService& service,
                                          foundation::Date now) {
    std::vector<std::string> hosts = service.hosts;
    if (hosts.empty()) hosts = {"localhost", "127.0.0.1", "::1"};
    PendingDirectory pending(path, kPublicDirectoryMode);
    const Authority authority = createAuthority(hosts, now);
    buildPlatform(pending.path() + "/platform", authority, {hosts.front(), service.port});
    buildService(pending.path() + "/service", authority, hosts);
    flushDirectory(pending.path());
    pending.publish();
    return {path, std::move(hosts)};
}

ServiceDirectory ServiceDirectory::open(const std::string& path) {
    const std::string description = path + "/service/service.json";
    const Result<Data> bytes = foundation::readSmallFile(description, kMaximumDescriptionSize);
    if (!bytes) {
        throw Failure(EX_NOINPUT, format("%@ holds no record service that can be read: %@", path,
                                         bytes.error().localizedDescription()));
    }
    const Value value = readJson(description);
    const Dictionary* object = value.dictionary();
    const Array* listed = object != nullptr ? value[kHostsKey].array() : nullptr;
    std::vector<std::string> hosts;
    if (listed != nullptr) {
        for (const Value& host : *listed) {
            if (host.string() == nullptr || canonicalHost(*host.string()) != *host.string()) {
                throw Failure(EX_CONFIG, format("%@: \"%@\" is not a host", description, host));
            }
            hosts.push_back(*host.string());
        }
    }
    if (hosts.empty()) throw Failure(EX_CONFIG, format("%@ names no hosts", description));
    ServiceDirectory directory(path, std::move(hosts));
    directory.storeUrl_ = storeUrlIn(value, description);
    directory.role_ = roleIn(value, description);
    return directory;
}

std::string ServiceDirectory::moveStore(const std::string& url) const {
    const std::string path = descriptionPath();
    const Value old = readJson(path);
    if (old.dictionary() == nullptr) throw Failure(EX_CONFIG, format("%@ is damaged", path));
    const std::string kept = freeNameBeside(path);
    writeNewFile(kept, jsonDocument(old), kPublicFileMode);
    Dictionary description = *old.dictionary();
    description[std::string(kStoreKey)] = url;
    // The directory keeps others out. A service of another account reads the file.
    replaceFile(path, jsonDocument(Value(std::move(description))), kPublicFileMode);
    return kept;
}

Endpoint ServiceDirectory::advertisedEndpoint() const {
    const Result<std::string> host = foundation::PlatformDirectory(platformPath()).lumoraHost();
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
