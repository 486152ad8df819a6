// SPDX-License-Identifier: Apache-2.0
//
// What every command of the calendar app shares: exit status, failures, the words of the command
// line, where results and messages go.
#pragma once

#include <fmt/format.h>

#include <cstdio>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "cli/exit_code.h"
#include "platform/calendar-service/app/occurrences.h"

namespace calendar_app {

using Json = nlohmann::ordered_json;

using qor::Exit;

// Ends a command: what happened, on which item, what to do next.
struct Failure : std::runtime_error {
    Failure(Exit status, const std::string& text) : std::runtime_error(text), exit(status) {}
    Exit exit;
};

template <typename... Args>
[[noreturn]] void fail(Exit exit, fmt::format_string<Args...> text, Args&&... args) {
    throw Failure(exit, fmt::format(text, std::forward<Args>(args)...));
}

// The command line as typed; what was not given is unset.
struct Options {
    std::string device = ".";
    bool json = false;

    std::string id;
    std::vector<std::string> ids;  // of the command that takes several
    std::string occurrence;
    std::optional<std::string> from;
    std::optional<std::string> to;
    std::optional<std::string> book;
    std::optional<std::string> title;
    std::optional<std::string> start;
    std::optional<std::string> end;
    std::optional<std::string> duration;
    std::optional<std::string> zone;
    bool all_day = false;
    std::optional<std::string> location;
    std::optional<std::string> description;
    std::optional<std::string> rrule;
    std::vector<std::string> alarms;
    std::optional<std::string> place;
    std::optional<std::string> organizer;
    std::vector<std::string> unset;
};

// Results go to stdout, messages to stderr.
void print_json(const Json& json);
void print_error(const std::string& text);
void print_warnings(const calendar_text::Warnings& warnings);

// A number above 0, or a usage failure that says what was expected.
int id_of(const std::string& text, const char* what);

// The zone of --zone, else the machine's.
calendar_text::Zone given_zone(const Options& options);
calendar_text::Zone find_zone(const std::string& id);

// One function per command; each needs the calendar service connected.
Exit list_books(const Options& options);
Exit list_events(const Options& options);
Exit show_event(const Options& options);
Exit show_agenda(const Options& options);
Exit add_event(const Options& options);
Exit edit_event(const Options& options);
Exit delete_events(const Options& options);
Exit cancel_occurrence(const Options& options);
Exit move_occurrence(const Options& options);

}  // namespace calendar_app
