// SPDX-License-Identifier: Apache-2.0
//
// The record functions: checks of handle, property and type, then the value.
#include "platform/calendar-service/record.h"

#include <cstdlib>
#include <cstring>
#include <new>

#include "platform/calendar-service/guard.h"

using device::Type;
using device::Value;

namespace {

struct IntDefault {
    const unsigned int& id;
    int value;
};
struct DoubleDefault {
    const unsigned int& id;
    double value;
};

// Everything that is not zero, null or empty in a new record.
const IntDefault kIntDefaults[] = {
    {_calendar_event.range_type, CALENDAR_RANGE_NONE},
    {_calendar_event.interval, 1},
    {_calendar_todo.range_type, CALENDAR_RANGE_NONE},
    {_calendar_todo.interval, 1},
};
const DoubleDefault kDoubleDefaults[] = {
    {_calendar_event.latitude, CALENDAR_RECORD_NO_COORDINATE},
    {_calendar_event.longitude, CALENDAR_RECORD_NO_COORDINATE},
    {_calendar_todo.latitude, CALENDAR_RECORD_NO_COORDINATE},
    {_calendar_todo.longitude, CALENDAR_RECORD_NO_COORDINATE},
};

// The value of a property of that type; null for anything else.
Value* find(calendar_record_h record, unsigned int id, Type type) {
    return record != nullptr && device::is_property(record->view, id, type) ? &record->at(id)
                                                                            : nullptr;
}

bool has_known_type(const calendar_time_s& time) {
    const unsigned int type = device::raw_value(time.type);
    return type == CALENDAR_TIME_UTIME || type == CALENDAR_TIME_LOCALTIME;
}

void free_value(Type type, Value* value) {
    if (type == Type::kText) {
        std::free(value->text);
    } else if (type == Type::kChildren) {
        delete value->children;
    }
}

// Calls the action with each child of the record.
template <typename Action>
void for_each_child(const calendar_record& record, const Action& action) {
    for (size_t i = 0; i < record.view.properties.size(); ++i) {
        if (record.view.properties[i].type != Type::kChildren ||
            record.values[i].children == nullptr) {
            continue;
        }
        for (const calendar_record_h child : *record.values[i].children) {
            action(child);
        }
    }
}

}  // namespace

calendar_record::calendar_record(const device::View& of_view)
    : view(of_view), values(new Value[of_view.properties.size()]) {
    // All members are trivial, and zero bytes are zero, null and the UTC instant 0 in each.
    std::memset(values.get(), 0, of_view.properties.size() * sizeof(Value));
    for (const IntDefault& row : kIntDefaults) {
        if (device::is_property(view, row.id, Type::kInt)) {
            at(row.id).integer = row.value;
        }
    }
    for (const DoubleDefault& row : kDoubleDefaults) {
        if (device::is_property(view, row.id, Type::kDouble)) {
            at(row.id).real = row.value;
        }
    }
}

calendar_record::~calendar_record() {
    for (size_t i = 0; i < view.properties.size(); ++i) {
        free_value(view.properties[i].type, &values[i]);
    }
}

namespace device {

void DestroyTree::operator()(calendar_record_h record) const {
    for_each_child(*record, DestroyTree());
    delete record;
}

RecordOwner make_record(const View& view) {
    return RecordOwner(new calendar_record(view));
}

void set_text(Value* value, const char* text) {
    char* copy = nullptr;
    if (text != nullptr) {
        copy = strdup(text);
        if (copy == nullptr) {
            throw std::bad_alloc();
        }
    }
    std::free(value->text);
    value->text = copy;
}

void add_child(calendar_record* parent, unsigned int id, calendar_record_h child) {
    Children*& children = parent->at(id).children;
    if (children == nullptr) {
        children = new Children;
    }
    children->push_back(child);
    child->held = true;
}

}  // namespace device

int calendar_record_create(const char* view_uri, calendar_record_h* out_record) {
    const device::View* const view = device::find_view(view_uri);
    if (view == nullptr || out_record == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    return device::guarded([&] { *out_record = device::make_record(*view).release(); });
}

int calendar_record_destroy(calendar_record_h record, bool destroy_children) {
    if (record == nullptr || record->held) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (destroy_children) {
        device::DestroyTree()(record);
    } else {
        for_each_child(*record, [](calendar_record_h child) { child->held = false; });
        delete record;
    }
    return CALENDAR_ERROR_NONE;
}

int calendar_record_get_uri_p(calendar_record_h record, const char** out_uri) {
    if (record == nullptr || out_uri == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_uri = record->view.uri;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_get_int(calendar_record_h record, unsigned int property_id, int* out_value) {
    const Value* const value = find(record, property_id, Type::kInt);
    if (value == nullptr || out_value == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_value = value->integer;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_get_double(calendar_record_h record, unsigned int property_id,
                               double* out_value) {
    const Value* const value = find(record, property_id, Type::kDouble);
    if (value == nullptr || out_value == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_value = value->real;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_get_caltime(calendar_record_h record, unsigned int property_id,
                                calendar_time_s* out_value) {
    const Value* const value = find(record, property_id, Type::kTime);
    if (value == nullptr || out_value == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_value = value->time;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_get_str_p(calendar_record_h record, unsigned int property_id, char** out_text) {
    const Value* const value = find(record, property_id, Type::kText);
    if (value == nullptr || out_text == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_text = value->text;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_set_int(calendar_record_h record, unsigned int property_id, int value) {
    Value* const found = find(record, property_id, Type::kInt);
    if (found == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    found->integer = value;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_set_double(calendar_record_h record, unsigned int property_id, double value) {
    Value* const found = find(record, property_id, Type::kDouble);
    if (found == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    found->real = value;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_set_caltime(calendar_record_h record, unsigned int property_id,
                                calendar_time_s value) {
    Value* const found = find(record, property_id, Type::kTime);
    if (found == nullptr || !has_known_type(value)) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    found->time = value;
    return CALENDAR_ERROR_NONE;
}

int calendar_record_set_str(calendar_record_h record, unsigned int property_id, const char* text) {
    Value* const found = find(record, property_id, Type::kText);
    if (found == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    return device::guarded([&] { device::set_text(found, text); });
}

int calendar_record_add_child_record(calendar_record_h record, unsigned int property_id,
                                     calendar_record_h child) {
    if (find(record, property_id, Type::kChildren) == nullptr || child == nullptr || child->held) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (property_id != _calendar_event.calendar_alarm) {
        return CALENDAR_ERROR_NOT_SUPPORTED;
    }
    if (&child->view != &device::kAlarmView) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    return device::guarded([&] {
        device::add_child(record, property_id, child);
        record->at(_calendar_event.has_alarm).integer = 1;
    });
}

int calendar_record_get_child_record_count(calendar_record_h record, unsigned int property_id,
                                           int* out_count) {
    const Value* const value = find(record, property_id, Type::kChildren);
    if (value == nullptr || out_count == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_count = value->children == nullptr ? 0 : static_cast<int>(value->children->size());
    return CALENDAR_ERROR_NONE;
}

int calendar_record_get_child_record_at_p(calendar_record_h record, unsigned int property_id,
                                          int index, calendar_record_h* out_child) {
    const Value* const value = find(record, property_id, Type::kChildren);
    if (value == nullptr || out_child == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (index < 0 || value->children == nullptr ||
        static_cast<size_t>(index) >= value->children->size()) {
        return CALENDAR_ERROR_NO_DATA;
    }
    *out_child = (*value->children)[static_cast<size_t>(index)];
    return CALENDAR_ERROR_NONE;
}
