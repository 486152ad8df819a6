// SPDX-License-Identifier: Apache-2.0
//
// Times: the first byte chooses a zone, the next eight are a number, the rest is read as a
// date-time, as milliseconds, as a duration, as coordinates and as a zone.
#include <sanitizer/lsan_interface.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "common/owned.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"

namespace {

void check(bool holds) {
    if (!holds) {
        std::abort();
    }
}

calendar_time_s end_of(const calendar_time_s& start, const char* duration) {
    calendar_record_h record = nullptr;
    check(calendar_record_create(_calendar_event._uri, &record) == 0);
    const Record event(record);
    calendar_time_s end{};
    check(calendar_record_set_caltime(record, _calendar_event.start_time, start) == 0 &&
          __qor_calendar_get_day(duration, record) == 0 &&
          calendar_record_get_caltime(record, _calendar_event.end_time, &end) == 0);
    return end;
}

void travel(const char* text, double degrees) {
    calendar_record_h record = nullptr;
    check(calendar_record_create(_calendar_event._uri, &record) == 0);
    const Record event(record);
    char* made = nullptr;
    check(_qor_calendar_parse_latitude(text, record) == 0 &&
          calendar_record_set_double(record, _calendar_event.longitude, degrees) == 0 &&
          _qor_calendar_make_longitude(record, &made) == 0);
    const MallocText owned(made);
    check(!owned || std::strspn(owned.get(), "-0123456789") == std::strlen(owned.get()));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    int64_t number = 0;
    int fields[2];
    double degrees = 0;
    if (size < 1 + sizeof(number)) {
        return 0;
    }
    std::memcpy(&number, data + 1, sizeof(number));
    std::memcpy(fields, data + 1, sizeof(fields));
    std::memcpy(&degrees, data + 1, sizeof(degrees));
    const std::string rest(reinterpret_cast<const char*>(data + 1 + sizeof(number)),
                           size - 1 - sizeof(number));
    const char* text = rest.c_str();
    const char* const zones[] = {nullptr, "Asia/Tokyo", "America/New_York", "Etc/GMT+9", text};
    const char* zone = zones[data[0] % std::size(zones)];

    static_cast<void>(_qor_calendar_convert_stol(zone, text));
    static_cast<void>(_qor_calendar_convert_dtol(zone, fields[0], fields[1], fields[0], fields[1],
                                                 fields[0], fields[1]));
    const MallocText written(_qor_calendar_convert_ltos(zone, number, (data[0] & 64U) != 0));
    check(written != nullptr && std::strlen(written.get()) < 32);

    calendar_time_s value{};
    check(_qor_calendar_parse_caltime(0, text, &value) == 0 && value.type == CALENDAR_TIME_UTIME);
    value.time.utime = number;
    check(end_of(value, text).time.utime >= number);
    calendar_time_s date{};
    date.type = CALENDAR_TIME_LOCALTIME;
    date.time.date = {fields[0], fields[1], fields[0], fields[1], 0, 0, false};
    check(end_of(date, text).type == CALENDAR_TIME_LOCALTIME);
    travel(text, degrees);

    // Each of these leaves a calendar open, so that there are not many of them.
    static int left = 100;
    if (left > 0) {
        --left;
        const __lsan::ScopedDisabler leaks_on_purpose;
        check(_qor_calendar_set_allday(0, &value) == 0 && value.type == CALENDAR_TIME_LOCALTIME);
    }
    return 0;
}
