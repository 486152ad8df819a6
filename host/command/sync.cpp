// SPDX-License-Identifier: Apache-2.0
//
// sync: one sync, with a preview and the wait for pending occurrences.
#include <fmt/format.h>
#include <glib.h>

#include <algorithm>

#include "host/adapter/adapter_files.h"
#include "host/command/command.h"
#include "host/command/output.h"
#include "host/command/runner.h"
#include "host/failure.h"
#include "host/sync/engine.h"

namespace qor {

namespace {

constexpr guint kRetrySeconds = 61;  // adapters try pending occurrences 60 seconds after an insert

// Rows that a later write may bring to life; a failed write waits for nothing.
std::size_t waiting_rows() {
    const std::vector<PendingRow> rows = pending_rows();
    return static_cast<std::size_t>(std::count_if(
        rows.begin(), rows.end(), [](const PendingRow& row) { return !row.parent_key.empty(); }));
}

gboolean expire(gpointer expired) {
    *static_cast<bool*>(expired) = true;
    return G_SOURCE_REMOVE;
}

// Returns whether the adapter has applied any.
bool wait_for_pending(std::size_t before) {
    bool expired = false;
    const guint timer = g_timeout_add_seconds(kRetrySeconds, expire, &expired);
    while (!expired && waiting_rows() == before) {
        g_main_context_iteration(nullptr, TRUE);
    }
    if (!expired) {
        g_source_remove(timer);
    }
    return waiting_rows() != before;
}

void tell_pending(std::size_t waiting) {
    if (waiting > 0) {
        fmt::print(
            "{} occurrences wait for their series, which is not in the cloud yet; --wait-"
            "pending waits for the adapter's next try\n",
            waiting);
    }
}

Outcome sync_once(Device& device, CloudStore& cloud, const Arguments& arguments) {
    const AdapterLibrary library = device.adapter();
    AdapterSession session(library, device.account_id(), false);
    const SyncOptions options = sync_options(arguments);
    Outcome outcome = run_logged(device, cloud, session, options, "sync");
    const std::size_t waiting = waiting_rows();
    if (arguments.wait_pending && waiting > 0 && !options.dry_run && wait_for_pending(waiting)) {
        const Outcome again = run_logged(device, cloud, session, options, "sync");
        outcome.report.entries.insert(outcome.report.entries.end(), again.report.entries.begin(),
                                      again.report.entries.end());
        outcome.duration_ms += again.duration_ms;
    }
    return outcome;
}

}  // namespace

Exit sync(const Arguments& arguments) {
    Device device(arguments, Device::Access::kUse);
    if (device.account_id() == 0) {
        throw Failure("nobody is signed in on this device: qor-host sign-in NAME --cloud FILE");
    }
    CloudStore cloud = device.open_cloud();
    if (arguments.start_over) {
        start_over(device.database());
    }
    Outcome outcome;
    outcome.report.dry_run = arguments.dry_run;
    if (idle(device, cloud)) {
        Device::mark_synced();
    } else {
        outcome = sync_once(device, cloud, arguments);
    }
    if (arguments.json) {
        print_json(report_json(outcome.report, outcome.duration_ms));
    } else {
        print_report(outcome.report, outcome.duration_ms);
        tell_pending(waiting_rows());
    }
    return outcome.status();
}

}  // namespace qor
