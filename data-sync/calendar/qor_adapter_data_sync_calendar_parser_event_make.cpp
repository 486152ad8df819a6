// SPDX-License-Identifier: Apache-2.0
//
// Writing the event document: an event's own, or the one that cancels one of its occurrences. Texts
// are borrowed from the record; the JSON library copies them. No state between calls.
#include <cstdint>
#include <cstdio>
#include <utility>

#include "common/log.h"
#include "common/number.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/calendar/event_members.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_reminder.h"

namespace {

constexpr char kUtc[] = "Etc/GMT";

// A document in the making. A step that fails leaves its code in error and ends the making.
struct Making {
    calendar_record_h record;
    JsonObject* event;
    int error;
};

void set_text(Making* making, EventKey key, const char* text) {
    json_object_set_string_member(making->event, kEventKeys[key], text);
}

void set_number(Making* making, EventKey key, int64_t number) {
    char text[256] = {};
    std::snprintf(text, sizeof text, "%lld", static_cast<long long>(number));
    set_text(making, key, text);
}

bool add_text(Making* making, EventKey key, unsigned int property) {
    char* text = nullptr;
    making->error = calendar_record_get_str_p(making->record, property, &text);
    if (making->error != 0) {
        return false;
    }
    if (text != nullptr) {
        set_text(making, key, text);
    }
    return true;
}

// An all-day date, as midnight UTC.
void set_date(Making* making, EventKey key, const calendar_time_s& time) {
    const auto& date = time.time.date;
    set_number(making, key,
               to_milliseconds(
                   _qor_calendar_convert_dtol(kUtc, date.year, date.month, date.mday, 0, 0, 0)));
}

bool add_times(Making* making) {
    calendar_time_s start{};
    calendar_time_s end{};
    calendar_record_h const record = making->record;
    making->error = calendar_record_get_caltime(record, _calendar_event.start_time, &start);
    if (making->error == 0) {
        making->error = calendar_record_get_caltime(record, _calendar_event.end_time, &end);
    }
    if (making->error != 0) {
        return false;
    }
    // Deliberate: the kind of the start decides how both are read.
    if (start.type == CALENDAR_TIME_UTIME) {
        set_number(making, kDtstart, to_milliseconds(start.time.utime));
        set_number(making, kDtend, to_milliseconds(end.time.utime));
    } else {
        set_date(making, kDtstart, start);
        set_date(making, kDtend, end);
        set_text(making, kAllDay, "1");
    }
    return true;
}

bool add_has_alarm(Making* making, int* has_alarm) {
    making->error = calendar_record_get_int(making->record, _calendar_event.has_alarm, has_alarm);
    if (making->error != 0) {
        return false;
    }
    set_number(making, kHasAlarm, *has_alarm);
    return true;
}

bool add_reminder(Making* making, JsonArray* reminders, int index) {
    calendar_record_h alarm = nullptr;
    making->error = calendar_record_get_child_record_at_p(
        making->record, _calendar_event.calendar_alarm, index, &alarm);
    if (making->error != 0) {
        return false;
    }
    Object element(json_object_new());
    making->error = _qor_calendar_parse_make_reminder_to_json(alarm, element.get());
    if (making->error != 0) {
        return false;
    }
    json_array_add_object_element(reminders, element.release());
    return true;
}

bool add_reminders(Making* making, JsonArray* reminders) {
    int count = 0;
    making->error = calendar_record_get_child_record_count(making->record,
                                                           _calendar_event.calendar_alarm, &count);
    for (int i = 0; making->error == 0 && i < count; ++i) {
        static_cast<void>(add_reminder(making, reminders, i));  // the loop sees the error
    }
    return making->error == 0;
}

bool add_rule(Making* making) {
    char* text = nullptr;
    // Deliberate: the result is not looked at; what was made is written.
    static_cast<void>(_qor_calendar_make_rrule(making->record, &text));
    const MallocText rule(text);
    if (rule) {
        set_text(making, kRrule, rule.get());
    }
    return true;
}

// Names the occurrence that is cancelled; fails, with code 0, when the host does not know its
// event.
bool add_occurrence(Making* making, const char* exdate) {
    int svc_id = 0;
    // A failure leaves the 0, which is no event's id.
    static_cast<void>(calendar_record_get_int(making->record, _calendar_event.id, &svc_id));
    const MallocText cloud_key(_qor_calendar_db_get_cloud_key_from_server(
        _qor_calendar_db_get_id_from_adapter_db(svc_id)));
    if (!cloud_key) {
        return false;
    }
    set_text(making, kOriginalSyncId, cloud_key.get());
    set_number(making, kOriginalInstanceTime,
               to_milliseconds(_qor_calendar_convert_stol(kUtc, exdate)));
    set_text(making, kEventStatus, "2");
    return true;
}

bool add_place(Making* making) {
    char* text = nullptr;
    // Deliberate: unlike a latitude, a longitude that cannot be read is left out.
    static_cast<void>(_qor_calendar_make_longitude(making->record, &text));
    const MallocText longitude(text);
    if (longitude) {
        set_text(making, kLongitude, longitude.get());
    }
    text = nullptr;
    making->error = _qor_calendar_make_latitude(making->record, &text);
    const MallocText latitude(text);
    if (making->error == 0 && latitude) {
        set_text(making, kLatitude, latitude.get());
    }
    return making->error == 0;
}

// The members before the reminders.
bool begin_event(Making* making, bool is_cancelled, int* has_alarm) {
    if (!add_text(making, kTitle, _calendar_event.summary) ||
        !add_text(making, kEventLocation, _calendar_event.location) ||
        !add_text(making, kDescription, _calendar_event.description)) {
        return false;
    }
    if (!is_cancelled) {
        set_text(making, kEventStatus, "0");
    }
    if (!add_times(making) || !add_text(making, kEventTimezone, _calendar_event.start_tzid)) {
        return false;
    }
    set_text(making, kAccessLevel, "0");
    return add_has_alarm(making, has_alarm);
}

// The members after them.
bool end_event(Making* making, const char* exdate) {
    if (exdate != nullptr ? !add_occurrence(making, exdate) : !add_rule(making)) {
        return false;
    }
    set_text(making, kHasAttendeeData, "0");
    return add_text(making, kOrganizer, _calendar_event.organizer_name) && add_place(making);
}

// Writes the document's text. Returns null, or the constructor that gave nothing.
const char* write_document(Object event, Array reminders, char** text, size_t* length) {
    const Generator generator(json_generator_new());
    if (!generator) {
        return "json_generator_new";
    }
    const Node node(json_node_new(JSON_NODE_OBJECT));
    if (!node) {
        return "json_node_new";
    }
    Object root(json_object_new());
    if (!root) {
        return "json_object_new";
    }
    json_object_set_object_member(root.get(), kEventName, event.release());
    if (reminders) {
        json_object_set_array_member(root.get(), kRemindersName, reminders.release());
    }
    json_node_take_object(node.get(), root.release());
    json_generator_set_root(generator.get(), node.get());
    *text = json_generator_to_data(generator.get(), length);
    return nullptr;
}

}  // namespace

int _qor_calendar_parse_make_event_to_json(calendar_record_h record, const char* exdate,
                                           char** text, size_t* length) {
    if (record == nullptr || text == nullptr) {
        return kError;
    }
    Object event(json_object_new());
    if (!event) {
        QOR_LOG(CRITICAL, "json_object_new fail");
        return kServiceFailed;
    }
    Making making{record, event.get(), 0};
    Array reminders;
    int has_alarm = 0;
    bool made = begin_event(&making, exdate != nullptr, &has_alarm);
    if (made && has_alarm >= 1) {
        reminders.reset(json_array_new());
        if (!reminders) {
            QOR_LOG(CRITICAL, "json_array_new fail");
            return kServiceFailed;
        }
        made = add_reminders(&making, reminders.get());
    }
    made = made && end_event(&making, exdate);
    if (!made) {
        QOR_LOG(CRITICAL, "get error(%x)", static_cast<unsigned int>(making.error));
        return kServiceFailed;
    }
    const char* const missing =
        write_document(std::move(event), std::move(reminders), text, length);
    if (missing != nullptr) {
        QOR_LOG(CRITICAL, "%s fail", missing);
        return kServiceFailed;
    }
    return 0;
}
