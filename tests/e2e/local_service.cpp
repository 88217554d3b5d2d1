#include "local_service.h"

#include <filesystem>
#include <stdexcept>
#include <utility>

#include "support/temporary_directory.h"

namespace pinwell::test {

LocalServiceTest::LocalServiceTest() {
    // Making keys takes long. The tests of a process copy the keys of the first one.
    static const TemporaryDirectory pattern;
    static const std::vector<std::string> names = [this] {
        const ProcessResult sample = lumora({"sample", pattern / "samples"});
        const ProcessResult init = lumora({"init", pattern / "service", "--host", "127.0.0.1"});
        if (sample.exitStatus != 0 || init.exitStatus != 0)
            throw std::runtime_error(sample.errors + init.errors);
        std::vector<std::string> made;
        for (const std::string& path : linesOf(sample.output))
            made.push_back(std::filesystem::path(path).filename());
        return made;
    }();
    std::filesystem::copy(
        pattern.path(), directory.path(),
        std::filesystem::copy_options::recursive | std::filesystem::copy_options::copy_symlinks);
    for (const std::string& name : names) samples.push_back(directory / "samples/" + name);
    environment["PINWELL_PLATFORM"] = serviceDirectory + "/platform";
}

ProcessResult LocalServiceTest::lumora(std::vector<std::string> arguments) const {
    return runProcess(lumoraCommand(std::move(arguments)));
}

Command LocalServiceTest::lumoraCommand(std::vector<std::string> arguments) const {
    Command command = this->command(std::move(arguments));
    command.executable = LUMORA_LOCAL_PROGRAM;
    return command;
}

void LocalServiceTest::record(const std::string& verb, std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin(), {verb, serviceDirectory});
    const ProcessResult result = lumora(std::move(arguments));
    ASSERT_EQ(result.exitStatus, 0) << result.errors;
}

void LocalServiceTest::serveRecords() {
    serving = std::make_unique<RunningProcess>(
        lumoraCommand({"serve", serviceDirectory, "--listen", "127.0.0.1:0", "--update-platform"}));
    const auto ready = serving->waitForLine("ready at https://127.0.0.1:");
    if (!ready) throw std::runtime_error("lumora-local did not start: " + serving->resultSoFar().errors);
}

}  // namespace pinwell::test
