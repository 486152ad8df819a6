// SPDX-License-Identifier: Apache-2.0
//
// One VEVENT read into what a document carries of it. What a document cannot carry is counted.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "host/document/event_document.h"
#include "host/ics/ical.h"
#include "host/ics/ics_zones.h"
#include "host/ics/report.h"

namespace qor {

// A date, or a time in a zone, as a file gives it.
struct IcsTime {
    WallTime wall;
    bool is_date = false;
    const IcsZone* zone = nullptr;  // of a time; borrowed from the IcsZones

    std::int64_t ms() const { return (is_date ? utc_instant(wall) : zone->instant(wall)) * 1000; }
};

struct IcsEvent {
    std::string uid;  // empty: it has none
    long sequence = 0;
    bool cancelled = false;  // STATUS:CANCELLED
    EventDocument document;  // without parent_key, instance_ms
    IcsTime start;
    std::optional<IcsTime> recurrence_id;
    std::vector<IcsTime> excluded;  // EXDATE
    std::string where;              // "work.ics:120"
};

// Reads the component; `where` names it in the report. None when it cannot be an event: no start,
// or a start that is no time. The reason stands in the report.
std::optional<IcsEvent> read_event(icalcomponent* component, const std::string& where,
                                   IcsZones& zones, IcsReport& report);

// The instant that names an occurrence of the event: a date where the event is all-day, a time
// where it is not, whichever of them the file gives ("EXDATE;VALUE=DATE" of a meeting at nine).
std::int64_t instance_ms(const IcsTime& instance, bool all_day, const IcsZone& zone,
                         const WallTime& start);

}  // namespace qor
