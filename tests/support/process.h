// Programs run as their users run them: arguments and environment in; both outputs and the end out.
//
//   const ProcessResult result = runProcess({.executable = path, .arguments = {"staple", "Sample.app"}});
//   EXPECT_EQ(result.exitStatus, 64);
//
// A child starts with only the given environment (and the sanitizers' needs, see below), with default signal
// dispositions, nothing blocked, and an empty standard input. kProcessPatience bounds every wait; a child
// that outlives it is killed, and the test has failed. No child outlives its object.
//
// Under a sanitizer, a report ends the child with kSanitizerStatus, which no program of ours uses, and is in
// `errors`: a test that compares the exit status cannot miss it.
#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::test {

inline constexpr std::chrono::seconds kProcessPatience{100};
inline constexpr int kSanitizerStatus = 99;

using Environment = std::map<std::string, std::string>;

/// Whether the tested programs are compiled with a sanitizer. A test program that only starts them is not.
bool programsAreSanitized();

/// The emulator that runs the programs, for tests that are compiled for another processor; otherwise empty.
std::string emulator();

/// The target of an output of the child.
enum class Output {
    captured,
    closed,      // the descriptor is not open at all
    brokenPipe,  // a pipe without a reader
    full,        // a device with no space left
};

struct Command {
    std::string executable;                   // a path; also the child's argv[0]
    std::vector<std::string> arguments = {};  // after argv[0]
    Environment environment = {};
    std::string workingDirectory = "/";
    bool hasInput = true;  // an empty one; otherwise the descriptor is not open
    Output output = Output::captured;
    Output errors = Output::captured;
};

struct ProcessResult {
    std::optional<int> exitStatus;  // `nullopt` if a signal ended it
    int signal = 0;
    std::string output;
    std::string errors;

    std::vector<std::string> outputLines() const;
};

/// The lines of a text, without their newlines. Text after the last newline is a line as well.
std::vector<std::string> linesOf(std::string_view text);

/// A child that runs beside the test. For one thread.
class RunningProcess {
  public:
    /// Throws std::system_error when it cannot be started.
    explicit RunningProcess(const Command& command);

    /// Kills it if it still runs.
    ~RunningProcess();
    RunningProcess(const RunningProcess&) = delete;
    RunningProcess& operator=(const RunningProcess&) = delete;

    /// Waits for a whole line of standard output that begins with `prefix`. Returns the line, or `nullopt` if
    /// the child ends or the wait times out.
    std::optional<std::string> waitForLine(std::string_view prefix);

    /// The same for a line with `part` anywhere, as in logs after a time.
    std::optional<std::string> waitForLineWith(std::string_view part);

    bool isRunning();

    /// Its process number, good for as long as the child has not been waited for.
    int id() const noexcept;

    void sendSignal(int number);

    /// Waits for its end. A child that had to be killed is a test failure, and ends with SIGKILL.
    ProcessResult wait();

    /// The result so far.
    const ProcessResult& resultSoFar() const noexcept;

  private:
    struct State;
    std::unique_ptr<State> state_;
};

/// Starts it and waits for its end.
ProcessResult runProcess(const Command& command);

}  // namespace pinwell::test
