// SPDX-License-Identifier: Apache-2.0
//
// status, log: what is known, and what was done. They only read, beside whatever is at work.
#include <fmt/format.h>
#include <qor_platform.h>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "host/adapter/adapter_files.h"
#include "host/command/command.h"
#include "host/command/output.h"
#include "host/command/runner.h"
#include "host/database/run_log.h"
#include "host/failure.h"
#include "host/sync/engine.h"

namespace qor {

namespace {

using Json = nlohmann::ordered_json;

Json pending_json(Items& items) {
    Json pending = Json::array();
    for (const PendingRow& row : pending_rows()) {
        const std::optional<Item> item = items.by_id(row.id);
        pending.push_back(
            {{"item", row.id}, {"title", item ? item->label : ""}, {"waits_for", row.parent_key}});
    }
    return pending;
}

Json aside_json(Journal& journal) {
    Json aside = Json::array();
    for (const Retry& retry : journal.retries()) {
        aside.push_back({{"title", retry.label},
                         {"key", retry.key},
                         {"reason", retry.reason.empty() ? "interrupted" : retry.reason}});
    }
    for (const DeviceChange& change : journal.changes()) {
        if (!change.reason.empty()) {
            aside.push_back({{"title", change.label}, {"key", ""}, {"reason", change.reason}});
        }
    }
    return aside;
}

std::size_t open_conflicts(HostDatabase& database) {
    std::size_t open = 0;
    for (const Conflict& conflict : Conflicts(database.connection()).list()) {
        open += conflict.restored ? 0 : 1;
    }
    return open;
}

Json cloud_json(Device& device) {
    const auto cloud = CloudStore::open(device.cloud_path(), {});
    if (!cloud) {
        return {{"file", device.cloud_path()}, {"error", cloud.error().message}};
    }
    return {{"file", device.cloud_path()},
            {"revision", need(cloud->revision())},
            {"synced_revision", device.database().number(setting::kCloudRevision)}};
}

Json gather(Device& device) {
    HostDatabase& database = device.database();
    Items items(database.connection());
    Journal journal(database.connection());
    const Items::Counts counts = items.counts();
    if (calendar_connect() != CALENDAR_ERROR_NONE) {
        throw Failure("the calendar service does not answer");
    }
    Json result = {{"device", device.name()},
                   {"account", database.setting(setting::kAccountName)},
                   {"events", counts.events},
                   {"occurrences", counts.occurrences},
                   {"pending", pending_json(items)},
                   {"put_aside", aside_json(journal)},
                   {"conflicts_kept", open_conflicts(database)},
                   {"baseline", adapter_baseline().value_or(0)},
                   {"calendar_version", calendar_version()},
                   {"synced_calendar_version", database.number(setting::kDeviceVersion)},
                   {"cloud", cloud_json(device)},
                   {"last_sync", time_text(Device::last_sync_ms())}};
    return result;
}

void print_status(const Json& status) {
    const auto text = [&](const char* name) { return status[name].get<std::string>(); };
    const auto number = [&](const char* name) { return status[name].get<std::int64_t>(); };
    const std::string account = text("account");
    fmt::print("account      {}\n", account.empty() ? "(nobody is signed in)" : account);
    fmt::print("items        {} events, {} changed or cancelled occurrences\n", number("events"),
               number("occurrences"));
    fmt::print("pending      {}\n", status["pending"].size());
    for (const Json& row : status["pending"]) {
        fmt::print("  {} waits for {}\n", one_line(row["title"].get<std::string>()),
                   row["waits_for"].get<std::string>());
    }
    fmt::print("put aside    {}\n", status["put_aside"].size());
    for (const Json& row : status["put_aside"]) {
        fmt::print("  {}: {}\n", one_line(row["title"].get<std::string>()),
                   row["reason"].get<std::string>());
    }
    fmt::print("conflicts    {} kept (qor-host conflicts)\n", number("conflicts_kept"));
    fmt::print("calendar     version {}, the adapter's baseline {}, synced up to {}\n",
               number("calendar_version"), number("baseline"), number("synced_calendar_version"));
    const Json& cloud = status["cloud"];
    if (cloud.contains("error")) {
        fmt::print("cloud        {}\n", cloud["error"].get<std::string>());
    } else {
        fmt::print("cloud        {}, revision {}, synced up to {}\n",
                   cloud["file"].get<std::string>(), cloud["revision"].get<std::int64_t>(),
                   cloud["synced_revision"].get<std::int64_t>());
    }
    fmt::print("last sync    {}\n", text("last_sync"));
}

Json run_json(const Run& run) {
    Json json = {{"run", run.id},
                 {"start", time_text(run.start_ms)},
                 {"duration_ms", run.duration_ms},
                 {"command", run.trigger},
                 {"result", run.result},
                 {"entries", Json::array()}};
    for (const ReportEntry& entry : run.entries) {
        json["entries"].push_back(entry_json(entry));
    }
    return json;
}

void print_run(const Run& run) {
    fmt::print("{} {} {}: {} ({:.2f} s)\n", run.id, time_text(run.start_ms), run.trigger,
               run.result, static_cast<double>(run.duration_ms) / 1000);
    for (const ReportEntry& entry : run.entries) {
        fmt::print("  {:<19} {}{}{}\n", what_text(entry.what),
                   one_line(entry.label.empty() ? entry.key : entry.label),
                   entry.reason.empty() ? "" : ": ", entry.reason);
    }
}

}  // namespace

Exit status(const Arguments& arguments) {
    Device device(arguments, Device::Access::kRead);
    const Json status = gather(device);
    if (arguments.json) {
        print_json(status);
    } else {
        print_status(status);
    }
    return Exit::kDone;
}

Exit log(const Arguments& arguments) {
    Device device(arguments, Device::Access::kRead);
    const std::vector<Run> runs =
        RunLog(device.database().connection()).latest(static_cast<std::size_t>(arguments.count));
    if (!arguments.json) {
        for (const Run& run : runs) {
            print_run(run);
        }
        return Exit::kDone;
    }
    Json all = Json::array();
    for (const Run& run : runs) {
        all.push_back(run_json(run));
    }
    print_json(all);
    return Exit::kDone;
}

}  // namespace qor
