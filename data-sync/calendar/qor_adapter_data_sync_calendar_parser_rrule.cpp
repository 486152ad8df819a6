// SPDX-License-Identifier: Apache-2.0
//
// Recurrence rules: RRULE texts to and from the recurrence properties of an event record. A rule is
// not validated: each known part is stored as it comes, the rest is ignored. The directions are no
// exact inverses: INTERVAL is always written, UNTIL is written in UTC and read in the event's zone,
// parts are written in table order. No state between calls.
#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <type_traits>

#include "common/log.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"

namespace {

using EventView = std::remove_cv_t<decltype(_calendar_event)>;
using Property = unsigned int EventView::*;

struct RulePart {
    const char* keyword;
    int (*parse)(const char* value, calendar_record_h record);
    Property list = nullptr;  // of a BY list, which is kept and written as the text it is
};

// Tried in this order; the first row whose keyword begins the part wins. The BY lists are written
// in this order too.
constexpr RulePart kRuleParts[] = {
    {"FREQ=", __qor_calendar_parse_freq},
    {"UNTIL=", __qor_calendar_parse_until},
    {"COUNT=", __qor_calendar_parse_count},
    {"INTERVAL=", __qor_calendar_parse_interval},
    {"BYSECOND=", __qor_calendar_parse_bysecond, &EventView::bysecond},
    {"BYMINUTE=", __qor_calendar_parse_byminute, &EventView::byminute},
    {"BYHOUR=", __qor_calendar_parse_byhour, &EventView::byhour},
    {"BYDAY=", __qor_calendar_parse_byday, &EventView::byday},
    {"BYMONTHDAY=", __qor_calendar_parse_bymonthday, &EventView::bymonthday},
    {"BYYEARDAY=", __qor_calendar_parse_byyearday, &EventView::byyearday},
    {"BYWEEKNO=", __qor_calendar_parse_byweekno, &EventView::byweekno},
    {"BYMONTH=", __qor_calendar_parse_bymonth, &EventView::bymonth},
    {"BYSETPOS=", __qor_calendar_parse_bysetpos, &EventView::bysetpos},
    {"WKST=", __qor_calendar_parse_wkst},
};

struct Keyword {
    const char* text;
    int value;
};

constexpr Keyword kFrequencies[] = {
    {"YEARLY", CALENDAR_RECURRENCE_YEARLY},
    {"MONTHLY", CALENDAR_RECURRENCE_MONTHLY},
    {"WEEKLY", CALENDAR_RECURRENCE_WEEKLY},
    {"DAILY", CALENDAR_RECURRENCE_DAILY},
};

constexpr Keyword kWeekDays[] = {
    {"SU", CALENDAR_SUNDAY},    {"MO", CALENDAR_MONDAY},   {"TU", CALENDAR_TUESDAY},
    {"WE", CALENDAR_WEDNESDAY}, {"TH", CALENDAR_THURSDAY}, {"FR", CALENDAR_FRIDAY},
    {"SA", CALENDAR_SATURDAY},
};

// A made rule holds up to 1023 characters. A part that is read may be as long as allows all nine BY
// lists, with the rest of a rule, to be written again.
constexpr size_t kRuleSize = 1024;
constexpr size_t kNumberSize = 32;
constexpr size_t kPartSize = 104;
static_assert(sizeof("FREQ=MONTHLY;INTERVAL=-2147483648;WKST=SU;UNTIL=") + kNumberSize +
                  9 * kPartSize <=
              kRuleSize);

// The value of the first keyword that begins a text.
template <size_t N>
int value_of(const Keyword (&keywords)[N], const char* text, int otherwise) {
    for (const Keyword& keyword : keywords) {
        if (std::strncmp(text, keyword.text, std::strlen(keyword.text)) == 0) {
            return keyword.value;
        }
    }
    return otherwise;
}

template <size_t N>
const char* text_of(const Keyword (&keywords)[N], int value) {
    for (const Keyword& keyword : keywords) {
        if (keyword.value == value) {
            return keyword.text;
        }
    }
    return nullptr;
}

// A decimal number from 0 to the largest int.
int parse_count(const char* text) {
    return static_cast<int>(std::clamp(std::strtol(text, nullptr, 10), 0L, long{INT_MAX}));
}

const RulePart* find_part(const char* text, size_t length) {
    for (const RulePart& part : kRuleParts) {
        const size_t keyword_length = std::strlen(part.keyword);
        if (length >= keyword_length && std::memcmp(text, part.keyword, keyword_length) == 0) {
            return &part;
        }
    }
    return nullptr;
}

bool is_event(calendar_record_h record) {
    return __qor_calendar_get_record_type(record) == kEventRecord;
}

// The text of a rule that is being made. What does not fit is left out and remembered.
struct RuleText {
    char text[kRuleSize] = {};
    size_t length = 0;
    bool fits = true;
    char number[kNumberSize] = {};  // scratch of the parts that are formatted

