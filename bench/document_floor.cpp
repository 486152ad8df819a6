// SPDX-License-Identifier: Apache-2.0
#include "bench/document_floor.h"

#include <unicode/ustring.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

const calendar_event_view& kEvent = _calendar_event;
constexpr UCalendarDateFields kFields[] = {UCAL_YEAR,        UCAL_MONTH,  UCAL_DATE,
                                           UCAL_HOUR_OF_DAY, UCAL_MINUTE, UCAL_SECOND};

Ucal open_calendar(const char* zone) {
    const Owned<UChar, std::free> id(
        static_cast<UChar*>(std::calloc(std::strlen(zone) + 1, sizeof(UChar))));
    u_uastrcpy(id.get(), zone);
    UErrorCode status = U_ZERO_ERROR;
    return Ucal(ucal_open(id.get(), u_strlen(id.get()), "en_US", UCAL_DEFAULT, &status));
}

// ---- Reading ------------------------------------------------------------------------------------

void read_text(JsonNode* node) {
    GValue value = G_VALUE_INIT;
    json_node_get_value(node, &value);
    static_cast<void>(json_node_get_value_type(node));
    const GText text(g_value_dup_string(&value));
    g_value_unset(&value);
}

void read_members(JsonNode* node) {
    JsonObjectIter members;
    const char* name = nullptr;
    JsonNode* member = nullptr;
    json_object_iter_init_ordered(&members, json_node_get_object(node));
    while (json_object_iter_next_ordered(&members, &name, &member) != FALSE) {
        if (json_node_get_node_type(member) == JSON_NODE_VALUE) {
            read_text(member);
        }
    }
}

void read_tree() {
    const Parser parser(json_parser_new());
    json_parser_load_from_data(parser.get(), kFloorDocument, sizeof kFloorDocument - 1, nullptr);
    const MallocText name(strdup("root"));
    const Node root(json_node_copy(json_parser_get_root(parser.get())));
    JsonObject* const document = json_node_get_object(root.get());
    read_members(root.get());
    read_members(json_object_get_member(document, "EVENT"));
    JsonArray* const reminders = json_node_get_array(json_object_get_member(document, "REMINDERS"));
    for (guint i = 0; i < json_array_get_length(reminders); ++i) {
        read_members(json_array_get_element(reminders, i));
    }
}

void set_time(calendar_record_h record, unsigned int property, const char* text) {
    calendar_time_s time{};
    calendar_record_get_caltime(record, property, &time);
    time.time.utime = std::strtoll(text, nullptr, 10) / 1000;
    calendar_record_set_caltime(record, property, time);
}

void set_until(calendar_record_h record) {
    calendar_record_set_int(record, kEvent.range_type, CALENDAR_RANGE_UNTIL);
    char* zone = nullptr;
    calendar_time_s until{};
    calendar_record_get_str_p(record, kEvent.start_tzid, &zone);
    calendar_record_get_caltime(record, kEvent.start_time, &until);
    int fields[6];
    char separators[2];
    static_cast<void>(std::sscanf("20141231T000000Z", "%4d%2d%2d%c%2d%2d%2d%c", &fields[0],
                                  &fields[1], &fields[2], &separators[0], &fields[3], &fields[4],
                                  &fields[5], &separators[1]));
    fields[1] -= 1;  // ICU counts months from 0
    const Ucal calendar = open_calendar(zone);
    for (int i = 0; i < 6; ++i) {
        ucal_set(calendar.get(), kFields[i], fields[i]);
    }
    UErrorCode status = U_ZERO_ERROR;
    until.time.utime = static_cast<int64_t>(ucal_getMillis(calendar.get(), &status) / 1000.0);
    calendar_record_set_caltime(record, kEvent.until_time, until);
}

