// SPDX-License-Identifier: Apache-2.0
//
// Reading the event document. Members are stored in document order and the order matters: "allDay"
// converts the times that it finds, "originalInstanceTime" is a date only after it, and a
// "duration" waits for "dtstart". No state between calls.
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"

#include <cstring>
#include <iterator>
#include <type_traits>
#include <utility>

#include "common/log.h"
#include "common/number.h"
#include "common/owned.h"
#include "common/qor_adapters_json_parser.h"
#include "common/result.h"
#include "data-sync/calendar/event_members.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_reminder.h"

namespace {

using EventView = std::remove_cv_t<decltype(_calendar_event)>;
using Buffer = qor_adapters_json_parse_buffer;

constexpr char kUtc[] = "Etc/GMT";

// ---- Storing one member of "EVENT" --------------------------------------------------------------

enum class Stored { kDone, kSetFailed, kGetFailed };

Stored set_if(bool stored) {
    return stored ? Stored::kDone : Stored::kSetFailed;
}

template <auto... Property>
Stored store_text(calendar_adapter_row* row, const char* value) {
    return set_if(
        ((calendar_record_set_str(row->record, _calendar_event.*Property, value) == 0) && ...));
}

template <auto Parse>
Stored store_parsed(calendar_adapter_row* row, const char* value) {
    return set_if(Parse(value, row->record) == 0);
}

Stored store_status(calendar_adapter_row* row, const char* value) {
    if (to_int32(value) == kCancelledInstance) {
        row->exception_status = kCancelledInstance;
    }
    return Stored::kDone;
}

// Reads a time of the record, converts it and writes it back.
template <typename Convert>
Stored convert_time(calendar_record_h record, unsigned int property, Convert convert) {
    calendar_time_s time{};
    if (calendar_record_get_caltime(record, property, &time) != 0) {
        return Stored::kGetFailed;
    }
    return set_if(convert(&time) == 0 && calendar_record_set_caltime(record, property, time) == 0);
}

enum Which : int { kStart = 0, kEnd = 1 };

Stored store_start(calendar_adapter_row* row, const char* value) {
    const Stored stored =
        convert_time(row->record, _calendar_event.start_time, [value](calendar_time_s* time) {
            return _qor_calendar_parse_caltime(kStart, value, time);
        });
    if (stored != Stored::kDone) {
        return stored;
    }
    row->has_start = 1;
    if (row->has_pending_duration == 0) {
        return Stored::kDone;
    }
    row->has_pending_duration = 0;
    const MallocText duration(std::exchange(row->pending_duration, nullptr));
    return set_if(__qor_calendar_get_day(duration.get(), row->record) == 0);
}

Stored store_end(calendar_adapter_row* row, const char* value) {
    const Stored stored = convert_time(
        row->record, _calendar_event.end_time,
        [value](calendar_time_s* time) { return _qor_calendar_parse_caltime(kEnd, value, time); });
    return set_if(stored == Stored::kDone);  // Deliberate: an unreadable end is a "set fail".
}

Stored store_duration(calendar_adapter_row* row, const char* value) {
    if (row->has_start != 0) {
        return set_if(__qor_calendar_get_day(value, row->record) == 0);
    }
    const MallocText earlier(std::exchange(row->pending_duration, strdup(value)));
    row->has_pending_duration = row->pending_duration != nullptr ? 1 : 0;
    return set_if(row->pending_duration != nullptr);
}

Stored store_all_day(calendar_adapter_row* row, const char* value) {
    if (to_int32(value) != 1) {
        return Stored::kDone;
    }
    row->is_allday = 1;
    const Stored start =
        convert_time(row->record, _calendar_event.start_time,
                     [](calendar_time_s* time) { return _qor_calendar_set_allday(kStart, time); });
    if (start != Stored::kDone) {
        return start;
    }
    return convert_time(row->record, _calendar_event.end_time,
                        [](calendar_time_s* time) { return _qor_calendar_set_allday(kEnd, time); });
}

Stored store_access_level(calendar_adapter_row* row, const char* value) {
    return set_if(to_int32(value) != 0 ||
                  calendar_record_set_int(row->record, _calendar_event.sensitivity, 0) == 0);
}

// A cancelled instance stays one, whatever follows.
void mark_exception(calendar_adapter_row* row) {
    if (row->exception_status != kCancelledInstance) {
        row->exception_status = kChangedInstance;
    }
}

// The event on the device that has a cloud key; below 1 when there is none.
int32_t find_event(const char* cloud_key) {
    int32_t svc_id = 0;
    const MallocText adapter_id(_qor_calendar_db_get_adapter_id_from_server(cloud_key));
    if (adapter_id) {
        // A failure leaves the 0.
        static_cast<void>(_qor_calendar_db_get_svc_id(to_int32(adapter_id.get()), &svc_id));
    }
    return svc_id;
}

Stored store_parent(calendar_adapter_row* row, const char* value) {
    if (value[0] == '\0') {
        return Stored::kDone;
    }
    const int32_t svc_id = find_event(value);
    if (svc_id < 1) {
        const MallocText earlier(std::exchange(row->ori_cloud_key, strdup(value)));
        row->invalid = 1;
    } else if (calendar_record_set_int(row->record, _calendar_event.original_event_id, svc_id) !=
               0) {
        return Stored::kSetFailed;
    } else {
        row->calsvc_ori_id = svc_id;
    }
    mark_exception(row);
    return set_if(row->invalid == 0 || row->ori_cloud_key != nullptr);
}

Stored store_instance(calendar_adapter_row* row, const char* value) {
    const int64_t seconds = to_seconds(std::strtoll(value, nullptr, 10));
    MallocText text(_qor_calendar_convert_ltos(kUtc, seconds, row->is_allday != 0));
    if (!text) {
        return Stored::kDone;
    }
    const int rc = calendar_record_set_str(row->record, _calendar_event.recurrence_id, text.get());
    const MallocText earlier(std::exchange(row->exdate, text.release()));  // also when rc is not 0
    if (rc != 0) {
        return Stored::kSetFailed;
    }
    mark_exception(row);
    return Stored::kDone;
}

using Store = Stored (*)(calendar_adapter_row* row, const char* value);

// How each member is stored, in the order of kEventKeys; null for a member that is not.
constexpr Store kStores[] = {
    store_text<&EventView::summary>,
    store_text<&EventView::location>,
    store_text<&EventView::description>,
    store_status,
    store_start,
    store_end,
    store_text<&EventView::start_tzid, &EventView::end_tzid>,
    store_duration,
    store_all_day,
    store_access_level,
    nullptr,  // "hasAlarm": the service counts the alarms
    store_parsed<_qor_calendar_parse_rrule>,
    store_parent,
    store_instance,
    nullptr,  // "lastDate"
    nullptr,  // "hasAttendeeData"
    store_text<&EventView::organizer_email, &EventView::organizer_name>,
    store_parsed<_qor_calendar_parse_longitude>,
    store_parsed<_qor_calendar_parse_latitude>,
};
static_assert(std::size(kStores) == kEventKeyCount);

// ---- Walking the document -----------------------------------------------------------------------

constexpr int kNoKey = -1;

int find_key(const char* name) {
    for (int key = 0; name != nullptr && key < kEventKeyCount; ++key) {
        const char* const known = kEventKeys[key];
        if (name[0] == known[0] && std::strcmp(name, known) == 0) {  // most differ at once
            return key;
        }
    }
    return kNoKey;
}

enum class Read { kDone, kServerError, kMemberNotStored, kAlarmNotMade, kReminderNotRead };

// An inner member named "error" is an unknown key like any other.
Read read_event(Buffer* event, calendar_adapter_row* row) {
    JsonWalk walk = walk_json_children(event);
    Buffer member;
    while (next_json_child(&walk, &member) != 0) {
        JsonValue value(&member);
        const char* const text = json_text(member);
        const int key = text != nullptr ? find_key(member.name) : kNoKey;
        if (key != kNoKey && __qor_calendar_parser_event_set_value(row, key, text) != 0) {
            static_cast<void>(value.release());  // Deliberate: kept, as is the whole tree.
            return Read::kMemberNotStored;
        }
    }
    return Read::kDone;
}

// An element that is no object is one without "minutes".
Read read_reminders(Buffer* reminders, calendar_record_h event) {
    JsonWalk walk = walk_json_children(reminders);
    Buffer element;
    while (next_json_child(&walk, &element) != 0) {
        const JsonValue value(&element);
        calendar_record_h handle = nullptr;
        if (calendar_record_create(_calendar_alarm._uri, &handle) != 0) {
            return Read::kAlarmNotMade;
        }
        Record alarm(handle);
        if (_qor_calendar_parse_reminder_from_json(&element, handle) != 0 ||
            calendar_record_add_child_record(event, _calendar_event.calendar_alarm, handle) != 0) {
            return Read::kReminderNotRead;
        }
        static_cast<void>(alarm.release());  // the event's from here on
    }
    return Read::kDone;
}

// A member that is no object or array is not looked at, an "error" text included.
Read read_top_member(Buffer* member, calendar_adapter_row* row) {
    if ((member->type != QOR_ADAPTERS_JSON_ARRAY && member->type != QOR_ADAPTERS_JSON_OBJECT) ||
        member->name == nullptr || member->node == nullptr) {
        return Read::kDone;
    }
    if (std::strcmp(member->name, kErrorName) == 0) {
        return Read::kServerError;
    }
    if (std::strcmp(member->name, kEventName) == 0) {
        return read_event(member, row);
    }
    if (std::strcmp(member->name, kRemindersName) == 0) {
        return read_reminders(member, row->record);
    }
    return Read::kDone;
}

Read read_document(Buffer* root, calendar_adapter_row* row) {
    JsonWalk walk = walk_json_children(root);
    Buffer member;
    Read read = Read::kDone;
    while (read == Read::kDone && next_json_child(&walk, &member) != 0) {
        const JsonValue value(&member);
        read = read_top_member(&member, row);
    }
    return read;
}

// The text of a scalar root is no tree, so it goes first.
void free_root(Buffer* root) noexcept {
    qor_adapters_json_parser_parse_buffer_free_value(root);
    qor_adapters_json_parser_parse_buffer_free(root);
}

}  // namespace

