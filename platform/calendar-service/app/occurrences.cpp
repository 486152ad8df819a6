// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/occurrences.h"

#include <fmt/format.h>
#include <libical/ical.h>

#include <algorithm>
#include <memory>

#include "platform/calendar-service/app/rule.h"
#include "platform/calendar-service/app/time_text.h"

namespace calendar_text {
namespace {

// Bounds for one event. A daily event needs 365 steps a year; only a rule that names seconds of the
// day or a huge COUNT gets near either.
constexpr int kMostSteps = 1'000'000;
constexpr std::size_t kMostOccurrences = 100'000;
constexpr std::int64_t kMostTimesOfDay = 20'000'000;

// Wall clock and UTC are never further apart than this, and a clock change never shifts more.
constexpr std::int64_t kSlack_s = 2 * kDay_s;

struct IteratorDeleter {
    void operator()(icalrecur_iterator* iterator) const noexcept {
        icalrecur_iterator_free(iterator);
    }
};
using Iterator = std::unique_ptr<icalrecur_iterator, IteratorDeleter>;

icaltimetype library_time(std::int64_t wall_s, bool is_date) {
    const Civil civil = civil_of(wall_s);
    icaltimetype time = icaltime_null_time();
    time.year = civil.year;
    time.month = civil.month;
    time.day = civil.day;
    time.hour = civil.hour;
    time.minute = civil.minute;
    time.second = civil.second;
    time.is_date = is_date ? 1 : 0;
    return time;
}

std::int64_t wall_of(const icaltimetype& time) {
    return day_of(time.year, time.month, time.day) + std::int64_t{time.hour} * 3600 +
           std::int64_t{time.minute} * 60 + time.second;
}

// One event's rule at work. Starts are UTC instants, or midnights of an all-day event.
class Expander {
  public:
    Expander(const Event& event, const Range& range, const Zone& zone)
        : event_(event),
          zone_(event.is_all_day() ? Zone::utc() : zone),
          from_s_(event.is_all_day() ? range.from_day_s : range.from_s),
          to_s_(event.is_all_day() ? range.to_day_s : range.to_s),
          length_s_(first_occurrence(event).end_s - event.start.at_s),
          first_wall_s_(zone_.to_wall(event.start.at_s)) {}

    bool run(std::vector<Occurrence>* out, Warnings* warnings) {
        keep(event_.start.at_s, out);  // the start is the first occurrence, whatever the rule says
        if (!event_.repeats()) {
            return true;
        }
        const std::optional<icalrecurrencetype> rule = library_rule(event_);
        if (!rule) {
            warnings->insert(fmt::format(
                "event {}: its rule cannot be read, showing its start only", event_.id));
            return true;
        }
        const std::int64_t search_s = search_start_s(*rule);
        if (search_s > to_s_ + kSlack_s) {
            return true;
        }
        if (is_too_much(search_s)) {
            return false;
        }
        const Iterator iterator = open(*rule, search_s);
        return !iterator || walk(iterator.get(), out);
    }

  private:
    // Far past the start the iterator is set forward, unless every step has to be counted. Week
    // numbers are the exception: set forward, the library loses weeks of the first year.
    std::int64_t search_start_s(const icalrecurrencetype& rule) const {
        const bool has_week_numbers = rule.by_week_no[0] != ICAL_RECURRENCE_ARRAY_MAX;
        const bool is_counted = event_.range_type == CALENDAR_RANGE_COUNT;
        return is_counted || has_week_numbers
                   ? first_wall_s_
                   : std::max(first_wall_s_, from_s_ - length_s_ - kSlack_s);
    }

    // Whether looking at every time that the rule names on every day is too much work: a rule that
    // never matches a day would keep the library busy in one step.
    bool is_too_much(std::int64_t search_s) const {
        const auto values = [](const Text& list) {
            const std::string& text = text_or_empty(list);
            return 1 + std::count(text.begin(), text.end(), ',');
        };
        const std::int64_t days = std::max((to_s_ - search_s) / kDay_s, std::int64_t{0});
        return !event_.is_all_day() && days > kMostTimesOfDay / values(event_.byhour) /
                                                  values(event_.byminute) / values(event_.bysecond);
    }

    Iterator open(icalrecurrencetype rule, std::int64_t search_s) const {
        rule.until = library_time(to_s_ + kSlack_s, event_.is_all_day());  // ends a vain search
        Iterator iterator(
            icalrecur_iterator_new(rule, library_time(first_wall_s_, event_.is_all_day())));
        if (iterator && search_s > first_wall_s_) {
            static_cast<void>(icalrecur_iterator_set_start(  // on failure it starts at the start
                iterator.get(), library_time(search_s, event_.is_all_day())));
        }
        return iterator;
    }

