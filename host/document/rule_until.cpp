// SPDX-License-Identifier: Apache-2.0
//
// UNTIL between UTC and wall-clock time, through ICU as a device computes it: lenient, with ICU's
// own choice for times that the clock skips or shows twice. Keeps no state; any thread.
#include "host/document/rule_until.h"

#include <fmt/format.h>

#include <array>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <optional>

#include "host/document/zone.h"

namespace qor {
namespace {

using nlohmann::ordered_json;

constexpr std::string_view kUntil = "UNTIL=";

std::string member_text(const ordered_json& event, const char* name) {
    const auto member = event.find(name);
    return member != event.end() && member->is_string() ? member->get<std::string>()
                                                        : std::string();
}

// "20141231T225959Z" with or without the Z; none for dates and anything else.
struct UntilText {
    WallTime time;
    bool utc = false;
};

std::optional<UntilText> parse_until(const std::string& text) {
    UntilText until;
    WallTime& t = until.time;
    char end = '\0';
    if (text.find_first_not_of("0123456789TZ") != std::string::npos || text.size() < 15) {
        return std::nullopt;
    }
    const int read = std::sscanf(text.c_str(), "%4d%2d%2dT%2d%2d%2d%c", &t.year, &t.month, &t.day,
                                 &t.hour, &t.minute, &t.second, &end);
    if (read < 6 || (read == 7 && (end != 'Z' || text.size() != 16))) {
        return std::nullopt;
    }
    until.utc = read == 7;
    return until;
}

std::string format_until(const WallTime& t, bool utc) {
    return fmt::format("{:04}{:02}{:02}T{:02}{:02}{:02}{}", t.year, t.month, t.day, t.hour,
                       t.minute, t.second, utc ? "Z" : "");
}

// Rewrites the value of UNTIL in place. False: there is nothing to rewrite.
bool convert_until(std::string& rule, const std::string& zone, bool to_utc) {
    std::size_t start = rule.find(kUntil);
    if (start == std::string::npos ||
        (start > 0 && rule[start - 1] != ';' && rule[start - 1] != ':')) {
        return false;
    }
    start += kUntil.size();
    const std::size_t end = std::min(rule.find_first_of(";:", start), rule.size());
    const std::optional<UntilText> until = parse_until(rule.substr(start, end - start));
    if (!until || until->utc == to_utc) {
        return false;
    }
    const std::optional<std::int64_t> instant =
        to_utc ? instant_of(until->time, zone, RepeatedHour::kSecond) : utc_instant(until->time);
    const std::optional<WallTime> wall =
        instant ? wall_time(*instant, to_utc ? kUtcZone : zone) : std::nullopt;
    if (!wall) {
        return false;
    }
    rule.replace(start, end - start, format_until(*wall, to_utc));
    return true;
}

// A device reads a rule with the kind and zone of the start that it has read before.
bool move_rule_back(ordered_json& event) {
    bool before = false;
    for (const auto& [name, value] : event.items()) {
        before = before || name == "rrule";
        if (before && (name == "dtstart" || name == "eventTimezone" || name == "allDay")) {
            ordered_json rule = event["rrule"];
            event.erase("rrule");
            event["rrule"] = std::move(rule);
            return true;
        }
    }
    return false;
}

std::string convert(std::string_view text, bool to_utc) {
    if (text.find(kUntil) == std::string_view::npos) {
        return std::string(text);  // most documents: spares them the parse
    }
    ordered_json document = ordered_json::parse(text, nullptr, false);
    const auto event = document.is_object() ? document.find("EVENT") : document.end();
    if (!document.is_object() || event == document.end() || !event->is_object()) {
        return std::string(text);
    }
    const bool moved = !to_utc && event->contains("rrule") && move_rule_back(*event);
    std::string rule = member_text(*event, "rrule");
    std::string zone = member_text(*event, "eventTimezone");
    const bool all_day = member_text(*event, "allDay") == "1";
    if (all_day || !convert_until(rule, zone.empty() ? kUtcZone : zone, to_utc)) {
        return moved ? document.dump() : std::string(text);
    }
    (*event)["rrule"] = rule;
    return document.dump();
}

}  // namespace

std::string until_to_wall_clock(std::string_view document) {
    return convert(document, false);
}

std::string until_to_utc(std::string_view document) {
    return convert(document, true);
}

}  // namespace qor
