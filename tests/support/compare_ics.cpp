// SPDX-License-Identifier: Apache-2.0
//
// compare_ics [--zone ZONE] [--allow KIND]... [--all] EXPORT.ics ORIGINAL.ics...: what an export
// says otherwise than the files that were imported, by kind, each with an example (or all of them).
// ZONE is of times without one. Reads both sides with libical alone, so that a mistake of the
// importer is not made a second time here. Exits 1 if there are differences of other kinds than
// the allowed ones.
#include <fmt/format.h>
#include <glib.h>
#include <libical/ical.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace {

constexpr int kMostOccurrences = 200;
constexpr int kWindowYears = 3;

struct FreeText {
    void operator()(char* text) const noexcept { icalmemory_free_buffer(text); }
};

std::string taken(char* text) {
    const std::unique_ptr<char, FreeText> owned(text);
    return owned ? owned.get() : "";
}

// A date or a time: what the file shows, and the second it means.
struct Moment {
    bool is_date = false;
    icaltimetype wall = icaltime_null_time();
    icaltimezone* zone = nullptr;  // null: UTC
    std::int64_t instant = 0;

    std::string clock() const { return taken(icaltime_as_ical_string_r(wall)).substr(0, 15); }
    std::string text() const {
        if (is_date) {
            return clock();
        }
        const time_t seconds = static_cast<time_t>(instant);
        return taken(icaltime_as_ical_string_r(
            icaltime_from_timet_with_zone(seconds, 0, icaltimezone_get_utc_timezone())));
    }
};

std::string plain(std::string text) {
    std::erase_if(text, [](char c) {
        return (static_cast<unsigned char>(c) < ' ' && c != '\n' && c != '\t') || c == '\x7f';
    });
    text.erase(text.find_last_not_of(" \t\n") + 1);
    text.erase(0, std::min(text.find_first_not_of(" \t\n"), text.size()));
    return text;
}

// Reads the times of one calendar.
class Reader {
  public:
    Reader(icalcomponent* calendar, icaltimezone* floating)
        : calendar_(calendar), floating_(floating) {}

    Moment moment(icaltimetype time, const char* tzid) const {
        Moment moment;
        moment.is_date = time.is_date != 0;
        moment.wall = time;
        moment.wall.zone = nullptr;
        if (!moment.is_date && icaltime_is_utc(time) == 0) {
            moment.zone = zone(tzid);
        }
        moment.instant =
            icaltime_as_timet_with_zone(moment.wall, moment.is_date ? nullptr : moment.zone);
        return moment;
    }
    std::optional<Moment> moment(icalproperty* property) const {
        if (property == nullptr || icalproperty_get_value(property) == nullptr) {
            return std::nullopt;
        }
        const icaltimetype time = icalvalue_get_datetimedate(icalproperty_get_value(property));
        icalparameter* tzid = icalproperty_get_first_parameter(property, ICAL_TZID_PARAMETER);
        if (icaltime_is_null_time(time) != 0 || time.month < 1 || time.month > 12 ||
            time.day > icaltime_days_in_month(time.month, time.year)) {
            return std::nullopt;
        }
        return moment(time, tzid == nullptr ? nullptr : icalparameter_get_tzid(tzid));
    }

  private:
    icaltimezone* zone(const char* tzid) const {
        if (tzid == nullptr) {
            return floating_;
        }
        if (std::strcmp(tzid, "UTC") == 0 || std::strcmp(tzid, "GMT") == 0) {
            return nullptr;
        }
        icaltimezone* found =
            calendar_ == nullptr ? nullptr : icalcomponent_get_timezone(calendar_, tzid);
        found = found != nullptr ? found : icaltimezone_get_builtin_timezone(tzid);
        found = found != nullptr ? found : icaltimezone_get_builtin_timezone_from_tzid(tzid);
        return found != nullptr ? found : floating_;
    }
    icalcomponent* calendar_;
    icaltimezone* floating_;
};

