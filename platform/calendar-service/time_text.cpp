// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/time_text.h"

#include <array>
#include <cstdio>
#include <cstdlib>

namespace device {

std::string date_text(const calendar_time_s& date) {
    const auto& d = date.time.date;
    std::array<char, 96> text{};  // six numbers of at most 11 characters
    static_cast<void>(std::snprintf(text.data(), text.size(), "%04d-%02d-%02d %02d:%02d:%02d%s",
                                    d.year, d.month, d.mday, d.hour, d.minute, d.second,
                                    d.is_leap_month ? " leap" : ""));
    return text.data();
}

calendar_time_s time_of_date_text(const char* text) {
    calendar_time_s date{};
    date.type = CALENDAR_TIME_LOCALTIME;
    date.time.date = {};
    auto& d = date.time.date;
    const char* rest = text;
    for (int* field : {&d.year, &d.month, &d.mday, &d.hour, &d.minute, &d.second}) {
        char* end = nullptr;
        *field = static_cast<int>(std::strtol(rest, &end, 10));
        rest = *end == '\0' ? end : end + 1;  // the separator; a minus after it is the number's
    }
    d.is_leap_month = *rest == 'l';
    return date;
}

}  // namespace device
