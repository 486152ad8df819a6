// SPDX-License-Identifier: Apache-2.0
//
// One VEVENT read into what a document carries of it. Each property's name is one row of a table;
// a name without a row is counted as not carried.
#include "host/ics/event_reader.h"

#include <fmt/format.h>
#include <glib.h>

#include <algorithm>
#include <cmath>
#include <limits>

#include "host/ics/rule_text.h"

namespace qor {
namespace {

constexpr std::int64_t kDayMs = 86'400'000;
constexpr std::int64_t kMostDays = 1'000'000;  // of a duration; longer ones are this long

// libical takes any digits.
bool is_real(const icaltimetype& time) {
    return time.year > 0 && time.month >= 1 && time.month <= 12 && time.day >= 1 &&
           time.day <= icaltime_days_in_month(time.month, time.year) && time.hour <= 23 &&
           time.minute <= 59 && time.second <= 60;
}

std::string parameter_text(icalproperty* property, const char* name) {
    for (icalparameter* parameter = icalproperty_get_first_parameter(property, ICAL_ANY_PARAMETER);
         parameter != nullptr;
         parameter = icalproperty_get_next_parameter(property, ICAL_ANY_PARAMETER)) {
        const IcalText text(icalparameter_as_ical_string_r(parameter));
        const std::string pair = text ? text.get() : "";
        if (pair.starts_with(std::string(name) + "=")) {
            std::string value = pair.substr(std::string_view(name).size() + 1);
            std::erase(value, '"');
            return value;
        }
    }
    return {};
}

// Reads one event; its report lines carry the event's title.
class Reader {
  public:
    Reader(icalcomponent* component, IcsZones& zones, IcsReport& report)
        : component_(component), zones_(zones), report_(report) {}

    bool read(IcsEvent& event);

  private:
    using Property = icalproperty*;
    struct Row {
        icalproperty_kind kind;
        void (Reader::*read)(IcsEvent&, Property);
    };
    static const Row kRows[];
    static const Row* row_of(icalproperty_kind kind);

    template <std::optional<std::string> EventDocument::*Member>
    void text(IcsEvent& event, Property property) {
        std::string value = without_outer_blanks(plain_text(property));
        if (!value.empty()) {
            event.document.*Member = std::move(value);
        }
    }
    void nothing(IcsEvent&, Property) {}
    void uid(IcsEvent& event, Property property) { event.uid = value_text(property); }
    void sequence(IcsEvent& event, Property property);
    void status(IcsEvent& event, Property property);
    void access(IcsEvent&, Property property);
    void rule(IcsEvent& event, Property property);
    void exclude(IcsEvent& event, Property property);
    void instance(IcsEvent& event, Property property);
    void position(IcsEvent& event, Property property);
    void organizer(IcsEvent& event, Property property);
    void stored_zone(IcsEvent& event, Property property);
    void error(IcsEvent& event, Property property);

    bool times(IcsEvent& event);
    void end(IcsEvent& event);
    void all_day_marker(IcsEvent& event, IcsTime& end);
    void alarms(IcsEvent& event);
    void alarm(IcsEvent& event, icalcomponent* alarm);
    void count_parameters(Property property);
    static std::string plain_text(Property property);
    std::optional<IcsTime> time(Property property);
    void count(const std::string& kind) { report_.count(kind, title_); }
    void problem(const IcsEvent& event, std::string what) {
        report_.problems.push_back({event.where, title_, std::move(what)});
    }
    Property first(icalproperty_kind kind) {
        return icalcomponent_get_first_property(component_, kind);
    }

