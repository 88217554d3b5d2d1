// A record service of the test with its administration listener, and clients with certificates.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "local_service.h"

namespace pinwell::test {

class AdminServiceTest : public LocalServiceTest {
  protected:
    /// A client with these roles: its certificate and key are at clientFile("client.pem") and
    /// clientFile("client.key").
    void admit(const std::string& client, const std::string& roles);
    std::string clientFile(const std::string& client, const std::string& file) const {
        return directory / (client + "/" + file);
    }

    /// Starts both listeners on free ports, after the clients were admitted.
    void serve();
    const std::string& administration() const { return administration_; }

    /// The tool, asking as this client.
    ProcessResult request(const std::string& client, std::vector<std::string> arguments) const;
    ProcessResult ticketTool(std::vector<std::string> arguments) const;

    const std::string tickets = directory / "tickets";

  private:
    std::string clients_ = "[clients]\n";
    std::string administration_;  // "https://127.0.0.1:PORT"
};

}  // namespace pinwell::test
