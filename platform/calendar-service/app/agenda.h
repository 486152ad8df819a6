// SPDX-License-Identifier: Apache-2.0
//
// The agenda of a range: every occurrence of every event, exceptions in place of the occurrences
// that they stand for, in the order of time. Its JSON holds content only, so that the agendas of
// two devices are equal texts when the devices show a person the same things.
#pragma once

#include <nlohmann/json_fwd.hpp>
#include <vector>

#include "platform/calendar-service/app/event.h"
#include "platform/calendar-service/app/occurrences.h"

namespace calendar_text {

struct AgendaEntry {
    const Event* event = nullptr;  // one of the given events
    Occurrence when;
};

struct Agenda {
    std::vector<AgendaEntry> entries;
    bool is_complete = true;  // false when an event has more occurrences than are expanded
    Warnings warnings;
};

// The events must outlive the agenda. An exception needs its parent among the events to replace
// anything. All-day entries come before timed ones of the same day on the zone's wall clock.
Agenda make_agenda(const std::vector<Event>& events, const Range& range, const Zone& zone);
Agenda make_agenda(std::vector<Event>&& events, const Range& range, const Zone& zone) = delete;

// What a person sees of one occurrence: no ids, nothing of how it repeats. Members without a value
// are left out; "start" and "end" are dates ("end" exclusive) or instants with the zone's offset;
// "alarms" are minutes before the start.
nlohmann::ordered_json content_json(const Event& event, const Occurrence& when);
nlohmann::ordered_json agenda_json(const Agenda& agenda);

}  // namespace calendar_text
