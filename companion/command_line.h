// The command lines of the companions. One table for each command defines its options and its
// help.
//
//   Command staple{"staple", "PATH...", "Staples each artefact.", {
//       {"jobs", 'j', "N", "How many at once", [&](const std::string& text) { return take(text, jobs); }}}};
//   const Parsed parsed = parseCommand("pinwell-batch", {staple}, argc, argv);
//   if (parsed.exitStatus) return *parsed.exitStatus;
//
// A line is `PROGRAM COMMAND [OPTION]... [--] ARGUMENT...`; options may be among the arguments. An error is
// one line on standard error, with the nearest existing name, and exit status 64.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::companion {

/// Takes an option's value, empty for an option without a value. Returns the fault of a wrong value, such as
/// "is not a number".
using TakeOption = std::function<std::optional<std::string>(const std::string& value)>;

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

/// "PROGRAM: TEXT" on standard error, in one line, control characters escaped.
void complain(std::string_view program, std::string_view text);

/// The word most similar to `word`; empty if none is similar.
std::string_view nearestWord(std::string_view word, std::span<const std::string_view> words);

// Values. Each sets the value, or returns the fault of the text.

/// A whole number between the two bounds.
std::optional<std::string> takeCount(const std::string& text, std::uint64_t lowest, std::uint64_t highest,
                                     std::uint64_t& value);

/// Seconds, with or without decimals, up to ten years.
std::optional<std::string> takeSeconds(const std::string& text, std::chrono::duration<double>& value);

/// One of these words.
std::optional<std::string> takeWord(const std::string& text, std::span<const std::string_view> words,
                                    std::string& value);

}  // namespace pinwell::companion