struct Event {
    std::string where;
    std::string uid;
    std::optional<Moment> instance;  // RECURRENCE-ID
    std::optional<Moment> start;
    Moment end;
    int sequence = 0;
    bool cancelled = false;
    std::string zone;
    std::map<std::string, std::string> texts;  // SUMMARY, GEO, alarms, ...
    std::optional<icalrecurrencetype> rule;
    std::vector<Moment> excluded;
    bool used = false;

    std::string name() const {
        return fmt::format("{} \"{}\"", where,
                           texts.contains("SUMMARY") ? texts.at("SUMMARY") : "");
    }
};

std::string value_of(icalproperty* property) {
    return taken(icalproperty_get_value_as_string_r(property));
}

std::string text_of(icalcomponent* component, icalproperty_kind kind) {
    icalproperty* property = icalcomponent_get_first_property(component, kind);
    const icalvalue* value = property == nullptr ? nullptr : icalproperty_get_value(property);
    const char* text = value == nullptr ? nullptr : icalvalue_get_text(value);
    return text == nullptr ? "" : plain(text);
}

std::string organizer(icalproperty* property) {
    icalparameter* cn = icalproperty_get_first_parameter(property, ICAL_CN_PARAMETER);
    std::string name = cn == nullptr ? "" : plain(icalparameter_get_cn(cn));
    std::string address = plain(value_of(property));
    if (g_ascii_strncasecmp(address.c_str(), "mailto:", 7) == 0) {
        address.erase(0, 7);
    }
    return !name.empty() ? name : address == "invalid:nomail" ? "" : address;
}

// Minutes before the start, of alarms that follow the event.
std::string alarms(icalcomponent* component, std::int64_t length_s) {
    std::multiset<std::int64_t> minutes;
    for (icalcomponent* alarm = icalcomponent_get_first_component(component, ICAL_VALARM_COMPONENT);
         alarm != nullptr;
         alarm = icalcomponent_get_next_component(component, ICAL_VALARM_COMPONENT)) {
        icalproperty* trigger = icalcomponent_get_first_property(alarm, ICAL_TRIGGER_PROPERTY);
        if (trigger == nullptr) {
            continue;
        }
        const icaltriggertype when = icalproperty_get_trigger(trigger);
        if (icaltime_is_null_time(when.time) == 0) {
            continue;
        }
        icalparameter* related = icalproperty_get_first_parameter(trigger, ICAL_RELATED_PARAMETER);
        const bool from_end =
            related != nullptr && icalparameter_get_related(related) == ICAL_RELATED_END;
        minutes.insert(
            (-std::int64_t{icaldurationtype_as_int(when.duration)} - (from_end ? length_s : 0)) /
            60);
    }
    return fmt::format("{}", fmt::join(minutes, ","));
}

Moment end_of(icalcomponent* component, const Moment& start, const Reader& reader) {
    if (const auto end =
            reader.moment(icalcomponent_get_first_property(component, ICAL_DTEND_PROPERTY))) {
        Moment result = *end;
        if (result.is_date != start.is_date) {  // the start says which of the two it is
            result.is_date = start.is_date;
            result.wall.is_date = start.is_date ? 1 : 0;
            result.zone = start.zone;
            result.instant = icaltime_as_timet_with_zone(result.wall, start.zone);
        }
        return result;
    }
    Moment result = start;
    icalproperty* duration = icalcomponent_get_first_property(component, ICAL_DURATION_PROPERTY);
    if (duration != nullptr) {
        const icaldurationtype length = icalproperty_get_duration(duration);
        const int sign = length.is_neg != 0 ? -1 : 1;
        const int seconds =
            static_cast<int>(length.hours * 3600 + length.minutes * 60 + length.seconds);
        const int days = static_cast<int>(length.days + 7 * length.weeks);
        if (start.is_date) {
            icaltime_adjust(&result.wall, sign * (days + (seconds + 86399) / 86400), 0, 0, 0);
        } else {
            icaltime_adjust(&result.wall, sign * days, 0, 0, 0);
        }
        result.instant = icaltime_as_timet_with_zone(result.wall, start.zone) +
                         (start.is_date ? 0 : sign * seconds);
    }
    return result;
}

