// A record service of the test, its samples, and a tool that trusts it.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "fixture.h"

namespace pinwell::test {

class LocalServiceTest : public EndToEndTest {
  protected:
    /// A service that is not started yet, for 127.0.0.1, and the samples.
    LocalServiceTest();

    ProcessResult lumora(std::vector<std::string> arguments) const;
    Command lumoraCommand(std::vector<std::string> arguments) const;

    /// A command on the service's records that must work.
    void record(const std::string& verb, std::vector<std::string> arguments) const;

    /// Starts it on a free port and points the platform directory at it.
    void serveRecords();

    std::string serviceDirectory = directory / "service";
    std::vector<std::string> samples;  // paths: an application, a signed and an unsigned image, a package
    std::unique_ptr<RunningProcess> serving;
};

}  // namespace pinwell::test
