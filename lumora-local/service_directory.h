// The directory of a record service.
//
//   DIR/platform/platform.json   {"lumora": {"host": "HOST:PORT"}}
//   DIR/platform/roots/          the service's root certificate: with the line above, all that clients need
//   DIR/service/                 mode 0700
//       service.json             the owner's settings (service_settings.h)
//       root.pem  ticket-intermediate.pem  ticket-signer.pem  server.pem
//       root.key  ticket-intermediate.key  ticket-signer.key  server.key      mode 0600
//                                root.key may be elsewhere; service.json may name other files than
//                                ticket-signer.* and server.*
//       records.sqlite           the records (and SQLite's own files beside it)
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "endpoint.h"
#include "service_settings.h"
#include "ticket_maker.h"
#include "values/date.h"
#include "values/value.h"

namespace pinwell::lumora {

struct NewService {
    std::vector<std::string> hosts;     // canonical; empty: the three names of this machine's loopback
    std::uint16_t port = kDefaultPort;  // for clients, on the first host
    std::string passphraseFile{};       // key_file.h; empty: keys are unencrypted
    std::string rootDirectory{};  // made for root.pem and root.key; empty: root.key stays in the service
    std::string signerRequest{};  // made: a request (RFC 2986) for the signer's certificate; empty: the
                                  // service's own authority certifies the signer
};

/// The directory of an existing service. Immutable; for any thread.
class ServiceDirectory {
  public:
    /// Makes everything that the table above lists, with fresh keys and an empty store, or nothing at all.
    /// `path` may be an empty directory; any other existing file stays unchanged (EX_CANTCREAT).
    static ServiceDirectory create(const std::string& path, const NewService& service, values::Date now);

    /// Reads the description. Throws Failure (EX_NOINPUT) when there is no service at `path`, (EX_CONFIG)
    /// when its description is damaged.
    static ServiceDirectory open(const std::string& path);

    const std::string& path() const noexcept { return path_; }
    std::string platformPath() const { return path_ + "/platform"; }
    std::string storePath() const { return servicePath("records.sqlite"); }
    std::string accessPath() const { return servicePath("access.toml"); }
    std::string descriptionPath() const { return servicePath("service.json"); }
    std::string rootCertificatePath() const { return servicePath("root.pem"); }
    std::string servicePath(const std::string& name) const { return path_ + "/service/" + name; }

    const ServiceSettings& settings() const noexcept { return settings_; }
    const std::string& serverCertificatePath() const noexcept { return settings_.server.certificate; }
    const std::string& serverKeyPath() const noexcept { return settings_.server.key; }
    const std::string& signerKeyPath() const noexcept { return settings_.signer.key; }

    /// Of the ticket signer's chain, the signer first and the root last.
    const std::vector<std::string>& signerChainPaths() const noexcept { return settings_.signer.chain; }

    /// Canonical, as in the server's certificate; never empty.
    const std::vector<std::string>& hosts() const noexcept { return settings_.hosts; }

    /// Opens the key and the chain that service.json names now. Throws Failure: EX_CONFIG if they do not fit,
    /// or the signer has no certificate yet.
    TicketSigner openSigner() const;

    /// Rewrites service.json in one step, as `change` edits it; one process at a time. The new document is
    /// checked before it replaces the old one. Throws Failure.
    void changeSettings(const std::function<void(values::Dictionary&)>& change) const;

    /// URL of the database with the records; `nullopt` if they are in the file at storePath().
    const std::optional<std::string>& storeUrl() const noexcept { return settings_.storeUrl; }

    Role role() const noexcept { return settings_.role; }

    /// Rewrites service.json in one step, so that the records are at `url`; its other members keep their
    /// values. The old file remains beside it. Returns the path of the old file. Throws Failure.
    std::string moveStore(const std::string& url) const;

    /// The host that platform.json names for clients. Reads the file each time. Throws Failure (EX_CONFIG)
    /// if the file names no usable host.
    Endpoint advertisedEndpoint() const;

    /// Rewrites platform.json in one step; its other members stay. Throws Failure.
    void advertise(const Endpoint& endpoint) const;

  private:
    ServiceDirectory(std::string path, ServiceSettings settings)
        : path_(std::move(path)), settings_(std::move(settings)) {}

    std::string path_;
    ServiceSettings settings_;
};

}  // namespace pinwell::lumora