// libical puts a prefix of its own before the names of the zones it comes with.
std::string zone_name(icaltimezone* zone) {
    const std::string name = icaltimezone_get_tzid(zone);
    const std::string prefix = "/freeassociation.sourceforge.net/";
    return name.starts_with(prefix) ? name.substr(prefix.size()) : name;
}

Event read_event(icalcomponent* component, const std::string& where, const Reader& reader) {
    Event event;
    event.where = where;
    const auto first = [&](icalproperty_kind kind) {
        return icalcomponent_get_first_property(component, kind);
    };
    const char* uid = icalcomponent_get_uid(component);
    event.uid = uid == nullptr ? "" : uid;
    event.sequence = icalcomponent_get_sequence(component);
    event.cancelled = icalcomponent_get_status(component) == ICAL_STATUS_CANCELLED;
    event.instance = reader.moment(first(ICAL_RECURRENCEID_PROPERTY));
    event.start = reader.moment(first(ICAL_DTSTART_PROPERTY));
    for (const auto& [name, kind] : {std::pair("SUMMARY", ICAL_SUMMARY_PROPERTY),
                                     std::pair("LOCATION", ICAL_LOCATION_PROPERTY),
                                     std::pair("DESCRIPTION", ICAL_DESCRIPTION_PROPERTY)}) {
        event.texts[name] = text_of(component, kind);
    }
    if (!event.start) {
        return event;
    }
    event.end = end_of(component, *event.start, reader);
    if (event.start->is_date && event.end.instant <= event.start->instant) {
        event.end = *event.start;
        icaltime_adjust(&event.end.wall, 1, 0, 0, 0);
        event.end.instant += 86400;
    }
    event.zone = event.start->is_date           ? "date"
                 : event.start->zone == nullptr ? "UTC"
                                                : zone_name(event.start->zone);
    if (icalproperty* geo = first(ICAL_GEO_PROPERTY)) {
        const icalgeotype place = icalproperty_get_geo(geo);
        event.texts["GEO"] = fmt::format("{:.6f} {:.6f}", place.lat, place.lon);
    }
    if (icalproperty* property = first(ICAL_ORGANIZER_PROPERTY)) {
        event.texts["ORGANIZER"] = organizer(property);
    }
    event.texts["VALARM"] = alarms(component, event.end.instant - event.start->instant);
    if (icalproperty* property = first(ICAL_RRULE_PROPERTY)) {
        event.rule = icalproperty_get_rrule(property);
    }
    for (icalproperty* property = first(ICAL_EXDATE_PROPERTY); property != nullptr;
         property = icalcomponent_get_next_property(component, ICAL_EXDATE_PROPERTY)) {
        if (const auto excluded = reader.moment(property)) {
            event.excluded.push_back(*excluded);
        }
    }
    return event;
}

std::string utf8(std::string text) {
    if (text.starts_with("\xef\xbb\xbf")) {
        text.erase(0, 3);
    }
    std::erase(text, '\0');
    if (g_utf8_validate(text.data(), static_cast<gssize>(text.size()), nullptr) != 0) {
        return text;
    }
    gsize length = 0;
    const std::unique_ptr<char, decltype(&g_free)> converted(
        g_convert(text.data(), static_cast<gssize>(text.size()), "UTF-8", "ISO-8859-1", nullptr,
                  &length, nullptr),
        g_free);
    return converted ? std::string(converted.get(), length) : text;
}

// An occurrence is named by its second, or by its date where one of the two is a date.
bool names(const Moment& moment, const Moment& occurrence) {
    if (moment.is_date || occurrence.is_date) {
        return moment.clock().substr(0, 8) == occurrence.clock().substr(0, 8);
    }
    return moment.instant == occurrence.instant;
}

