#include "companion/command_line.h"

#include <curl/curl.h>
#include <getopt.h>
#include <openssl/crypto.h>
#include <sysexits.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <numeric>

#include "base/text.h"
#include "values/format.h"

namespace pinwell::companion {
namespace {

constexpr double kMostSeconds = 10.0 * 365 * 24 * 3600;
constexpr std::size_t kHelpColumn = 26;
constexpr std::size_t kMostEdits = 2;

void write(int stream, std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = ::write(stream, text.data(), text.size());
        if (written <= 0) return;
        text.remove_prefix(static_cast<std::size_t>(written));
    }
}

// Insertions, deletions, replacements and swaps of neighbours between two words.
std::size_t editsBetween(std::string_view from, std::string_view to) {
    std::vector<std::vector<std::size_t>> edits(from.size() + 1, std::vector<std::size_t>(to.size() + 1));
    for (std::size_t i = 0; i <= from.size(); ++i) {
        for (std::size_t j = 0; j <= to.size(); ++j) {
            if (i == 0 || j == 0) {
                edits[i][j] = i + j;
                continue;
            }
            const std::size_t replaced = edits[i - 1][j - 1] + (from[i - 1] == to[j - 1] ? 0 : 1);
            edits[i][j] = std::min({edits[i - 1][j] + 1, edits[i][j - 1] + 1, replaced});
            if (i > 1 && j > 1 && from[i - 1] == to[j - 2] && from[i - 2] == to[j - 1])
                edits[i][j] = std::min(edits[i][j], edits[i - 2][j - 2] + 1);
        }
    }
    return edits[from.size()][to.size()];
}

std::string helpLine(const std::string& what, const std::string& help) {
    std::string line = "  " + what;
    line += line.size() + 2 > kHelpColumn ? "\n" + std::string(kHelpColumn, ' ')
                                          : std::string(kHelpColumn - line.size(), ' ');
    return line + help + "\n";
}

std::string optionHelp(const Option& option) {
    std::string what = option.letter == 0 ? "    " : std::string("-") + option.letter + ",";
    what += "--" + option.name;
    if (!option.argument.empty()) what += " " + option.argument;
    return helpLine(what, option.help);
}

std::string helpOf(const Program& program) {
    std::string text = program.help + "\n\n";
    for (const Command& command : program.commands)
        text += (&command == &program.commands.front() ? "Usage: " : "       ") + program.name + " " +
                command.name + " [OPTION]... [--] " + command.arguments + "\n";
    text += "\nSubcommands:\n";
    for (const Command& command : program.commands) text += helpLine(command.name, command.help);
    text += "\nOptions:\n" +
            helpLine("-h,--help", "Print this help, and after a command that of the command") +
            helpLine("    --version", "Print the version");
    return text + (program.epilogue.empty() ? "" : "\n" + program.epilogue + "\n");
}

std::string helpOf(const Program& program, const Command& command) {
    std::string text = "Usage: " + program.name + " " + command.name + " [OPTION]... [--] " +
                       command.arguments + "\n" + command.help + "\n\nOptions:\n";
    for (const Option& option : command.options) text += optionHelp(option);
    text += helpLine("-h,--help", "Print this help");
    text += helpLine("    --version", "Print the version");
    return text + (program.epilogue.empty() ? "" : "\n" + program.epilogue + "\n");
}

class Reader {
  public:
    Reader(const Program& program, const Command& command) : program_(program), command_(command) {
        for (const Option& one : command.options) {
            if (one.letter != 0) letters_ += std::string(1, one.letter) + (one.argument.empty() ? "" : ":");
            const int takes = one.argument.empty() ? no_argument : required_argument;
            names_.push_back({one.name.c_str(), takes, nullptr, 0});
        }
        names_.push_back({"help", no_argument, nullptr, 'h'});
        names_.push_back({"version", no_argument, nullptr, 'V'});
        names_.push_back({nullptr, 0, nullptr, 0});
    }

