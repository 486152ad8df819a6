// SPDX-License-Identifier: Apache-2.0
//
// Which Olson zone a TZID means. Producers name zones by Olson ids, by ids behind a path, by other
// systems' names, by display texts; VTIMEZONE says what the name stands for.
#pragma once

#include <map>
#include <optional>
#include <string>

#include "host/document/zone.h"
#include "host/ics/ical.h"
#include "host/ics/report.h"

namespace qor {

// A zone of a file. Times are computed from the Olson zone where there is one, else from the rules
// of the file's VTIMEZONE; documents then name UTC.
struct IcsZone {
    std::string olson;              // empty: only `rules` are known
    icaltimezone* rules = nullptr;  // borrowed from the IcsZones
    // Seconds since the epoch; the first of two times that the clock shows twice.
    std::int64_t instant(const WallTime& time) const;
    WallTime wall(std::int64_t instant_s) const;
    const std::string& document_zone() const { return olson.empty() ? kUtcZone : olson; }
};

class IcsZones {
  public:
    // `floating` is the zone of times without one, and of zones that nothing is known about.
    IcsZones(std::string floating, IcsReport& report);
    // Takes a VTIMEZONE component. False: it makes no sense.
    bool add(const char* vtimezone);
    // Never fails: what cannot be understood is told in the report and taken as floating.
    // `year` is where rules are compared with those of the Olson zones.
    const IcsZone& find(const std::string& tzid, int year);
    const IcsZone& floating() const { return floating_; }

  private:
    std::optional<IcsZone> by_name(const std::string& tzid) const;
    IcsZone by_rules(const std::string& tzid, icaltimezone* rules, int year);

    IcsZone floating_;
    IcsReport& report_;
    std::map<std::string, IcalZone> rules_;  // by TZID
    std::map<std::string, IcsZone> known_;
};

// The Olson id in an Olson id, an id behind a path ("/example.org/1/Europe/Berlin") or a name of
// the kind "W. Europe Standard Time"; empty when it is none of them.
std::string olson_zone(const std::string& name);

// This computer's zone, UTC when it has none.
std::string local_zone();

}  // namespace qor
