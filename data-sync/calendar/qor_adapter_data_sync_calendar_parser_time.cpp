// SPDX-License-Identifier: Apache-2.0
//
// Times: date-time texts, instants and durations through ICU's C calendar interface, and the record
// check that all of recurrence and time starts with. Each operation opens a calendar of its own; no
// state between calls.
#include <unicode/ucal.h>
#include <unicode/ustring.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <iterator>
#include <limits>

#include "common/log.h"
#include "common/number.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"

namespace {

using ZoneText = Owned<UChar, std::free>;

constexpr char kUtc[] = "Etc/GMT";
constexpr char kLocale[] = "en_US";
constexpr double kMsPerSecond = 1000.0;

struct DateTime {
    int year = 0;
    int month = 0;  // 1 to 12
    int mday = 0;
    int hour = 0;
    int minute = 0;
    int second = 0;
};

// A sum that stops at the limits of its type.
template <typename T>
T add_clamped(T a, T b) {
    T sum = 0;
    if (__builtin_add_overflow(a, b, &sum)) {
        return b < 0 ? std::numeric_limits<T>::min() : std::numeric_limits<T>::max();
    }
    return sum;
}

double to_ms(int64_t seconds) {
    return static_cast<double>(seconds) * kMsPerSecond;
}
int64_t to_seconds(double ms) {
    return to_int64(ms / kMsPerSecond);
}

// ICU opens a zone that it does not know as UTC, with success.
bool is_unknown_zone(const UCalendar* calendar) {
    constexpr char16_t kUnknownZone[] = u"Etc/Unknown";
    UChar id[std::size(kUnknownZone)];
    UErrorCode status = U_ZERO_ERROR;
    ucal_getTimeZoneID(calendar, id, std::size(kUnknownZone), &status);
    return U_SUCCESS(status) && u_strcmp(id, kUnknownZone) == 0;  // a longer id is a failed status
}

// Reads the fields of a text. What the text lacks stays 0. Deliberate: separator and suffix are not
// examined, so that a Z never makes a text UTC.
DateTime scan_date_time(const char* text) {
    DateTime t;
    static_cast<void>(std::sscanf(text, "%4d%2d%2d%*c%2d%2d%2d", &t.year, &t.month, &t.mday,
                                  &t.hour, &t.minute, &t.second));
    return t;
}

// Reads a wall-clock time as UTC without ICU.
int64_t utc_seconds(const DateTime& t) {
    std::tm fields{};
    fields.tm_year = add_clamped(t.year, -1900);
    fields.tm_mon = add_clamped(t.month, -1);
    fields.tm_mday = t.mday;
    fields.tm_hour = t.hour;
    fields.tm_min = t.minute;
    fields.tm_sec = t.second;
    return timegm(&fields);
}

// The date on which a calendar stands; nothing once the status is a failure.
void get_date(const UCalendar* calendar, DateTime* date, UErrorCode* status) {
    if (U_SUCCESS(*status)) {
        date->year = ucal_get(calendar, UCAL_YEAR, status);
        date->month = ucal_get(calendar, UCAL_MONTH, status) + 1;
        date->mday = ucal_get(calendar, UCAL_DATE, status);
    }
}

calendar_time_s local_date(const DateTime& date) {
    calendar_time_s value{};
    value.type = CALENDAR_TIME_LOCALTIME;
    value.time.date.year = date.year;
    value.time.date.month = date.month;
    value.time.date.mday = date.mday;
    return value;
}

// Moves a local date by days; on a failure it stays.
UErrorCode add_days(UCalendar* calendar, int days, calendar_time_s* value) {
    auto& date = value->time.date;
    UErrorCode status = U_ZERO_ERROR;
    ucal_setDate(calendar, date.year, add_clamped(date.month, -1), date.mday, &status);
    if (U_SUCCESS(status)) {
        ucal_add(calendar, UCAL_DATE, days, &status);
    }
    DateTime moved;
    get_date(calendar, &moved, &status);
    if (U_SUCCESS(status)) {
        date.year = moved.year;
        date.month = moved.month;
        date.mday = moved.mday;
    }
    return status;
}

struct DurationUnit {
    char designator;
    int seconds;
    int days;  // 0: a part of a day
};

constexpr DurationUnit kDurationUnits[] = {
    {'W', 604800, 7}, {'D', 86400, 1}, {'H', 3600, 0}, {'M', 60, 0}, {'S', 1, 0},
};

// Adds up the units of a duration: days for an all-day event, else seconds. Deliberate: the sign is
// skipped, so that it counts forward. A total past 32 bits stops at their limit and is reported.
int add_up(const char* duration, bool all_day, bool* overflow) {
    constexpr int64_t kMaxTotal = std::numeric_limits<int>::max();
    int64_t total = 0;
    char number[8] = {};
    size_t length = 0;
    // A number of eight characters ends the scan; the rest of the text is ignored.
    for (const char* c = duration; *c != '\0' && *c != '\n' && length < sizeof(number); ++c) {
        const auto* unit =
            std::find_if(std::begin(kDurationUnits), std::end(kDurationUnits),
                         [c](const DurationUnit& candidate) { return candidate.designator == *c; });
        if (unit != std::end(kDurationUnits)) {
            const int64_t n = std::strtol(number, nullptr, 10);
            // Deliberate: a part of a day sets an all-day count back ("P1DT12H" is no day).
            total =
                all_day && unit->days == 0 ? 0 : total + n * (all_day ? unit->days : unit->seconds);
            *overflow = *overflow || total > kMaxTotal;
            total = std::min(total, kMaxTotal);
            std::memset(number, 0, sizeof(number));
            length = 0;
        } else if (*c == 'P') {
            length = 0;  // Deliberate: the characters collected so far stay in the number.
        } else if (std::strchr("T+-", *c) == nullptr) {
            number[length++] = *c;
        }
    }
    return static_cast<int>(total);
}

}  // namespace

