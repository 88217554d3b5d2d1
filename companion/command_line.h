// The command lines of the companions: one table a command, from which its options are read and its help is
// written.
//
//   Command staple{"staple", "PATH...", "Staples each artefact.", {
//       {"jobs", 'j', "N", "How many at once", [&](const std::string& text) { return take(text, jobs); }}}};
//   const Parsed parsed = parseCommand("pinwell-batch", {staple}, argc, argv);
//   if (parsed.exitStatus) return *parsed.exitStatus;
//
// A line is `PROGRAM COMMAND [OPTION]... [--] ARGUMENT...`; options may stand among the arguments. What is
// wrong is said in one line on standard error, with the nearest name that exists, and ends with 64.
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

/// Takes an option's value, empty for an option without one. Returns what is wrong with it, if anything, as
/// in "is not a number".
using TakeOption = std::function<std::optional<std::string>(const std::string& value)>;

struct Option {
    std::string name;      // without dashes
    char letter = 0;       // 0: it has none
    std::string argument;  // what the help calls it; empty: the option takes none
    std::string help;
    TakeOption take;
};

struct Command {
    std::string name;
    std::string arguments;  // what the help calls them
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
    /// The process is to end with it: the help was printed, or what is wrong.
    std::optional<int> exitStatus;

    const Command* command = nullptr;
    std::vector<std::string> arguments;
};

/// Reads the line. `arguments` of the result holds what is no option, byte for byte.
Parsed parseCommand(const Program& program, int argc, char** argv);

/// "PROGRAM: TEXT" on standard error, in one line, control characters escaped.
void complain(std::string_view program, std::string_view text);

/// Of these words the one that may have been meant; empty if none is near.
std::string_view nearestWord(std::string_view word, std::span<const std::string_view> words);

// Values. Each returns what is wrong with the text, or sets the value.

/// A whole number between the two bounds.
std::optional<std::string> takeCount(const std::string& text, std::uint64_t lowest, std::uint64_t highest,
                                     std::uint64_t& value);

/// Seconds, with decimals or without, up to ten years.
std::optional<std::string> takeSeconds(const std::string& text, std::chrono::duration<double>& value);

/// One of these words.
std::optional<std::string> takeWord(const std::string& text, std::span<const std::string_view> words,
                                    std::string& value);

}  // namespace pinwell::companion
