// SPDX-License-Identifier: Apache-2.0
//
// add, edit, delete, cancel, move: each says what it changed.
#include <fmt/ranges.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "platform/calendar-service/app/app.h"
#include "platform/calendar-service/app/describe.h"
#include "platform/calendar-service/app/input.h"
#include "platform/calendar-service/app/rule.h"
#include "platform/calendar-service/app/store.h"
#include "platform/calendar-service/app/time_text.h"

namespace calendar_app {
namespace {

using namespace calendar_text;

// A list with one entry more. Entries of a list are separated by a comma alone, since readers of
// the list may compare entries without trimming them; what is there stays as it is.
Text with_entry(const Event& event, const std::string& entry) {
    const std::string& list = text_or_empty(event.exdate);
    return list.empty() ? entry : list + "," + entry;
}

// True when the list lacked the occurrence and now has it.
bool enter_cancelled(const Event& event, std::int64_t start_s) {
    Warnings told_elsewhere;
    if (cancelled_starts(event, &told_elsewhere).contains(start_s)) {
        return false;
    }
    write_exdate(event.id, with_entry(event, compact_text({event.is_all_day(), start_s})));
    return true;
}

std::optional<Event> exception_at(const Event& parent, std::int64_t start_s) {
    for (Event& exception : exceptions_of(parent.id)) {
        if (occurrence_start(text_or_empty(exception.recurrence_id), parent.is_all_day()) ==
            start_s) {
            return std::move(exception);
        }
    }
    return std::nullopt;
}

Event recurring_event(const std::string& id_text) {
    Event event = find_event(id_of(id_text, "event"));
    if (event.parent_id > 0) {
        fail(Exit::kFailed, "{} is itself a moved occurrence of event {}; edit or delete it",
             name_of(event), event.parent_id);
    }
    return event;
}

// One line per value that differs, such as `  title: "Lunch" -> "Late lunch"`.
Lines differences(const Event& before, const Event& after) {
    const Lines old_lines = lines_of(before);
    const Lines new_lines = lines_of(after);
    const auto value_in = [](const Lines& lines, const std::string& name) {
        const auto found = std::find_if(lines.begin(), lines.end(),
                                        [&](const auto& line) { return line.first == name; });
        return found == lines.end() ? std::string("none") : found->second;
    };
    Lines changes;
    const auto compare = [&](const std::string& name) {
        const std::string old_value = value_in(old_lines, name);
        const std::string new_value = value_in(new_lines, name);
        const bool told = std::any_of(changes.begin(), changes.end(),
                                      [&](const auto& change) { return change.first == name; });
        if (old_value != new_value && !told) {
            changes.emplace_back(name, fmt::format("{} -> {}", old_value, new_value));
        }
    };
    for (const auto& [name, value] : old_lines) {
        compare(name);
    }
    for (const auto& [name, value] : new_lines) {
        compare(name);
    }
    return changes;
}

void report_change(const Options& options, const Event& before, const Event& after) {
    const Lines changes = differences(before, after);
    if (options.json) {
        Json names = Json::array();
        for (const auto& [name, value] : changes) {
            names.push_back(name);
        }
        print_json({{"action", changes.empty() ? "unchanged" : "changed"},
                    {"changed", names},
                    {"event", event_json(after)}});
        return;
    }
    fmt::print("{} {}.\n", changes.empty() ? "Nothing to change in" : "Changed", name_of(after));
    for (const auto& [name, value] : changes) {
        fmt::print("  {}: {}\n", name, value);
    }
}

// Cancelled occurrences follow a change of their event's times.
void carry_cancelled(const Event& before, Event* after) {
    std::vector<std::string> entries = cancelled_entries(*after);
    bool is_changed = false;
    for (std::string& entry : entries) {
        const std::string carried = carried_occurrence(entry, before, *after);
        is_changed |= carried != entry;
        entry = carried;
    }
    if (is_changed) {
        after->exdate = fmt::format("{}", fmt::join(entries, ","));
    }
}

// So do the exceptions: each stands for the same occurrence as before.
void carry_exceptions(const Event& before, const Event& after) {
    for (Event& exception : exceptions_of(after.id)) {
        const std::string old_text = text_or_empty(exception.recurrence_id);
        exception.recurrence_id = carried_occurrence(old_text, before, after);
        if (*exception.recurrence_id != old_text) {
            replace_event(exception);
        }
    }
}

bool gives_changes(const Options& options) {
    return options.title || options.start || options.end || options.duration || options.zone ||
           options.all_day || options.location || options.description || options.rrule ||
           !options.alarms.empty() || options.place || options.organizer || options.book ||
           !options.unset.empty();
}

int event_book(const std::string& id_text) {
    const Book book = find_book(id_of(id_text, "book"));
    if (book.type != CALENDAR_BOOK_TYPE_EVENT) {
        fail(Exit::kFailed, "book {} \"{}\" does not hold events; see 'qor-calendar books'",
             book.id, qor::one_line(text_or_empty(book.name)));
    }
    return book.id;
}

// Deletes one event; a deleted exception leaves its occurrence cancelled.
std::string delete_one(const Event& event) {
    if (event.parent_id < 1) {
        const std::size_t exceptions = exceptions_of(event.id).size();
        delete_event(event.id);
        return exceptions == 0 ? "" : fmt::format(", with {} moved occurrences", exceptions);
    }
    const Event parent = find_event(event.parent_id);
    const std::optional<std::int64_t> start =
        occurrence_start(text_or_empty(event.recurrence_id), parent.is_all_day());
    if (start) {
        static_cast<void>(enter_cancelled(parent, *start));
    }
    delete_event(event.id);
    return start ? fmt::format("; the occurrence {} of event {} is cancelled",
                               occurrence_text(parent, *start), parent.id)
                 : "";
}

// The exception event of an occurrence that has none yet: a copy of its parent at that time.
Event new_exception(const Event& parent, std::int64_t start_s) {
    Event exception = parent;
    const Occurrence first = first_occurrence(parent);
    exception.id = 0;
    exception.parent_id = parent.id;
    exception.recurrence_id = compact_text({parent.is_all_day(), start_s});
    exception.exdate.reset();
    clear_rule(&exception);
    exception.start.at_s = start_s;
    exception.end.at_s = start_s + first.end_s - first.start_s;
    return exception;
}

}  // namespace

Exit add_event(const Options& options) {
    Event event;
    apply_new(options, &event);
    event.book_id = options.book ? event_book(*options.book) : default_book();
    event.id = insert_event(event);
    if (options.json) {
        print_json({{"action", "added"}, {"event", event_json(event)}});
        return Exit::kDone;
    }
    const std::string rule = rule_text(event);
    fmt::print("Added {} to book {}: {}{}{}.\n", name_of(event), event.book_id, when_text(event),
               event.start_zone ? " " + *event.start_zone : "",
               rule.empty() ? "" : ", repeats " + rule);
    return Exit::kDone;
}

Exit edit_event(const Options& options) {
    const Event before = find_event(id_of(options.id, "event"));
    if (!gives_changes(options)) {
        fail(Exit::kUsage,
             "nothing to change in event {}; give an option such as --title TEXT, "
             "see 'qor-calendar edit --help'",
             before.id);
    }
    if (before.parent_id > 0 && options.rrule) {
        fail(Exit::kFailed, "{} is a moved occurrence and cannot repeat; edit event {}",
             name_of(before), before.parent_id);
    }
    Event after = before;
    apply_changes(options, &after);
    if (options.book) {
        after.book_id = event_book(*options.book);
    }
    if (before.parent_id < 1 && before.repeats()) {
        carry_cancelled(before, &after);
    }
    if (!(after == before)) {
        replace_event(after);
    }
    if (before.parent_id < 1 && before.repeats()) {
        carry_exceptions(before, after);
    }
    report_change(options, before, after);
    return Exit::kDone;
}

Exit delete_events(const Options& options) {
    std::vector<int> ids;
    for (const std::string& text : options.ids) {
        ids.push_back(id_of(text, "event"));
    }
    Json deleted = Json::array();
    for (const int id : ids) {
        try {
            const Event event = find_event(id);
            const std::string with = delete_one(event);
            deleted.push_back({{"id", id}, {"title", text_or_empty(event.title)}});
            if (!options.json) {
                fmt::print("Deleted {}{}.\n", name_of(event), with);
            }
        } catch (const Failure& failure) {
            print_error(failure.what());  // the other events are deleted all the same
        }
    }
    if (options.json) {
        print_json({{"action", "deleted"}, {"events", deleted}});
    }
    if (deleted.size() == ids.size()) {
        return Exit::kDone;
    }
    return deleted.empty() ? Exit::kFailed : Exit::kPartly;
}

Exit cancel_occurrence(const Options& options) {
    const Event event = recurring_event(options.id);
    const std::int64_t start_s = find_occurrence(event, options.occurrence);
    const std::optional<Event> exception = exception_at(event, start_s);
    const bool is_new = enter_cancelled(event, start_s) || exception;
    if (exception) {
        delete_event(exception->id);
    }
    if (options.json) {
        print_json({{"action", is_new ? "cancelled" : "unchanged"},
                    {"id", event.id},
                    {"occurrence", compact_text({event.is_all_day(), start_s})}});
        return Exit::kDone;
    }
    const std::string when = occurrence_text(event, start_s);
    if (is_new) {
        fmt::print("Cancelled the occurrence {} of {}{}.\n", when, name_of(event),
                   exception ? fmt::format(", which event {} had moved", exception->id) : "");
    } else {
        fmt::print("The occurrence {} of {} was cancelled already.\n", when, name_of(event));
    }
    return Exit::kDone;
}

Exit move_occurrence(const Options& options) {
    const Event parent = recurring_event(options.id);
    const std::int64_t start_s = find_occurrence(parent, options.occurrence);
    Warnings told_elsewhere;
    const bool was_listed = cancelled_starts(parent, &told_elsewhere).contains(start_s);
    const std::optional<Event> existing = exception_at(parent, start_s);
    const std::string when = occurrence_text(parent, start_s);
    if (was_listed && !existing) {
        fail(Exit::kFailed, "the occurrence {} of {} is cancelled; add an event of its own instead",
             when, name_of(parent));
    }
    Event exception = existing ? *existing : new_exception(parent, start_s);
    apply_changes(options, &exception);
    // The exception comes first: were this interrupted, no reader would miss the occurrence.
    if (existing) {
        replace_event(exception);
    } else {
        exception.id = insert_event(exception);
    }
    static_cast<void>(enter_cancelled(find_event(parent.id), start_s));  // listed before is fine
    if (options.json) {
        print_json({{"action", "moved"},
                    {"id", parent.id},
                    {"occurrence", compact_text({parent.is_all_day(), start_s})},
                    {"event", event_json(exception)}});
        return Exit::kDone;
    }
    fmt::print("Moved the occurrence {} of {} to {}: event {} \"{}\".\n", when, name_of(parent),
               when_text(exception), exception.id, qor::one_line(text_or_empty(exception.title)));
    return Exit::kDone;
}

}  // namespace calendar_app