    icalcomponent* component_;
    IcsZones& zones_;
    IcsReport& report_;
    std::string title_;
};

// Read in the order in which they stand in the file. DTSTART, DTEND and DURATION come first and
// together; what makes up every VEVENT (DTSTAMP) or is read elsewhere needs nothing.
const Reader::Row Reader::kRows[] = {
    {ICAL_SUMMARY_PROPERTY, &Reader::text<&EventDocument::title>},
    {ICAL_LOCATION_PROPERTY, &Reader::text<&EventDocument::location>},
    {ICAL_DESCRIPTION_PROPERTY, &Reader::text<&EventDocument::description>},
    {ICAL_UID_PROPERTY, &Reader::uid},
    {ICAL_SEQUENCE_PROPERTY, &Reader::sequence},
    {ICAL_STATUS_PROPERTY, &Reader::status},
    {ICAL_CLASS_PROPERTY, &Reader::access},
    {ICAL_RRULE_PROPERTY, &Reader::rule},
    {ICAL_EXDATE_PROPERTY, &Reader::exclude},
    {ICAL_RECURRENCEID_PROPERTY, &Reader::instance},
    {ICAL_GEO_PROPERTY, &Reader::position},
    {ICAL_ORGANIZER_PROPERTY, &Reader::organizer},
    {ICAL_XLICERROR_PROPERTY, &Reader::error},
    {ICAL_DTSTART_PROPERTY, &Reader::nothing},
    {ICAL_DTEND_PROPERTY, &Reader::nothing},
    {ICAL_DURATION_PROPERTY, &Reader::nothing},
    {ICAL_DTSTAMP_PROPERTY, &Reader::nothing},
};

const Reader::Row* Reader::row_of(icalproperty_kind kind) {
    const Row* row = std::find_if(std::begin(kRows), std::end(kRows),
                                  [&](const Row& candidate) { return candidate.kind == kind; });
    return row == std::end(kRows) ? nullptr : row;
}

std::string Reader::plain_text(Property property) {
    const icalvalue* value = icalproperty_get_value(property);
    const char* text = value == nullptr ? nullptr : icalvalue_get_text(value);
    return text == nullptr ? std::string() : without_controls(text);
}

std::optional<IcsTime> Reader::time(Property property) {
    const icalvalue* value = icalproperty_get_value(property);
    const icaltimetype read =
        value == nullptr ? icaltime_null_time() : icalvalue_get_datetimedate(value);
    if (icaltime_is_null_time(read) != 0 || !is_real(read)) {
        return std::nullopt;
    }
    IcsTime result;
    result.wall = {read.year, read.month, read.day, 0, 0, 0};
    result.is_date = read.is_date != 0;
    if (result.is_date) {
        return result;
    }
    result.wall = {read.year, read.month, read.day, read.hour, read.minute, read.second};
    const std::string tzid = parameter_text(property, "TZID");
    if (icaltime_is_utc(read) != 0) {
        result.zone = &zones_.find(kUtcZone, read.year);
    } else if (!tzid.empty()) {
        result.zone = &zones_.find(tzid, read.year);
    } else {
        result.zone = &zones_.floating();
        report_.zones["(times without a zone)"] = "taken as " + result.zone->olson;
    }
    return result;
}

void Reader::sequence(IcsEvent& event, Property property) {
    event.sequence = icalproperty_get_sequence(property);
    if (event.sequence != 0) {
        count("SEQUENCE");
    }
}

void Reader::status(IcsEvent& event, Property property) {
    const std::string value = value_text(property);
    event.cancelled = event.cancelled || value == "CANCELLED";
    if (value != "CANCELLED" && value != "CONFIRMED") {
        count("STATUS:" + value);
    }
}

void Reader::access(IcsEvent&, Property property) {
    if (const std::string value = value_text(property); value != "PUBLIC") {
        count("CLASS:" + value);
    }
}

void Reader::rule(IcsEvent& event, Property property) {
    if (event.document.rule) {
        count("RRULE, a second one");
        return;
    }
    const std::string text = document_rule(value_text(property), event.start, title_, report_);
    if (text.empty()) {
        problem(event, "its RRULE is not understood; it is stored as a single event");
        return;
    }
    event.document.rule = text;
}

void Reader::exclude(IcsEvent& event, Property property) {
    if (const auto excluded = time(property)) {
        event.excluded.push_back(*excluded);
    } else {
        problem(event, fmt::format("its EXDATE {} is no date; left out", value_text(property)));
    }
}

void Reader::instance(IcsEvent& event, Property property) {
    event.recurrence_id = time(property);
    if (!event.recurrence_id) {
        problem(event, "its RECURRENCE-ID is no date; it is stored as an event of its own");
    }
    if (parameter_text(property, "RANGE") == "THISANDFUTURE") {
        count("RECURRENCE-ID;RANGE=THISANDFUTURE (changes its one occurrence)");
    }
}

void Reader::position(IcsEvent& event, Property property) {
    const icalgeotype geo = icalproperty_get_geo(property);
    if (!(std::fabs(geo.lat) <= 90.0) || !(std::fabs(geo.lon) <= 180.0)) {
        count("GEO out of range");
        return;
    }
    event.document.latitude = micro_degrees(geo.lat);
    event.document.longitude = micro_degrees(geo.lon);
}

// A document has room for one text: the name where there is one.
void Reader::organizer(IcsEvent& event, Property property) {
    icalparameter* cn = icalproperty_get_first_parameter(property, ICAL_CN_PARAMETER);
    const char* text = cn == nullptr ? nullptr : icalparameter_get_cn(cn);
    const std::string name = text == nullptr ? "" : text;
    std::string address = value_text(property);
    if (g_ascii_strncasecmp(address.c_str(), "mailto:", 7) == 0) {
        address.erase(0, 7);
    }
    const bool nobody = address.empty() || address == "invalid:nomail";
    if (!name.empty() && !nobody && name != address) {
        count("ORGANIZER, the address beside the name");
    }
    if (!name.empty() || !nobody) {
        event.document.organizer = without_controls(name.empty() ? address : name);
    }
}

// An export says with this what a DTSTART cannot: the zone of an all-day event, or of a time that
// had to be written in UTC.
void Reader::stored_zone(IcsEvent& event, Property property) {
    const std::string zone = value_text(property);
    event.document.zone = zone == "none" ? std::nullopt : std::optional(zone);
}

// libical tells in words what it dropped; the event's own title or time is a problem, anything
// that would not have been carried is counted.
void Reader::error(IcsEvent& event, Property property) {
    const std::string what = value_text(property);
    const auto name_after = [&](std::string_view words) {
        const std::size_t found = what.find(words);
        const std::size_t from = found == std::string::npos ? what.size() : found + words.size();
        const auto ends = [](char c) { return g_ascii_isalnum(c) == 0 && c != '-'; };
        const auto begin = what.begin() + static_cast<std::ptrdiff_t>(from);
        return std::string(begin, std::find_if(begin, what.end(), ends));
    };
    const std::string unknown = name_after("Parse error in property name: ");
    const std::string untyped = name_after("Invalid VALUE type for property ");
    const std::string dropped = name_after(" value in ");
    const icalproperty_kind kind = icalproperty_string_to_kind(dropped.c_str());
    if (!unknown.empty() && what.ends_with(": " + unknown)) {
        count(unknown);  // a name that libical does not know
    } else if (!untyped.empty()) {
        count(untyped + ";VALUE");  // read as if the parameter were not there
    } else if (!dropped.empty() && (kind == ICAL_DTSTAMP_PROPERTY || row_of(kind) == nullptr)) {
        count(dropped);
    } else if (what.find("No value for") == std::string::npos) {  // "LOCATION:" is an empty text
        problem(event, fmt::format("not understood: {}", what));
    }
}

void Reader::count_parameters(Property property) {
    const std::string name = name_text(property);
    for (icalparameter* parameter = icalproperty_get_first_parameter(property, ICAL_ANY_PARAMETER);
         parameter != nullptr;
         parameter = icalproperty_get_next_parameter(property, ICAL_ANY_PARAMETER)) {
        const IcalText text(icalparameter_as_ical_string_r(parameter));
        const std::string pair = text ? text.get() : "";
        const std::string key = pair.substr(0, pair.find('='));
        if (key != "TZID" && key != "VALUE" && key != "CN" && key != "RANGE" &&
            !key.starts_with("X-LIC")) {
            count(fmt::format("{};{}", name, key));
        }
    }
}

// Some producers write an all-day event as midnight to midnight, with this marker.
void Reader::all_day_marker(IcsEvent& event, IcsTime& end) {
    for (Property property = first(ICAL_X_PROPERTY); property != nullptr;
         property = icalcomponent_get_next_property(component_, ICAL_X_PROPERTY)) {
        if (name_text(property) == "X-MICROSOFT-CDO-ALLDAYEVENT" &&
            value_text(property) == "TRUE") {
            const auto midnight = [](const WallTime& t) {
                return t.hour == 0 && t.minute == 0 && t.second == 0;
            };
            if (midnight(event.start.wall) && midnight(end.wall)) {
                event.start.is_date = end.is_date = true;
            }
        }
    }
}

void Reader::end(IcsEvent& event) {
    const IcsTime& start = event.start;
    IcsTime end = start;
    const Property duration = first(ICAL_DURATION_PROPERTY);
    std::int64_t exact_ms = 0;
    if (const Property property = first(ICAL_DTEND_PROPERTY); property != nullptr) {
        const auto read = time(property);
        if (!read) {
            problem(event, "its DTEND is no time; it ends as it starts");
        }
        end = read.value_or(start);
    } else if (duration != nullptr) {
        // Days follow the clock, hours pass (RFC 5545 3.3.6).
        const icaldurationtype length = icalproperty_get_duration(duration);
        const int sign = length.is_neg != 0 ? -1 : 1;
        const std::int64_t days = length.days + std::int64_t{7} * length.weeks;
        end.wall.day += sign * static_cast<int>(std::min(days, kMostDays));
        exact_ms = sign * std::int64_t{1000} *
                   (std::int64_t{3600} * length.hours + std::int64_t{60} * length.minutes +
                    length.seconds);
    }
    if (!start.is_date) {
        all_day_marker(event, end);
    }
    EventDocument& document = event.document;
    document.all_day = start.is_date;
    document.start_ms = start.ms();
    if (start.is_date) {
        end.is_date = true;
        end.wall = {end.wall.year, end.wall.month, end.wall.day, 0, 0, 0};
        const std::int64_t days = (exact_ms + kDayMs - 1) / kDayMs;
        document.end_ms = std::max(end.ms() + days * kDayMs, start.ms() + kDayMs);
        return;
    }
    if (end.is_date) {
        end.is_date = false;
        end.zone = start.zone;
    }
    document.zone = start.zone->document_zone();
    document.end_ms = end.ms() + exact_ms;
    if (*document.end_ms < *document.start_ms) {
        problem(event, "it ends before it starts; stored as ending when it starts");
        document.end_ms = document.start_ms;
    }
    if (end.zone->document_zone() != start.zone->document_zone()) {
        count("DTEND in another zone than DTSTART (the instant is kept)");
    }
}

bool Reader::times(IcsEvent& event) {
    Property property = first(ICAL_DTSTART_PROPERTY);
    std::string reason;
    for (Property error = first(ICAL_XLICERROR_PROPERTY); error != nullptr;
         error = icalcomponent_get_next_property(component_, ICAL_XLICERROR_PROPERTY)) {
        const std::string what = value_text(error);
        reason = what.find("DTSTART") == std::string::npos ? reason : what;
    }
    if (property == nullptr && reason.empty()) {
        property = first(ICAL_RECURRENCEID_PROPERTY);  // who cancels an occurrence says no more
    }
    const auto start = property == nullptr ? std::nullopt : time(property);
    if (!start) {
        problem(event, (reason.empty() ? "it has no usable DTSTART" : reason) + "; left out");
        return false;
    }
    event.start = *start;
    end(event);
    return true;
}

void Reader::alarm(IcsEvent& event, icalcomponent* alarm) {
    EventDocument& document = event.document;
    constexpr std::int64_t kMostMinutes = std::numeric_limits<std::int32_t>::max() / 60;
    const Property trigger = icalcomponent_get_first_property(alarm, ICAL_TRIGGER_PROPERTY);
    for (Property property = icalcomponent_get_first_property(alarm, ICAL_ANY_PROPERTY);
         property != nullptr;
         property = icalcomponent_get_next_property(alarm, ICAL_ANY_PROPERTY)) {
        const std::string name = name_text(property);
        if (name == "ACTION" && value_text(property) == "NONE") {
            count("VALARM with ACTION:NONE (no alert)");
            return;
        }
        if (name == "ACTION" && value_text(property) != "DISPLAY") {
            count("VALARM with ACTION:" + value_text(property) + " (becomes a plain alert)");
        } else if (icalproperty_isa(property) == ICAL_XLICERROR_PROPERTY) {
            error(event, property);
        } else if (name == "DESCRIPTION") {  // required there; counts if it says something
            const std::string text = plain_text(property);
            if (text != title_ && text != "Reminder") {
                count("VALARM DESCRIPTION");
            }
        } else if (name != "ACTION" && name != "TRIGGER") {
            count("VALARM " + name);
        }
    }
    if (trigger == nullptr) {
        count("VALARM without TRIGGER");
        return;
    }
    const icaltriggertype when = icalproperty_get_trigger(trigger);
    if (icaltime_is_null_time(when.time) == 0) {
        count("VALARM at a fixed time");
        return;
    }
    std::int64_t before_s = -static_cast<std::int64_t>(icaldurationtype_as_int(when.duration));
    if (parameter_text(trigger, "RELATED") == "END") {
        before_s -= (*document.end_ms - *document.start_ms) / 1000;
    }
    if (before_s % 60 != 0) {
        count("VALARM TRIGGER, its seconds");
    }
    const std::int64_t minutes = before_s / 60;
    if (minutes > kMostMinutes || minutes < -kMostMinutes) {
        count("VALARM further off than a device can count");
        return;
    }
    document.reminders.push_back(minutes);
}

void Reader::alarms(IcsEvent& event) {
    for (icalcomponent* part = icalcomponent_get_first_component(component_, ICAL_ANY_COMPONENT);
         part != nullptr; part = icalcomponent_get_next_component(component_, ICAL_ANY_COMPONENT)) {
        const icalcomponent_kind kind = icalcomponent_isa(part);
        if (kind == ICAL_VALARM_COMPONENT) {
            alarm(event, part);
        } else {
            const char* name = icalcomponent_kind_to_string(kind);
            const bool named = name != nullptr && kind != ICAL_X_COMPONENT;
            count(named ? name : "component of an unknown kind inside an event");
        }
    }
}

bool Reader::read(IcsEvent& event) {
    if (const Property property = first(ICAL_SUMMARY_PROPERTY); property != nullptr) {
        title_ = plain_text(property);
    }
    const bool usable = times(event);
    for (Property property = first(ICAL_ANY_PROPERTY); property != nullptr;
         property = icalcomponent_get_next_property(component_, ICAL_ANY_PROPERTY)) {
        if (const Row* row = row_of(icalproperty_isa(property)); row != nullptr) {
            if (usable) {
                (this->*row->read)(event, property);
                count_parameters(property);
            }
            continue;
        }
        const std::string name = name_text(property);
        if (name == "X-QOR-TIMEZONE") {
            stored_zone(event, property);
        } else if (usable && name != "X-MICROSOFT-CDO-ALLDAYEVENT") {
            count(name);
        }
    }
    if (usable) {
        alarms(event);
    }
    return usable;
}

}  // namespace

std::optional<IcsEvent> read_event(icalcomponent* component, const std::string& where,
                                   IcsZones& zones, IcsReport& report) {
    IcsEvent event;
    event.where = where;
    return Reader(component, zones, report).read(event) ? std::optional(std::move(event))
                                                        : std::nullopt;
}

std::int64_t instance_ms(const IcsTime& instance, bool all_day, const IcsZone& zone,
                         const WallTime& start) {
    WallTime wall = instance.wall;
    if (all_day) {
        return utc_instant({wall.year, wall.month, wall.day, 0, 0, 0}) * 1000;
    }
    if (!instance.is_date) {
        return instance.ms();
    }
    wall.hour = start.hour;
    wall.minute = start.minute;
    wall.second = start.second;
    return zone.instant(wall) * 1000;
}

}  // namespace qor
