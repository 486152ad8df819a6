// SPDX-License-Identifier: Apache-2.0
//
// qor-cloud list, show and log.
#include <algorithm>
#include <map>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "host/cloud/qor_cloud_commands.h"
#include "host/document/event_document.h"
#include "host/document/zone.h"

namespace qor {
namespace {

using nlohmann::ordered_json;

constexpr std::size_t kLongestTitle = 44;

// "2014-03-15 08:30 UTC" of milliseconds since the epoch.
std::string utc_text(std::int64_t ms) {
    const WallTime t =
        wall_time(ms / 1000 - (ms % 1000 < 0 ? 1 : 0), kUtcZone).value_or(WallTime{});
    return fmt::format("{:04}-{:02}-{:02} {:02}:{:02} UTC", t.year, t.month, t.day, t.hour,
                       t.minute);
}

// "2014-03-15" of an all-day event, else its start on its own zone's clock.
std::string start_text(const EventDocument& event) {
    if (!event.start_ms) {
        return "-";
    }
    const std::string zone = event.zone.value_or(kUtcZone);
    const auto wall = wall_time(*event.start_ms / 1000, event.all_day ? kUtcZone : zone);
    if (!wall) {
        return utc_text(*event.start_ms);
    }
    const std::string date = fmt::format("{:04}-{:02}-{:02}", wall->year, wall->month, wall->day);
    return event.all_day ? date : fmt::format("{} {:02}:{:02}", date, wall->hour, wall->minute);
}

std::string kind_text(const EventDocument& event) {
    if (event.cancelled) {
        return "cancelled occurrence";
    }
    if (event.is_occurrence()) {
        return "changed occurrence";
    }
    if (!event.rule) {
        return "";
    }
    const std::size_t start = event.rule->find("FREQ=");
    std::string frequency = start == std::string::npos ? "" : event.rule->substr(start + 5);
    frequency = frequency.substr(0, frequency.find(';'));
    std::ranges::transform(frequency, frequency.begin(), [](char c) {
        return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    });
    return frequency;
}

std::string zone_text(const EventDocument& event) {
    const std::string zone = event.zone.value_or(kUtcZone);
    return event.all_day || event.cancelled ? "" : zone == kUtcZone ? "UTC" : zone;
}

ordered_json document_json(const CloudDocument& document) {
    ordered_json json{{"key", document.key},
                      {"revision", document.revision},
                      {"deleted", document.deleted},
                      {"title", document.title},
                      {"modified_ms", document.modified_ms},
                      {"modified_by", document.modified_by}};
    if (!document.parent_key.empty()) {
        json["parent_key"] = document.parent_key;
    }
    if (!document.deleted) {
        json["document"] = ordered_json::parse(document.text, nullptr, false);
    }
    return json;
}

std::string dumped(const ordered_json& json) {
    return json.dump(2, ' ', false, ordered_json::error_handler_t::replace) + "\n";
}

bool contains_ignoring_case(const std::string& text, const std::string& part) {
    const auto lower = [](char c) {
        return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    };
    return part.empty() ||
           std::search(text.begin(), text.end(), part.begin(), part.end(),
                       [&](char a, char b) { return lower(a) == lower(b); }) != text.end();
}

// The document of that key, or the only one whose key begins so. None: the message was printed.
std::optional<CloudDocument> find_document(const CloudStore& store, const std::string& key,
                                           Exit& exit) {
    const Result<std::optional<CloudDocument>> exact = store.get(key);
    if (!exact) {
        exit = fail(exact.error());
        return std::nullopt;
    }
    if (exact->has_value()) {
        return *exact;
    }
    const Result<CloudChanges> all = store.changes(0);
    if (!all) {
        exit = fail(all.error());
        return std::nullopt;
    }
    std::vector<const CloudDocument*> found;
    for (const CloudDocument& document : all->documents) {
        if (document.key.starts_with(key)) {
            found.push_back(&document);
        }
    }
    // An event's key begins those of its occurrences; it is the one that is meant.
    const auto shortest = std::ranges::min_element(
        found, {}, [](const CloudDocument* document) { return document->key.size(); });
    const bool one_series = std::ranges::all_of(found, [&](const CloudDocument* document) {
        return document->key.starts_with((*shortest)->key);
    });
    if (!found.empty() && one_series) {
        return **shortest;
    }
    print_error(found.empty()
                    ? fmt::format("no document {}; 'qor-cloud list' shows the keys", key)
                    : fmt::format("{} begins {} keys; give more of it", key, found.size()));
    exit = Exit::kFailed;
    return std::nullopt;
}

}  // namespace

Exit cloud_list(const CloudArguments& arguments) {
    const Result<CloudStore> store = CloudStore::open(arguments.cloud, {.who = arguments.who});
    if (!store) {
        return fail(store.error());
    }
    const Result<CloudChanges> changes = store->changes(arguments.since);
    if (!changes) {
        return fail(changes.error());
    }
    Table table({"START", "TITLE", "REPEATS", "ZONE", "REV", "KEY"});
    table.right_align({4});
    ordered_json json{{"revision", changes->revision}, {"documents", ordered_json::array()}};
    std::vector<std::pair<std::string, std::vector<std::string>>> rows;
    for (const CloudDocument& document : changes->documents) {
        if ((document.deleted && !arguments.deleted) ||
            !contains_ignoring_case(document.title, arguments.match)) {
            continue;
        }
        if (arguments.json) {
            json["documents"].push_back(document_json(document));
            continue;
        }
        const EventDocument event = EventDocument::parse(document.text).value_or(EventDocument{});
        std::string start = document.deleted ? "deleted" : start_text(event);
        rows.push_back(
            {start,
             {start, shortened(one_line(document.title), kLongestTitle), kind_text(event),
              zone_text(event), std::to_string(document.revision), document.key}});
    }
    if (arguments.json) {
        fmt::print("{}", dumped(json));
        return Exit::kDone;
    }
    std::ranges::stable_sort(rows, {}, [](const auto& row) { return row.first; });
    for (auto& [start, cells] : rows) {
        table.add(std::move(cells));
    }
    if (!table.empty()) {
        table.print();
    }
    fmt::print(stderr, "{} at revision {}\n", plural(rows.size(), "document"), changes->revision);
    return Exit::kDone;
}

Exit cloud_show(const CloudArguments& arguments) {
    const Result<CloudStore> store = CloudStore::open(arguments.cloud, {.who = arguments.who});
    if (!store) {
        return fail(store.error());
    }
    Exit exit = Exit::kDone;
    const std::optional<CloudDocument> document = find_document(*store, arguments.key, exit);
    if (!document) {
        return exit;
    }
    const Result<std::vector<CloudDocument>> occurrences = store->occurrences(document->key);
    if (!occurrences) {
        return fail(occurrences.error());
    }
    if (arguments.json) {
        ordered_json json = document_json(*document);
        json["occurrences"] = ordered_json::array();
        for (const CloudDocument& occurrence : *occurrences) {
            json["occurrences"].push_back(occurrence.key);
        }
        fmt::print("{}", dumped(json));
        return Exit::kDone;
    }
    fmt::print("Key       {}\nTitle     {}\nRevision  {}, by {} at {}\n", document->key,
               one_line(document->title), document->revision, document->modified_by,
               utc_text(document->modified_ms));
    if (document->deleted) {
        fmt::print("Deleted\n");
        return Exit::kDone;
    }
    const EventDocument event = EventDocument::parse(document->text).value_or(EventDocument{});
    fmt::print("Start     {} {}\n", start_text(event), zone_text(event));
    if (!document->parent_key.empty()) {
        fmt::print("Kind      {} of {}\n", kind_text(event), document->parent_key);
    }
    for (const CloudDocument& occurrence : *occurrences) {
        const auto parsed = EventDocument::parse(occurrence.text).value_or(EventDocument{});
        fmt::print("          {} {}\n", kind_text(parsed), occurrence.key);
    }
    fmt::print("\n{}", dumped(ordered_json::parse(document->text, nullptr, false)));
    return Exit::kDone;
}

Exit cloud_log(const CloudArguments& arguments) {
    const Result<CloudStore> store = CloudStore::open(arguments.cloud, {.who = arguments.who});
    if (!store) {
        return fail(store.error());
    }
    const Result<std::vector<CloudLogEntry>> entries = store->log(arguments.limit, arguments.key);
    if (!entries) {
        return fail(entries.error());
    }
    Table table({"REV", "TIME", "WHO", "WHAT", "TITLE", "KEY"});
    table.right_align({0});
    ordered_json json = ordered_json::array();
    for (const CloudLogEntry& entry : *entries) {
        json.push_back({{"revision", entry.revision},
                        {"time_ms", entry.time_ms},
                        {"who", entry.who},
                        {"what", entry.what},
                        {"key", entry.key},
                        {"title", entry.title}});
        table.add({std::to_string(entry.revision), utc_text(entry.time_ms), entry.who, entry.what,
                   shortened(one_line(entry.title), kLongestTitle), entry.key});
    }
    if (arguments.json) {
        fmt::print("{}", dumped(json));
    } else if (!table.empty()) {
        table.print();
    }
    return Exit::kDone;
}

}  // namespace qor
