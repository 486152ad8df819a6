// SPDX-License-Identifier: Apache-2.0
//
// Views: which properties a kind of record has. Constant tables. A property's id holds its view and
// type besides its index, so that checking one costs a few comparisons.
#pragma once

#include <cstddef>
#include <span>

#include "platform/include/calendar_service.h"

namespace device {

enum class Type : unsigned char { kInt = 1, kText, kDouble, kTime, kChildren };

struct Property {
    const char* name;  // of a stored property: its column too
    Type type;
};

struct View {
    unsigned int number;  // from 1
    const char* uri;
    std::span<const Property> properties;  // in the order of the view's structure
};

extern const View kBookView;
extern const View kEventView;
extern const View kTodoView;
extern const View kAlarmView;
extern const View kUpdatedInfoView;

// The view of a URI; null when there is none, or for a null text.
const View* find_view(const char* uri);

inline constexpr unsigned int kIndexMask = 0xff;

constexpr unsigned int property_id(unsigned int view_number, Type type, size_t index) {
    return view_number << 16 | static_cast<unsigned int>(type) << 8 |
           static_cast<unsigned int>(index);
}

// Index of a property within its view.
constexpr size_t index_of(unsigned int id) {
    return id & kIndexMask;
}

// Whether the id names a property of the view that has the type.
inline bool is_property(const View& view, unsigned int id, Type type) {
    const size_t index = index_of(id);
    return index < view.properties.size() && view.properties[index].type == type &&
           id == property_id(view.number, type, index);
}

}  // namespace device
