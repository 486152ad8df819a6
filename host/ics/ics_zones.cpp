// SPDX-License-Identifier: Apache-2.0
//
// Which Olson zone a TZID means. One object per calendar of a file; one thread.
#include "host/ics/ics_zones.h"

#include <fmt/format.h>
#include <unicode/ucal.h>
#include <unicode/uenum.h>
#include <unicode/ustring.h>

#include <algorithm>
#include <functional>
#include <vector>

namespace qor {
namespace {

using Utf16 = std::vector<UChar>;

Utf16 utf16(const std::string& text) {
    Utf16 wide(text.size() + 1);
    int32_t length = 0;
    UErrorCode status = U_ZERO_ERROR;
    u_strFromUTF8(wide.data(), static_cast<int32_t>(wide.size()), &length, text.data(),
                  static_cast<int32_t>(text.size()), &status);
    wide.resize(U_FAILURE(status) ? 1 : static_cast<std::size_t>(length) + 1);
    wide.back() = 0;
    return wide;
}

std::string ascii(const UChar* text, int32_t length) {
    std::string result;
    for (int32_t i = 0; i < length; ++i) {
        result += static_cast<char>(text[i]);
    }
    return result;
}

// The zone that people would name for a region of equal clocks: Europe/Berlin for
// Arctic/Longyearbyen.
std::string best_known_zone(const std::string& zone) {
    UChar windows[128];
    UChar result[128];
    UErrorCode status = U_ZERO_ERROR;
    const int32_t named = ucal_getWindowsTimeZoneID(utf16(zone).data(), -1, windows, 128, &status);
    if (U_FAILURE(status) || named == 0) {
        return zone;
    }
    const int32_t length =
        ucal_getTimeZoneIDForWindowsID(windows, named, nullptr, result, 128, &status);
    return U_FAILURE(status) || length == 0 ? zone : ascii(result, length);
}

constexpr int kComparedYears = 3;
constexpr int kLaterYear = 2030;      // no zone's table foresees a change after it
constexpr int kLaterExceptions = 18;  // of 72: summer time that begins and ends a month apart

// Offsets from UTC on the 1st and 16th of each month, as a zone's rules give them.
std::vector<int> offsets(icaltimezone* rules, int year) {
    std::vector<int> result;
    for (int month = 0; month < 12 * kComparedYears; ++month) {
        for (const int day : {1, 16}) {
            icaltimetype time = icaltime_null_time();
            time.year = year + month / 12;
            time.month = month % 12 + 1;
            time.day = day;
            time.hour = 12;
            time.zone = icaltimezone_get_utc_timezone();
            int is_daylight = 0;
            result.push_back(icaltimezone_get_utc_offset_of_utc_time(rules, &time, &is_daylight));
        }
    }
    return result;
}

// Whether the zone has these offsets, save at most `exceptions` of them.
bool has_offsets(const std::string& zone, int year, const std::vector<int>& expected,
                 int exceptions) {
    std::size_t at = 0;
    for (int month = 0; month < 12 * kComparedYears; ++month) {
        for (const int day : {1, 16}) {
            const std::int64_t instant =
                utc_instant({year + month / 12, month % 12 + 1, day, 12, 0, 0});
            const int wanted = expected[at++];
            const auto wall = wall_time(instant, zone);
            if ((!wall || utc_instant(*wall) - instant != wanted) && exceptions-- == 0) {
                return false;
            }
        }
    }
    return true;
}

bool changes(const std::vector<int>& offsets) {
    return std::ranges::adjacent_find(offsets, std::not_equal_to()) != offsets.end();
}

// A zone whose clocks go as these rules do; empty when there is none. Zones went alike for years
// and then parted, so it should do nearly the same later on, where the rules tell of later.
std::string zone_with_rules(icaltimezone* rules, int year) {
    const std::vector<int> expected = offsets(rules, year);
    const std::vector<int> later = offsets(rules, kLaterYear);
    const bool rules_end = changes(expected) && !changes(later);
    std::vector<std::pair<int, std::string>> votes;  // of all regions for their best known zone
    std::string parted;
    UErrorCode status = U_ZERO_ERROR;
    UEnumeration* zones = ucal_openTimeZoneIDEnumeration(UCAL_ZONE_TYPE_CANONICAL_LOCATION, nullptr,
                                                         nullptr, &status);
    int32_t length = 0;
    while (!U_FAILURE(status)) {
        const char* id = uenum_next(zones, &length, &status);
        if (id == nullptr) {
            break;
        }
        if (!has_offsets(id, year, expected, 0)) {
            continue;
        }
        const std::string better = best_known_zone(id);
        const std::string zone = has_offsets(better, year, expected, 0) ? better : id;
        if (!rules_end && !has_offsets(zone, kLaterYear, later, kLaterExceptions)) {
            parted = zone;
            continue;
        }
        const auto vote = std::ranges::find(votes, zone, &std::pair<int, std::string>::second);
        ++(vote == votes.end() ? votes.emplace_back(0, zone) : *vote).first;
    }
    uenum_close(zones);
    const auto most = std::ranges::max_element(votes, {}, &std::pair<int, std::string>::first);
    return most == votes.end() ? parted : most->second;
}

}  // namespace

std::int64_t IcsZone::instant(const WallTime& time) const {
    if (rules == nullptr) {
        return instant_of(time, olson).value_or(utc_instant(time));
    }
    icaltimetype wall = icaltime_null_time();
    wall.year = time.year;
    wall.month = time.month;
    wall.day = time.day;
    wall.hour = time.hour;
    wall.minute = time.minute;
    wall.second = time.second;
    wall = icaltime_normalize(wall);
    int is_daylight = 0;
    return utc_instant(time) - icaltimezone_get_utc_offset(rules, &wall, &is_daylight);
}

WallTime IcsZone::wall(std::int64_t instant_s) const {
    std::int64_t shown = instant_s;
    if (rules != nullptr) {
        const WallTime utc = wall_time(instant_s, kUtcZone).value_or(WallTime{});
        icaltimetype time = icaltime_null_time();
        time.year = utc.year;
        time.month = utc.month;
        time.day = utc.day;
        time.hour = utc.hour;
        time.minute = utc.minute;
        time.second = utc.second;
        time.zone = icaltimezone_get_utc_timezone();
        int is_daylight = 0;
        shown += icaltimezone_get_utc_offset_of_utc_time(rules, &time, &is_daylight);
    }
    return wall_time(shown, rules == nullptr ? olson : kUtcZone).value_or(WallTime{});
}

std::string olson_zone(const std::string& name) {
    if (is_utc_zone(name)) {
        return kUtcZone;
    }
    // "/example.org/20210210_1/Europe/Berlin": the id is what follows some slash.
    for (std::size_t at = 0; at != std::string::npos && at < name.size();) {
        std::string tail = name.substr(at);
        if (is_known_zone(tail) && (at == 0 || tail.find('/') != std::string::npos)) {
            return tail;
        }
        const std::size_t slash = name.find('/', at);
        at = slash == std::string::npos ? slash : slash + 1;
    }
    if (const std::size_t dash = name.find('-'); dash != std::string::npos) {
        std::string with_slash = name;  // "America-Chicago"
        with_slash[dash] = '/';
        if (is_known_zone(with_slash)) {
            return with_slash;
        }
    }
    UChar result[128];
    UErrorCode status = U_ZERO_ERROR;
    const int32_t length =
        ucal_getTimeZoneIDForWindowsID(utf16(name).data(), -1, nullptr, result, 128, &status);
    return U_FAILURE(status) ? std::string() : ascii(result, length);
}

std::string local_zone() {
    UChar result[128];
    UErrorCode status = U_ZERO_ERROR;
    const int32_t length = ucal_getHostTimeZone(result, 128, &status);
    const std::string zone = U_FAILURE(status) ? std::string() : ascii(result, length);
    const std::string known = olson_zone(zone);
    return known.empty() ? kUtcZone : known;
}

IcsZones::IcsZones(std::string floating, IcsReport& report) : report_(report) {
    floating_.olson = std::move(floating);
}

bool IcsZones::add(const char* vtimezone) {
    IcalComponent component(icalparser_parse_string(vtimezone));
    if (!component || icalcomponent_isa(component.get()) != ICAL_VTIMEZONE_COMPONENT) {
        return false;
    }
    IcalZone zone(icaltimezone_new());
    if (!zone || icaltimezone_set_component(zone.get(), component.get()) == 0) {
        return false;
    }
    static_cast<void>(component.release());  // the zone owns it now
    const char* id = icaltimezone_get_tzid(zone.get());
    if (id == nullptr) {
        return false;
    }
    rules_.emplace(id, std::move(zone));
    return true;
}

std::optional<IcsZone> IcsZones::by_name(const std::string& tzid) const {
    if (const std::string olson = olson_zone(tzid); !olson.empty()) {
        return IcsZone{olson, nullptr};
    }
    const auto rules = rules_.find(tzid);
    const char* location =
        rules == rules_.end() ? nullptr : icaltimezone_get_location(rules->second.get());
    const std::string olson = location == nullptr ? std::string() : olson_zone(location);
    return olson.empty() ? std::nullopt : std::optional(IcsZone{olson, nullptr});
}

IcsZone IcsZones::by_rules(const std::string& tzid, icaltimezone* rules, int year) {
    // Producers describe the zone's present rules; long before and after, tables differ.
    year = std::clamp(year, 1990, 2034);
    const std::string olson = zone_with_rules(rules, year);
    if (!olson.empty()) {
        report_.zones[tzid] =
            fmt::format("{}, whose clocks go as the file's VTIMEZONE says", olson);
        return {olson, nullptr};
    }
    report_.zones[tzid] =
        "times computed from the file's VTIMEZONE, stored in UTC; no known zone "
        "has its rules, so a recurring event may be off when clocks change";
    return {"", rules};
}

const IcsZone& IcsZones::find(const std::string& tzid, int year) {
    if (const auto known = known_.find(tzid); known != known_.end()) {
        return known->second;
    }
    if (const std::optional<IcsZone> zone = by_name(tzid)) {
        if (zone->olson != tzid && zone->olson != kUtcZone) {
            report_.zones[tzid] = zone->olson;
        }
        return known_.emplace(tzid, *zone).first->second;
    }
    const auto rules = rules_.find(tzid);
    if (rules != rules_.end()) {
        return known_.emplace(tzid, by_rules(tzid, rules->second.get(), year)).first->second;
    }
    report_.zones[tzid] = fmt::format("not known, and no VTIMEZONE; taken as {}", floating_.olson);
    return known_.emplace(tzid, floating_).first->second;
}

}  // namespace qor
