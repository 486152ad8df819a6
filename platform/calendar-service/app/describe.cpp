// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/describe.h"

#include <fmt/ranges.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "platform/calendar-service/app/agenda.h"
#include "platform/calendar-service/app/rule.h"
#include "platform/calendar-service/app/time_text.h"

namespace calendar_app {
namespace {

using namespace calendar_text;

Zone own_zone(const Event& event) {
    Warnings told_elsewhere;
    return zone_of(event, &told_elsewhere);
}

std::string alarms_text(const Event& event) {
    std::vector<std::string> texts;
    for (const Alarm& alarm : event.alarms) {
        if (alarm.tick_unit == CALENDAR_ALARM_TIME_UNIT_SPECIFIC) {
            texts.emplace_back("at a time of its own");
        } else if (alarm.tick_unit > 0) {
            texts.push_back(duration_text(std::int64_t{alarm.tick} * alarm.tick_unit) + " before");
        }
    }
    return fmt::format("{}", fmt::join(texts, ", "));
}

std::string organizer_text(const Event& event) {
    const std::string& name = text_or_empty(event.organizer_name);
    const std::string& email = text_or_empty(event.organizer_email);
    return email.empty() || email == name ? name : fmt::format("{} <{}>", name, email);
}

std::string cancelled_text(const Event& event) {
    Warnings told_elsewhere;
    std::vector<std::string> texts;
    for (const std::int64_t start_s : cancelled_starts(event, &told_elsewhere)) {
        texts.push_back(occurrence_text(event, start_s));
    }
    return fmt::format("{}", fmt::join(texts, ", "));
}

}  // namespace

std::string name_of(const Event& event) {
    return fmt::format("event {} \"{}\"", event.id, qor::one_line(text_or_empty(event.title)));
}

std::string when_text(const Event& event, const Occurrence& when, const Zone& zone) {
    if (event.is_all_day()) {
        const std::int64_t last_s = when.end_s - kDay_s;
        return last_s == when.start_s
                   ? fmt::format("{}, all day", day_text(when.start_s))
                   : fmt::format("{} - {}, {} days", day_text(when.start_s), day_text(last_s),
                                 (when.end_s - when.start_s) / kDay_s);
    }
    const std::int64_t start_s = zone.to_wall(when.start_s);
    const std::int64_t end_s = zone.to_wall(when.end_s);
    std::string start = fmt::format("{} {}", day_text(start_s), clock_text(start_s));
    if (when.end_s == when.start_s) {
        return start;
    }
    return midnight(start_s) == midnight(end_s)
               ? fmt::format("{}-{}", start, clock_text(end_s))
               : fmt::format("{} - {} {}", start, day_text(end_s), clock_text(end_s));
}

std::string when_text(const Event& event) {
    return when_text(event, first_occurrence(event), own_zone(event));
}

std::string occurrence_text(const Event& event, std::int64_t start_s) {
    if (event.is_all_day()) {
        return date_text(start_s);
    }
    const std::int64_t wall_s = own_zone(event).to_wall(start_s);
    return fmt::format("{} {}", date_text(wall_s), clock_text(wall_s));
}

Lines lines_of(const Event& event) {
    Lines lines = {
        {"title", text_or_empty(event.title)},
        {"when", when_text(event)},
        {"zone", text_or_empty(event.start_zone)},
        {"location", text_or_empty(event.location)},
        {"description", text_or_empty(event.description)},
        {"organizer", organizer_text(event)},
        {"place",
         event.has_place() ? fmt::format("{:.6f},{:.6f}", event.latitude, event.longitude) : ""},
        {"alarms", alarms_text(event)},
        {"rule", rule_text(event)},
        {"cancelled", cancelled_text(event)},
        {"exception", event.parent_id > 0
                          ? fmt::format("of event {}, in place of {}", event.parent_id,
                                        text_or_empty(event.recurrence_id))
                          : ""},
        {"book", fmt::format("{}", event.book_id)},
    };
    for (auto& line : lines) {
        line.second = qor::one_line(line.second);
    }
    std::erase_if(lines, [](const auto& line) { return line.second.empty(); });
    return lines;
}

std::vector<std::string> cancelled_entries(const Event& event) {
    std::vector<std::string> entries;
    const std::string& list = text_or_empty(event.exdate);
    for (std::size_t at = 0; at < list.size();) {
        const std::size_t comma = std::min(list.find(',', at), list.size());
        const std::string entry = trim(std::string_view(list).substr(at, comma - at));
        if (!entry.empty()) {
            entries.push_back(entry);
        }
        at = comma + 1;
    }
    return entries;
}

Json event_json(const Event& event) {
    Json json;
    json["id"] = event.id;
    json["book"] = event.book_id;
    json.update(content_json(event, first_occurrence(event)));
    if (event.repeats()) {
        json["rrule"] = rule_text(event);
    }
    if (const auto entries = cancelled_entries(event); !entries.empty()) {
        json["cancelled"] = entries;
    }
    if (event.parent_id > 0) {
        json["exception_of"] = event.parent_id;
        json["occurrence"] = text_or_empty(event.recurrence_id);
    }
    return json;
}

}  // namespace calendar_app
