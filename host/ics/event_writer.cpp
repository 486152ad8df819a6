// SPDX-License-Identifier: Apache-2.0
//
// One document written as a VEVENT. Keeps no state; any thread.
#include "host/ics/event_writer.h"

#include <fmt/format.h>

#include <cstdlib>
#include <limits>

#include "host/document/zone.h"
#include "host/ics/rule_text.h"

namespace qor {
namespace {

icaltimetype ical_time(const WallTime& wall, bool is_date) {
    icaltimetype time = icaltime_null_time();
    time.year = wall.year;
    time.month = wall.month;
    time.day = wall.day;
    time.hour = wall.hour;
    time.minute = wall.minute;
    time.second = wall.second;
    time.is_date = is_date ? 1 : 0;
    return time;
}

std::int64_t seconds(std::int64_t ms) {
    return ms / 1000 - (ms % 1000 < 0 ? 1 : 0);
}

class Writer {
  public:
    Writer(const EventToWrite& event, std::set<std::string>& zones, IcsReport& report)
        : event_(event), document_(event.document), zones_(zones), report_(report) {}

    IcalComponent write();

  private:
    void add(icalproperty* property) { icalcomponent_add_property(component_.get(), property); }
    bool add_time(icalproperty_kind kind, std::int64_t ms, bool is_date, const std::string& zone);
    void add_times();
    void add_stored_zone(bool zone_written);
    void add_rule();
    void add_place();
    void add_organizer();
    void add_alarms();
    void count(const std::string& kind) {
        report_.count(kind, document_.title.value_or(event_.key));
    }
    void problem(std::string what) {
        report_.problems.push_back({event_.key, document_.title.value_or(""), std::move(what)});
    }

