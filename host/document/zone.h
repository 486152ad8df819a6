// SPDX-License-Identifier: Apache-2.0
//
// Time zones as documents name them: Olson ids, computed by ICU as on a device, where "Etc/GMT"
// stands for UTC. Keeps no state between calls but a cache of opened calendars per thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace qor {

inline const std::string kUtcZone = "Etc/GMT";

// A date and time as a clock on the wall shows it; month 1 to 12.
struct WallTime {
    int year = 0;
    int month = 0;
    int day = 0;
    int hour = 0;
    int minute = 0;
    int second = 0;
    bool operator==(const WallTime&) const = default;
};

// What a time means that the clock shows twice, at the end of summer time. RFC 5545 3.3.5 has the
// first; a device takes the second. A time that the clock skips counts from before the gap in both.
enum class RepeatedHour { kFirst, kSecond };

// Whether ICU, and so a device, knows the zone.
bool is_known_zone(const std::string& zone);

// UTC under one of its many names ("UTC", "Etc/UTC", "Zulu").
bool is_utc_zone(const std::string& zone);

// Seconds since the epoch; none for a zone that is not known.
std::optional<std::int64_t> instant_of(const WallTime& time, const std::string& zone,
                                       RepeatedHour repeated = RepeatedHour::kFirst);

// The same for UTC; fields out of range roll over (day 32 is the next month's first).
std::int64_t utc_instant(const WallTime& time);

// None for a zone that is not known.
std::optional<WallTime> wall_time(std::int64_t instant_s, const std::string& zone);

}  // namespace qor
