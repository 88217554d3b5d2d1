// Where a record service lives.
//
//   DIR/platform/platform.json   {"lumora": {"host": "HOST:PORT"}}
//   DIR/platform/roots/          the service's root certificate: with the line above, all that a client needs
//   DIR/service/                 mode 0700
//       service.json             {"hosts": [...]}, the names the server's certificate speaks for;
//                                "store": "postgresql://...", if the records are not in records.sqlite;
//                                "role": "lookup", for a service that changes no records
//       root.pem  ticket-intermediate.pem  ticket-signer.pem  server.pem
//       root.key  ticket-intermediate.key  ticket-signer.key  server.key      mode 0600
//       records.sqlite           the records (and the files that SQLite keeps beside it)
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/endpoint.h"

namespace pinwell::lumora {

struct NewService {
    std::vector<std::string> hosts;     // canonical; empty: the three names of this machine's loopback
    std::uint16_t port = kDefaultPort;  // where clients will look for it, on the first host
};

enum class Role {
    full,    ///< issues, revokes and answers lookups
    lookup,  ///< answers lookups
};

/// Throws Failure (EX_CONFIG) if `url` is not one of a database that can hold records. `place` is where it is
/// from, for the message.
void requireStoreUrl(const std::string& url, const std::string& place);

/// An existing service's place. Immutable; may be used from any thread.
class ServiceDirectory {
  public:
    /// Makes everything that the table above lists, with fresh keys and an empty store, or nothing at all.
    /// `path` may be an empty directory; anything else that stands there is left alone (EX_CANTCREAT).
    static ServiceDirectory create(const std::string& path, const NewService& service, foundation::Date now);

    /// Reads the description. Throws Failure (EX_NOINPUT) when there is no service at `path`, (EX_CONFIG)
    /// when its description is damaged.
    static ServiceDirectory open(const std::string& path);

    const std::string& path() const noexcept { return path_; }
    std::string descriptionPath() const { return servicePath("service.json"); }
    std::string platformPath() const { return path_ + "/platform"; }
    std::string storePath() const { return servicePath("records.sqlite"); }
    std::string serverCertificatePath() const { return servicePath("server.pem"); }
    std::string serverKeyPath() const { return servicePath("server.key"); }
    std::string signerKeyPath() const { return servicePath("ticket-signer.key"); }

    /// Of the ticket signer's chain, the signer first and the root last.
    std::vector<std::string> signerChainPaths() const {
        return {servicePath("ticket-signer.pem"), servicePath("ticket-intermediate.pem"),
                servicePath("root.pem")};
    }

    /// Canonical, as they stand in the server's certificate; never empty.
    const std::vector<std::string>& hosts() const noexcept { return hosts_; }

    /// URL of the database with the records; `nullopt` if they are in the file at storePath().
    const std::optional<std::string>& storeUrl() const noexcept { return storeUrl_; }

    Role role() const noexcept { return role_; }

    /// Rewrites service.json in one step, so that the records are at `url`; the rest of its text stays as it
    /// is in meaning. The old file stays beside it. Returns the path of the old file. Throws Failure.
    std::string moveStore(const std::string& url) const;

    /// Where platform.json sends clients. Read afresh each time. Throws Failure (EX_CONFIG) when it says
    /// nothing that can be used.
    Endpoint advertisedEndpoint() const;

    /// Rewrites platform.json in one step; what else stands in it stays. Throws Failure.
    void advertise(const Endpoint& endpoint) const;

  private:
    ServiceDirectory(std::string path, std::vector<std::string> hosts)
        : path_(std::move(path)), hosts_(std::move(hosts)) {}

    std::string servicePath(const std::string& name) const { return path_ + "/service/" + name; }

    std::string path_;
    std::vector<std::string> hosts_;
    std::optional<std::string> storeUrl_;
    Role role_ = Role::full;
};

}  // namespace pinwell::lumora
