// A service with an administration listener, and clients that have certificates.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "support/process.h"
#include "support/temporary_directory.h"

namespace httplib {
class SSLClient;
}

namespace pinwell::lumora::test {

/// The response to a client, from either library. `status` is -1 without a response.
struct AdminAnswer {
    int status = -1;
    std::string body;
    std::map<std::string, std::string> headers;

    /// Empty if it is not there.
    std::string header(const std::string& name) const {
        const auto found = headers.find(name);
        return found == headers.end() ? std::string() : found->second;
    }
};

/// A client with the certificate and the key in PEM files.
class AdminClient {
  public:
    AdminClient(const std::string& service, int port, const std::string& certificate, const std::string& key);
    ~AdminClient();
    AdminClient(AdminClient&&) noexcept;

    AdminAnswer get(const std::string& target);

    /// With an Idempotency-Key, unless it is empty.
    AdminAnswer post(const std::string& path, const std::string& body, const std::string& key = "",
                     const std::string& contentType = "application/json");

  private:
    std::unique_ptr<httplib::SSLClient> client_;
};

/// A service directory for 127.0.0.1 with access.toml and, in `clients/NAME` beside it, certificates for
/// "ci.example" (issue, read), "manager" (issue, revoke, read), "auditor" (read) and "stranger" (no role).
class ServiceWithClients {
  public:
    ServiceWithClients();

    const std::string& path() const noexcept { return service_; }
    std::string folderOf(const std::string& client) const { return directory_ / ("clients/" + client); }
    std::string authority() const { return service_ + "/service/clients/ca.pem"; }
    std::string accessPath() const { return service_ + "/service/access.toml"; }
    std::string scratch(const std::string& name) const { return directory_ / name; }

  private:
    const pinwell::test::TemporaryDirectory directory_;
    const std::string service_;
};

/// `serve` with both listeners on free loopback ports, until the test ends.
class AdminInstance {
  public:
    /// `authorities`, unless empty, replaces the service's own; `options` are further options of the
    /// command. Throws std::runtime_error if it does not start.
    explicit AdminInstance(const ServiceWithClients& service, const std::string& authorities = "",
                           const std::vector<std::string>& options = {});

    int port() const noexcept { return port_; }
    int adminPort() const noexcept { return adminPort_; }
    AdminClient client(const std::string& name) const;
    pinwell::test::RunningProcess& process() noexcept { return process_; }

    /// SIGKILL.
    void kill();

    /// Sends SIGTERM; returns the output.
    pinwell::test::ProcessResult stop();

  private:
    const ServiceWithClients& service_;
    pinwell::test::RunningProcess process_;
    int port_ = 0;
    int adminPort_ = 0;
};

/// The name of a record, made of a number.
std::string recordNamed(int number);

/// The body of a request about it, with further members.
std::string bodyFor(const std::string& record, const std::string& members = "");

}  // namespace pinwell::lumora::test
