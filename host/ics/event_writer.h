// SPDX-License-Identifier: Apache-2.0
//
// One document written as a VEVENT.
#pragma once

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "host/document/event_document.h"
#include "host/ics/ical.h"
#include "host/ics/report.h"

namespace qor {

struct EventToWrite {
    std::string key;  // for the report
    std::string uid;
    EventDocument document;
    std::int64_t modified_ms = 0;
    const EventDocument* parent = nullptr;  // of a changed occurrence
    std::vector<std::int64_t> excluded_ms;  // instants of cancelled occurrences
};

// The component; its zones are added to `zones`. None when the document has no start, which the
// report then tells.
IcalComponent write_event(const EventToWrite& event, std::set<std::string>& zones,
                          IcsReport& report);

// A VTIMEZONE under the zone's own name.
IcalComponent write_zone(const std::string& zone);

}  // namespace qor
