// SPDX-License-Identifier: Apache-2.0
//
// The journal of runs.
#include "host/database/run_log.h"

#include <algorithm>

namespace qor {

namespace {

constexpr std::int64_t kKeptRuns = 1000;

}  // namespace

void RunLog::add(const Run& run, bool hide_titles) {
    WriteBatch batch(connection_);
    connection_.run("INSERT INTO run(start_ms, duration_ms, trigger, result) VALUES(?, ?, ?, ?)",
                    run.start_ms, run.duration_ms, run.trigger, run.result);
    const std::int64_t id = connection_.last_id();
    for (const ReportEntry& entry : run.entries) {
        connection_.run("INSERT INTO run_entry VALUES(?, ?, ?, ?, ?)", id, what_text(entry.what),
                        hide_titles ? std::string_view() : std::string_view(entry.label), entry.key,
                        entry.reason);
    }
    connection_.run("DELETE FROM run_entry WHERE run <= ?", id - kKeptRuns);
    connection_.run("DELETE FROM run WHERE id <= ?", id - kKeptRuns);
    batch.commit();
}

std::vector<Run> RunLog::latest(std::size_t count) {
    std::vector<Run> runs;
    {
        Rows rows = connection_.query(
            "SELECT id, start_ms, duration_ms, trigger, result FROM run ORDER BY id DESC LIMIT ?",
            static_cast<std::int64_t>(count));
        while (rows.next()) {
            runs.push_back({rows.integer(0),
                            rows.integer(1),
                            rows.integer(2),
                            rows.text(3),
                            rows.text(4),
                            {}});
        }
    }
    std::reverse(runs.begin(), runs.end());
    for (Run& run : runs) {
        Rows rows = connection_.query(
            "SELECT what, label, cloud_key, reason FROM run_entry WHERE run = ? ORDER BY rowid",
            run.id);
        while (rows.next()) {
            run.entries.push_back(
                {what_from_text(rows.text(0)), rows.text(1), rows.text(2), rows.text(3)});
        }
    }
    return runs;
}

}  // namespace qor
