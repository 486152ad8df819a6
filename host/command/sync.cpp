// SPDX-License-Identifier: Apache-2.0
//
// sync: one sync, with a preview and the wait for pending occurrences.
#include <fmt/format.h>
#include <glib.h>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "host/adapter/adapter_files.h"
#include "host/command/command.h"
#include "host/command/output.h"
#include "host/command/runner.h"
#include "host/failure.h"
#include "host/sync/engine.h"

namespace qor {

namespace {

constexpr guint kRetrySeconds = 61;  // adapters try pending occurrences 60 seconds after an insert

struct Waiting {
    std::size_t all = 0;
    std::size_t ready = 0;  // their series is on the device: the adapter's next try applies them
};

// A failed write is pending, too, but waits for nothing.
Waiting waiting_rows(HostDatabase& database) {
    Waiting waiting;
    Items items(database.connection());
    for (const PendingRow& row : pending_rows()) {
        const std::optional<Item> parent = items.by_key(row.parent_key);
        waiting.all += row.parent_key.empty() ? 0 : 1;
        waiting.ready += parent && parent->id > 0 && !parent->pending ? 1 : 0;
    }
    return waiting;
}

gboolean expire(gpointer expired) {
    *static_cast<bool*>(expired) = true;
    return G_SOURCE_REMOVE;
}

void wait_for_pending(HostDatabase& database) {
    bool expired = false;
    const guint timer = g_timeout_add_seconds(kRetrySeconds, expire, &expired);
    while (!expired && waiting_rows(database).ready > 0) {
        g_main_context_iteration(nullptr, TRUE);
    }
    if (!expired) {
        g_source_remove(timer);
    }
}

void tell_pending(const Waiting& waiting) {
    if (waiting.all > waiting.ready) {
        fmt::print("{} waiting for their series, which is not in the cloud yet\n",
                   plural(waiting.all - waiting.ready, "occurrence"));
    }
    if (waiting.ready > 0) {
        fmt::print(
            "{} waiting for the adapter's next try, a minute after its latest insert: "
            "sync --wait-pending waits for it\n",
            plural(waiting.ready, "occurrence"));
    }
}

Outcome sync_once(Device& device, CloudStore& cloud, const Arguments& arguments) {
    const AdapterLibrary library = device.adapter();
    AdapterSession session(library, device.account_id(), false);
    const SyncOptions options = sync_options(arguments);
    Outcome outcome = run_logged(device, cloud, session, options, "sync");
    if (arguments.wait_pending && !options.dry_run && waiting_rows(device.database()).ready > 0) {
        wait_for_pending(device.database());
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
        tell_pending(waiting_rows(device.database()));
    }
    return outcome.status();
}

}  // namespace qor
