// SPDX-License-Identifier: Apache-2.0
//
// An event document taken apart and put together: a JSON object with "EVENT", whose values are all
// texts, and "REMINDERS". Reading is lenient as a device's is (a number is what its text begins
// with); writing has one form, so that the same event is the same text, byte by byte.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace qor {

struct EventDocument {
    std::optional<std::string> title;
    std::optional<std::string> location;
    std::optional<std::string> description;
    std::optional<std::string> organizer;
    std::optional<std::string> zone;       // "eventTimezone", an Olson id
    std::optional<std::string> rule;       // "rrule", UNTIL in UTC with a Z
    std::optional<std::string> longitude;  // micro-degrees
    std::optional<std::string> latitude;
    std::optional<std::int64_t> start_ms;  // midnight UTC of the date for an all-day event
    std::optional<std::int64_t> end_ms;    // exclusive
    bool all_day = false;
    bool cancelled = false;  // "eventStatus" "2"
    // An occurrence that is cancelled or changed: its event's key, the instant the rule gave it.
    std::optional<std::string> parent_key;
    std::optional<std::int64_t> instance_ms;
    bool instance_is_date = false;        // its event is an all-day event
    std::vector<std::int64_t> reminders;  // minutes before the start

    bool operator==(const EventDocument&) const = default;
    bool is_occurrence() const { return parent_key.has_value() && instance_ms.has_value(); }

    // The document's text. Keys stand in the order in which a device must read them: "allDay" and
    // "eventTimezone" before the times, "allDay" before "originalInstanceTime" exactly where
    // that is a date, "rrule" last of what it depends on.
    std::string to_text() const;

    // None when the text is no event document.
    static std::optional<EventDocument> parse(std::string_view text);
};

// Degrees as micro-degree text the way a device writes it: six decimals without the point.
std::string micro_degrees(double degrees);

}  // namespace qor
