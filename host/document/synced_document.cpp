// SPDX-License-Identifier: Apache-2.0
//
// What the host needs to understand of an event document.
#include "host/document/synced_document.h"

#include <fmt/chrono.h>
#include <fmt/format.h>

#include <array>
#include <cstdlib>
#include <map>
#include <nlohmann/json.hpp>
#include <utility>

#include "host/document/rule_until.h"

namespace qor {

namespace {

using Json = nlohmann::ordered_json;
using Meaning = std::map<std::string, std::string>;

constexpr int kDeepestNesting = 32;
constexpr std::int64_t kDaySeconds = 86400;
constexpr std::int64_t kNoCoordinate = 1000000000;

// Members that change together, and the name under which their meaning is compared.
struct Group {
    const char* name;
    std::array<const char*, 5> keys;
};
constexpr Group kGroups[] = {
    {"title", {"title"}},
    {"eventLocation", {"eventLocation"}},
    {"description", {"description"}},
    {"organizer", {"organizer"}},
    {"time", {"dtstart", "dtend", "duration", "allDay", "eventTimezone"}},
    {"rrule", {"rrule"}},
    {"longitude", {"longitude"}},
    {"latitude", {"latitude"}},
};

bool nested_too_deep(std::string_view text) {
    int depth = 0;
    bool quoted = false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const char c = text[i];
        if (quoted) {
            i += c == '\\' ? 1 : 0;
            quoted = c != '"';
        } else if (c == '"') {
            quoted = true;
        } else if (c == '{' || c == '[') {
            if (++depth > kDeepestNesting) {
                return true;
            }
        } else if (c == '}' || c == ']') {
            --depth;
        }
    }
    return false;
}

std::string member(const Json& object, const char* key) {
    const auto found = object.find(key);
    return found != object.end() && found->is_string() ? found->get<std::string>() : std::string();
}

std::int64_t to_integer(const std::string& text) {
    return std::strtoll(text.c_str(), nullptr, 10);
}

std::int64_t floor_to_day(std::int64_t seconds) {
    const std::int64_t rest = seconds % kDaySeconds;
    return seconds - (rest < 0 ? rest + kDaySeconds : rest);
}

std::string time_meaning(const Json& event) {
    const bool all_day = to_integer(member(event, "allDay")) == 1;
    const auto seconds = [&](const char* key) {
        const std::int64_t value = to_integer(member(event, key)) / 1000;
        return all_day ? floor_to_day(value) : value;
    };
    // Where the end is told as a duration, only a device knows the end that comes of it.
    const std::string end =
        event.contains("duration") ? "duration" : std::to_string(seconds("dtend"));
    return fmt::format("{} {} {} {}", seconds("dtstart"), end, all_day,
                       member(event, "eventTimezone"));
}

std::string rule_meaning(const std::string& rule, bool all_day) {
    Meaning parts = {{"INTERVAL", "1"}};
    std::size_t at = 0;
    while (at <= rule.size()) {
        const std::size_t end = std::min(rule.find_first_of(";:", at), rule.size());
        const std::string part = rule.substr(at, end - at);
        at = end + 1;
        const std::size_t equals = part.find('=');
        if (equals == std::string::npos) {
            continue;
        }
        std::string value = part.substr(equals + 1);
        if (all_day && part.starts_with("UNTIL=")) {
            value = value.substr(0, 8);
        }
        parts[part.substr(0, equals)] = value;
    }
    if (!parts.contains("FREQ")) {
        return {};
    }
    std::string text;
    for (const auto& [name, value] : parts) {
        text.append(name).append("=").append(value).append(";");
    }
    return text;
}

std::string coordinate_meaning(const Json& event, const char* key) {
    const std::string text = member(event, key);
    const std::int64_t value = to_integer(text);
    return text.empty() || value == kNoCoordinate ? "" : std::to_string(value);
}

std::string reminder_meaning(const Json& root) {
    std::string text;
    const auto reminders = root.find("REMINDERS");
    if (reminders == root.end() || !reminders->is_array()) {
        return text;
    }
    for (const Json& reminder : *reminders) {
        if (reminder.is_object()) {
            text += std::to_string(to_integer(member(reminder, "minutes"))) + ",";
        }
    }
    return text;
}

Meaning meaning(const SyncedDocument& document) {
    const Json& event = document.event();
    if (document.kind() == ItemKind::kCancelled) {
        return {{"parent", document.parent_key()},
                {"instant", std::to_string(document.instant_ms() / 1000)}};
    }
    const bool all_day = to_integer(member(event, "allDay")) == 1;
    Meaning result;
    for (const char* key : {"title", "eventLocation", "description", "organizer"}) {
        result[key] = member(event, key);
    }
    result["time"] = time_meaning(event);
    result["rrule"] = rule_meaning(member(event, "rrule"), all_day);
    result["longitude"] = coordinate_meaning(event, "longitude");
    result["latitude"] = coordinate_meaning(event, "latitude");
    result["reminders"] = reminder_meaning(document.root());
    return result;
}

void copy_member(const Json& from, Json& to, const char* key) {
    if (from.contains(key)) {
        to[key] = from.at(key);
    } else {
        to.erase(key);
    }
}

}  // namespace

