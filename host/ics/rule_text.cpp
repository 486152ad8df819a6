// SPDX-License-Identifier: Apache-2.0
//
// RRULE values between files and documents. Keeps no state; any thread.
#include "host/ics/rule_text.h"

#include <fmt/format.h>
#include <glib.h>

#include <map>

namespace qor {
namespace {

// The order in which devices write the parts.
constexpr const char* kPartOrder[] = {"FREQ",     "INTERVAL",   "BYSECOND",  "BYMINUTE", "BYHOUR",
                                      "BYDAY",    "BYMONTHDAY", "BYYEARDAY", "BYWEEKNO", "BYMONTH",
                                      "BYSETPOS", "WKST",       "COUNT",     "UNTIL"};
constexpr std::size_t kLongestPart = 103;  // what the adapter reads: "BYMONTHDAY=1,2,...,31" fits

std::map<std::string, std::string> parts_of(const std::string& rule) {
    std::map<std::string, std::string> parts;
    for (std::size_t at = 0; at < rule.size();) {
        const std::size_t end = std::min(rule.find(';', at), rule.size());
        const std::string part = rule.substr(at, end - at);
        const std::size_t equals = std::min(part.find('='), part.size());
        std::string name = part.substr(0, equals);
        for (char& c : name) {
            c = g_ascii_toupper(c);
        }
        if (equals + 1 < part.size()) {
            parts.emplace(std::move(name), part.substr(equals + 1));
        }
        at = end + 1;
    }
    return parts;
}

std::string utc_text(const WallTime& t) {
    return fmt::format("{:04}{:02}{:02}T{:02}{:02}{:02}Z", t.year, t.month, t.day, t.hour, t.minute,
                       t.second);
}

// UNTIL of a timed event given as a date includes that whole day; one without a zone is a time in
// the event's zone.
std::string document_until(const std::string& value, const IcsTime& start) {
    const icaltimetype until = icaltime_from_string(value.c_str());
    if (icaltime_is_null_time(until) != 0) {
        return {};
    }
    WallTime wall{until.year, until.month, until.day, until.hour, until.minute, until.second};
    if (start.is_date) {
        return utc_text({wall.year, wall.month, wall.day, 0, 0, 0});
    }
    if (icaltime_is_utc(until) != 0) {
        return utc_text(wall);
    }
    if (until.is_date != 0) {
        wall = {wall.year, wall.month, wall.day, 23, 59, 59};
    }
    return utc_text(wall_time(start.zone->instant(wall), kUtcZone).value_or(wall));
}

std::string joined(const std::map<std::string, std::string>& parts) {
    std::string text;
    for (const char* name : kPartOrder) {
        if (const auto part = parts.find(name); part != parts.end()) {
            text += fmt::format("{}{}={}", text.empty() ? "" : ";", name, part->second);
        }
    }
    return text;
}

}  // namespace

std::string document_rule(const std::string& value, const IcsTime& start, const std::string& title,
                          IcsReport& report) {
    std::map<std::string, std::string> parts = parts_of(value);
    const std::string frequency = parts["FREQ"];
    if (frequency.empty()) {
        return {};
    }
    if (frequency != "DAILY" && frequency != "WEEKLY" && frequency != "MONTHLY" &&
        frequency != "YEARLY") {
        report.count("RRULE with FREQ=" + frequency + " (devices show it once)", title);
    }
    parts.emplace("INTERVAL", "1");
    if (const auto until = parts.find("UNTIL"); until != parts.end()) {
        until->second = document_until(until->second, start);
        if (until->second.empty()) {
            return {};
        }
    }
    for (const char* name : {"RSCALE", "SKIP"}) {
        if (parts.contains(name)) {
            report.count(fmt::format("RRULE with {}", name), title);
        }
    }
    for (const auto& [name, text] : parts) {
        if (name.size() + 1 + text.size() > kLongestPart) {
            report.count(
                fmt::format("RRULE with {} longer than {} characters (devices cannot read it)",
                            name, kLongestPart),
                title);
        }
    }
    return joined(parts);
}

std::string ics_rule(const std::string& rule, bool all_day) {
    std::map<std::string, std::string> parts = parts_of(rule);
    if (const auto until = parts.find("UNTIL"); until != parts.end() && all_day) {
        until->second = until->second.substr(0, 8);
    }
    return joined(parts);
}

}  // namespace qor
