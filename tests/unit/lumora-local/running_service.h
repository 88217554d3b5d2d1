// The program under test in a separate process, and clients that use it over TLS.
#pragma once

#include <sys/types.h>

#include <memory>
#include <string>
#include <vector>

#include "lumora-local/record_name.h"
#include "lumora-local/record_store.h"
#include "lumora-local/service_directory.h"
#include "support/temporary_directory.h"

namespace httplib {
class SSLClient;
}

namespace pinwell::lumora::test {

/// The path of lookups.
inline constexpr const char* kLookupPath =
    "/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup";

struct Outcome {
    int exitStatus = -1;  // 128 and the signal's number when one ended the program
    std::string out;
    std::string err;
};

/// Runs lumora-local to its end.
Outcome runProgram(const std::vector<std::string>& arguments);

/// A service in a temporary directory, which serves on a free loopback port until the test ends.
class RunningService {
  public:
    /// `settings` takes the place of service.json, unless it is empty.
    explicit RunningService(const std::vector<std::string>& options = {}, const std::string& settings = {});
    ~RunningService();

    /// A fresh record with a ticket over arbitrary hashes; returns its name.
    std::string put(const CodeHash& hash, bool asAsset = false, bool revoked = false);

    int port() const noexcept { return port_; }
    const std::string& path() const noexcept { return path_; }
    const ServiceDirectory& directory() const noexcept { return directory_; }
    std::string rootPath() const { return directory_.platformPath() + "/roots/lumora-local.pem"; }

    /// Trusts only the service's root, and checks the host.
    std::unique_ptr<httplib::SSLClient> client() const;

    void sendSignal(int number) const;

    /// Waits for the end. The exit status, or 128 and the signal's number.
    int wait();

    /// Its output so far.
    std::string output() const;
    std::string errors() const;

  private:
    pinwell::test::TemporaryDirectory temporary_;
    std::string path_ = temporary_ / "service";
    ServiceDirectory directory_;
    pid_t process_ = -1;
    int port_ = 0;
};

/// A bare TLS connection, for input that no well-behaved client would send.
class RawClient {
  public:
    explicit RawClient(const RunningService& service) : RawClient(service.port()) {}
    explicit RawClient(int port);
    ~RawClient();
    RawClient(const RawClient&) = delete;
    RawClient& operator=(const RawClient&) = delete;

    /// False when the service has closed the connection.
    bool send(const std::string& bytes);

    /// All input until the service closes.
    std::string readToEnd();

    /// All input up to the `count`-th empty line, for example that many heads of responses without bodies.
    std::string readUntil(const std::string& mark, std::size_t count = 1);

    /// The certificate that the service shows, in DER.
    std::string serverCertificate() const;

    /// Ends the TCP connection without a word of TLS.
    void drop();

  private:
    struct Connection;
    std::unique_ptr<Connection> connection_;
};

}  // namespace pinwell::lumora::test
