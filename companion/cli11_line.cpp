// Command lines that CLI11 reads.
#include <sysexits.h>

#include <CLI/CLI.hpp>
#include <string_view>
#include <vector>

#include "companion/command_line.h"

namespace pinwell::companion {
namespace {

/// The command on the line, or the program itself.
const CLI::App& innermost(const CLI::App& app) {
    const std::vector<CLI::App*> parsed = app.get_subcommands();
    return parsed.empty() ? app : *parsed.front();
}

std::vector<std::string> optionNames(const CLI::App& app) {
    std::vector<std::string> names;
    for (const CLI::Option* option : app.get_options()) {
        for (const std::string& name : option->get_lnames()) names.push_back("--" + name);
    }
    // A group of options is a command without a name.
    for (const CLI::App* group :
         app.get_subcommands([](const CLI::App* one) { return one->get_name().empty(); })) {
        const std::vector<std::string> more = optionNames(*group);
        names.insert(names.end(), more.begin(), more.end());
    }
    return names;
}

std::vector<std::string> commandNames(const CLI::App& app) {
    std::vector<std::string> names;
    for (const CLI::App* command : app.get_subcommands([](const CLI::App*) { return true; })) {
        names.push_back(command->get_name());
    }
    return names;
}

std::string unknown(std::string_view kind, const std::string& word, const std::vector<std::string>& names) {
    const std::vector<std::string_view> words(names.begin(), names.end());
    const std::string_view nearest = nearestWord(word, words);
    return "unknown " + std::string(kind) + " " + word +
           (nearest.empty() ? std::string() : "; did you mean " + std::string(nearest) + "?");
}

/// Words that nothing accepted. An option comes before an argument, because it explains the others.
std::string describeRest(const CLI::App& app) {
    const std::vector<std::string> rest = app.remaining(true);
    const CLI::App& command = innermost(app);
    for (const std::string& word : rest) {
        if (word.size() > 1 && word.front() == '-') {
            return unknown("option", word.substr(0, word.find('=')), optionNames(command));
        }
    }
    const std::vector<std::string> commands = commandNames(app);
    if (!rest.empty() && &command == &app && !commands.empty())
        return unknown("command", rest.front(), commands);
    return rest.empty() ? std::string() : "unexpected argument " + rest.front();
}

std::string describe(const CLI::App& app, const CLI::ParseError& error) {
    const auto kind = static_cast<CLI::ExitCodes>(error.get_exit_code());
    if (kind == CLI::ExitCodes::ExtrasError || kind == CLI::ExitCodes::RequiredError) {
        std::string rest = describeRest(app);
        if (!rest.empty()) return rest;
    }
    return error.what();
}

}  // namespace

std::optional<int> parseLine(CLI::App& app, int argc, char** argv) {
    try {
        app.parse(argc, argv);
        return std::nullopt;
    } catch (const CLI::Success& request) {
        return app.exit(request);  // help, version
    } catch (const CLI::ParseError& error) {
        complain(app.get_name(), describe(app, error));
        return EX_USAGE;
    }
}

}  // namespace pinwell::companion
