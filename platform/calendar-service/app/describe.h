// SPDX-License-Identifier: Apache-2.0
//
// An event in words and as JSON.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "platform/calendar-service/app/app.h"
#include "platform/calendar-service/app/event.h"

namespace calendar_app {

// "event 3 \"Stand-up\""
std::string name_of(const calendar_text::Event& event);

// "Mon 2014-03-17 09:30-10:00" on the zone's wall clock; "Mon 2014-03-17, all day".
std::string when_text(const calendar_text::Event& event, const calendar_text::Occurrence& when,
                      const calendar_text::Zone& zone);

// The same of the event's own start, on the clock of its own zone.
std::string when_text(const calendar_text::Event& event);

// An occurrence by its start alone, on the clock of the event's own zone.
std::string occurrence_text(const calendar_text::Event& event, std::int64_t start_s);

// What an event says, one named line each; lines without a value are left out.
using Lines = std::vector<std::pair<std::string, std::string>>;
Lines lines_of(const calendar_text::Event& event);

Json event_json(const calendar_text::Event& event);

// The entries of the exdate list without the blanks around them.
std::vector<std::string> cancelled_entries(const calendar_text::Event& event);

}  // namespace calendar_app
