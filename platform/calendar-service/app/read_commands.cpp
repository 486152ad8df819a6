// SPDX-License-Identifier: Apache-2.0
//
// books, list, show, agenda: the commands that change nothing.
#include <chrono>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "platform/calendar-service/app/agenda.h"
#include "platform/calendar-service/app/app.h"
#include "platform/calendar-service/app/describe.h"
#include "platform/calendar-service/app/rule.h"
#include "platform/calendar-service/app/store.h"
#include "platform/calendar-service/app/time_text.h"

namespace calendar_app {
namespace {

using namespace calendar_text;

constexpr int kDaysShown = 7;

const char* type_name(int type) {
    switch (type) {
        case CALENDAR_BOOK_TYPE_EVENT:
            return "events";
        case CALENDAR_BOOK_TYPE_TODO:
            return "to-dos";
        default:
            return "other";
    }
}

// The book that --book names, which must exist; 0 for all.
int chosen_book(const Options& options) {
    return options.book ? find_book(id_of(*options.book, "book")).id : 0;
}

void warn_of_zones(const std::vector<Event>& events) {
    Warnings warnings;
    for (const Event& event : events) {
        static_cast<void>(zone_of(event, &warnings));
    }
    print_warnings(warnings);
}

std::int64_t day_given(const char* name, const std::string& text, const Zone& zone, bool is_to) {
    const std::optional<GivenTime> given = parse_time(text);
    if (!given) {
        fail(Exit::kUsage,
             "{}: \"{}\" is no date or time; write 2014-03-15 or \"2014-03-15 09:30\"", name, text);
    }
    if (given->has_time) {
        return given->in(zone);
    }
    return zone.to_utc(given->wall_s + (is_to ? kDay_s : 0));  // the last day counts in full
}

Range range_given(const Options& options, const Zone& zone) {
    const std::int64_t now_s = std::chrono::duration_cast<std::chrono::seconds>(
                                   std::chrono::system_clock::now().time_since_epoch())
                                   .count();
    const std::int64_t today_s = zone.to_utc(midnight(zone.to_wall(now_s)));
    const std::int64_t from_s =
        options.from ? day_given("FROM", *options.from, zone, false) : today_s;
    const std::int64_t week_s = zone.to_utc(zone.to_wall(from_s) + kDaysShown * kDay_s);
    const std::int64_t to_s = options.to ? day_given("TO", *options.to, zone, true) : week_s;
    if (to_s <= from_s) {
        fail(Exit::kUsage, "TO: \"{}\" is not after FROM \"{}\"", options.to.value_or(""),
             options.from.value_or(""));
    }
    return make_range(from_s, to_s, zone);
}

}  // namespace

Exit list_books(const Options& options) {
    Json json = Json::array();
    qor::Table table({"BOOK", "NAME", "HOLDS", "ACCOUNT", "DESCRIPTION"});
    for (const Book& book : read_books()) {
        json.push_back({{"id", book.id},
                        {"name", text_or_empty(book.name)},
                        {"holds", type_name(book.type)},
                        {"account", book.account_id},
                        {"description", text_or_empty(book.description)}});
        table.add({fmt::format("{}", book.id), text_or_empty(book.name), type_name(book.type),
                   book.account_id > 0 ? fmt::format("{}", book.account_id) : "local",
                   text_or_empty(book.description)});
    }
    if (options.json) {
        print_json(json);
    } else if (table.empty()) {
        fmt::print("No books yet; 'qor-calendar add' makes one.\n");
    } else {
        table.print();
    }
    return Exit::kDone;
}

Exit list_events(const Options& options) {
    const std::vector<Event> events = read_all_events(chosen_book(options));
    warn_of_zones(events);
    Json json = Json::array();
    qor::Table table({"EVENT", "WHEN", "TITLE", "REPEATS", "NOTE"});
    for (const Event& event : events) {
        json.push_back(event_json(event));
        table.add({fmt::format("{}", event.id), when_text(event), text_or_empty(event.title),
                   rule_text(event),
                   event.parent_id > 0 ? fmt::format("exception of {}", event.parent_id) : ""});
    }
    if (options.json) {
        print_json(json);
    } else if (table.empty()) {
        fmt::print("No events; see 'qor-calendar add --help'.\n");
    } else {
        table.print();
    }
    return Exit::kDone;
}

Exit show_event(const Options& options) {
    const int id = id_of(options.id, "event");
    const Event event = find_event(id);
    const std::vector<Event> exceptions = exceptions_of(id);
    warn_of_zones({event});
    if (options.json) {
        Json json = event_json(event);
        for (const Event& exception : exceptions) {
            json["exceptions"].push_back(event_json(exception));
        }
        print_json(json);
        return Exit::kDone;
    }
    for (const auto& [name, value] : lines_of(event)) {
        fmt::print("{:<13}{}\n", name, value);
    }
    for (const Event& exception : exceptions) {
        fmt::print("{:<13}event {}: {}\n", "moved", exception.id, when_text(exception));
    }
    return Exit::kDone;
}

Exit show_agenda(const Options& options) {
    const Zone zone = given_zone(options);
    const Range range = range_given(options, zone);
    const std::vector<Event> events = read_all_events(chosen_book(options));
    const Agenda agenda = make_agenda(events, range, zone);
    print_warnings(agenda.warnings);
    if (options.json) {
        print_json(agenda_json(agenda));
        return agenda.is_complete ? Exit::kDone : Exit::kPartly;
    }
    qor::Table table({"WHEN", "TITLE", "LOCATION", "EVENT"});
    for (const AgendaEntry& entry : agenda.entries) {
        table.add({when_text(*entry.event, entry.when, zone), text_or_empty(entry.event->title),
                   text_or_empty(entry.event->location), fmt::format("{}", entry.event->id)});
    }
    if (table.empty()) {
        fmt::print("Nothing from {} to {} ({}).\n", day_text(zone.to_wall(range.from_s)),
                   day_text(zone.to_wall(range.to_s - 1)), zone.id());
    } else {
        table.print();
    }
    return agenda.is_complete ? Exit::kDone : Exit::kPartly;
}

}  // namespace calendar_app
