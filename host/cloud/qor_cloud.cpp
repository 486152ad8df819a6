// SPDX-License-Identifier: Apache-2.0
//
// qor-cloud: looks into a cloud file, brings .ics calendars in and out. One table of commands
// drives dispatch and help.
#include <CLI/CLI.hpp>
#include <exception>

#include "host/cli/terminal.h"
#include "host/cloud/qor_cloud_commands.h"

namespace qor {

void print_error(const std::string& text) {
    fmt::print(stderr, "qor-cloud: error: {}\n", one_line(text));
}

Exit fail(const Error& error) {
    const char* hint = error.kind == ErrorKind::kMissing
                           ? ". Name the cloud with --cloud FILE; 'qor-cloud import' makes one"
                           : "";
    print_error(error.message + hint);
    return Exit::kFailed;
}

namespace {

void declare_import(CLI::App& command, CloudArguments& arguments) {
    command.add_option("FILE", arguments.files, ".ics files; - is standard input")->required();
    command
        .add_option("--zone", arguments.zone,
                    "Zone of times without one (default: the file's, "
                    "else this computer's)")
        ->type_name("ZONE");
    command.add_flag("--dry-run", arguments.dry_run, "Say what would happen and change nothing");
    command.add_flag("--overwrite", arguments.overwrite,
                     "Take the file's version also where the cloud's was changed or deleted since");
}

void declare_export(CLI::App& command, CloudArguments& arguments) {
    command.add_option("FILE", arguments.output, "Where to write it (default: standard output)");
}

void declare_list(CLI::App& command, CloudArguments& arguments) {
    command.add_option("--match", arguments.match, "Only titles that contain this")
        ->type_name("TEXT");
    command.add_option("--since", arguments.since, "Only what changed after this revision")
        ->type_name("REVISION");
    command.add_flag("--deleted", arguments.deleted, "Deleted documents too");
}

void declare_show(CLI::App& command, CloudArguments& arguments) {
    command.add_option("KEY", arguments.key, "The document's key, or how it begins")->required();
}

void declare_log(CLI::App& command, CloudArguments& arguments) {
    command.add_option("--key", arguments.key, "Only this document")->type_name("KEY");
    command.add_option("--limit", arguments.limit, "So many of the latest lines; 0 is all")
        ->type_name("COUNT")
        ->capture_default_str();
}

struct Command {
    const char* name;
    const char* help;
    const char* more;
    void (*declare)(CLI::App& command, CloudArguments& arguments);
    Exit (*run)(const CloudArguments& arguments);
};
constexpr Command kCommands[] = {
    {"import", "Bring .ics calendars into the cloud.",
     "The same file imported twice changes nothing. What devices changed or deleted since the "
     "last\n"
     "import stays; where the file has changed too, that is listed (exit status 1).\n"
     "What a document cannot carry is counted by kind.\n\n"
     "Examples:\n"
     "  qor-cloud import work.ics holidays.ics\n"
     "  qor-cloud import --dry-run big.ics\n"
     "  qor-cloud import --zone Europe/Berlin old-phone.ics",
     declare_import, cloud_import},
    {"export", "Write everything in the cloud as one .ics calendar.",
     "Examples:\n"
     "  qor-cloud export backup.ics\n"
     "  qor-cloud export | grep SUMMARY",
     declare_export, cloud_export},
    {"list", "List the documents by their start.",
     "Examples:\n"
     "  qor-cloud list --match dentist\n"
     "  qor-cloud list --since 120 --deleted\n"
     "  qor-cloud list --json",
     declare_list, cloud_list},
    {"show", "Show one document.",
     "Examples:\n"
     "  qor-cloud show team-meeting@example.org\n"
     "  qor-cloud show team-m",
     declare_show, cloud_show},
    {"log", "Show who wrote what, oldest first.",
     "Examples:\n"
     "  qor-cloud log\n"
     "  qor-cloud log --key team-meeting@example.org --limit 0",
     declare_log, cloud_log},
};

void declare_all(CLI::App& app, CloudArguments& arguments) {
    app.name("qor-cloud");
    app.fallthrough();
    app.allow_extras();  // what is left over gets a better message than the library's
    app.require_subcommand(0, 1);
    app.add_option("--cloud", arguments.cloud, "The cloud file")
        ->type_name("FILE")
        ->envname("QOR_CLOUD")
        ->capture_default_str();
    app.add_option("--as", arguments.who, "The name that the log shows")
        ->type_name("NAME")
        ->capture_default_str();
    app.add_flag("--json", arguments.json, "Print the result as JSON");
    app.footer(
        "Exit status: 0 done, 1 partly (what is missing is listed), 2 wrong usage, 3 failed.\n"
        "'qor-cloud COMMAND --help' shows examples.");
    for (const Command& command : kCommands) {
        CLI::App* sub = app.add_subcommand(command.name, command.help);
        sub->footer(command.more);
        command.declare(*sub, arguments);
    }
}

Exit refuse(const std::string& what, const std::string& meant, const std::string& help) {
    print_error(fmt::format("{}; {}see 'qor-cloud{} --help'", what,
                            meant.empty() ? "" : fmt::format("did you mean '{}'? ", meant), help));
    return Exit::kUsage;
}

Exit run_chosen(const CLI::App& app, const CloudArguments& arguments) {
    const std::vector<std::string> left_over = app.remaining();
    const std::vector<CLI::App*> chosen = app.get_subcommands();
    if (chosen.empty()) {
        std::vector<std::string> names;
        for (const Command& command : kCommands) {
            names.emplace_back(command.name);
        }
        return left_over.empty() ? refuse("no command given", "", "")
                                 : refuse(fmt::format("unknown command \"{}\"", left_over.front()),
                                          nearest(left_over.front(), names), "");
    }
    const std::string name = chosen.front()->get_name();
    if (!left_over.empty()) {
        std::vector<std::string> options;
        for (const CLI::App* declared : {const_cast<const CLI::App*>(chosen.front()), &app}) {
            for (const CLI::Option* option : declared->get_options()) {
                options.push_back(option->get_name());
            }
        }
        return refuse(fmt::format("{}: unexpected \"{}\"", name, left_over.front()),
                      nearest(left_over.front(), options), " " + name);
    }
    const Command* command = std::find_if(std::begin(kCommands), std::end(kCommands),
                                          [&](const Command& c) { return name == c.name; });
    return command->run(arguments);
}

Exit run(int argc, char** argv) {
    CLI::App app("The cloud that devices sync with: one file of event documents.");
    CloudArguments arguments;
    declare_all(app, arguments);
    try {
        app.parse(argc, argv);
        return run_chosen(app, arguments);
    } catch (const CLI::Success& help) {
        return static_cast<Exit>(app.exit(help));
    } catch (const CLI::ParseError& error) {
        const std::vector<CLI::App*> chosen = app.get_subcommands();
        return refuse(error.what(), "", chosen.empty() ? "" : " " + chosen.front()->get_name());
    }
}

}  // namespace
}  // namespace qor

int main(int argc, char** argv) {
    try {
        return static_cast<int>(qor::run(argc, argv));
    } catch (const std::exception& error) {
        qor::print_error(error.what());
        return static_cast<int>(qor::Exit::kFailed);
    }
}
