// SPDX-License-Identifier: Apache-2.0
//
// A sync as commands run it.
#include "host/command/runner.h"

#include <fmt/format.h>
#include <qor_platform.h>
#include <unistd.h>

#include <iostream>
#include <utility>

#include "host/command/output.h"
#include "host/database/run_log.h"
#include "host/failure.h"
#include "host/sync/engine.h"

namespace qor {

namespace {

Winner ask_person(const Conflict& conflict) {
    const auto told = [](const std::string& text) {
        const auto document = SyncedDocument::parse(text);
        return document ? document->label() : std::string("deleted");
    };
    fmt::print(stderr, "\n{}\n  on this device: {}\n  in the cloud:   {}\n", conflict.label,
               told(conflict.document), told(conflict.kept));
    for (std::string answer; std::cin;) {
        fmt::print(stderr, "Keep the (c)loud's, the (d)evice's, (b)oth, or decide (l)ater? ");
        std::getline(std::cin, answer);
        switch (answer.empty() ? ' ' : answer[0]) {
            case 'c':
                return Winner::kCloud;
            case 'd':
                return Winner::kDevice;
            case 'b':
                return Winner::kBoth;
            case 'l':
                return Winner::kUndecided;
            default:
                break;
        }
    }
    return Winner::kUndecided;
}

}  // namespace

Exit Outcome::status() const {
    if (report.stopped) {
        return Exit::kFailed;
    }
    return report.partly() ? Exit::kPartly : Exit::kDone;
}

SyncOptions sync_options(const Arguments& arguments) {
    SyncOptions options;
    options.policy = arguments.policy;
    options.dry_run = arguments.dry_run;
    options.allow_mass_delete = arguments.allow_mass_delete;
    if (isatty(STDIN_FILENO) == 1 && isatty(STDERR_FILENO) == 1) {
        options.ask = ask_person;
    }
    options.progress = show_progress;
    return options;
}

bool idle(Device& device, CloudStore& cloud) {
    if (calendar_connect() != CALENDAR_ERROR_NONE) {
        throw Failure("the calendar service does not answer; is the device directory writable?");
    }
    const bool idle = nothing_to_do(cloud, device.database(), calendar_version());
    if (idle) {
        static_cast<void>(calendar_disconnect());  // an adapter would connect once more
    }
    return idle;
}

Outcome run_logged(Device& device, CloudStore& cloud, AdapterSession& session,
                   const SyncOptions& options, const char* trigger) {
    Outcome outcome;
    outcome.report.dry_run = options.dry_run;
    const std::int64_t start = now_ms();
    const bool hide_titles = device.database().number(setting::kHideTitles) != 0;
    const auto enter = [&](const std::string& result) {
        outcome.duration_ms = now_ms() - start;
        if (!options.dry_run && (!outcome.report.entries.empty() || result != "done")) {
            RunLog(device.database().connection())
                .add({0, start, outcome.duration_ms, trigger, result, outcome.report.entries},
                     hide_titles);
        }
    };
    try {
        SyncContext context{session, cloud, device.database(), options, outcome.report};
        run_sync(context);
    } catch (const Failure& failure) {
        enter(failure.what());
        throw;
    }
    enter(outcome.report.stopped ? "stopped" : outcome.report.partly() ? "partly" : "done");
    if (!options.dry_run && !outcome.report.stopped) {
        Device::mark_synced();
    }
    return outcome;
}

}  // namespace qor