int __qor_calendar_get_record_type(calendar_record_h record) {
    const char* uri = nullptr;
    if (calendar_record_get_uri_p(record, &uri) != CALENDAR_ERROR_NONE || uri == nullptr) {
        return kOtherRecord;
    }
    // Deliberate: to-do records are refused like any other record, though they have like
    // properties.
    return std::strcmp(uri, _calendar_event._uri) == 0 ? kEventRecord : kOtherRecord;
}

UCalendar* __qor_calendar_get_ucal(const char* zone) {
    const char* id = zone != nullptr ? zone : kUtc;
    const ZoneText text{static_cast<UChar*>(std::calloc(std::strlen(id) + 1, sizeof(UChar)))};
    if (!text) {
        QOR_LOG(CRITICAL, "Failed to calloc");
        return nullptr;
    }
    u_uastrcpy(text.get(), id);
    UErrorCode status = U_ZERO_ERROR;
    Ucal calendar{ucal_open(text.get(), u_strlen(text.get()), kLocale, UCAL_DEFAULT, &status)};
    if (U_FAILURE(status)) {
        QOR_LOG(CRITICAL, "ucal_open failed (%s)", u_errorName(status));
        return nullptr;
    }
    if (is_unknown_zone(calendar.get())) {
        QOR_LOG(CRITICAL, "unknown zone [%.64s], taken as UTC", id);
    }
    return calendar.release();
}

int64_t _qor_calendar_convert_dtol(const char* zone, int year, int month, int mday, int hour,
                                   int minute, int second) {
    const Ucal calendar{__qor_calendar_get_ucal(zone)};
    if (!calendar) {
        QOR_LOG(CRITICAL, "__qor_calendar_get_ucal() fail, taken as UTC");
        return utc_seconds({year, month, mday, hour, minute, second});
    }
    // Deliberate: the milliseconds of the moment of opening stay. Truncation drops them from 1970
    // on; an earlier instant comes out one second late unless they are 0.
    ucal_set(calendar.get(), UCAL_YEAR, year);
    ucal_set(calendar.get(), UCAL_MONTH, add_clamped(month, -1));
    ucal_set(calendar.get(), UCAL_DATE, mday);
    ucal_set(calendar.get(), UCAL_HOUR_OF_DAY, hour);
    ucal_set(calendar.get(), UCAL_MINUTE, minute);
    ucal_set(calendar.get(), UCAL_SECOND, second);
    UErrorCode ignored = U_ZERO_ERROR;  // a lenient calendar rolls every field over
    return to_seconds(ucal_getMillis(calendar.get(), &ignored));
}

