// SPDX-License-Identifier: Apache-2.0
//
// Recurrence rules: RFC 5545 3.3.10 text to and from an event's properties.
#pragma once

#include <libical/ical.h>

#include <optional>
#include <string>
#include <string_view>

#include "platform/calendar-service/app/event.h"
#include "platform/calendar-service/app/zone.h"

namespace calendar_text {

// The rule of an event, UNTIL in UTC; an empty text when the event does not repeat.
std::string rule_text(const Event& event);

// Reads a rule into an event whose start is set, in place of the rule that it had. An UNTIL without
// a Z is wall-clock time of the zone; a date alone lasts to the end of that day. Returns what is
// wrong with the rule, and leaves the event alone then; an empty text is success.
std::string set_rule(std::string_view text, const Zone& zone, Event* event);

// Makes the event one that does not repeat.
void clear_rule(Event* event);

// The rule for the library's iterator, without COUNT and UNTIL; nothing when the event does not
// repeat or its BY lists cannot be read.
std::optional<icalrecurrencetype> library_rule(const Event& event);

}  // namespace calendar_text