int __qor_calendar_parser_event_set_value(calendar_adapter_row* row, int key, const char* value) {
    const bool is_stored = key >= 0 && key < kEventKeyCount && kStores[key] != nullptr;
    switch (is_stored ? kStores[key](row, value) : Stored::kDone) {
        case Stored::kDone:
            return 0;
        case Stored::kSetFailed:
            QOR_LOG(CRITICAL, "set fail");
            return kError;
        case Stored::kGetFailed:
            QOR_LOG(CRITICAL, "get fail");
            return kError;
    }
    return kError;
}

int _qor_calendar_parse_event_from_json(const char* text, int /*offset*/, size_t length, int flags,
                                        calendar_adapter_row* row) {
    if (text == nullptr || row == nullptr || row->record == nullptr ||
        (length == 0 && flags == 0)) {
        QOR_LOG(CRITICAL, "error");
        return kBadArgument;
    }
    Buffer root{};
    // Deliberate: a text that is not JSON has no members and succeeds.
    qor_adapters_json_parser_parse_buffer(text, length, &root);
    Owned<Buffer, free_root> tree(&root);
    switch (read_document(&root, row)) {
        case Read::kDone:
            return 0;
        case Read::kServerError:
            return kError;
        case Read::kMemberNotStored:
            static_cast<void>(tree.release());  // Deliberate: this failure keeps the tree.
            QOR_LOG(CRITICAL, "set fail");
            return kError;
        case Read::kAlarmNotMade:
            QOR_LOG(CRITICAL, "set fail");
            return kError;
        case Read::kReminderNotRead:
            QOR_LOG(CRITICAL, "_qor_calendar_parse_reminder_from_json fail");
            return kError;
    }
    return kError;
}