int64_t _qor_calendar_convert_stol(const char* zone, const char* text) {
    constexpr size_t kDateLength = 8;
    DateTime t;
    if (text == nullptr) {
        QOR_LOG(CRITICAL, "no text");
    } else if (std::strlen(text) == kDateLength) {
        static_cast<void>(std::sscanf(text, "%4d%2d%2d", &t.year, &t.month, &t.mday));
    } else {
        t = scan_date_time(text);
    }
    return _qor_calendar_convert_dtol(zone, t.year, t.month, t.mday, t.hour, t.minute, t.second);
}

char* _qor_calendar_convert_ltos(const char* zone, int64_t seconds, bool all_day) {
    const char* id = zone != nullptr ? zone : kUtc;
    const Ucal calendar{__qor_calendar_get_ucal(id)};
    if (!calendar) {
        QOR_LOG(CRITICAL, "__qor_calendar_get_ucal() fail");
        return nullptr;
    }
    UErrorCode status = U_ZERO_ERROR;
    ucal_setMillis(calendar.get(), to_ms(seconds), &status);
    if (U_FAILURE(status)) {
        QOR_LOG(CRITICAL, "ucal_setMillis failed (%s)", u_errorName(status));
        return nullptr;
    }
    DateTime t;
    get_date(calendar.get(), &t, &status);
    t.hour = ucal_get(calendar.get(), UCAL_HOUR_OF_DAY, &status);
    t.minute = ucal_get(calendar.get(), UCAL_MINUTE, &status);
    t.second = ucal_get(calendar.get(), UCAL_SECOND, &status);
    if (U_FAILURE(status)) {
        QOR_LOG(CRITICAL, "ucal_get failed (%s)", u_errorName(status));
        return nullptr;
    }
    char text[32];
    if (all_day) {
        std::snprintf(text, sizeof(text), "%04d%02d%02d", t.year, t.month, t.mday);
    } else {
        // Deliberate: a prefix decides, so that offset zones ("Etc/GMT+9") get the Z of UTC too.
        const char* suffix = std::strncmp(id, kUtc, std::strlen(kUtc)) == 0 ? "Z" : "";
        std::snprintf(text, sizeof(text), "%04d%02d%02dT%02d%02d%02d%s", t.year, t.month, t.mday,
                      t.hour, t.minute, t.second, suffix);
    }
    return strdup(text);
}

int _qor_calendar_parse_caltime(int which, const char* milliseconds, calendar_time_s* value) {
    if (milliseconds == nullptr || value == nullptr) {
        QOR_LOG(CRITICAL, "no text or no value");
        return kSuccess;
    }
    const bool was_all_day = value->type == CALENDAR_TIME_LOCALTIME;
    value->type = CALENDAR_TIME_UTIME;
    value->time.utime = to_seconds(static_cast<double>(std::strtoll(milliseconds, nullptr, 10)));
    if (was_all_day) {
        // A failure leaves the instant, which is still the right one.
        static_cast<void>(_qor_calendar_set_allday(which, value));
    }
    return kSuccess;
}

