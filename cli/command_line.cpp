// SPDX-License-Identifier: Apache-2.0
#include "cli/command_line.h"

#include <fmt/format.h>

#include <cstdio>
#include <vector>

#include "cli/nearest.h"
#include "cli/terminal.h"

namespace qor {
namespace {

std::string suggestion(const Nearest& nearest) {
    const std::string name = nearest.name();
    return name.empty() ? "" : fmt::format("did you mean '{}'? ", name);
}

std::string unknown_command(const CLI::App& app, const std::string& typed) {
    Nearest nearest(typed);
    for (const CLI::App* command : app.get_subcommands([](const CLI::App*) { return true; })) {
        nearest.offer(command->get_name());
    }
    return fmt::format("unknown command \"{}\"; {}see '{} --help'", typed, suggestion(nearest),
                       app.get_name());
}

std::string unknown_argument(const CLI::App& app, const CLI::App& command,
                             const std::string& typed) {
    Nearest nearest(typed);
    for (const CLI::App* declared : {&command, &app}) {
        for (const CLI::Option* option : declared->get_options()) {
            if (!option->get_positional()) {
                nearest.offer(option->get_name());
            }
        }
    }
    return fmt::format("{}: unexpected \"{}\"; {}see '{} {} --help'", command.get_name(), typed,
                       suggestion(nearest), app.get_name(), command.get_name());
}

// What was not understood of a command line, or an empty text.
std::string left_over(const CLI::App& app) {
    const std::vector<std::string> words = app.remaining();
    const std::vector<CLI::App*> chosen = app.get_subcommands();
    if (chosen.empty()) {
        return words.empty() ? fmt::format("no command given; see '{} --help'", app.get_name())
                             : unknown_command(app, words.front());
    }
    return words.empty() ? "" : unknown_argument(app, *chosen.front(), words.front());
}

std::string wrong_value(const CLI::App& app, const CLI::ParseError& error) {
    const std::vector<CLI::App*> chosen = app.get_subcommands();
    if (chosen.empty()) {
        return fmt::format("{}; see '{} --help'", error.what(), app.get_name());
    }
    const std::string& command = chosen.front()->get_name();
    return fmt::format("{}: {}; see '{} {} --help'", command, error.what(), app.get_name(),
                       command);
}

}  // namespace

void print_error(std::string_view tool, std::string_view text) {
    fmt::print(stderr, "{}: error: {}\n", tool, one_line(text));
}

void expect_command(CLI::App& app) {
    app.fallthrough();
    app.allow_extras();  // what is left over gets a better message than the library's
    app.require_subcommand(0, 1);
}

bool parse_command_line(CLI::App& app, int argc, char** argv, int* status) {
    std::string problem;
    try {
        app.parse(argc, argv);
        problem = left_over(app);
    } catch (const CLI::Success& help) {
        *status = app.exit(help);
        return false;
    } catch (const CLI::ParseError& error) {
        problem = wrong_value(app, error);
    }
    if (problem.empty()) {
        return true;
    }
    print_error(app.get_name(), problem);
    *status = static_cast<int>(Exit::kUsage);
    return false;
}

}  // namespace qor
