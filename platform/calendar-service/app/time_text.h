// SPDX-License-Identifier: Apache-2.0
//
// Dates, times and durations as text: what a person types, what the calendar store keeps
// ("20140315", "20140315T093000Z"), what is shown.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/calendar-service/app/event.h"
#include "platform/calendar-service/app/zone.h"

namespace calendar_text {

struct Civil {
    int year = 1970;
    int month = 1;  // 1 to 12
    int day = 1;
    int hour = 0;
    int minute = 0;
    int second = 0;
};

Civil civil_of(std::int64_t wall_s);

// Midnight of a date. Fields out of range are moved into it; a day past its month's end runs on
// into the next month.
std::int64_t day_of(int year, int month, int day);

// Midnight of the day that a wall-clock time falls on.
std::int64_t midnight(std::int64_t wall_s);

// A date with or without a time: "2014-03-15", "2014-03-15 09:30", "2014-03-15T09:30:00+01:00",
// "20140315T093000Z". An offset or a Z makes it a UTC instant.
struct GivenTime {
    std::int64_t wall_s = 0;  // as written
    bool has_time = false;
    std::optional<std::int64_t> utc_s;  // when the text says so itself

    std::int64_t in(const Zone& zone) const { return utc_s ? *utc_s : zone.to_utc(wall_s); }
};
std::optional<GivenTime> parse_time(std::string_view text);

// "PT1H30M", "P2D" (RFC 5545 3.3.6, forward only), "1h30m", "3d"; a bare number counts minutes.
struct Duration {
    std::int64_t days = 0;     // weeks and days: kept on the wall clock
    std::int64_t seconds = 0;  // the rest: exact
};
std::optional<Duration> parse_duration(std::string_view text);

std::string trim(std::string_view text);

std::string date_text(std::int64_t wall_s);      // "2014-03-15"
std::string day_text(std::int64_t wall_s);       // "Sat 2014-03-15"
std::string clock_text(std::int64_t wall_s);     // "09:30", with seconds unless they are 0
std::string compact_text(const Moment& moment);  // as the store keeps occurrences
std::string instant_text(std::int64_t utc_s, const Zone& zone);  // "2014-03-15T09:30:00+01:00"
std::string duration_text(std::int64_t seconds);                 // "1h30m", "2d", "0m"

}  // namespace calendar_text
