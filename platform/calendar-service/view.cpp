// SPDX-License-Identifier: Apache-2.0
//
// One table per view, in the order of the view's structure, which is filled from it.
#include "platform/calendar-service/view.h"

#include <cstring>
#include <utility>

namespace device {

namespace {

constexpr Property kBookProperties[] = {
    {"id", Type::kInt},         {"name", Type::kText},      {"description", Type::kText},
    {"account_id", Type::kInt}, {"store_type", Type::kInt},
};

constexpr Property kEventProperties[] = {
    {"id", Type::kInt},
    {"calendar_book_id", Type::kInt},
    {"summary", Type::kText},
    {"description", Type::kText},
    {"location", Type::kText},
    {"sensitivity", Type::kInt},
    {"latitude", Type::kDouble},
    {"longitude", Type::kDouble},
    {"organizer_name", Type::kText},
    {"organizer_email", Type::kText},
    {"start_time", Type::kTime},
    {"start_tzid", Type::kText},
    {"end_time", Type::kTime},
    {"end_tzid", Type::kText},
    {"freq", Type::kInt},
    {"range_type", Type::kInt},
    {"until_time", Type::kTime},
    {"count", Type::kInt},
    {"interval", Type::kInt},
    {"bysecond", Type::kText},
    {"byminute", Type::kText},
    {"byhour", Type::kText},
    {"byday", Type::kText},
    {"bymonthday", Type::kText},
    {"byyearday", Type::kText},
    {"byweekno", Type::kText},
    {"bymonth", Type::kText},
    {"bysetpos", Type::kText},
    {"wkst", Type::kInt},
    {"exdate", Type::kText},
    {"recurrence_id", Type::kText},
    {"original_event_id", Type::kInt},
    {"has_alarm", Type::kInt},
    {"calendar_alarm", Type::kChildren},
    {"exception", Type::kChildren},
};

constexpr Property kTodoProperties[] = {
    {"id", Type::kInt},           {"calendar_book_id", Type::kInt},
    {"summary", Type::kText},     {"start_time", Type::kTime},
    {"start_tzid", Type::kText},  {"latitude", Type::kDouble},
    {"longitude", Type::kDouble}, {"freq", Type::kInt},
    {"range_type", Type::kInt},   {"until_time", Type::kTime},
    {"count", Type::kInt},        {"interval", Type::kInt},
};

constexpr Property kAlarmProperties[] = {{"tick", Type::kInt}, {"tick_unit", Type::kInt}};

constexpr Property kUpdatedInfoProperties[] = {
    {"id", Type::kInt},
    {"modified_status", Type::kInt},
    {"calendar_book_id", Type::kInt},
    {"version", Type::kInt},
};

constexpr char kBookUri[] = "device.calendar.book";
constexpr char kEventUri[] = "device.calendar.event";
constexpr char kTodoUri[] = "device.calendar.todo";
constexpr char kAlarmUri[] = "device.calendar.alarm";
constexpr char kUpdatedInfoUri[] = "device.calendar.updated_info";

constexpr unsigned int kBook = 1;
constexpr unsigned int kEvent = 2;
constexpr unsigned int kTodo = 3;
constexpr unsigned int kAlarm = 4;
constexpr unsigned int kUpdatedInfo = 5;

// The public structure of a view: its URI and the id of each property.
template <typename Structure, size_t Count, size_t... Index>
constexpr Structure make_structure(const char* uri, unsigned int number,
                                   const Property (&properties)[Count],
                                   std::index_sequence<Index...> /*indices*/) {
    return {uri, property_id(number, properties[Index].type, Index)...};
}

template <typename Structure, size_t Count>
constexpr Structure make_structure(const char* uri, unsigned int number,
                                   const Property (&properties)[Count]) {
    constexpr size_t kRoom = (sizeof(Structure) - sizeof(const char*)) / sizeof(unsigned int);
    static_assert(Count == kRoom || Count + 1 == kRoom, "one row per member, but for padding");
    return make_structure<Structure>(uri, number, properties, std::make_index_sequence<Count>());
}

}  // namespace

const View kBookView{kBook, kBookUri, kBookProperties};
const View kEventView{kEvent, kEventUri, kEventProperties};
const View kTodoView{kTodo, kTodoUri, kTodoProperties};
const View kAlarmView{kAlarm, kAlarmUri, kAlarmProperties};
const View kUpdatedInfoView{kUpdatedInfo, kUpdatedInfoUri, kUpdatedInfoProperties};

const View* find_view(const char* uri) {
    if (uri == nullptr) {
        return nullptr;
    }
    for (const View* view : {&kEventView, &kBookView, &kUpdatedInfoView, &kAlarmView, &kTodoView}) {
        if (std::strcmp(view->uri, uri) == 0) {
            return view;
        }
    }
    return nullptr;
}

}  // namespace device

extern "C" {

constinit const calendar_book_view _calendar_book = device::make_structure<calendar_book_view>(
    device::kBookUri, device::kBook, device::kBookProperties);
constinit const calendar_event_view _calendar_event = device::make_structure<calendar_event_view>(
    device::kEventUri, device::kEvent, device::kEventProperties);
constinit const calendar_todo_view _calendar_todo = device::make_structure<calendar_todo_view>(
    device::kTodoUri, device::kTodo, device::kTodoProperties);
constinit const calendar_alarm_view _calendar_alarm = device::make_structure<calendar_alarm_view>(
    device::kAlarmUri, device::kAlarm, device::kAlarmProperties);
constinit const calendar_updated_info_view _calendar_updated_info =
    device::make_structure<calendar_updated_info_view>(
        device::kUpdatedInfoUri, device::kUpdatedInfo, device::kUpdatedInfoProperties);
}
