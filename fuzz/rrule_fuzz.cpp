// SPDX-License-Identifier: Apache-2.0
//
// Recurrence rules: the first byte chooses the event's start, the rest is an RRULE text. What is
// read can be written, and what was written comes back as it was, but for UNTIL.
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

Record new_event(unsigned int kind) {
    calendar_record_h record = nullptr;
    check(calendar_record_create(_calendar_event._uri, &record) == 0);
    Record event(record);
    calendar_time_s start{};
    if ((kind & 1U) != 0) {
        start.type = CALENDAR_TIME_LOCALTIME;
        start.time.date = {2014, 3, 15, 0, 0, 0, false};
    }
    const char* const zones[] = {nullptr, "Asia/Tokyo", "America/New_York", "Nowhere"};
    check(calendar_record_set_caltime(record, _calendar_event.start_time, start) == 0);
    check(calendar_record_set_str(record, _calendar_event.start_tzid, zones[kind / 2 % 4]) == 0);
    return event;
}

MallocText make(const Record& event) {
    char* rule = nullptr;
    const int result = _qor_calendar_make_rrule(event.get(), &rule);
    check(result == (rule != nullptr ? 0 : -1));
    return MallocText(rule);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) {
        return 0;
    }
    const std::string text(reinterpret_cast<const char*>(data + 1), size - 1);
    const Record event = new_event(data[0]);
    const int result = _qor_calendar_parse_rrule(text.c_str(), event.get());
    check(result == 0 || result == -1 || result == 6);
    const MallocText rule = make(event);
    if (rule) {
        const Record again = new_event(data[0]);
        check(_qor_calendar_parse_rrule(rule.get(), again.get()) == 0);
        const MallocText second = make(again);
        check(second != nullptr);
        check(std::strstr(rule.get(), ";UNTIL=") != nullptr ||
              std::strcmp(rule.get(), second.get()) == 0);
    }
    return 0;
}
