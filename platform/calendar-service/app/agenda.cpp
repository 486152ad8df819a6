// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/agenda.h"

#include <fmt/format.h>

#include <algorithm>
#include <map>
#include <nlohmann/json.hpp>
#include <set>
#include <tuple>

#include "platform/calendar-service/app/time_text.h"

namespace calendar_text {
namespace {

using Json = nlohmann::ordered_json;

// The occurrences that have an exception event of their own, by parent id.
std::map<int, std::set<std::int64_t>> replaced_starts(const std::vector<Event>& events,
                                                      Warnings* warnings) {
    std::map<int, bool> is_all_day;
    for (const Event& event : events) {
        is_all_day[event.id] = event.is_all_day();
    }
    std::map<int, std::set<std::int64_t>> replaced;
    for (const Event& event : events) {
        const auto parent = is_all_day.find(event.parent_id);
        if (event.parent_id < 1 || parent == is_all_day.end()) {
            continue;
        }
        const std::optional<std::int64_t> start =
            occurrence_start(text_or_empty(event.recurrence_id), parent->second);
        if (start) {
            replaced[event.parent_id].insert(*start);
        } else {
            warnings->insert(
                fmt::format("event {}: its recurrence id \"{}\" cannot be read, "
                            "it replaces no occurrence of event {}",
                            event.id, text_or_empty(event.recurrence_id), event.parent_id));
        }
    }
    return replaced;
}

void add_text(Json* json, const char* name, const Text& text) {
    if (!text_or_empty(text).empty()) {  // unset and empty look the same to a person
        (*json)[name] = *text;
    }
}

struct SortedEntry {
    std::int64_t start_s;
    bool is_timed;
    std::string content;  // decides between entries of the same time, on every device alike
    AgendaEntry entry;

    auto key() const { return std::tie(start_s, is_timed, entry.when.end_s, content); }
};

}  // namespace

Agenda make_agenda(const std::vector<Event>& events, const Range& range, const Zone& zone) {
    Agenda agenda;
    const auto replaced = replaced_starts(events, &agenda.warnings);
    const std::set<std::int64_t> none;
    std::vector<SortedEntry> sorted;
    for (const Event& event : events) {
        const auto found = replaced.find(event.id);
        std::vector<Occurrence> occurrences;
        if (!expand(event, range, found == replaced.end() ? none : found->second, &occurrences,
                    &agenda.warnings)) {
            agenda.is_complete = false;
            agenda.warnings.insert(
                fmt::format("event {}: it repeats too often, some occurrences are left out; ask "
                            "for a shorter range",
                            event.id));
        }
        for (const Occurrence& when : occurrences) {
            const bool is_timed = !event.is_all_day();
            sorted.push_back(
                {is_timed ? when.start_s : zone.to_utc(when.start_s),
                 is_timed,
                 content_json(event, when).dump(-1, ' ', false, Json::error_handler_t::replace),
                 {&event, when}});
        }
    }
    std::sort(sorted.begin(), sorted.end(),
              [](const SortedEntry& a, const SortedEntry& b) { return a.key() < b.key(); });
    for (const SortedEntry& each : sorted) {
        agenda.entries.push_back(each.entry);
    }
    return agenda;
}

Json content_json(const Event& event, const Occurrence& when) {
    Warnings ignored;  // make_agenda() has told them
    const Zone zone = zone_of(event, &ignored);
    Json json;
    json["title"] = text_or_empty(event.title);
    json["all_day"] = event.is_all_day();
    if (event.is_all_day()) {
        json["start"] = date_text(when.start_s);
        json["end"] = date_text(when.end_s);
    } else {
        json["start"] = instant_text(when.start_s, zone);
        json["end"] = instant_text(when.end_s, zone);
    }
    add_text(&json, "zone", event.start_zone);
    add_text(&json, "location", event.location);
    add_text(&json, "description", event.description);
    add_text(&json, "organizer", event.organizer_name);
    if (event.has_place()) {
        json["place"] = fmt::format("{:.6f},{:.6f}", event.latitude, event.longitude);
    }
    for (const Alarm& alarm : event.alarms) {
        if (alarm.tick_unit > CALENDAR_ALARM_TIME_UNIT_SPECIFIC) {
            json["alarms"].push_back(std::int64_t{alarm.tick} * alarm.tick_unit / 60);
        }
    }
    return json;
}

Json agenda_json(const Agenda& agenda) {
    Json json = Json::array();
    for (const AgendaEntry& entry : agenda.entries) {
        json.push_back(content_json(*entry.event, entry.when));
    }
    return json;
}

}  // namespace calendar_text