    bool walk(icalrecur_iterator* iterator, std::vector<Occurrence>* out) const {
        int made = 1;  // the start
        for (int step = 0; step < kMostSteps; ++step) {
            const icaltimetype next = icalrecur_iterator_next(iterator);
            if (icaltime_is_null_time(next) != 0) {
                return true;
            }
            const std::int64_t wall_s = wall_of(next);
            if (wall_s <= first_wall_s_) {
                continue;
            }
            if (wall_s > to_s_ + kSlack_s || is_past_range(zone_.to_utc(wall_s), ++made)) {
                return true;
            }
            keep(zone_.to_utc(wall_s), out);
            if (out->size() >= kMostOccurrences) {
                return false;
            }
        }
        return false;
    }

    bool is_past_range(std::int64_t start_s, int number) const {
        switch (event_.range_type) {
            case CALENDAR_RANGE_COUNT:
                return number > event_.count;
            case CALENDAR_RANGE_UNTIL:
                return start_s > last_start_s();
            default:
                return false;
        }
    }

    // The until time in the kind of the start. A date ends with its last second.
    std::int64_t last_start_s() const {
        if (event_.until.is_date == event_.is_all_day()) {
            return event_.until.at_s;
        }
        return event_.is_all_day() ? midnight(event_.until.at_s)
                                   : zone_.to_utc(event_.until.at_s + kDay_s - 1);
    }

    void keep(std::int64_t start_s, std::vector<Occurrence>* out) const {
        const std::int64_t end_s = start_s + length_s_;
        const bool begins_inside = start_s >= from_s_ && start_s < to_s_;
        if (begins_inside || (start_s < from_s_ && end_s > from_s_)) {
            out->push_back({start_s, end_s});
        }
    }

    const Event& event_;
    const Zone zone_;
    const std::int64_t from_s_;
    const std::int64_t to_s_;
    const std::int64_t length_s_;
    const std::int64_t first_wall_s_;
};

}  // namespace

Occurrence first_occurrence(const Event& event) {
    const std::int64_t shortest_s = event.is_all_day() ? kDay_s : 0;
    return {event.start.at_s, std::max(event.end.at_s, event.start.at_s + shortest_s)};
}

Range make_range(std::int64_t from_s, std::int64_t to_s, const Zone& zone) {
    const std::int64_t last_s = std::max(from_s, to_s - 1);
    return {
        from_s, to_s, midnight(zone.to_wall(from_s)),
        to_s > from_s ? midnight(zone.to_wall(last_s)) + kDay_s : midnight(zone.to_wall(from_s))};
}

Zone zone_of(const Event& event, Warnings* warnings) {
    const std::string& id = text_or_empty(event.start_zone);
    const std::optional<Zone> zone = Zone::find(id);
    if (!zone) {
        warnings->insert(
            fmt::format("event {}: unknown time zone \"{}\", using UTC", event.id, id));
    }
    return zone.value_or(Zone::utc());
}

std::optional<std::int64_t> occurrence_start(const std::string& text, bool is_all_day) {
    const std::optional<GivenTime> given = parse_time(text);
    if (!given) {
        return std::nullopt;
    }
    return is_all_day ? midnight(given->wall_s) : given->in(Zone::utc());
}

std::set<std::int64_t> cancelled_starts(const Event& event, Warnings* warnings) {
    std::set<std::int64_t> starts;
    const std::string& list = text_or_empty(event.exdate);
    for (std::size_t at = 0; at < list.size();) {
        const std::size_t comma = std::min(list.find(',', at), list.size());
        const std::string entry = trim(std::string_view(list).substr(at, comma - at));
        const std::optional<std::int64_t> start = occurrence_start(entry, event.is_all_day());
        if (start) {
            starts.insert(*start);
        } else if (!entry.empty()) {
            warnings->insert(
                fmt::format("event {}: its exdate entry \"{}\" cannot be read, "
                            "leaving it aside",
                            event.id, entry));
        }
        at = comma + 1;
    }
    return starts;
}

bool expand_rule(const Event& event, const Range& range, std::vector<Occurrence>* out,
                 Warnings* warnings) {
    std::vector<Occurrence> found;
    const bool complete = Expander(event, range, zone_of(event, warnings)).run(&found, warnings);
    const auto earlier = [](const Occurrence& a, const Occurrence& b) {
        return a.start_s < b.start_s;
    };
    const auto same = [](const Occurrence& a, const Occurrence& b) {
        return a.start_s == b.start_s;
    };
    std::sort(found.begin(), found.end(), earlier);
    found.erase(std::unique(found.begin(), found.end(), same), found.end());
    out->insert(out->end(), found.begin(), found.end());
    return complete;
}

bool expand(const Event& event, const Range& range, const std::set<std::int64_t>& replaced,
            std::vector<Occurrence>* out, Warnings* warnings) {
    std::vector<Occurrence> found;
    const bool complete = expand_rule(event, range, &found, warnings);
    const std::set<std::int64_t> cancelled = cancelled_starts(event, warnings);
    std::copy_if(found.begin(), found.end(), std::back_inserter(*out),
                 [&](const Occurrence& occurrence) {
                     return !cancelled.contains(occurrence.start_s) &&
                            !replaced.contains(occurrence.start_s);
                 });
    return complete;
}

}  // namespace calendar_text