std::vector<Moment> occurrences(const Event& event, const std::vector<Moment>& replaced) {
    if (!event.rule) {
        return {*event.start};
    }
    std::vector<Moment> result;
    icaltimetype start = event.start->wall;
    start.zone = event.start->is_date           ? nullptr
                 : event.start->zone == nullptr ? icaltimezone_get_utc_timezone()
                                                : event.start->zone;
    icalrecur_iterator* iterator = icalrecur_iterator_new(*event.rule, start);
    for (int i = 0; iterator != nullptr && i < kMostOccurrences; ++i) {
        icaltimetype next = icalrecur_iterator_next(iterator);
        if (icaltime_is_null_time(next) != 0 || next.year > start.year + kWindowYears) {
            break;
        }
        Moment moment = *event.start;
        next.zone = nullptr;
        moment.wall = next;
        moment.instant = icaltime_as_timet_with_zone(next, moment.is_date ? nullptr : moment.zone);
        const auto is_named = [&](const Moment& other) { return names(other, moment); };
        if (std::ranges::none_of(event.excluded, is_named) &&
            std::ranges::none_of(replaced, is_named)) {
            result.push_back(moment);
        }
    }
    icalrecur_iterator_free(iterator);
    return result;
}

struct FreeComponent {
    void operator()(icalcomponent* component) const noexcept { icalcomponent_free(component); }
};

// One of the two sides: all events of its files, also by UID.
struct Side {
    icaltimezone* floating = nullptr;
    std::vector<std::unique_ptr<icalcomponent, FreeComponent>> files;  // events look into them
    std::vector<Event> events;
    std::map<std::string, std::vector<Event*>> by_uid;

    bool read(const std::string& path) {
        std::ifstream in(path, std::ios::binary);
        std::stringstream text;
        text << in.rdbuf();
        if (!in) {
            fmt::print(stderr, "compare_ics: {}: cannot be read\n", path);
            return false;
        }
        files.emplace_back(icalparser_parse_string(utf8(text.str()).c_str()));
        if (files.back()) {
            collect(files.back().get(), nullptr, path.substr(path.rfind('/') + 1));
        }
        return true;
    }
    void index() {
        for (Event& event : events) {
            by_uid[event.uid].push_back(&event);
        }
    }
    std::vector<Moment> replaced(const Event& event) const {
        std::vector<Moment> result;
        if (const auto found = by_uid.find(event.uid); !event.instance && found != by_uid.end()) {
            for (const Event* other : found->second) {
                if (other->instance) {
                    result.push_back(*other->instance);
                }
            }
        }
        return result;
    }

  private:
    void collect(icalcomponent* component, icalcomponent* calendar, const std::string& where) {
        const icalcomponent_kind kind = icalcomponent_isa(component);
        if (kind == ICAL_VEVENT_COMPONENT) {
            Event event = read_event(component, where, Reader(calendar, floating));
            event.cancelled =
                event.cancelled ||
                (calendar != nullptr && icalcomponent_get_method(calendar) == ICAL_METHOD_CANCEL);
            events.push_back(std::move(event));
            return;
        }
        // An iterator of its own: looking up zones moves the one inside the component.
        icalcompiter parts = icalcomponent_begin_component(component, ICAL_ANY_COMPONENT);
        for (icalcomponent* part = icalcompiter_deref(&parts); part != nullptr;
             part = icalcompiter_next(&parts)) {
            collect(part, kind == ICAL_VCALENDAR_COMPONENT ? component : calendar, where);
        }
    }
};

std::string digest(const std::string& text) {
    gchar* sum = g_compute_checksum_for_string(G_CHECKSUM_SHA256, text.c_str(), -1);
    std::string result(sum);
    g_free(sum);
    return result;
}

class Comparison {
  public:
    Comparison(Side& originals, Side& exported) : originals_(originals), exported_(exported) {}