    const EventToWrite& event_;
    const EventDocument& document_;
    std::set<std::string>& zones_;
    IcsReport& report_;
    IcalComponent component_;
};

// True when the time was written in its zone; false for UTC, also where the zone's clock cannot
// say it (the second of two equal hours) or the system has no rules of the zone.
bool Writer::add_time(icalproperty_kind kind, std::int64_t ms, bool is_date,
                      const std::string& zone) {
    const std::int64_t instant = seconds(ms);
    const auto wall = is_date || is_utc_zone(zone) ? std::nullopt : wall_time(instant, zone);
    const bool in_zone = wall && instant_of(*wall, zone) == instant &&
                         icaltimezone_get_builtin_timezone(zone.c_str()) != nullptr;
    icaltimetype time = ical_time(in_zone ? *wall : *wall_time(instant, kUtcZone), is_date);
    if (is_date) {
        time.hour = time.minute = time.second = 0;
    } else if (!in_zone) {
        time.zone = icaltimezone_get_utc_timezone();
    }
    icalproperty* property = icalproperty_new(kind);
    icalproperty_set_value(property,
                           is_date ? icalvalue_new_date(time) : icalvalue_new_datetime(time));
    if (is_date) {
        icalproperty_set_parameter(property, icalparameter_new_value(ICAL_VALUE_DATE));
    }
    if (in_zone) {
        icalproperty_set_parameter(property, icalparameter_new_tzid(zone.c_str()));
        zones_.insert(zone);
    }
    add(property);
    return in_zone;
}

void Writer::add_times() {
    const std::string zone = document_.zone.value_or(kUtcZone);
    const bool zone_written =
        add_time(ICAL_DTSTART_PROPERTY, *document_.start_ms, document_.all_day, zone);
    if (document_.end_ms && *document_.end_ms > *document_.start_ms) {
        add_time(ICAL_DTEND_PROPERTY, *document_.end_ms, document_.all_day,
                 zone_written ? zone : kUtcZone);
    }
    add_stored_zone(zone_written);
    const EventDocument& series = event_.parent == nullptr ? document_ : *event_.parent;
    const std::string series_zone = series.zone.value_or(kUtcZone);
    if (event_.parent != nullptr) {
        add_time(ICAL_RECURRENCEID_PROPERTY, *document_.instance_ms, series.all_day, series_zone);
    }
    for (const std::int64_t instance : event_.excluded_ms) {
        add_time(ICAL_EXDATE_PROPERTY, instance, series.all_day, series_zone);
    }
}

void Writer::add_stored_zone(bool zone_written) {
    const bool as_read_back =
        document_.all_day ? !document_.zone : zone_written || document_.zone == kUtcZone;
    if (!as_read_back) {
        icalproperty* property = icalproperty_new_x(document_.zone.value_or("none").c_str());
        icalproperty_set_x_name(property, "X-QOR-TIMEZONE");
        add(property);
    }
}

void Writer::add_rule() {
    if (!document_.rule) {
        return;
    }
    const std::string text = ics_rule(*document_.rule, document_.all_day);
    const icalrecurrencetype rule = icalrecurrencetype_from_string(text.c_str());
    if (rule.freq == ICAL_NO_RECURRENCE) {
        problem(fmt::format("its rule \"{}\" is none; written as a single event", *document_.rule));
        return;
    }
    add(icalproperty_new_rrule(rule));
}

void Writer::add_place() {
    if (!document_.latitude && !document_.longitude) {
        return;
    }
    const double latitude =
        static_cast<double>(std::atoll(document_.latitude.value_or("1000000000").c_str())) / 1e6;
    const double longitude =
        static_cast<double>(std::atoll(document_.longitude.value_or("1000000000").c_str())) / 1e6;
    if (latitude > 90 || latitude < -90 || longitude > 180 || longitude < -180) {
        count("coordinates that are no place on Earth");
        return;
    }
    add(icalproperty_new_geo({latitude, longitude}));
}

void Writer::add_organizer() {
    std::string name = without_controls(document_.organizer.value_or(""));
    if (name.empty()) {
        return;
    }
    if (name.find('@') != std::string::npos &&
        name.find_first_of(" \"\n\t<>") == std::string::npos) {
        add(icalproperty_new_organizer(("mailto:" + name).c_str()));
        return;
    }
    // libical writes quotes and line ends as "^'" and "^n" (RFC 6868), but not a "^" itself.
    for (std::size_t at = 0; (at = name.find('^', at)) != std::string::npos; at += 2) {
        name.insert(at, 1, '^');
    }
    icalproperty* property = icalproperty_new_organizer("invalid:nomail");
    icalproperty_set_parameter(property, icalparameter_new_cn(name.c_str()));
    add(property);
}

void Writer::add_alarms() {
    constexpr std::int64_t kMostMinutes = std::numeric_limits<int>::max() / 60;
    for (const std::int64_t minutes : document_.reminders) {
        if (minutes > kMostMinutes || minutes < -kMostMinutes) {
            count("reminder too far off to be written");
            continue;
        }
        icalcomponent* alarm = icalcomponent_new_valarm();
        icalcomponent_add_property(alarm, icalproperty_new_action(ICAL_ACTION_DISPLAY));
        icalcomponent_add_property(
            alarm,
            icalproperty_new_trigger(icaltriggertype_from_int(-static_cast<int>(minutes) * 60)));
        icalcomponent_add_property(alarm, icalproperty_new_description("Reminder"));
        icalcomponent_add_component(component_.get(), alarm);
    }
}

IcalComponent Writer::write() {
    if (!document_.start_ms) {
        problem("it has no start; left out");
        return nullptr;
    }
    component_.reset(icalcomponent_new_vevent());
    add(icalproperty_new_uid(event_.uid.c_str()));
    add(icalproperty_new_dtstamp(icaltime_from_timet_with_zone(seconds(event_.modified_ms), 0,
                                                               icaltimezone_get_utc_timezone())));
    add_times();
    add_rule();
    const std::pair<const std::optional<std::string>&, icalproperty* (*)(const char*)> texts[] = {
        {document_.title, icalproperty_new_summary},
        {document_.location, icalproperty_new_location},
        {document_.description, icalproperty_new_description},
    };
    for (const auto& [text, make] : texts) {
        if (text && !text->empty()) {
            add(make(without_controls(*text).c_str()));
        }
    }
    add_place();
    add_organizer();
    add_alarms();
    return std::move(component_);
}

}  // namespace

IcalComponent write_event(const EventToWrite& event, std::set<std::string>& zones,
                          IcsReport& report) {
    return Writer(event, zones, report).write();
}

IcalComponent write_zone(const std::string& zone) {
    icaltimezone* known = icaltimezone_get_builtin_timezone(zone.c_str());
    icalcomponent* rules = known == nullptr ? nullptr : icaltimezone_get_component(known);
    IcalComponent copy(rules == nullptr ? nullptr : icalcomponent_new_clone(rules));
    if (copy) {
        icalproperty* id = icalcomponent_get_first_property(copy.get(), ICAL_TZID_PROPERTY);
        if (id != nullptr) {
            icalproperty_set_tzid(id, zone.c_str());
        }
    }
    return copy;
}

}  // namespace qor
