// Runs of pinwell-gate over samples of a real record service, stapled by the real tool.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "local_service.h"

namespace pinwell::test {

class GateRun : public LocalServiceTest {
  protected:
    /// The samples are stapled, and a service with their records runs. It is the same for all tests of a
    /// process: a test that changes records, or ends the service, starts one of its own (serveRecords).
    void SetUp() override;

    Command gateCommand(std::vector<std::string> arguments) const;
    ProcessResult gate(std::vector<std::string> arguments) const;
    ProcessResult gate(std::vector<std::string> arguments, const std::vector<std::string>& paths) const;

    /// Ends the test's own service.
    void stopService() const;

    const std::string& application() const { return samples.at(0); }
    const std::string& image() const { return samples.at(1); }
    const std::string& unsignedImage() const { return samples.at(2); }
    const std::string& package() const { return samples.at(3); }
};

/// Changes a bit of one byte of a file.
void flip(const std::string& path, std::size_t at);

}  // namespace pinwell::test