int _qor_calendar_set_allday([[maybe_unused]] int which, calendar_time_s* value) {
    constexpr size_t kZoneUnits = 8;
    static_assert(sizeof(kUtc) <= kZoneUnits);
    if (value == nullptr) {
        return kNothing;
    }
    if (value->type == CALENDAR_TIME_LOCALTIME) {
        return kSuccess;
    }
    ZoneText zone{static_cast<UChar*>(std::calloc(kZoneUnits, sizeof(UChar)))};
    if (!zone) {
        QOR_LOG(CRITICAL, "Failed to calloc");
        return kSuccess;  // Deliberate: the value stays an instant and the caller goes on.
    }
    u_uastrcpy(zone.get(), kUtc);
    UErrorCode status = U_ZERO_ERROR;
    // Deliberate: this calendar, alone among those of this module, is never closed.
    UCalendar* calendar =
        ucal_open(zone.get(), u_strlen(zone.get()), kLocale, UCAL_DEFAULT, &status);
    zone.reset();
    if (U_FAILURE(status)) {
        return kNothing;
    }
    ucal_setMillis(calendar, static_cast<double>(to_int64(to_ms(value->time.utime))), &status);
    DateTime date;
    get_date(calendar, &date, &status);
    if (U_FAILURE(status)) {
        return kNothing;
    }
    *value = local_date(date);
    return kSuccess;
}

int __qor_calendar_get_day(const char* duration, calendar_record_h record) {
    calendar_time_s end{};  // the start, until the duration has been added
    if (calendar_record_get_caltime(record, _calendar_event.start_time, &end) !=
        CALENDAR_ERROR_NONE) {
        return kServiceFailed;
    }
    const bool all_day = end.type == CALENDAR_TIME_LOCALTIME;
    bool overflow = false;
    const int total = duration != nullptr ? add_up(duration, all_day, &overflow) : 0;
    if (overflow) {
        QOR_LOG(CRITICAL, "duration too long [%.64s], cut to %d", duration, total);
    }
    if (!all_day) {
        end.time.utime = add_clamped(end.time.utime, int64_t{total});
    } else if (total != 0) {
        const Ucal calendar{__qor_calendar_get_ucal(kUtc)};
        if (!calendar) {
            QOR_LOG(CRITICAL, "__qor_calendar_get_ucal() fail");
        } else if (const UErrorCode status = add_days(calendar.get(), total, &end);
                   U_FAILURE(status)) {
            // Deliberate: the text of the millisecond call serves the date calls too.
            QOR_LOG(CRITICAL, "ucal_setMillis failed (%s)", u_errorName(status));
        }
    }
    // Deliberate: an end that the service refuses is no failure of the event.
    static_cast<void>(calendar_record_set_caltime(record, _calendar_event.end_time, end));
    return kSuccess;
}

int __qor_calendar_parse_until(const char* value, calendar_record_h record) {
    if (value == nullptr || __qor_calendar_get_record_type(record) != kEventRecord) {
        return kNotAnEvent;
    }
    int error = calendar_record_set_int(record, _calendar_event.range_type, CALENDAR_RANGE_UNTIL);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_int() fail (%x)", error);
        return kServiceFailed;
    }
    char* zone = nullptr;
    error = calendar_record_get_str_p(record, _calendar_event.start_tzid, &zone);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "get_str_p() fail (%x)", error);
        return kServiceFailed;
    }
    calendar_time_s start{};
    error = calendar_record_get_caltime(record, _calendar_event.start_time, &start);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "get_caltime() fail (%x)", error);
        return kServiceFailed;
    }
    calendar_time_s until{};
    if (start.type == CALENDAR_TIME_LOCALTIME) {
        const DateTime date = scan_date_time(value);
        if (date.month < 1 || date.month > 12 || date.mday < 1 || date.mday > 31) {
            // Deliberate: reported, and stored as written all the same.
            QOR_LOG(CRITICAL, "invalid time:[%s]%d/%d/%d", value, date.year, date.month, date.mday);
        }
        until = local_date(date);
    } else {
        // Deliberate: wall-clock time of the event's zone, whatever suffix the text carries, though
        // the rule maker writes UTC.
        until.time.utime = _qor_calendar_convert_stol(zone, value);
    }
    error = calendar_record_set_caltime(record, _calendar_event.until_time, until);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_caltime() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}
