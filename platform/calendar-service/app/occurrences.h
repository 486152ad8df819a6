// SPDX-License-Identifier: Apache-2.0
//
// From an event to its occurrences in a range of time: rule, range, cancelled occurrences (RFC 5545
// 3.8.5). The rule runs on the wall clock of the event's start zone.
#pragma once

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "platform/calendar-service/app/event.h"
#include "platform/calendar-service/app/zone.h"

namespace calendar_text {

// UTC instants; of an all-day event, the midnights of its first day and of the day after its last.
struct Occurrence {
    std::int64_t start_s = 0;
    std::int64_t end_s = 0;
};

// The event's own start and end; an all-day event lasts a day at least.
Occurrence first_occurrence(const Event& event);

// From the first moment to the last but one. All-day events are compared by day, as the calendar on
// the wall of the zone shows them.
struct Range {
    std::int64_t from_s = 0;
    std::int64_t to_s = 0;
    std::int64_t from_day_s = 0;
    std::int64_t to_day_s = 0;
};
Range make_range(std::int64_t from_s, std::int64_t to_s, const Zone& zone);

// What a reader should hear about, such as "event 5: unknown zone \"Mars/Base\", using UTC".
using Warnings = std::set<std::string>;

// The zone that the event's rule runs in: UTC, with a warning, when its id is unknown.
Zone zone_of(const Event& event, Warnings* warnings);

// The start that a recurrence id or an exdate entry names for an event of this kind, or nothing.
std::optional<std::int64_t> occurrence_start(const std::string& text, bool is_all_day);

// The starts that the event's exdate list names. Entries may have blanks around them; those of an
// all-day event may carry a time.
std::set<std::int64_t> cancelled_starts(const Event& event, Warnings* warnings);

// The occurrences that the rule makes and the range holds a part of, cancelled ones included, in
// the order of time. An event without a readable rule occurs once. False when the bounds on work
// (steps, occurrences) ended it early.
bool expand_rule(const Event& event, const Range& range, std::vector<Occurrence>* out,
                 Warnings* warnings);

// The same without the cancelled ones and without the given starts.
bool expand(const Event& event, const Range& range, const std::set<std::int64_t>& replaced,
            std::vector<Occurrence>* out, Warnings* warnings);

}  // namespace calendar_text
