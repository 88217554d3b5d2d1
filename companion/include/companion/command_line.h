// The command lines of the companions: options, help, versions, errors. An error is one line on standard
// error, with the nearest existing name, and exit status 64.
//
// pinwell-batch and pinwell-ticket have a table for each command, with its options and its help:
//
//   const Program program{.name = "pinwell-batch", .help = "...", .epilogue = "...", .commands = {
//       {"staple", "PATH...", "Staples each artefact.", {
//           countOption("jobs", 'j', "N", "How many at once", 1, kMostJobs, settings.jobs)}}}};
//   const Parsed parsed = parseCommand(program, argc, argv);
//   if (parsed.exitStatus) return *parsed.exitStatus;
//
// Their line is `PROGRAM COMMAND [OPTION]... [--] ARGUMENT...`; options may be among the arguments. The other
// companions read their options with CLI11, and share the wording of errors and versions.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/error.h"
#include "companion/streams.h"

namespace CLI {
class App;
}  // namespace CLI

namespace pinwell::companion {

using Seconds = std::chrono::duration<double>;

/// Takes an option's value, empty for an option without a value. The reason of an error is the fault of a
/// wrong value, such as "is not a number".
using TakeOption = std::function<base::Result<void>(const std::string& value)>;

struct Option {
    std::string name;      // without dashes
    char letter = 0;       // 0: none
    std::string argument;  // its name in the help; empty: the option takes no value
    std::string help;
    TakeOption take;
};

struct Command {
    std::string name;
    std::string arguments;  // their name in the help
    std::string help;       // one sentence
    std::vector<Option> options;
};

struct Program {
    std::string name;
    std::string help;      // one sentence or two
    std::string epilogue;  // below the options: exit statuses, for instance
    std::vector<Command> commands;
};

struct Parsed {
    /// The process must end with this status: the help or an error was printed.
    std::optional<int> exitStatus;

    const Command* command = nullptr;
    std::vector<std::string> arguments;
};

/// Reads the line. `arguments` of the result holds everything except the options, byte for byte.
Parsed parseCommand(const Program& program, int argc, char** argv);

// Values. The reason of an error is the fault of the text, as in TakeOption.

/// A whole number between the two bounds.
base::Result<std::uint64_t> readCount(std::string_view text, std::uint64_t lowest, std::uint64_t highest);

/// Seconds, with or without decimals, up to ten years.
base::Result<Seconds> readSeconds(std::string_view text);

/// The fault of a value.
base::Error wrongValue(std::string fault);

// Options. Each sets a value that must outlive it. `name`, `letter`, `argument` and `help` as in Option.

Option flagOption(std::string name, char letter, std::string help, bool& value);

/// A text, not empty, given once.
Option textOption(std::string name, char letter, std::string argument, std::string help,
                  std::optional<std::string>& value);

/// A whole number between the two bounds.
template <class Number>
Option countOption(std::string name, char letter, std::string argument, std::string help,
                   std::uint64_t lowest, std::uint64_t highest, Number& value) {
    return {std::move(name), letter, std::move(argument), std::move(help),
            [lowest, highest, &value](const std::string& text) -> base::Result<void> {
                const auto count = readCount(text, lowest, highest);
                if (!count) return count.error();
                value = static_cast<Number>(*count);
                return {};
            }};
}

/// A number of seconds; `Time` is Seconds or an optional of it.
template <class Time>
Option secondsOption(std::string name, std::string help, Time& value) {
    return {std::move(name), 0, "SECONDS", std::move(help),
            [&value](const std::string& text) -> base::Result<void> {
                const auto seconds = readSeconds(text);
                if (!seconds) return seconds.error();
                value = *seconds;
                return {};
            }};
}

/// "--color WHEN", "--quiet" and "--verbose". The last of the latter two counts.
std::vector<Option> outputOptions(ColorWhen& color, bool& isQuiet, bool& isVerbose);

// For all companions.

/// "PROGRAM: TEXT" on standard error, in one line, control characters escaped.
void complain(std::string_view program, std::string_view text);

/// The word most similar to `word`; empty if none is similar.
std::string_view nearestWord(std::string_view word, std::span<const std::string_view> words);

/// Reads the line of a program that uses CLI11. Returns the exit status if the process must end: after the
/// help or the version, or after an error. The error is one line on standard error: the library's text, or
/// for an unknown command or option its name and the nearest existing one.
std::optional<int> parseLine(CLI::App& app, int argc, char** argv);

/// "PROGRAM 34.0 (commit 0123456789ab, OpenSSL 3.0.17, curl 7.88.1)": the libraries are the loaded ones.
/// Without a line end.
std::string versionText(std::string_view program);

/// "34.0"
std::string versionNumber();

}  // namespace pinwell::companion