    void append(const char* keyword, const char* value) {
        const size_t space = sizeof(text) - length;
        const int added = std::snprintf(text + length, space, "%s%s", keyword, value);
        if (added >= 0 && static_cast<size_t>(added) < space) {
            length += static_cast<size_t>(added);
        } else {
            fits = false;
        }
    }
};

// A calendar-service call and its error, 0 when all went well.
struct CallError {
    const char* call;
    int code;
};

CallError append_interval(calendar_record_h record, RuleText* rule) {
    int interval = 0;
    const int error = calendar_record_get_int(record, _calendar_event.interval, &interval);
    std::snprintf(rule->number, sizeof(rule->number), "%d", interval);
    rule->append(";INTERVAL=", rule->number);
    return {"get_int", error};
}

CallError append_lists(calendar_record_h record, RuleText* rule) {
    for (const RulePart& part : kRuleParts) {
        if (part.list == nullptr) {
            continue;
        }
        char* list = nullptr;
        const int error = calendar_record_get_str_p(record, _calendar_event.*part.list, &list);
        if (error != CALENDAR_ERROR_NONE) {
            return {"get_str_p", error};
        }
        if (list != nullptr) {
            rule->append(";", part.keyword);
            rule->append(list, "");
        }
    }
    return {};
}

CallError append_week_start(calendar_record_h record, RuleText* rule) {
    int wkst = CALENDAR_SUNDAY;
    const int error = calendar_record_get_int(record, _calendar_event.wkst, &wkst);
    if (const char* day = text_of(kWeekDays, wkst)) {
        rule->append(";WKST=", day);
    }
    return {"get_int", error};
}

CallError append_until(calendar_record_h record, RuleText* rule) {
    calendar_time_s until{};
    const int error = calendar_record_get_caltime(record, _calendar_event.until_time, &until);
    if (error != CALENDAR_ERROR_NONE) {
        return {"get_caltime", error};
    }
    const auto& date = until.time.date;
    if (until.type == CALENDAR_TIME_LOCALTIME) {
        std::snprintf(rule->number, sizeof(rule->number), "%04d%02d%02dT000000Z", date.year,
                      date.month, date.mday);
    } else if (const MallocText utc{_qor_calendar_convert_ltos(nullptr, until.time.utime, false)}) {
        std::snprintf(rule->number, sizeof(rule->number), "%s", utc.get());
    }
    // Deliberate: an instant without a text leaves the interval's digits, and these are written.
    rule->append(";UNTIL=", rule->number);
    return {};
}

CallError append_range(calendar_record_h record, RuleText* rule) {
    int value = CALENDAR_RANGE_NONE;
    const int error = calendar_record_get_int(record, _calendar_event.range_type, &value);
    if (error != CALENDAR_ERROR_NONE) {
        return {"get_int", error};
    }
    if (value == CALENDAR_RANGE_UNTIL) {
        return append_until(record, rule);
    }
    if (value == CALENDAR_RANGE_COUNT) {
        // Deliberate: a count that cannot be read is written as the range type, 1.
        static_cast<void>(calendar_record_get_int(record, _calendar_event.count, &value));
        std::snprintf(rule->number, sizeof(rule->number), "%d", value);
        rule->append(";COUNT=", rule->number);
    }
    return {};
}

// What follows the frequency, in the order in which it is written.
constexpr CallError (*kRuleSteps[])(calendar_record_h, RuleText*) = {
    append_interval, append_lists, append_week_start, append_range};

}  // namespace

