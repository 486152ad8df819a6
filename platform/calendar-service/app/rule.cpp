// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/rule.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <charconv>

#include "cli/nearest.h"
#include "platform/calendar-service/app/time_text.h"

namespace calendar_text {
namespace {

constexpr int kLargestInterval = 32767;  // the library counts periods in a short

// Positions are the service's values.
constexpr std::string_view kFrequencies[] = {"", "DAILY", "WEEKLY", "MONTHLY", "YEARLY"};
constexpr std::string_view kWeekdays[] = {"", "SU", "MO", "TU", "WE", "TH", "FR", "SA"};

struct ByList {
    std::string_view name;
    Text Event::*member;
    bool of_time;  // names times of day, which an all-day event has none of
};
constexpr ByList kByLists[] = {
    {"BYSECOND", &Event::bysecond, true},      {"BYMINUTE", &Event::byminute, true},
    {"BYHOUR", &Event::byhour, true},          {"BYDAY", &Event::byday, false},
    {"BYMONTHDAY", &Event::bymonthday, false}, {"BYYEARDAY", &Event::byyearday, false},
    {"BYWEEKNO", &Event::byweekno, false},     {"BYMONTH", &Event::bymonth, false},
    {"BYSETPOS", &Event::bysetpos, false},
};

std::string upper(std::string_view text) {
    std::string result;
    for (const char c : text) {
        if (std::isspace(static_cast<unsigned char>(c)) == 0) {
            result += static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        }
    }
    return result;
}

template <std::size_t N>
int position(const std::string_view (&names)[N], std::string_view name) {
    const auto* found = std::find(names + 1, names + N, name);
    return found == names + N ? 0 : static_cast<int>(found - names);
}

// A number from 1 to most, or 0.
int count_of(std::string_view text, int most) {
    int value = 0;
    const char* end = text.data() + text.size();
    const auto [at, error] = std::from_chars(text.data(), end, value);
    return error == std::errc{} && at == end && value >= 1 && value <= most ? value : 0;
}

bool has_week_start(const Event& event) {
    return event.week_start >= CALENDAR_SUNDAY && event.week_start <= CALENDAR_SATURDAY;
}

// FREQ, INTERVAL, the BY lists that say something, WKST.
std::string core_text(const Event& event) {
    std::string text = fmt::format("FREQ={}", kFrequencies[static_cast<std::size_t>(event.freq)]);
    if (event.interval > 1) {
        text += fmt::format(";INTERVAL={}", event.interval);
    }
    for (const ByList& list : kByLists) {
        const std::string value = upper(text_or_empty(event.*list.member));
        if (!value.empty() && !(list.of_time && event.is_all_day())) {
            text += fmt::format(";{}={}", list.name, value);
        }
    }
    if (has_week_start(event)) {
        text += fmt::format(";WKST={}", kWeekdays[static_cast<std::size_t>(event.week_start)]);
    }
    return text;
}

std::string set_until(const std::string& value, const Zone& zone, Event* event) {
    const std::optional<GivenTime> given = parse_time(value);
    if (!given) {
        return fmt::format("UNTIL \"{}\" is no date or time", value);
    }
    event->range_type = CALENDAR_RANGE_UNTIL;
    if (event->is_all_day()) {
        event->until = {true, midnight(given->wall_s)};
    } else if (given->has_time) {
        event->until = {false, given->in(zone)};
    } else {
        event->until = {false, zone.to_utc(given->wall_s + kDay_s - 1)};
    }
    return {};
}

std::string unknown_part(const std::string& name) {
    qor::Nearest nearest(name);
    for (const std::string_view known : {"FREQ", "INTERVAL", "COUNT", "UNTIL", "WKST"}) {
        nearest.offer(known);
    }
    for (const ByList& list : kByLists) {
        nearest.offer(list.name);
    }
    const std::string hint =
        nearest.name().empty() ? "" : fmt::format("; did you mean {}?", nearest.name());
    return fmt::format("\"{}\" is no part of a rule{}", name, hint);
}

std::string set_part(const std::string& name, const std::string& value, const Zone& zone,
                     Event* event) {
    if (name == "FREQ") {
        event->freq = position(kFrequencies, value);
        return event->freq != 0 ? ""
                                : fmt::format(
                                      "FREQ \"{}\" is not one of DAILY, WEEKLY, MONTHLY, "
                                      "YEARLY",
                                      value);
    }
    if (name == "INTERVAL") {
        event->interval = count_of(value, kLargestInterval);
        return event->interval != 0 ? ""
                                    : fmt::format("INTERVAL \"{}\" is not a number from 1 to {}",
                                                  value, kLargestInterval);
    }
    if (name == "COUNT") {
        event->range_type = CALENDAR_RANGE_COUNT;
        event->count = count_of(value, std::numeric_limits<int>::max());
        return event->count != 0 ? "" : fmt::format("COUNT \"{}\" is not a number above 0", value);
    }
    if (name == "UNTIL") {
        return set_until(value, zone, event);
    }
    if (name == "WKST") {
        event->week_start = position(kWeekdays, value);
        return event->week_start != 0 ? "" : fmt::format("WKST \"{}\" is no weekday", value);
    }
    for (const ByList& list : kByLists) {
        if (name == list.name) {
            event->*list.member = value;
            return value.empty() ? fmt::format("{} names nothing", name) : "";
        }
    }
    return unknown_part(name);
}

}  // namespace

std::string rule_text(const Event& event) {
    if (!event.repeats()) {
        return {};
    }
    std::string text = core_text(event);
    if (event.range_type == CALENDAR_RANGE_COUNT) {
        text += fmt::format(";COUNT={}", event.count);
    } else if (event.range_type == CALENDAR_RANGE_UNTIL) {
        text += ";UNTIL=" + compact_text(event.until);
    }
    return text;
}

void clear_rule(Event* event) {
    const Event none;
    event->freq = none.freq;
    event->range_type = none.range_type;
    event->until = none.until;
    event->count = none.count;
    event->interval = none.interval;
    event->week_start = none.week_start;
    for (const ByList& list : kByLists) {
        (event->*list.member).reset();
    }
}

std::string set_rule(std::string_view text, const Zone& zone, Event* event) {
    Event changed = *event;
    clear_rule(&changed);
    std::string rule = upper(text);
    if (rule.starts_with("RRULE:")) {
        rule.erase(0, 6);
    }
    std::string seen = ";";
    for (std::size_t at = 0; at < rule.size();) {
        const std::size_t end = std::min(rule.find(';', at), rule.size());
        const std::string part = rule.substr(at, end - at);
        const std::size_t equals = std::min(part.find('='), part.size());
        const std::string name = part.substr(0, equals);
        if (seen.find(";" + name + ";") != std::string::npos) {
            return fmt::format("{} is given twice", name);
        }
        seen += name + ";";
        const std::string value = part.substr(std::min(equals + 1, part.size()));
        if (std::string wrong = set_part(name, value, zone, &changed); !wrong.empty()) {
            return wrong;
        }
        at = end + 1;
    }
    if (changed.freq == CALENDAR_RECURRENCE_NONE) {
        return "FREQ is missing";
    }
    if (seen.find(";COUNT;") != std::string::npos && seen.find(";UNTIL;") != std::string::npos) {
        return "COUNT and UNTIL exclude each other";
    }
    if (!library_rule(changed)) {
        return "a list of the rule holds a value that it cannot hold";
    }
    *event = std::move(changed);
    return {};
}

std::optional<icalrecurrencetype> library_rule(const Event& event) {
    if (!event.repeats() || event.interval > kLargestInterval) {
        return std::nullopt;
    }
    for (const ByList& list : kByLists) {
        if (text_or_empty(event.*list.member).find_first_of(";=") != std::string::npos) {
            return std::nullopt;
        }
    }
    icalerror_set_errors_are_fatal(false);  // a rule that cannot be read is an answer here
    const icalrecurrencetype rule = icalrecurrencetype_from_string(core_text(event).c_str());
    if (rule.freq == ICAL_NO_RECURRENCE) {
        return std::nullopt;
    }
    return rule;
}

}  // namespace calendar_text
