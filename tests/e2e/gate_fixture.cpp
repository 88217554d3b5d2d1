#include "gate_fixture.h"

#include <csignal>
#include <filesystem>
#include <memory>
#include <stdexcept>

namespace pinwell::test {
namespace {

namespace fs = std::filesystem;

void replaceTree(const std::string& from, const std::string& to) {
    fs::remove_all(to);
    fs::copy(from, to, fs::copy_options::recursive | fs::copy_options::copy_symlinks);
}

}  // namespace

void GateRun::SetUp() {
    // Issuing, starting a service and stapling take longer than most of the tests. The first one of a process
    // does it, and the others copy the result.
    static const TemporaryDirectory pattern;
    static const std::unique_ptr<RunningProcess> common = [this] {
        record("issue", samples);
        replaceTree(serviceDirectory, pattern / "service");
        replaceTree(serviceDirectory, pattern / "served");
        fs::create_directory(pattern / "tmp");
        Command serve =
            lumoraCommand({"serve", pattern / "served", "--listen", "127.0.0.1:0", "--update-platform"});
        // It outlives the test's own directory.
        serve.environment["HOME"] = pattern.path();
        serve.environment["TMPDIR"] = pattern / "tmp";
        serve.workingDirectory = "/";
        auto service = std::make_unique<RunningProcess>(serve);
        if (!service->waitForLine("ready at https://127.0.0.1:"))
            throw std::runtime_error("lumora-local did not start: " + service->resultSoFar().errors);
        environment["PINWELL_PLATFORM"] = pattern / "served/platform";
        for (const std::string& path : samples) {
            const ProcessResult stapled = pinwell({"staple", path});
            if (stapled.exitStatus != 0) throw std::runtime_error(stapled.output + stapled.errors);
        }
        replaceTree(directory / "samples", pattern / "samples");
        return service;
    }();
    replaceTree(pattern / "samples", directory / "samples");
    replaceTree(pattern / "service", serviceDirectory);
    replaceTree(pattern / "served/platform", serviceDirectory + "/platform");
    environment["PINWELL_PLATFORM"] = serviceDirectory + "/platform";
}

Command GateRun::gateCommand(std::vector<std::string> arguments) const {
    Command made = command(std::move(arguments));
    made.executable = PINWELL_GATE_PROGRAM;
    return made;
}

ProcessResult GateRun::gate(std::vector<std::string> arguments) const {
    return runProcess(gateCommand(std::move(arguments)));
}

ProcessResult GateRun::gate(std::vector<std::string> arguments, const std::vector<std::string>& paths) const {
    arguments.insert(arguments.end(), paths.begin(), paths.end());
    return gate(std::move(arguments));
}

void GateRun::stopService() const {
    serving->sendSignal(SIGTERM);
    EXPECT_EQ(serving->wait().exitStatus, 0);
}

void flip(const std::string& path, std::size_t at) {
    std::string contents = readFile(path);
    contents.at(at) = static_cast<char>(contents.at(at) ^ 1);
    writeFile(path, std::string_view(contents));
}

}  // namespace pinwell::test
