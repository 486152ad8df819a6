// SPDX-License-Identifier: Apache-2.0
//
// A tool with commands: one table drives dispatch and help, and all tools answer a command line
// that makes no sense alike, with what was probably meant.
#pragma once

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstddef>
#include <iterator>
#include <string>
#include <string_view>

#include "cli/exit_code.h"

namespace qor {

template <typename Options>
struct Command {
    const char* name;
    const char* help;
    const char* more;                                      // below the options: examples
    void (*declare)(CLI::App& command, Options& options);  // null: it takes none
    Exit (*run)(const Options& options);
};

// "TOOL: error: TEXT" on stderr, on one line.
void print_error(std::string_view tool, std::string_view text);

// Makes an application take one command, and collect what it does not know.
void expect_command(CLI::App& app);

// False when that is all: help was printed, or what is wrong. The tool then ends with `status`.
bool parse_command_line(CLI::App& app, int argc, char** argv, int* status);

template <typename Options, std::size_t N>
void declare_commands(CLI::App& app, const Command<Options> (&commands)[N], Options& options) {
    expect_command(app);
    for (const Command<Options>& command : commands) {
        CLI::App* const sub = app.add_subcommand(command.name, command.help);
        sub->footer(command.more);
        if (command.declare != nullptr) {
            command.declare(*sub, options);
        }
    }
}

// The command to run, or null as above. To be called with what was declared.
template <typename Options, std::size_t N>
const Command<Options>* choose_command(CLI::App& app, const Command<Options> (&commands)[N],
                                       int argc, char** argv, int* status) {
    if (!parse_command_line(app, argc, argv, status)) {
        return nullptr;
    }
    const std::string name = app.get_subcommands().front()->get_name();
    return std::find_if(std::begin(commands), std::end(commands),
                        [&](const Command<Options>& command) { return name == command.name; });
}

}  // namespace qor
