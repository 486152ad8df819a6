// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/input.h"

#include <fmt/ranges.h>

#include <algorithm>
#include <charconv>

#include "cli/nearest.h"
#include "cli/terminal.h"
#include "platform/calendar-service/app/describe.h"
#include "platform/calendar-service/app/rule.h"
#include "platform/calendar-service/app/time_text.h"

namespace calendar_app {
namespace {

using namespace calendar_text;

constexpr std::int64_t kUsualLength_s = 3600;
constexpr std::int64_t kSearch_s = 732 * kDay_s;  // how far on the next occurrences are looked for
constexpr int kLongestAlarm_m = 366 * 24 * 60;

Zone own_zone(const Event& event) {
    Warnings told_elsewhere;
    return zone_of(event, &told_elsewhere);
}

// ---- Removing values ----------------------------------------------------------------------------

struct Removable {
    const char* name;
    void (*remove)(Event* event);
};
constexpr Removable kRemovables[] = {
    {"alarms", [](Event* event) { event->alarms.clear(); }},
    {"cancelled", [](Event* event) { event->exdate.reset(); }},
    {"description", [](Event* event) { event->description.reset(); }},
    {"location", [](Event* event) { event->location.reset(); }},
    {"organizer",
     [](Event* event) {
         event->organizer_name.reset();
         event->organizer_email.reset();
     }},
    {"place",
     [](Event* event) {
         event->latitude = CALENDAR_RECORD_NO_COORDINATE;
         event->longitude = CALENDAR_RECORD_NO_COORDINATE;
     }},
    {"rrule", clear_rule},
    {"title", [](Event* event) { event->title.reset(); }},
    {"zone",
     [](Event* event) {
         event->start_zone.reset();
         event->end_zone.reset();
     }},
};

void remove_value(const std::string& name, Event* event) {
    qor::Nearest nearest(name);
    std::vector<std::string> names;
    for (const Removable& removable : kRemovables) {
        if (name == removable.name) {
            removable.remove(event);
            return;
        }
        nearest.offer(removable.name);
        names.emplace_back(removable.name);
    }
    fail(Exit::kUsage, "--unset: \"{}\" cannot be removed; {}", name,
         nearest.name().empty() ? fmt::format("one of {}", fmt::join(names, ", "))
                                : fmt::format("did you mean {}?", nearest.name()));
}

// ---- Details ------------------------------------------------------------------------------------

void set_text(const char* option, const std::optional<std::string>& value, Text* text) {
    if (!value) {
        return;
    }
    if (!qor::is_utf8(*value)) {
        fail(Exit::kUsage, "{}: the text is not UTF-8; check the terminal's encoding", option);
    }
    *text = *value;
}

double degrees(const std::string& text, double most) {
    double value = 0;
    const char* end = text.data() + text.size();
    const auto [at, error] = std::from_chars(text.data(), end, value);
    if (error != std::errc{} || at != end || !(value >= -most && value <= most)) {
        fail(Exit::kUsage, "--place: \"{}\" is not a number of degrees from -{} to {}", text, most,
             most);
    }
    return value;
}

void set_place(const std::string& text, Event* event) {
    const std::size_t comma = text.find(',');
    if (comma == std::string::npos) {
        fail(Exit::kUsage, "--place: \"{}\" is not LATITUDE,LONGITUDE such as 37.566535,126.977969",
             text);
    }
    event->latitude = degrees(trim(std::string_view(text).substr(0, comma)), 90);
    event->longitude = degrees(trim(std::string_view(text).substr(comma + 1)), 180);
}

// "Ann <ann@example.org>"; any other text is both name and address.
void set_organizer(const std::string& text, Event* event) {
    set_text("--organizer", text, &event->organizer_name);
    event->organizer_email = event->organizer_name;
    const std::size_t open = text.find('<');
    if (open != std::string::npos && text.ends_with('>')) {
        event->organizer_name = trim(std::string_view(text).substr(0, open));
        event->organizer_email = text.substr(open + 1, text.size() - open - 2);
    }
}

Alarm alarm_of(const std::string& text) {
    const std::optional<Duration> before = parse_duration(text);
    const std::int64_t seconds = before ? before->days * kDay_s + before->seconds : -1;
    if (!before || seconds % 60 != 0 || seconds / 60 > kLongestAlarm_m) {
        fail(Exit::kUsage, "--alarm: \"{}\" is no time before the start; use 15m, 2h, 1d or 1w",
             text);
    }
    constexpr int kUnits[] = {CALENDAR_ALARM_TIME_UNIT_WEEK, CALENDAR_ALARM_TIME_UNIT_DAY,
                              CALENDAR_ALARM_TIME_UNIT_HOUR};
    for (const int unit : kUnits) {
        if (seconds > 0 && seconds % unit == 0) {
            return {static_cast<int>(seconds / unit), unit};
        }
    }
    return {static_cast<int>(seconds / 60), CALENDAR_ALARM_TIME_UNIT_MINUTE};
}

void apply_details(const Options& options, Event* event) {
    set_text("--title", options.title, &event->title);
    set_text("--location", options.location, &event->location);
    set_text("--description", options.description, &event->description);
    if (options.place) {
        set_place(*options.place, event);
    }
    if (options.organizer) {
        set_organizer(*options.organizer, event);
    }
    if (!options.alarms.empty()) {
        event->alarms.clear();
        std::transform(options.alarms.begin(), options.alarms.end(),
                       std::back_inserter(event->alarms), alarm_of);
    }
    if (options.rrule) {
        const std::string wrong = set_rule(*options.rrule, own_zone(*event), event);
        if (!wrong.empty()) {
            fail(Exit::kUsage, "--rrule: {}; a rule looks like FREQ=WEEKLY;BYDAY=MO,WE;COUNT=10",
                 wrong);
        }
    }
}

// ---- Times --------------------------------------------------------------------------------------

GivenTime time_given(const char* option, const std::string& text) {
    const std::optional<GivenTime> given = parse_time(text);
    if (!given) {
        fail(Exit::kUsage,
             "{}: \"{}\" is no date or time; write 2014-03-15 or \"2014-03-15 09:30\"", option,
             text);
    }
    return *given;
}

std::int64_t end_given(const Options& options, const Event& event, const Zone& zone) {
    if (options.duration) {
        const std::optional<Duration> length = parse_duration(*options.duration);
        if (!length) {
            fail(Exit::kUsage, "--duration: \"{}\" is no duration; use 1h30m, 2d or PT1H30M",
                 *options.duration);
        }
        if (event.is_all_day() && (length->seconds != 0 || length->days == 0)) {
            fail(Exit::kUsage, "--duration: an all-day event lasts whole days, such as 2d, not {}",
                 *options.duration);
        }
        const std::int64_t days_s = length->days * kDay_s;
        return event.is_all_day()
                   ? event.start.at_s + days_s
                   : zone.to_utc(zone.to_wall(event.start.at_s) + days_s) + length->seconds;
    }
    const GivenTime given = time_given("--end", *options.end);
    if (given.has_time == event.is_all_day()) {
        fail(Exit::kUsage, "--end: \"{}\" should be {}, as the start is", *options.end,
             event.is_all_day() ? "a date" : "a date and a time");
    }
    return event.is_all_day() ? given.wall_s : given.in(zone);
}

// The length that an event keeps when its start or its kind changes.
std::int64_t kept_end(const Event& before, const Event& after, const Zone& old_zone) {
    const Occurrence old = first_occurrence(before);
    if (before.is_all_day() == after.is_all_day()) {
        return after.start.at_s + old.end_s - old.start_s;
    }
    if (!after.is_all_day()) {
        return after.start.at_s + kUsualLength_s;
    }
    const std::int64_t first_s = midnight(old_zone.to_wall(old.start_s));
    const std::int64_t last_s = midnight(old_zone.to_wall(std::max(old.end_s - 1, old.start_s)));
    return after.start.at_s + last_s - first_s + kDay_s;  // every day that it touched
}

void apply_start(const Options& options, const Event& before, const Zone& old_zone,
                 const Zone& zone, Event* event) {
    const bool was_all_day = before.is_all_day();
    GivenTime given;
    given.wall_s = was_all_day ? before.start.at_s : old_zone.to_wall(before.start.at_s);
    given.has_time = !was_all_day;
    if (options.start) {
        const std::int64_t old_clock_s = given.wall_s - midnight(given.wall_s);
        given = time_given("--start", *options.start);
        if (!given.has_time && !was_all_day) {
            given.wall_s += old_clock_s;  // a day alone moves a timed event to that day
            given.has_time = true;
        } else if (given.has_time && options.all_day) {
            fail(Exit::kUsage, "--start: \"{}\" has a time, an all-day event has none",
                 *options.start);
        }
    }
    if (options.all_day || !given.has_time) {
        event->start = {true, midnight(given.wall_s)};
    } else {
        event->start = {false, given.in(zone)};
    }
}

// An until time is of the start's kind.
void keep_until_in_kind(const Zone& zone, Event* event) {
    if (event->range_type != CALENDAR_RANGE_UNTIL || event->until.is_date == event->is_all_day()) {
        return;
    }
    const std::int64_t until_s = event->until.at_s;
    event->until = event->is_all_day() ? Moment{true, midnight(zone.to_wall(until_s))}
                                       : Moment{false, zone.to_utc(until_s + kDay_s - 1)};
}

void apply_times(const Options& options, const Event& before, Event* event) {
    if (options.end && options.duration) {
        fail(Exit::kUsage, "--end and --duration exclude each other; give one of them");
    }
    const Zone old_zone = own_zone(before);
    if (options.zone) {
        event->start_zone = find_zone(*options.zone).id();
        event->end_zone = event->start_zone;
    }
    const Zone zone = own_zone(*event);
    apply_start(options, before, old_zone, zone, event);
    event->end.is_date = event->is_all_day();
    event->end.at_s = options.end || options.duration ? end_given(options, *event, zone)
                                                      : kept_end(before, *event, old_zone);
    if (event->end.at_s < event->start.at_s) {
        fail(Exit::kUsage, "the end is before the start: {} comes after {}",
             options.start.value_or(occurrence_text(*event, event->start.at_s)),
             options.end.value_or(""));
    }
    event->end.at_s = first_occurrence(*event).end_s;  // an all-day event lasts a day at least
    if (event->start.at_s < kEarliest_s || event->end.at_s > kLatest_s) {
        fail(Exit::kUsage, "the event ends after the year 9999");
    }
    keep_until_in_kind(zone, event);
}

}  // namespace

void apply_new(const Options& options, Event* event) {
    Event before;  // gives a new event its kind and length
    before.start.is_date = options.all_day || !time_given("--start", *options.start).has_time;
    before.end = {before.start.is_date, before.start.is_date ? kDay_s : kUsualLength_s};
    if (!before.start.is_date) {
        event->start_zone = given_zone(options).id();
        event->end_zone = event->start_zone;
    }
    apply_times(options, before, event);
    apply_details(options, event);
}

void apply_changes(const Options& options, Event* event) {
    const Event before = *event;
    for (const std::string& name : options.unset) {
        remove_value(name, event);
    }
    if (options.start || options.end || options.duration || options.zone || options.all_day ||
        event->start_zone != before.start_zone) {
        apply_times(options, before, event);
    }
    apply_details(options, event);
}

std::int64_t find_occurrence(const Event& event, const std::string& text) {
    if (!event.repeats()) {
        fail(Exit::kFailed, "{} does not repeat; use 'qor-calendar edit' or 'delete'",
             name_of(event));
    }
    const GivenTime given = time_given("OCCURRENCE", text);
    const Zone zone = own_zone(event);
    const bool exact = given.has_time && !event.is_all_day();
    Range range;
    range.from_day_s = midnight(given.wall_s);
    range.to_day_s = range.from_day_s + kDay_s;
    range.from_s = exact ? given.in(zone) : zone.to_utc(range.from_day_s);
    range.to_s = exact ? range.from_s + 1 : zone.to_utc(range.to_day_s);
    const std::int64_t from_s = event.is_all_day() ? range.from_day_s : range.from_s;

    const auto starts_in = [&](const Range& searched, std::size_t most) {
        std::vector<Occurrence> found;
        std::vector<std::int64_t> starts;
        Warnings told_elsewhere;
        static_cast<void>(expand_rule(event, searched, &found, &told_elsewhere));
        for (const Occurrence& occurrence : found) {
            if (occurrence.start_s >= from_s && starts.size() < most) {
                starts.push_back(occurrence.start_s);
            }
        }
        return starts;
    };
    const auto in_words = [&](const std::vector<std::int64_t>& starts) {
        std::vector<std::string> words;
        std::transform(starts.begin(), starts.end(), std::back_inserter(words),
                       [&](std::int64_t start_s) { return occurrence_text(event, start_s); });
        return fmt::format("{}", fmt::join(words, ", "));
    };
    const std::vector<std::int64_t> starts = starts_in(range, 5);
    if (starts.size() == 1) {
        return starts.front();
    }
    if (starts.size() > 1) {
        fail(Exit::kFailed, "{} occurs several times on {}: {}; give the time too", name_of(event),
             text, in_words(starts));
    }
    Range later = range;
    later.to_s += kSearch_s;
    later.to_day_s += kSearch_s;
    const std::vector<std::int64_t> next = starts_in(later, 3);
    fail(Exit::kFailed, "{} has no occurrence at {}; {}", name_of(event), text,
         next.empty() ? "it does not occur after that" : "the next are " + in_words(next));
}

std::string carried_occurrence(const std::string& text, const Event& before, const Event& after) {
    const std::optional<std::int64_t> start = occurrence_start(text, before.is_all_day());
    if (!start) {
        return text;
    }
    const auto to_wall = [](const Event& event, std::int64_t at_s) {
        return event.is_all_day() ? at_s : own_zone(event).to_wall(at_s);
    };
    const std::int64_t shift_s =
        to_wall(after, after.start.at_s) - to_wall(before, before.start.at_s);
    const std::int64_t wall_s = to_wall(before, *start) + shift_s;
    return compact_text(after.is_all_day() ? Moment{true, midnight(wall_s)}
                                           : Moment{false, own_zone(after).to_utc(wall_s)});
}

}  // namespace calendar_app
