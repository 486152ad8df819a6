// SPDX-License-Identifier: Apache-2.0
//
// An event document taken apart and put together. Keeps no state; any thread.
#include "host/document/event_document.h"

#include <fmt/format.h>

#include <algorithm>
#include <cstdlib>
#include <nlohmann/json.hpp>

namespace qor {
namespace {

using nlohmann::ordered_json;

constexpr std::int64_t kDayMs = 86'400'000;

using Text = std::optional<std::string>;

Text text_of(const ordered_json& object, const char* key) {
    const auto member = object.find(key);
    return member != object.end() && member->is_string() ? Text(member->get<std::string>())
                                                         : std::nullopt;
}

std::optional<std::int64_t> number_of(const ordered_json& object, const char* key) {
    const Text text = text_of(object, key);
    return text ? std::optional<std::int64_t>(std::strtoll(text->c_str(), nullptr, 10))
                : std::nullopt;
}

// The length that a device gives "P1DT2H": signs count for nothing; of an all-day event only weeks
// and days count, and only those behind the last smaller unit ("P1DT12H" is no day).
std::int64_t duration_ms(const std::string& text, bool all_day) {
    std::int64_t total = 0;
    std::string digits;
    for (const char c : text) {
        if (c >= '0' && c <= '9' && digits.size() < 7) {
            digits += c;
            continue;
        }
        const std::int64_t n = std::strtoll(digits.c_str(), nullptr, 10);
        switch (c) {
            case 'W':
                total += 7 * n * kDayMs;
                break;
            case 'D':
                total += n * kDayMs;
                break;
            case 'H':
                total = all_day ? 0 : total + n * 3'600'000;
                break;
            case 'M':
                total = all_day ? 0 : total + n * 60'000;
                break;
            case 'S':
                total = all_day ? 0 : total + n * 1'000;
                break;
            default:
                break;
        }
        digits.clear();
    }
    return total;
}

void put(ordered_json& event, const char* key, const Text& value) {
    if (value) {
        event[key] = *value;
    }
}

void put(ordered_json& event, const char* key, const std::optional<std::int64_t>& value) {
    if (value) {
        event[key] = std::to_string(*value);
    }
}

}  // namespace

std::string EventDocument::to_text() const {
    ordered_json event = ordered_json::object();
    put(event, "title", title);
    put(event, "eventLocation", location);
    put(event, "description", description);
    event["eventStatus"] = cancelled ? "2" : "0";
    // Deliberate: a date in the series of a timed event must not be read as a date-only instance.
    const bool instance_first = is_occurrence() && !instance_is_date;
    if (all_day && !instance_first) {
        event["allDay"] = "1";
    }
    put(event, "eventTimezone", zone);
    put(event, "dtstart", start_ms);
    put(event, "dtend", end_ms);
    if (!cancelled) {
        event["accessLevel"] = "0";
        event["hasAlarm"] = reminders.empty() ? "0" : "1";
        put(event, "rrule", rule);
    }
    put(event, "original_sync_id", parent_key);
    put(event, "originalInstanceTime", instance_ms);
    if (all_day && instance_first) {
        event["allDay"] = "1";
    }
    if (!cancelled) {
        event["hasAttendeeData"] = "0";
    }
    put(event, "organizer", organizer);
    put(event, "longitude", longitude);
    put(event, "latitude", latitude);

    ordered_json document = ordered_json::object();
    document["EVENT"] = std::move(event);
    for (const std::int64_t minutes : reminders) {
        document["REMINDERS"].push_back({{"method", "1"}, {"minutes", std::to_string(minutes)}});
    }
    return document.dump(-1, ' ', false, ordered_json::error_handler_t::replace);
}

std::optional<EventDocument> EventDocument::parse(std::string_view text) {
    const ordered_json document = ordered_json::parse(text, nullptr, false);
    if (!document.is_object() || !document.contains("EVENT") || !document["EVENT"].is_object()) {
        return std::nullopt;
    }
    const ordered_json& event = document["EVENT"];
    EventDocument result;
    result.title = text_of(event, "title");
    result.location = text_of(event, "eventLocation");
    result.description = text_of(event, "description");
    result.organizer = text_of(event, "organizer");
    result.zone = text_of(event, "eventTimezone");
    result.rule = text_of(event, "rrule");
    result.longitude = text_of(event, "longitude");
    result.latitude = text_of(event, "latitude");
    result.start_ms = number_of(event, "dtstart");
    result.end_ms = number_of(event, "dtend");
    result.all_day = number_of(event, "allDay") == 1;
    result.cancelled = number_of(event, "eventStatus") == 2;
    result.parent_key = text_of(event, "original_sync_id");
    result.instance_ms = number_of(event, "originalInstanceTime");
    const auto position = [&](const char* key) {
        return std::distance(event.begin(), event.find(key));
    };
    result.instance_is_date =
        result.all_day && position("allDay") < position("originalInstanceTime");
    if (const Text duration = text_of(event, "duration");
        duration && result.start_ms && !result.end_ms) {
        result.end_ms = *result.start_ms + duration_ms(*duration, result.all_day);
    }
    const auto reminders = document.find("REMINDERS");
    if (reminders != document.end() && reminders->is_array()) {
        for (const ordered_json& reminder : *reminders) {
            if (const auto minutes = number_of(reminder, "minutes"); minutes) {
                result.reminders.push_back(*minutes);
            }
        }
    }
    return result;
}

std::string micro_degrees(double degrees) {
    std::string text = fmt::format("{:.6f}", degrees);
    std::erase(text, '.');
    return text;
}

}  // namespace qor
