#include "local_service.h"

#include <stdexcept>
#include <utility>

namespace pinwell::test {

LocalServiceTest::LocalServiceTest() {
    const ProcessResult sample = lumora({"sample", directory / "samples"});
    const ProcessResult init = lumora({"init", serviceDirectory, "--host", "127.0.0.1"});
    if (sample.exitStatus != 0 || init.exitStatus != 0) throw std::runtime_error(sample.errors + init.errors);
    samples = linesOf(sample.output);
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