void set_rule(calendar_record_h record) {
    const char* uri = nullptr;
    for (int part = 0; part < 6; ++part) {  // the rule and its five parts
        calendar_record_get_uri_p(record, &uri);
    }
    calendar_record_set_int(record, kEvent.interval, 1);
    calendar_record_set_int(record, kEvent.freq, CALENDAR_RECURRENCE_WEEKLY);
    calendar_record_set_int(record, kEvent.interval,
                            static_cast<int>(std::strtol("1", nullptr, 10)));
    calendar_record_set_str(record, kEvent.byday, kFloorDays);
    calendar_record_set_int(record, kEvent.wkst, CALENDAR_MONDAY);
    set_until(record);
}

void set_alarm(calendar_record_h record, int minutes) {
    calendar_record_h alarm = nullptr;
    calendar_record_create(_calendar_alarm._uri, &alarm);
    calendar_record_set_int(alarm, _calendar_alarm.tick, minutes);
    calendar_record_set_int(alarm, _calendar_alarm.tick_unit, CALENDAR_ALARM_TIME_UNIT_MINUTE);
    calendar_record_add_child_record(record, kEvent.calendar_alarm, alarm);
}

void set_place(calendar_record_h record, unsigned int property, const char* text) {
    const char* uri = nullptr;
    calendar_record_get_uri_p(record, &uri);
    calendar_record_set_double(record, property,
                               static_cast<double>(std::strtoll(text, nullptr, 10)) / 1000000.0);
}

// ---- Writing ------------------------------------------------------------------------------------

void set_number(JsonObject* object, const char* name, int64_t number) {
    char text[256] = {};
    std::snprintf(text, sizeof text, "%lld", static_cast<long long>(number));
    json_object_set_string_member(object, name, text);
}

void add_text(JsonObject* object, const char* name, calendar_record_h record,
              unsigned int property) {
    char* text = nullptr;
    calendar_record_get_str_p(record, property, &text);
    json_object_set_string_member(object, name, text);
}

void add_times(JsonObject* object, calendar_record_h record) {
    calendar_time_s start{};
    calendar_time_s end{};
    calendar_record_get_caltime(record, kEvent.start_time, &start);
    calendar_record_get_caltime(record, kEvent.end_time, &end);
    set_number(object, "dtstart", start.time.utime * 1000);
    set_number(object, "dtend", end.time.utime * 1000);
}

MallocText until_text(calendar_record_h record) {
    calendar_time_s until{};
    calendar_record_get_caltime(record, kEvent.until_time, &until);
    const Ucal calendar = open_calendar("Etc/GMT");
    UErrorCode status = U_ZERO_ERROR;
    ucal_setMillis(calendar.get(), static_cast<double>(until.time.utime) * 1000.0, &status);
    int fields[6];
    for (int i = 0; i < 6; ++i) {
        fields[i] = ucal_get(calendar.get(), kFields[i], &status);
    }
    char text[32];
    std::snprintf(text, sizeof text, "%04d%02d%02dT%02d%02d%02dZ", fields[0], fields[1] + 1,
                  fields[2], fields[3], fields[4], fields[5]);
    return MallocText(strdup(text));
}

void add_rule(JsonObject* object, calendar_record_h record) {
    const char* uri = nullptr;
    char* text = nullptr;
    int number = 0;
    calendar_record_get_uri_p(record, &uri);
    calendar_record_get_int(record, kEvent.freq, &number);
    calendar_record_get_int(record, kEvent.interval, &number);
    for (const unsigned int list :
         {kEvent.bysecond, kEvent.byminute, kEvent.byhour, kEvent.byday, kEvent.bymonthday,
          kEvent.byyearday, kEvent.byweekno, kEvent.bymonth, kEvent.bysetpos}) {
        calendar_record_get_str_p(record, list, &text);
    }
    calendar_record_get_int(record, kEvent.wkst, &number);
    calendar_record_get_int(record, kEvent.range_type, &number);
    const MallocText until = until_text(record);
    char buffer[1024] = {};
    std::snprintf(buffer, sizeof buffer, "FREQ=WEEKLY;INTERVAL=1;BYDAY=%s;WKST=MO;UNTIL=%s",
                  kFloorDays, until.get());
    const MallocText rule(strdup(buffer));
    json_object_set_string_member(object, "rrule", rule.get());
}

