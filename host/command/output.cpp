// SPDX-License-Identifier: Apache-2.0
//
// What commands say.
#include "host/command/output.h"

#include <fmt/chrono.h>
#include <fmt/format.h>
#include <unistd.h>

#include <cstdio>
#include <map>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"

namespace qor {

namespace {

constexpr std::size_t kMostLines = 20;  // of one kind; all are in the log

struct Count {
    What what;
    const char* name;
};
constexpr Count kCounts[] = {
    {What::kUploadNew, "uploaded_new"},
    {What::kUploadChange, "uploaded_changed"},
    {What::kUploadDeletion, "uploaded_deleted"},
    {What::kDeviceNew, "device_new"},
    {What::kDeviceChange, "device_changed"},
    {What::kDeviceDeletion, "device_deleted"},
    {What::kPending, "pending"},
    {What::kConflict, "conflicts"},
    {What::kProblem, "put_aside"},
};

std::string summary(const SyncReport& report, std::int64_t duration_ms) {
    const std::size_t up = report.count(What::kUploadNew) + report.count(What::kUploadChange) +
                           report.count(What::kUploadDeletion);
    const std::size_t down = report.count(What::kDeviceNew) + report.count(What::kDeviceChange) +
                             report.count(What::kDeviceDeletion);
    if (report.entries.empty()) {
        return "nothing to do: device and cloud agree";
    }
    std::string text = fmt::format("{}{} to the cloud, {} to this device",
                                   report.dry_run ? "would go: " : "", up, down);
    for (const auto& [what, name] : {std::pair{What::kPending, "waiting for their series"},
                                     std::pair{What::kConflict, "conflicts decided"},
                                     std::pair{What::kProblem, "put aside"}}) {
        if (const std::size_t count = report.count(what); count > 0) {
            text += fmt::format(", {} {}", count, name);
        }
    }
    return report.dry_run ? text : fmt::format("{} ({:.2f} s)", text, double(duration_ms) / 1000);
}

}  // namespace

std::string time_text(std::int64_t time_ms) {
    if (time_ms == 0) {
        return "never";
    }
    return fmt::format("{:%Y-%m-%d %H:%M:%S}",
                       fmt::localtime(static_cast<std::time_t>(time_ms / 1000)));
}

void print_json(const nlohmann::ordered_json& value) {
    fmt::print("{}\n", value.dump(2, ' ', false, nlohmann::json::error_handler_t::replace));
}

void print_report(const SyncReport& report, std::int64_t duration_ms) {
    std::map<What, std::size_t> printed;
    for (const ReportEntry& entry : report.entries) {
        if (++printed[entry.what] <= kMostLines || entry.what == What::kProblem) {
            fmt::print("{:<19} {}{}{}\n", what_text(entry.what), one_line(entry.label),
                       entry.reason.empty() ? "" : ": ", entry.reason);
        }
    }
    for (const auto& [what, count] : printed) {
        if (count > kMostLines && what != What::kProblem) {
            fmt::print("{:<19} ... and {} more\n", what_text(what), count - kMostLines);
        }
    }
    fmt::print("{}\n", summary(report, duration_ms));
}

nlohmann::ordered_json entry_json(const ReportEntry& entry) {
    nlohmann::ordered_json json = {
        {"what", what_text(entry.what)}, {"title", entry.label}, {"key", entry.key}};
    if (!entry.reason.empty()) {
        json["reason"] = entry.reason;
    }
    return json;
}

nlohmann::ordered_json report_json(const SyncReport& report, std::int64_t duration_ms) {
    nlohmann::ordered_json json = {
        {"dry_run", report.dry_run}, {"stopped", report.stopped}, {"duration_ms", duration_ms}};
    for (const Count& count : kCounts) {
        json[count.name] = report.count(count.what);
    }
    json["entries"] = nlohmann::ordered_json::array();
    for (const ReportEntry& entry : report.entries) {
        json["entries"].push_back(entry_json(entry));
    }
    return json;
}

void show_progress(const char* step, std::size_t done, std::size_t total) {
    static const bool terminal = isatty(STDERR_FILENO) == 1;
    constexpr std::size_t kWorthTelling = 100;
    constexpr std::size_t kEvery = 50;
    if (!terminal || total < kWorthTelling || (done % kEvery != 0 && done != total)) {
        return;
    }
    fmt::print(stderr, "\r\033[K{}: {} of {}{}", step, done, total,
               done == total ? "\r\033[K" : "");
    std::fflush(stderr);
}

}  // namespace qor
