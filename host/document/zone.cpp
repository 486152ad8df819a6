// SPDX-License-Identifier: Apache-2.0
//
// Time zones through ICU's calendars. Opening one costs far more than a conversion, so each thread
// keeps those that it has used.
#include "host/document/zone.h"

#include <unicode/ucal.h>
#include <unicode/ustring.h>

#include <chrono>
#include <memory>
#include <unordered_map>
#include <vector>

namespace qor {
namespace {

struct CloseCalendar {
    void operator()(UCalendar* calendar) const noexcept { ucal_close(calendar); }
};
using Calendar = std::unique_ptr<UCalendar, CloseCalendar>;

std::vector<UChar> utf16(const std::string& text) {
    std::vector<UChar> wide(text.size() + 1);
    u_uastrcpy(wide.data(), text.c_str());
    return wide;
}

Calendar open_calendar(const std::string& zone) {
    if (!is_known_zone(zone)) {
        return nullptr;
    }
    const std::vector<UChar> id = utf16(zone);
    UErrorCode status = U_ZERO_ERROR;
    Calendar calendar(ucal_open(id.data(), -1, "en_US", UCAL_GREGORIAN, &status));
    if (U_FAILURE(status)) {
        return nullptr;
    }
    // Dates before 1582 count as today's calendar does, on both sides of a conversion.
    ucal_setGregorianChange(calendar.get(), -8.64e15, &status);
    return U_FAILURE(status) ? nullptr : std::move(calendar);
}

UCalendar* calendar_of(const std::string& zone) {
    thread_local std::unordered_map<std::string, Calendar> calendars;
    const auto found = calendars.find(zone);
    if (found != calendars.end()) {
        return found->second.get();
    }
    return calendars.emplace(zone, open_calendar(zone)).first->second.get();
}

}  // namespace

bool is_known_zone(const std::string& zone) {
    if (zone.empty() || zone.size() > 100) {
        return false;
    }
    const std::vector<UChar> id = utf16(zone);
    UChar canonical[128];
    UBool system_id = 0;
    UErrorCode status = U_ZERO_ERROR;
    ucal_getCanonicalTimeZoneID(id.data(), -1, canonical, 128, &system_id, &status);
    return !U_FAILURE(status) && system_id != 0 && zone != "Etc/Unknown";
}

bool is_utc_zone(const std::string& zone) {
    for (const char* name : {"Etc/GMT", "UTC", "Etc/UTC", "GMT", "Z", "Zulu", "Etc/Zulu", "Etc/UCT",
                             "UCT", "Universal", "Etc/Universal", "Etc/GMT0", "Etc/GMT+0",
                             "Etc/GMT-0", "GMT0", "Greenwich", "Etc/Greenwich"}) {
        if (zone == name) {
            return true;
        }
    }
    return false;
}

std::optional<std::int64_t> instant_of(const WallTime& time, const std::string& zone,
                                       RepeatedHour repeated) {
    UCalendar* calendar = calendar_of(zone);
    if (calendar == nullptr) {
        return std::nullopt;
    }
    ucal_setAttribute(calendar, UCAL_REPEATED_WALL_TIME,
                      repeated == RepeatedHour::kFirst ? UCAL_WALLTIME_FIRST : UCAL_WALLTIME_LAST);
    UErrorCode status = U_ZERO_ERROR;
    ucal_clear(calendar);
    ucal_setDateTime(calendar, time.year, time.month - 1, time.day, time.hour, time.minute,
                     time.second, &status);
    const UDate millis = ucal_getMillis(calendar, &status);
    if (U_FAILURE(status)) {
        return std::nullopt;
    }
    return static_cast<std::int64_t>(millis / 1000.0);
}

std::int64_t utc_instant(const WallTime& time) {
    using namespace std::chrono;
    const year_month first = year(time.year) / January + months(time.month - 1);
    const sys_days day = sys_days(first / 1) + days(time.day - 1);
    return sys_seconds(day).time_since_epoch().count() + time.hour * 3600LL + time.minute * 60LL +
           time.second;
}

std::optional<WallTime> wall_time(std::int64_t instant_s, const std::string& zone) {
    UCalendar* calendar = calendar_of(zone);
    if (calendar == nullptr) {
        return std::nullopt;
    }
    UErrorCode status = U_ZERO_ERROR;
    ucal_setMillis(calendar, static_cast<double>(instant_s) * 1000.0, &status);
    const auto field = [&](UCalendarDateFields name) { return ucal_get(calendar, name, &status); };
    const WallTime time{field(UCAL_EXTENDED_YEAR), field(UCAL_MONTH) + 1, field(UCAL_DATE),
                        field(UCAL_HOUR_OF_DAY),   field(UCAL_MINUTE),    field(UCAL_SECOND)};
    return U_FAILURE(status) ? std::nullopt : std::optional(time);
}

}  // namespace qor
