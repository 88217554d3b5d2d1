// Runs of pinwell-gate over samples of a real record service, stapled by the real tool.
#pragma once

#include <csignal>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "local_service.h"

namespace pinwell::test {

class GateRun : public LocalServiceTest {
  protected:
    void SetUp() override {
        record("issue", samples);
        serveRecords();
        for (const std::string& path : samples) ASSERT_EQ(pinwell({"staple", path}).exitStatus, 0) << path;
    }

    Command gateCommand(std::vector<std::string> arguments) const {
        Command made = command(std::move(arguments));
        made.executable = PINWELL_GATE_PROGRAM;
        return made;
    }
    ProcessResult gate(std::vector<std::string> arguments) const {
        return runProcess(gateCommand(std::move(arguments)));
    }
    ProcessResult gate(std::vector<std::string> arguments, const std::vector<std::string>& paths) const {
        arguments.insert(arguments.end(), paths.begin(), paths.end());
        return gate(std::move(arguments));
    }

    void stopService() const {
        serving->sendSignal(SIGTERM);
        EXPECT_EQ(serving->wait().exitStatus, 0);
    }

    const std::string& application() const { return samples.at(0); }
    const std::string& image() const { return samples.at(1); }
    const std::string& unsignedImage() const { return samples.at(2); }
    const std::string& package() const { return samples.at(3); }
};

/// Changes a bit of one byte of a file.
inline void flip(const std::string& path, std::size_t at) {
    std::string contents = readFile(path);
    contents.at(at) = static_cast<char>(contents.at(at) ^ 1);
    writeFile(path, std::string_view(contents));
}

}  // namespace pinwell::test
