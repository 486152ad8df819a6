// SPDX-License-Identifier: Apache-2.0
//
// Records: a view and one value per property, in a flat array. A record owns its texts; its
// children it owns until it is destroyed without them. One thread at a time.
#pragma once

#include <memory>
#include <vector>

#include "platform/calendar-service/view.h"
#include "platform/include/calendar_service.h"

namespace device {

using Children = std::vector<calendar_record_h>;

// The member in use is the one of the property's type.
union Value {
    int integer;
    double real;
    calendar_time_s time;
    char* text;  // malloc; null is unset
    Children* children;
};

}  // namespace device

struct calendar_record {
    // Every property has its default. Throws std::bad_alloc.
    explicit calendar_record(const device::View& of_view);
    ~calendar_record();
    calendar_record(const calendar_record&) = delete;
    calendar_record& operator=(const calendar_record&) = delete;

    // A property's value, of the record's own view.
    device::Value& at(unsigned int id) { return values[device::index_of(id)]; }
    const device::Value& at(unsigned int id) const { return values[device::index_of(id)]; }

    const device::View& view;
    bool held = false;  // by a parent or a list, which will destroy it
    std::unique_ptr<device::Value[]> values;
};

namespace device {

struct DestroyTree {
    void operator()(calendar_record_h record) const;
};
// A record with all below it.
using RecordOwner = std::unique_ptr<calendar_record, DestroyTree>;

RecordOwner make_record(const View& view);  // throws std::bad_alloc

// Sets a text to a copy; null unsets it. Throws std::bad_alloc, leaving the old text.
void set_text(Value* value, const char* text);

// Appends a child, which the parent then holds. Throws std::bad_alloc, leaving it to the caller.
void add_child(calendar_record* parent, unsigned int id, calendar_record_h child);

}  // namespace device