    void run() {
        // What is exactly there goes first: a UID may stand for several events.
        std::vector<Event*> rest;
        for (Event& event : originals_.events) {
            Event* counterpart = is_left_out(event) ? nullptr : best_of(event);
            if (counterpart != nullptr && rank(event, *counterpart) >= kExact) {
                take(event, *counterpart);
            } else {
                rest.push_back(&event);
            }
        }
        for (Event* event : rest) {
            find(*event);
        }
        for (const Event& event : exported_.events) {
            if (!event.used) {
                differ("only in the export", event, event.uid);
            }
        }
    }
    int print(bool all, const std::set<std::string>& allowed) const {
        bool failed = false;
        fmt::print("{} events in the files, {} in the export, {} compared\n",
                   originals_.events.size(), exported_.events.size(), compared_);
        for (const auto& [kind, lines] : found_) {
            failed = failed || !allowed.contains(kind);
            fmt::print("{:6} {}\n", lines.size(), kind);
            for (std::size_t i = 0; i < (all ? lines.size() : 1); ++i) {
                fmt::print("           {}\n", lines[i]);
            }
        }
        return failed ? 1 : 0;
    }

  private:
    void differ(const std::string& kind, const Event& event, const std::string& detail) {
        std::string line = fmt::format("{}: {}", event.name(), detail);
        std::ranges::replace(line, '\n', ' ');
        found_[kind].push_back(line);
    }
    bool is_older_version(const Event& event) const {
        return std::ranges::any_of(originals_.by_uid.at(event.uid), [&](const Event* other) {
            return !event.uid.empty() && other->start && other->sequence > event.sequence &&
                   other->where == event.where &&
                   other->instance.has_value() == event.instance.has_value() &&
                   (!event.instance || names(*other->instance, *event.instance));
        });
    }
    bool is_double(const Event& event) const {
        return std::ranges::any_of(originals_.by_uid.at(event.uid), [&](const Event* other) {
            return other < &event && (event.uid.empty() || other->where == event.where) &&
                   other->texts == event.texts && other->start &&
                   other->start->clock() == event.start->clock();
        });
    }
    bool is_left_out(const Event& event) const {
        return !event.start || event.cancelled || is_older_version(event);
    }
    Event* best_of(const Event& event) const {
        Event* best = nullptr;
        const std::string made =
            "uid-" + (event.uid.empty() ? "" : digest(event.uid).substr(0, 32));
        for (const std::string& uid : {event.uid, made}) {
            for (Event* candidate : candidates(uid)) {
                if (!candidate->used && fits(event, *candidate) &&
                    (best == nullptr || rank(event, *candidate) > rank(event, *best))) {
                    best = candidate;
                }
            }
        }
        return best;
    }
    void find(const Event& event) {
        if (!event.start) {
            differ("left out: no usable DTSTART", event, "");
        } else if (event.cancelled) {
            if (!event.instance) {
                differ("left out: cancelled", event, "");
            }
        } else if (is_older_version(event)) {
            differ("left out: a later SEQUENCE stands in the file", event, "");
        } else if (Event* best = best_of(event)) {
            take(event, *best);
        } else if (is_double(event)) {
            differ("left out: stands twice in the file", event, "");
        } else {
            differ("not in the export", event, event.uid);
        }
    }
    void take(const Event& event, Event& counterpart) {
        counterpart.used = true;
        ++compared_;
        if (counterpart.uid != event.uid) {
            differ("another UID", event, fmt::format("{} -> {}", event.uid, counterpart.uid));
        }
        compare(event, counterpart);
    }
    // Those of the UID, or of one that was made from it ("uid~1f2e", "uid#20260105T083000Z").
    std::vector<Event*> candidates(const std::string& uid) const {
        std::vector<Event*> result;
        for (auto at = exported_.by_uid.lower_bound(uid);
             !uid.empty() && at != exported_.by_uid.end() && at->first.starts_with(uid); ++at) {
            const char next = at->first.size() == uid.size() ? '~' : at->first[uid.size()];
            if (next == '~' || next == '#' || uid == "uid-") {
                result.insert(result.end(), at->second.begin(), at->second.end());
            }
        }
        return result;
    }
    bool fits(const Event& event, const Event& candidate) const {
        if (event.uid.empty() && (candidate.texts.at("SUMMARY") != event.texts.at("SUMMARY") ||
                                  candidate.start->clock() != event.start->clock())) {
            return false;
        }
        if (!event.instance || candidate.uid.find('#') != std::string::npos) {
            return !candidate.instance;
        }
        return candidate.instance && names(*event.instance, *candidate.instance);
    }
    static constexpr int kExact = 6;
    static int rank(const Event& event, const Event& candidate) {
        return (candidate.texts == event.texts ? 4 : 0) +
               (candidate.start->instant == event.start->instant ? 2 : 0) +
               (candidate.uid == event.uid ? 1 : 0);
    }
    void compare(const Event& a, const Event& b) {
        std::set<std::string> names;
        for (const auto* texts : {&a.texts, &b.texts}) {
            for (const auto& [name, text] : *texts) {
                names.insert(name);
            }
        }
        for (const std::string& name : names) {
            const std::string before = a.texts.contains(name) ? a.texts.at(name) : "";
            const std::string after = b.texts.contains(name) ? b.texts.at(name) : "";
            if (before != after) {
                differ(name, a, fmt::format("'{}' -> '{}'", before, after));
            }
        }
        if (a.start->is_date != b.start->is_date) {
            differ("a date for a time", a, b.start->text());
            return;
        }
        moments("DTSTART", a, {*a.start}, {*b.start});
        const std::int64_t length = a.end.instant - a.start->instant;
        if (length != b.end.instant - b.start->instant) {
            differ(length < 0 ? "end before the start" : "length", a,
                   fmt::format("{} s -> {} s", length, b.end.instant - b.start->instant));
        }
        if (a.zone != b.zone) {
            differ("zone", a, fmt::format("{} -> {}", a.zone, b.zone));
        }
        if (a.rule.has_value() != b.rule.has_value()) {
            differ("RRULE", a, a.rule ? "lost" : "new");
        } else if (a.rule) {
            moments("occurrences", a, occurrences(a, originals_.replaced(a)),
                    occurrences(b, exported_.replaced(b)));
        }
    }
    void moments(const std::string& what, const Event& event, const std::vector<Moment>& a,
                 const std::vector<Moment>& b) {
        const auto texts = [](const std::vector<Moment>& all, std::string (Moment::*text)() const) {
            std::vector<std::string> result(all.size());
            std::ranges::transform(all, result.begin(), text);
            return result;
        };
        const auto left = texts(a, &Moment::text);
        const auto right = texts(b, &Moment::text);
        if (left == right) {
            return;
        }
        const bool same_clock = texts(a, &Moment::clock) == texts(b, &Moment::clock);
        const auto [l, r] = std::ranges::mismatch(left, right);
        differ(what + (same_clock ? ", the same clock time in a zone of other rules" : ""), event,
               fmt::format("{} -> {} ({} -> {} in all)", l == left.end() ? "none" : *l,
                           r == right.end() ? "none" : *r, left.size(), right.size()));
    }