    // `arguments` begins with the command.
    Parsed read(int count, char** arguments) {
        Parsed parsed;
        parsed.command = &command_;
        unsetenv("POSIXLY_CORRECT");  // otherwise options after an argument would be arguments
        opterr = 0;
        optind = 0;  // glibc: start again
        while (!parsed.exitStatus) {
            int index = -1;

            const int found = getopt_long(count, arguments, letters_.c_str(), names_.data(), &index);
            if (found == -1) break;
            parsed.exitStatus = take(found, index, arguments[std::max(optind, 1) - 1]);
        }
        for (int i = optind; i < count && !parsed.exitStatus; ++i)
            parsed.arguments.emplace_back(arguments[i]);
        return parsed;
    }

  private:
    std::optional<int> take(int found, int index, std::string_view word) {
        switch (found) {
            case 'h':
                write(STDOUT_FILENO, helpOf(program_, command_));
                return EX_OK;
            case 'V':
                write(STDOUT_FILENO, versionText(program_.name) + "\n");
                return EX_OK;
            case ':':
                return refuse("the option " + nameOfWord(word) + " needs a value");
            case '?':
                return refuseUnknown(word);
            default:
                break;
        }
        const Option& option = found == 0
                                   ? command_.options.at(static_cast<std::size_t>(index))
                                   : *std::find_if(command_.options.begin(), command_.options.end(),
                                                   [&](const Option& one) { return one.letter == found; });
        const std::string value = optarg == nullptr ? std::string() : std::string(optarg);
        const auto taken = option.take(value);
        if (taken) return std::nullopt;
        return refuse("--" + option.name + (option.argument.empty() ? "" : " " + value) + ": " +
                      taken.error().localizedFailureReason());
    }

    static std::string nameOfWord(std::string_view word) {
        return std::string(word.substr(0, word.find('=')));
    }

    int refuseUnknown(std::string_view word) {
        // A letter within a group has no separate word.
        if (!word.starts_with("--") && optopt != 0)
            return refuse(std::string("unknown option -") + static_cast<char>(optopt));
        std::string name = nameOfWord(word);
        const auto isKnown = [&](const ::option& one) {
            return one.name != nullptr && name == std::string("--") + one.name;
        };
        if (std::any_of(names_.begin(), names_.end(), isKnown))
            return refuse("the option " + name + " takes no value");
        std::vector<std::string_view> words;
        for (const ::option& one : names_)
            if (one.name != nullptr) words.emplace_back(one.name);
        const std::string bare = name.substr(std::min<std::size_t>(2, name.size()));
        const auto beginsSo = std::count_if(words.begin(), words.end(),
                                            [&](std::string_view one) { return one.starts_with(bare); });
        const std::string_view nearest = nearestWord(bare, words);
        if (beginsSo > 1) return refuse("the option " + name + " is ambiguous");
        return refuse("unknown option " + name +
                      (nearest.empty() ? std::string() : "; did you mean --" + std::string(nearest) + "?"));
    }

    int refuse(const std::string& text) {
        complain(program_.name, text);
        return EX_USAGE;
    }

    const Program& program_;
    const Command& command_;
    std::string letters_ = ":h";  // the colon distinguishes a missing value from an unknown option
    std::vector<::option> names_;
};

}  // namespace

void complain(std::string_view program, std::string_view text) {
    write(STDERR_FILENO, std::string(program) + ": " + base::escapeForTerminal(text) + "\n");
}

std::string_view nearestWord(std::string_view word, std::span<const std::string_view> words) {
    std::string_view nearest;
    // At most a third of a word may differ: "-x" is too short to compare.
    std::size_t fewest = std::min(kMostEdits, (word.size() + 1) / 3) + 1;
    for (const std::string_view one : words) {
        const std::size_t edits = word.size() > 64 ? fewest : editsBetween(word, one);
        if (edits < fewest) {
            fewest = edits;
            nearest = one;
        }
    }
    return nearest;
}

