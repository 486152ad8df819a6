// SPDX-License-Identifier: Apache-2.0
//
// What the tests of recurrence and time share: an event record, values and the log told as texts.
#pragma once

#include <string>

#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"
#include "tests/support/device_test.h"

inline calendar_time_s instant(int64_t seconds) {
    return {.type = CALENDAR_TIME_UTIME, .time = {.utime = seconds}};
}

inline calendar_time_s date(int year, int month, int mday) {
    return {.type = CALENDAR_TIME_LOCALTIME, .time = {.date = {year, month, mday, 0, 0, 0, false}}};
}

// "1394875800" for an instant, "2014-3-15 0:0:0" for a local date.
inline std::string told(const calendar_time_s& value) {
    const auto& d = value.time.date;
    char text[100];
    std::snprintf(text, sizeof(text), "%d-%d-%d %d:%d:%d%s", d.year, d.month, d.mday, d.hour,
                  d.minute, d.second, d.is_leap_month ? " leap" : "");
    return value.type == CALENDAR_TIME_UTIME ? std::to_string(value.time.utime) : text;
}

class ParserTest : public DeviceTest {
  protected:
    static std::string taken(char* owned_text) {
        const MallocText text(owned_text);
        return text ? text.get() : "(null)";
    }

    // The captured log as "function: text | function: text".
    static std::string logged() {
        std::string all;
        for (const LogLine& line : log()) {
            all += (all.empty() ? "" : " | ") + line.function + ": " + line.text;
        }
        return all;
    }

    static std::string told_time(const Record& record, unsigned int property) {
        calendar_time_s value{};
        EXPECT_EQ(calendar_record_get_caltime(record.get(), property, &value), 0);
        return told(value);
    }

    static Record new_event(const calendar_time_s& start = instant(0), const char* zone = nullptr) {
        Record event = new_record(_calendar_event._uri);
        EXPECT_EQ(calendar_record_set_caltime(event.get(), _calendar_event.start_time, start), 0);
        EXPECT_EQ(calendar_record_set_str(event.get(), _calendar_event.start_tzid, zone), 0);
        return event;
    }
};