    Side& originals_;
    Side& exported_;
    std::size_t compared_ = 0;
    std::map<std::string, std::vector<std::string>> found_;
};

}  // namespace

int main(int argc, char** argv) {
    icalerror_set_errors_are_fatal(0);
    ical_set_unknown_token_handling_setting(ICAL_ASSUME_IANA_TOKEN);
    std::vector<std::string> files;
    std::set<std::string> allowed;
    Side originals;
    Side exported;
    bool all = false;
    for (int i = 1; i < argc; ++i) {
        const std::string argument = argv[i];
        if (argument == "--zone" && i + 1 < argc) {
            originals.floating = icaltimezone_get_builtin_timezone(argv[++i]);
        } else if (argument == "--allow" && i + 1 < argc) {
            allowed.insert(argv[++i]);
        } else if (argument == "--all") {
            all = true;
        } else {
            files.push_back(argument);
        }
    }
    for (const std::string& file : files) {
        if (!(&file == &files.front() ? exported : originals).read(file)) {
            return 2;
        }
    }
    if (originals.events.empty() || exported.events.empty()) {
        fmt::print(stderr, "compare_ics: no events on one of the sides\n");
        return 2;
    }
    originals.index();
    exported.index();
    Comparison comparison(originals, exported);
    comparison.run();
    return comparison.print(all, allowed);
}