Parsed parseCommand(const Program& program, int argc, char** argv) {
    const std::string first = argc > 1 ? argv[1] : "";
    if (first == "--help" || first == "-h") {
        write(STDOUT_FILENO, helpOf(program));
        return {.exitStatus = EX_OK, .command = nullptr, .arguments = {}};
    }
    if (first == "--version") {
        write(STDOUT_FILENO, versionText(program.name) + "\n");
        return {.exitStatus = EX_OK, .command = nullptr, .arguments = {}};
    }
    std::vector<std::string_view> names;
    for (const Command& command : program.commands) {
        if (command.name == first) return Reader(program, command).read(argc - 1, argv + 1);
        names.emplace_back(command.name);
    }
    const std::string all = std::accumulate(
        std::next(names.begin()), names.end(), std::string(names.front()),
        [](const std::string& list, std::string_view name) { return list + ", " + std::string(name); });
    const std::string_view nearest = nearestWord(first, names);
    if (argc < 2) {
        complain(program.name, "a command is needed: " + all);
    } else if (first.starts_with('-') && first.size() > 1) {
        complain(program.name, "the command comes first: " + all);
    } else {
        complain(program.name,
                 "unknown command " + first + "; " +
                     (nearest.empty() ? "there are: " + all : "did you mean " + std::string(nearest) + "?"));
    }
    return {.exitStatus = EX_USAGE, .command = nullptr, .arguments = {}};
}

base::Error wrongValue(std::string fault) {
    return {base::kDataErrorDomain, base::kMalformedDocument, std::move(fault)};
}

base::Result<std::uint64_t> readCount(std::string_view text, std::uint64_t lowest, std::uint64_t highest) {
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    const bool isNumber = error == std::errc{} && end == text.data() + text.size() && !text.empty();
    if (!isNumber || number < lowest || number > highest)
        return wrongValue("is not a number from " + std::to_string(lowest) + " to " +
                          std::to_string(highest));
    return number;
}

base::Result<Seconds> readSeconds(std::string_view text) {
    double number = 0;
    const auto [end, error] =
        std::from_chars(text.data(), text.data() + text.size(), number, std::chars_format::fixed);
    const bool isNumber = error == std::errc{} && end == text.data() + text.size() && !text.empty();
    if (!isNumber || !(number >= 0) || number > kMostSeconds) return wrongValue("is not a number of seconds");
    return Seconds(number);
}

Option flagOption(std::string name, char letter, std::string help, bool& value) {
    return {std::move(name), letter, "", std::move(help), [&value](const std::string&) {
                value = true;
                return base::Result<void>();
            }};
}

Option textOption(std::string name, char letter, std::string argument, std::string help,
                  std::optional<std::string>& value) {
    return {std::move(name), letter, std::move(argument), std::move(help),
            [&value](const std::string& given) -> base::Result<void> {
                if (given.empty()) return wrongValue("is empty");
                if (value) return wrongValue("is given twice");
                value = given;
                return {};
            }};
}

std::vector<Option> outputOptions(ColorWhen& color, bool& isQuiet, bool& isVerbose) {
    const auto setOneOf = [](bool& set, bool& other) {
        return [&set, &other](const std::string&) {
            set = true;
            other = false;
            return base::Result<void>();
        };
    };
    return {{"color", 0, "WHEN", "Colour the lines: auto, always or never (default: auto)",
             [&color](const std::string& word) -> base::Result<void> {
                 if (word != "auto" && word != "always" && word != "never")
                     return wrongValue("is none of: auto, always, never");
                 color = colorWhenNamed(word);
                 return {};
             }},
            {"quiet", 'q', "", "Print nothing but JSON", setOneOf(isQuiet, isVerbose)},
            {"verbose", 'v', "", "Print all that pinwell -v says", setOneOf(isVerbose, isQuiet)}};
}

std::string versionText(std::string_view program) {
    return values::format("%s %s (commit %s, OpenSSL %s, curl %s)", program, PINWELL_VERSION, PINWELL_COMMIT,
                          OpenSSL_version(OPENSSL_VERSION_STRING),
                          curl_version_info(CURLVERSION_NOW)->version);
}

std::string versionNumber() {
    return PINWELL_VERSION;
}

}  // namespace pinwell::companion