SyncedDocument::SyncedDocument() : root_(std::make_unique<Json>()) {}
SyncedDocument::SyncedDocument(const SyncedDocument& other)
    : root_(std::make_unique<Json>(*other.root_)) {}
SyncedDocument::SyncedDocument(SyncedDocument&& other) noexcept = default;
SyncedDocument& SyncedDocument::operator=(SyncedDocument other) noexcept {
    root_.swap(other.root_);
    return *this;
}
SyncedDocument::~SyncedDocument() = default;

std::optional<SyncedDocument> SyncedDocument::parse(std::string_view text) {
    if (nested_too_deep(text)) {
        return std::nullopt;
    }
    SyncedDocument document;
    *document.root_ = Json::parse(text, nullptr, false);
    if (!document.root().is_object() || !document.root().contains("EVENT") ||
        !document.event().is_object()) {
        return std::nullopt;
    }
    return document;
}

void SyncedDocument::set(const std::string& key, const std::string& value) {
    event()[key] = value;
}

std::string SyncedDocument::text() const {
    return root_->dump();
}

Json& SyncedDocument::event() {
    return (*root_)["EVENT"];
}

const Json& SyncedDocument::event() const {
    return std::as_const(*root_)["EVENT"];
}

std::string SyncedDocument::value(const char* key) const {
    return member(event(), key);
}

ItemKind SyncedDocument::kind() const {
    if (value("original_sync_id").empty()) {
        return ItemKind::kOrdinary;
    }
    return to_integer(value("eventStatus")) == 2 ? ItemKind::kCancelled : ItemKind::kChanged;
}

bool SyncedDocument::recurring() const {
    return value("rrule").find("FREQ=") != std::string::npos;
}

std::string SyncedDocument::title() const {
    return value("title");
}

std::string SyncedDocument::parent_key() const {
    return value("original_sync_id");
}

std::int64_t SyncedDocument::instant_ms() const {
    return to_integer(value("originalInstanceTime"));
}

std::string SyncedDocument::label() const {
    const bool all_day = to_integer(value("allDay")) == 1;
    const std::int64_t at_ms =
        kind() == ItemKind::kCancelled ? instant_ms() : to_integer(value("dtstart"));
    std::string name = title().empty() ? "(no title)" : title();
    constexpr std::int64_t kYear9999 = 253402300799;
    const std::int64_t seconds = at_ms / 1000;
    if (seconds < -kYear9999 || seconds > kYear9999) {
        return name;
    }
    const std::tm time = fmt::gmtime(static_cast<std::time_t>(seconds));
    return fmt::format(
        "{} ({}{})", name,
        all_day ? fmt::format("{:%Y-%m-%d}", time) : fmt::format("{:%Y-%m-%d %H:%M} UTC", time),
        kind() == ItemKind::kCancelled ? ", cancelled" : "");
}

bool documents_agree(const SyncedDocument& one, const SyncedDocument& other) {
    Meaning left = meaning(one);
    Meaning right = meaning(other);
    if (one.event().contains("duration") != other.event().contains("duration")) {
        Json plain_left = one.event();
        Json plain_right = other.event();
        for (Json* event : {&plain_left, &plain_right}) {
            event->erase("dtend");
            event->erase("duration");
        }
        left["time"] = time_meaning(plain_left);
        right["time"] = time_meaning(plain_right);
    }
    return left == right;
}

SyncedDocument merge_changes(const SyncedDocument& cloud, const SyncedDocument& before,
                             const SyncedDocument& now) {
    SyncedDocument merged = cloud;
    Meaning was = meaning(before);
    Meaning is = meaning(now);
    for (const Group& group : kGroups) {
        if (was[group.name] == is[group.name]) {
            continue;
        }
        for (const char* key : group.keys) {
            if (key != nullptr) {
                copy_member(now.event(), merged.event(), key);
            }
        }
    }
    if (was["reminders"] != is["reminders"]) {
        copy_member(now.root(), merged.root(), "REMINDERS");
        copy_member(now.event(), merged.event(), "hasAlarm");
    }
    return merged;
}

std::string for_device(const SyncedDocument& document) {
    SyncedDocument ordered = document;
    for (const char* key : {"original_sync_id", "originalInstanceTime"}) {
        const auto found = ordered.event().find(key);
        if (found != ordered.event().end()) {
            const Json kept = *found;
            ordered.event().erase(key);
            ordered.event()[key] = kept;
        }
    }
    return until_to_wall_clock(ordered.text());
}

}  // namespace qor