int _qor_calendar_parse_rrule(const char* text, calendar_record_h record) {
    if (text == nullptr || std::strstr(text, "FREQ=") == nullptr) {
        return kNothing;
    }
    if (!is_event(record)) {
        return kNotAnEvent;
    }
    // A rule without INTERVAL recurs every time; a refusal leaves the service's default, also 1.
    static_cast<void>(calendar_record_set_int(record, _calendar_event.interval, 1));
    while (*text != '\0') {
        const size_t length = std::strcspn(text, ";:");
        if (const RulePart* part = find_part(text, length)) {
            if (length >= kPartSize) {
                // Cut or left out it would recur at other times: the whole rule is refused.
                QOR_LOG(CRITICAL, "rule part too long [%.64s] (%zu)", text, length);
                return kServiceFailed;
            }
            char value[kPartSize] = {};
            const size_t keyword_length = std::strlen(part->keyword);
            std::memcpy(value, text + keyword_length, length - keyword_length);
            const int result = part->parse(value, record);
            if (result != kSuccess) {
                QOR_LOG(CRITICAL, "parse fail (%x)", result);
                return kServiceFailed;
            }
        }
        text += length;
        text += *text != '\0' ? 1 : 0;
    }
    return kSuccess;
}

int __qor_calendar_parse_freq(const char* value, calendar_record_h record) {
    if (value == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    const int freq = value_of(kFrequencies, value, CALENDAR_RECURRENCE_NONE);
    const int error = calendar_record_set_int(record, _calendar_event.freq, freq);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_int() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}

int __qor_calendar_parse_count(const char* value, calendar_record_h record) {
    if (value == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    int error = calendar_record_set_int(record, _calendar_event.range_type, CALENDAR_RANGE_COUNT);
    if (error == CALENDAR_ERROR_NONE) {
        error = calendar_record_set_int(record, _calendar_event.count, parse_count(value));
    }
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_int() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}

int __qor_calendar_parse_interval(const char* value, calendar_record_h record) {
    if (value == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    const int error = calendar_record_set_int(record, _calendar_event.interval, parse_count(value));
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_int() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}

// The nine handlers of the BY lists differ in name and property only; each logs under its own name.
#define QOR_BY_LIST_HANDLER(name)                                                       \
    int __qor_calendar_parse_##name(const char* value, calendar_record_h record) {      \
        if (value == nullptr || !is_event(record)) {                                    \
            return kNotAnEvent;                                                         \
        }                                                                               \
        const int error = calendar_record_set_str(record, _calendar_event.name, value); \
        if (error != CALENDAR_ERROR_NONE) {                                             \
            QOR_LOG(CRITICAL, "set_str() fail (%x)", error);                            \
            return kServiceFailed;                                                      \
        }                                                                               \
        return kSuccess;                                                                \
    }

QOR_BY_LIST_HANDLER(bysecond)
QOR_BY_LIST_HANDLER(byminute)
QOR_BY_LIST_HANDLER(byhour)
QOR_BY_LIST_HANDLER(byday)
QOR_BY_LIST_HANDLER(bymonthday)
QOR_BY_LIST_HANDLER(byyearday)
QOR_BY_LIST_HANDLER(byweekno)
QOR_BY_LIST_HANDLER(bymonth)
QOR_BY_LIST_HANDLER(bysetpos)
#undef QOR_BY_LIST_HANDLER

int __qor_calendar_parse_wkst(const char* value, calendar_record_h record) {
    if (value == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    const int error =
        calendar_record_set_int(record, _calendar_event.wkst, value_of(kWeekDays, value, -1));
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_int() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}

int _qor_calendar_make_rrule(calendar_record_h record, char** rule) {
    if (rule == nullptr || !is_event(record)) {
        QOR_LOG(CRITICAL, "invalid type.");
        return kNotAnEvent;
    }
    int freq = CALENDAR_RECURRENCE_NONE;
    const int error = calendar_record_get_int(record, _calendar_event.freq, &freq);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "get_int() fail (%x)", error);
        return kServiceFailed;
    }
    const char* frequency = text_of(kFrequencies, freq);
    if (frequency == nullptr) {
        return kNothing;
    }
    RuleText text;
    text.append("FREQ=", frequency);
    for (const auto append_part : kRuleSteps) {
        const CallError failed = append_part(record, &text);
        if (failed.code != CALENDAR_ERROR_NONE) {
            QOR_LOG(CRITICAL, "%s() fail (%x)", failed.call, failed.code);
            return kServiceFailed;
        }
    }
    if (!text.fits) {
        QOR_LOG(CRITICAL, "rule too long [%.64s]", text.text);
        return kServiceFailed;
    }
    char* copy = strdup(text.text);
    if (copy == nullptr) {
        QOR_LOG(CRITICAL, "Failed to strdup");
        return kServiceFailed;
    }
    *rule = copy;
    return kSuccess;
}