void add_reminder(JsonArray* reminders, calendar_record_h record, int index) {
    calendar_record_h alarm = nullptr;
    int tick = 0;
    int unit = 0;
    calendar_record_get_child_record_at_p(record, kEvent.calendar_alarm, index, &alarm);
    JsonObject* const element = json_object_new();
    json_object_set_string_member(element, "method", "1");
    calendar_record_get_int(alarm, _calendar_alarm.tick, &tick);
    calendar_record_get_int(alarm, _calendar_alarm.tick_unit, &unit);
    set_number(element, "minutes", tick);
    json_array_add_object_element(reminders, element);
}

void add_place(JsonObject* object, const char* name, calendar_record_h record,
               unsigned int property) {
    const char* uri = nullptr;
    double degrees = 0;
    char text[32] = {};
    calendar_record_get_uri_p(record, &uri);
    calendar_record_get_double(record, property, &degrees);
    std::snprintf(text, sizeof text, "%.6f", degrees);
    char* const point = std::strchr(text, '.');
    std::memmove(point, point + 1, std::strlen(point));
    const MallocText place(strdup(text));
    json_object_set_string_member(object, name, place.get());
}

GText generate(JsonObject* event, JsonArray* reminders) {
    const Generator generator(json_generator_new());
    const Node node(json_node_new(JSON_NODE_OBJECT));
    JsonObject* const root = json_object_new();
    json_object_set_object_member(root, "EVENT", event);
    json_object_set_array_member(root, "REMINDERS", reminders);
    json_node_take_object(node.get(), root);
    json_generator_set_root(generator.get(), node.get());
    gsize length = 0;
    return GText(json_generator_to_data(generator.get(), &length));
}

}  // namespace

void read_document_floor(calendar_record_h record) {
    read_tree();
    calendar_record_set_str(record, kEvent.summary, kFloorTitle);
    calendar_record_set_str(record, kEvent.location, kFloorLocation);
    calendar_record_set_str(record, kEvent.description, kFloorDescription);
    set_time(record, kEvent.start_time, "1394875800000");
    set_time(record, kEvent.end_time, "1394879400000");
    calendar_record_set_str(record, kEvent.start_tzid, kFloorZone);
    calendar_record_set_str(record, kEvent.end_tzid, kFloorZone);
    calendar_record_set_int(record, kEvent.sensitivity, 0);
    set_rule(record);
    calendar_record_set_str(record, kEvent.organizer_email, kFloorOrganizer);
    calendar_record_set_str(record, kEvent.organizer_name, kFloorOrganizer);
    set_place(record, kEvent.longitude, "126977969");
    set_place(record, kEvent.latitude, "37566535");
    for (const int minutes : kFloorMinutes) {
        set_alarm(record, minutes);
    }
}

GText write_document_floor(calendar_record_h record) {
    JsonObject* const event = json_object_new();
    int number = 0;
    add_text(event, "title", record, kEvent.summary);
    add_text(event, "eventLocation", record, kEvent.location);
    add_text(event, "description", record, kEvent.description);
    json_object_set_string_member(event, "eventStatus", "0");
    add_times(event, record);
    add_text(event, "eventTimezone", record, kEvent.start_tzid);
    json_object_set_string_member(event, "accessLevel", "0");
    calendar_record_get_int(record, kEvent.has_alarm, &number);
    set_number(event, "hasAlarm", number);
    JsonArray* const reminders = json_array_new();
    calendar_record_get_child_record_count(record, kEvent.calendar_alarm, &number);
    for (int i = 0; i < kFloorAlarms; ++i) {
        add_reminder(reminders, record, i);
    }
    add_rule(event, record);
    json_object_set_string_member(event, "hasAttendeeData", "0");
    add_text(event, "organizer", record, kEvent.organizer_name);
    add_place(event, "longitude", record, kEvent.longitude);
    add_place(event, "latitude", record, kEvent.latitude);
    return generate(event, reminders);
}
