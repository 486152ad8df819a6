// SPDX-License-Identifier: Apache-2.0
//
// qor-cloud: looks into a cloud file, brings .ics calendars in and out. One table of commands
// drives dispatch and help.
#include <exception>

#include "cli/command_line.h"
#include "host/cloud/qor_cloud_commands.h"

namespace qor {

void print_error(const std::string& text) {
    print_error("qor-cloud", text);
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

constexpr Command<CloudArguments> kCommands[] = {
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
    declare_commands(app, kCommands, arguments);
}

int run(int argc, char** argv) {
    CLI::App app("The cloud that devices sync with: one file of event documents.");
    CloudArguments arguments;
    declare_all(app, arguments);
    int status = 0;
    const auto* const command = choose_command(app, kCommands, argc, argv, &status);
    return command != nullptr ? static_cast<int>(command->run(arguments)) : status;
}

}  // namespace
}  // namespace qor

int main(int argc, char** argv) {
    try {
        return qor::run(argc, argv);
    } catch (const std::exception& error) {
        qor::print_error(error.what());
        return static_cast<int>(qor::Exit::kFailed);
    }
}
