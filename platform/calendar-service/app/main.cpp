// SPDX-License-Identifier: Apache-2.0
//
// qor-calendar: the calendar app of a device, for a terminal. One table of commands drives the
// dispatch and the help.
#include "cli/command_line.h"
#include "platform/calendar-service/app/app.h"
#include "platform/calendar-service/app/store.h"

namespace calendar_app {
namespace {

void declare_book(CLI::App& command, Options& options) {
    command.add_option("--book", options.book, "Only this book (see 'books')")->type_name("ID");
}

void declare_id(CLI::App& command, Options& options) {
    command.add_option("ID", options.id, "The event's number (see 'list')")->required();
}

void declare_text(CLI::App& command, const char* name, std::optional<std::string>& value,
                  const char* type, const char* help) {
    command.add_option(name, value, help)->type_name(type);
}

void declare_times(CLI::App& command, Options& options) {
    declare_text(command, "--start", options.start, "TIME",
                 "Start: 2014-03-15, \"2014-03-15 09:30\", 2014-03-15T08:30Z");
    declare_text(command, "--end", options.end, "TIME",
                 "First moment after it; of an all-day event the day after the last");
    declare_text(command, "--duration", options.duration, "LENGTH",
                 "Length instead of an end: 1h30m, 2d, PT45M");
}

void declare_details(CLI::App& command, Options& options) {
    declare_text(command, "--title", options.title, "TEXT", "What it is");
    declare_times(command, options);
    declare_text(command, "--zone", options.zone, "ZONE",
                 "Zone of the times, such as Europe/Berlin (new events: this machine's)");
    command.add_flag("--all-day", options.all_day, "Dates without times");
    declare_text(command, "--location", options.location, "TEXT", "Where it is");
    declare_text(command, "--description", options.description, "TEXT", "Notes");
    declare_text(command, "--rrule", options.rrule, "RULE",
                 "How it repeats (RFC 5545): FREQ=WEEKLY;BYDAY=MO,WE;COUNT=10");
    command
        .add_option("--alarm", options.alarms,
                    "Time before the start: 15m, 2h, 1d; may be given several times")
        ->type_name("LENGTH")
        ->allow_extra_args(false);
    declare_text(command, "--place", options.place, "LAT,LON", "Degrees: 37.566535,126.977969");
    declare_text(command, "--organizer", options.organizer, "TEXT", "\"Ann <ann@example.org>\"");
    declare_text(command, "--book", options.book, "ID", "The book that holds it (see 'books')");
}

void declare_add(CLI::App& command, Options& options) {
    declare_details(command, options);
    command.get_option("--title")->required();
    command.get_option("--start")->required();
}

void declare_edit(CLI::App& command, Options& options) {
    declare_id(command, options);
    declare_details(command, options);
    command
        .add_option("--unset", options.unset,
                    "Remove a value: alarms, cancelled, description, location, organizer, place, "
                    "rrule, title, zone; may be given several times")
        ->type_name("NAME")
        ->allow_extra_args(false);
}

void declare_delete(CLI::App& command, Options& options) {
    command.add_option("ID", options.ids, "The events' numbers (see 'list')")->required();
}

void declare_cancel(CLI::App& command, Options& options) {
    declare_id(command, options);
    command.add_option("OCCURRENCE", options.occurrence, "Its day, or its day and time")
        ->required();
}

void declare_move(CLI::App& command, Options& options) {
    declare_cancel(command, options);
    declare_times(command, options);
    declare_text(command, "--zone", options.zone, "ZONE", "Zone of the new times");
    declare_text(command, "--title", options.title, "TEXT", "A title of its own");
    declare_text(command, "--location", options.location, "TEXT", "A location of its own");
    declare_text(command, "--description", options.description, "TEXT", "Notes of its own");
    command.get_option("--start")->required();
}

void declare_agenda(CLI::App& command, Options& options) {
    command.add_option("FROM", options.from, "First day or moment (default: today)");
    command.add_option("TO", options.to, "Last day, or the moment it ends (default: 7 days)");
    declare_text(command, "--zone", options.zone, "ZONE",
                 "Zone to show times in (default: this machine's)");
    declare_book(command, options);
}

constexpr qor::Command<Options> kCommands[] = {
    {"books", "List the calendar books.",
     "Examples:\n"
     "  qor-calendar --device phone books",
     nullptr, list_books},
    {"list", "List the events as they are stored, one line each.",
     "Examples:\n"
     "  qor-calendar list --book 1\n"
     "  qor-calendar list --json",
     declare_book, list_events},
    {"show", "Show everything about one event.",
     "Examples:\n"
     "  qor-calendar show 3",
     declare_id, show_event},
    {"add", "Add an event.",
     "Without an end an event lasts an hour, or a day when its start is a day.\n\n"
     "Examples:\n"
     "  qor-calendar add --title Lunch --start \"2014-03-17 12:30\" --duration 45m\n"
     "  qor-calendar add --title Stand-up --start \"2014-03-17 09:30\" --zone Europe/Berlin \\\n"
     "      --rrule \"FREQ=WEEKLY;BYDAY=MO,WE\" --alarm 15m\n"
     "  qor-calendar add --title Holiday --start 2014-08-04 --duration 2w",
     declare_add, add_event},
    {"edit", "Change an event; what is not given stays.",
     "A new start keeps the length. Cancelled and moved occurrences follow their event.\n\n"
     "Examples:\n"
     "  qor-calendar edit 3 --start \"2014-03-17 10:00\" --location \"Room 2\"\n"
     "  qor-calendar edit 3 --unset alarms --unset rrule",
     declare_edit, edit_event},
    {"delete", "Delete events, with their moved occurrences.",
     "Examples:\n"
     "  qor-calendar delete 3 5",
     declare_delete, delete_events},
    {"cancel", "Cancel one occurrence of a recurring event.",
     "Examples:\n"
     "  qor-calendar cancel 3 2014-03-19\n"
     "  qor-calendar cancel 3 \"2014-03-19 09:30\"",
     declare_cancel, cancel_occurrence},
    {"move", "Move one occurrence of a recurring event.",
     "A moved occurrence is an event of its own; move it again by its original day.\n\n"
     "Examples:\n"
     "  qor-calendar move 3 2014-03-19 --start \"2014-03-20 11:00\" --title \"Stand-up (late)\"",
     declare_move, move_occurrence},
    {"agenda", "Show what happens in a range of days, recurring events expanded.",
     "With --json the output holds content only and no ids: equal texts mean that two devices\n"
     "show the same. Give --zone then, so that both cut the days alike.\n\n"
     "Examples:\n"
     "  qor-calendar agenda\n"
     "  qor-calendar agenda 2014-03-01 2014-03-31 --zone Europe/Berlin\n"
     "  qor-calendar --device phone agenda 2014-03-01 2014-03-31 --json",
     declare_agenda, show_agenda},
};

void declare_all(CLI::App& app, Options& options) {
    app.name("qor-calendar");
    app.add_option("--device", options.device, "The device's directory, made when missing")
        ->type_name("DIR")
        ->capture_default_str();
    app.add_flag("--json", options.json, "Print the result as JSON");
    app.footer(
        "Exit status: 0 done, 1 partly, 2 wrong usage, 3 failed.\n"
        "'qor-calendar COMMAND --help' shows examples.");
    qor::declare_commands(app, kCommands, options);
}

int run(int argc, char** argv) {
    CLI::App app("The calendar of a device, for a terminal.");
    Options options;
    declare_all(app, options);
    int status = 0;
    const auto* const command = qor::choose_command(app, kCommands, argc, argv, &status);
    if (command == nullptr) {
        return status;
    }
    try {
        const Connection connection(options.device);
        return static_cast<int>(command->run(options));
    } catch (const Failure& failure) {
        print_error(failure.what());
        return static_cast<int>(failure.exit);
    }
}

}  // namespace
}  // namespace calendar_app

int main(int argc, char** argv) {
    try {
        return calendar_app::run(argc, argv);
    } catch (const std::exception& error) {
        calendar_app::print_error(error.what());
        return static_cast<int>(calendar_app::Exit::kFailed);
    }
}
