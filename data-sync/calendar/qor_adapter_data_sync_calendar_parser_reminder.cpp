// SPDX-License-Identifier: Apache-2.0
//
// Reminders. The two directions differ on purpose: alarms are read in minutes only, but written
// from any unit, so that two hours come back as 120 minutes.
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_reminder.h"

#include <cstdio>
#include <cstring>

#include "common/log.h"
#include "common/number.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/calendar/event_members.h"

namespace {

constexpr char kMethodName[] = "method";
constexpr char kMinutesName[] = "minutes";
constexpr char kMethodAlert[] = "1";

constexpr int kSecondsPerMinute = 60;

bool set_minutes(calendar_record_h alarm, const char* minutes) {
    return calendar_record_set_int(alarm, _calendar_alarm.tick, to_int32(minutes)) == 0 &&
           calendar_record_set_int(alarm, _calendar_alarm.tick_unit,
                                   CALENDAR_ALARM_TIME_UNIT_MINUTE) == 0;
}

// In 32 bits, wrapping around, the division truncating toward zero.
int32_t to_minutes(int tick, int unit) {
    return static_cast<int32_t>(static_cast<uint32_t>(tick) * static_cast<uint32_t>(unit)) /
           kSecondsPerMinute;
}

}  // namespace

int _qor_calendar_parse_reminder_from_json(qor_adapters_json_parse_buffer* element,
                                           calendar_record_h alarm) {
    JsonWalk walk = walk_json_children(element);
    qor_adapters_json_parse_buffer member;
    while (next_json_child(&walk, &member) != 0) {
        const JsonValue value(&member);
        if (member.name == nullptr) {
            continue;
        }
        if (std::strcmp(member.name, kErrorName) == 0) {
            return kError;
        }
        const char* const text = json_text(member);
        if (std::strcmp(member.name, kMinutesName) == 0 && text != nullptr &&
            !set_minutes(alarm, text)) {
            QOR_LOG(CRITICAL, "set fail");
            return kError;
        }
    }
    return 0;
}

int _qor_calendar_parse_make_reminder_to_json(calendar_record_h alarm, JsonObject* object) {
    if (object == nullptr) {
        return kError;
    }
    json_object_set_string_member(object, kMethodName, kMethodAlert);
    int tick = 0;
    int unit = 0;
    if (calendar_record_get_int(alarm, _calendar_alarm.tick, &tick) != 0 ||
        calendar_record_get_int(alarm, _calendar_alarm.tick_unit, &unit) != 0) {
        QOR_LOG(CRITICAL, "get fail");
        return kError;
    }
    if (unit == CALENDAR_ALARM_NONE) {
        QOR_LOG(CRITICAL, "alarm none");
        return kError;
    }
    if (unit == CALENDAR_ALARM_TIME_UNIT_SPECIFIC) {
        QOR_LOG(CRITICAL, "tick unit is specific");
        return kError;
    }
    char minutes[256] = {};
    std::snprintf(minutes, sizeof minutes, "%lld", static_cast<long long>(to_minutes(tick, unit)));
    json_object_set_string_member(object, kMinutesName, minutes);
    return 0;
}
