#include "service_settings.h"

#include <algorithm>
#include <filesystem>
#include <initializer_list>
#include <string_view>

#include "endpoint.h"
#include "failure.h"
#include "key_file.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::Array;
using values::format;
using values::Value;

constexpr std::size_t kCertificatesInChain = 3;

/// One object of the document. Its name comes before its keys in messages: "signer.".
class SettingsObject {
  public:
    SettingsObject(const Value& value, const std::string& path, std::string name)
        : value_(value), path_(path), name_(std::move(name)) {
        if (value_.dictionary() == nullptr) {
            if (name_.empty()) throw Failure(EX_CONFIG, format("%@ is not a JSON object", path_));
            complain(name_.substr(0, name_.size() - 1), "is not an object");
        }
    }

    void allowOnly(std::initializer_list<std::string_view> keys) const {
        for (const auto& [key, value] : *value_.dictionary()) {
            if (std::find(keys.begin(), keys.end(), key) == keys.end()) {
                throw Failure(EX_CONFIG, format("%@: unknown key \"%@%@\"", path_, name_, key));
            }
        }
    }

    bool has(std::string_view key) const { return !value_[key].isNil(); }

    SettingsObject object(std::string_view key) const {
        return {value_[key], path_, name_ + std::string(key) + "."};
    }

    /// Empty if it is not there.
    std::string text(std::string_view key) const {
        if (!has(key)) return {};
        const std::string* text = value_[key].string();
        if (text == nullptr || text->empty() || text->find('\0') != std::string::npos) {
            complain(name_ + std::string(key), "is not a text");
        }
        return *text;
    }

    /// Empty if it is not there.
    std::vector<std::string> texts(std::string_view key) const {
        if (!has(key)) return {};
        const Array* array = value_[key].array();
        std::vector<std::string> all;
        if (array == nullptr) complain(name_ + std::string(key), "is not an array");
        for (const Value& element : *array) {
            if (element.string() == nullptr || element.string()->empty()) {
                complain(name_ + std::string(key), "holds what is not a text");
            }
            all.push_back(*element.string());
        }
        return all;
    }

    [[noreturn]] void complain(const std::string& key, std::string_view what) const {
        throw Failure(EX_CONFIG, format("%@: \"%@\" %@", path_, key, what));
    }

  private:
    const Value& value_;
    const std::string& path_;
    std::string name_;
};

std::vector<std::string> readHosts(const SettingsObject& settings, const std::string& path) {
    std::vector<std::string> hosts = settings.texts("hosts");
    for (const std::string& host : hosts) {
        if (canonicalHost(host) != host) {
            throw Failure(EX_CONFIG, format("%@: \"hosts\": \"%@\" is not a host", path, host));
        }
    }
    if (hosts.empty()) throw Failure(EX_CONFIG, format("%@ names no hosts", path));
    return hosts;
}

/// Files beside service.json are named relative to it.
class Folder {
  public:
    explicit Folder(const std::string& file) : folder_(std::filesystem::path(file).parent_path()) {}

    std::string pathOf(const std::string& name) const {
        return name.empty() || isTokenKey(name) ? name : (folder_ / name).string();
    }

  private:
    std::filesystem::path folder_;
};

SignerSettings readSigner(const SettingsObject& settings, const Folder& folder) {
    SignerSettings signer{
        "ticket-signer.key", {"ticket-signer.pem", "ticket-intermediate.pem", "root.pem"}, ""};
    if (settings.has("signer")) {
        const SettingsObject object = settings.object("signer");
        object.allowOnly({"key", "chain", "requested"});
        signer = {object.text("key"), object.texts("chain"), object.text("requested")};
        const bool certified = signer.chain.size() == kCertificatesInChain && !signer.key.empty();
        const bool waiting = signer.chain.empty() && signer.key.empty() && !signer.requested.empty();
        if (!certified && !waiting) {
            settings.complain("signer", "needs a \"key\" and a \"chain\" of three certificates");
        }
    }
    signer.key = folder.pathOf(signer.key);
    signer.requested = folder.pathOf(signer.requested);
    for (std::string& certificate : signer.chain) certificate = folder.pathOf(certificate);
    return signer;
}

ServerSettings readServer(const SettingsObject& settings, const Folder& folder) {
    ServerSettings server{"server.key", "server.pem"};
    if (settings.has("server")) {
        const SettingsObject object = settings.object("server");
        object.allowOnly({"key", "certificate"});
        server = {object.text("key"), object.text("certificate")};
        if (server.key.empty() || server.certificate.empty()) {
            settings.complain("server", "needs a \"key\" and a \"certificate\"");
        }
        if (isTokenKey(server.key))
            object.complain("server.key", "is not a file: only tickets are signed by a token");
    }
    return {folder.pathOf(server.key), folder.pathOf(server.certificate)};
}

std::optional<AdminSettings> readAdmin(const SettingsObject& settings, const Folder& folder) {
    if (!settings.has("admin")) return std::nullopt;
    const SettingsObject object = settings.object("admin");
    object.allowOnly({"listen", "clients"});
    const std::optional<Endpoint> listen = parseEndpoint(object.text("listen"), kDefaultAdminPort);
    if (!listen) object.complain("admin.listen", "is not ADDRESS:PORT");
    if (object.text("clients").empty()) object.complain("admin.clients", "is missing");
    return AdminSettings{*listen, folder.pathOf(object.text("clients"))};
}

Role readRole(const SettingsObject& settings, const Value& role, const std::string& path) {
    if (!settings.has("role")) return Role::full;
    if (role.string() == nullptr || *role.string() != "lookup") {
        throw Failure(EX_CONFIG, format("%@: \"role\" is %@; it can be \"lookup\" or absent", path, role));
    }
    return Role::lookup;
}

}  // namespace

void requireStoreUrl(const std::string& url, const std::string& place) {
    const bool known = url.starts_with("postgresql://") || url.starts_with("postgres://");
    // The text is not repeated: it may contain a password.
    if (!known || url.find('\0') != std::string::npos) {
        throw Failure(EX_CONFIG, format("%@ is not a URL that begins with postgresql://", place));
    }
}

bool isTokenKey(std::string_view key) {
    return key.starts_with(kTokenScheme);
}

ServiceSettings parseServiceSettings(const Value& document, const std::string& path) {
    const SettingsObject settings(document, path, "");
    settings.allowOnly({"admin", "hosts", "log", "passphraseFile", "role", "server", "signer", "store"});
    const Folder folder(path);
    ServiceSettings result;
    result.hosts = readHosts(settings, path);
    result.passphraseFile = settings.text("passphraseFile");
    if (!isCredential(result.passphraseFile)) result.passphraseFile = folder.pathOf(result.passphraseFile);
    if (settings.has("store")) {
        const std::string* url = document["store"].string();
        requireStoreUrl(url != nullptr ? *url : "", path + ": \"store\"");
        result.storeUrl = *url;
    }
    const std::string log = settings.text("log");
    if (!log.empty() && log != "text" && log != "json") settings.complain("log", "is neither text nor json");
    if (log == "json") result.log = LogForm::json;
    result.role = readRole(settings, document["role"], path);
    result.signer = readSigner(settings, folder);
    result.server = readServer(settings, folder);
    result.admin = readAdmin(settings, folder);
    return result;
}

}  // namespace pinwell::lumora
