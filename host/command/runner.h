// SPDX-License-Identifier: Apache-2.0
//
// A sync as commands run it: skipped where there is nothing to do, timed, and entered in the log.
#pragma once

#include <string>

#include "host/command/device.h"
#include "host/sync/context.h"

namespace qor {

struct Outcome {
    SyncReport report;
    std::int64_t duration_ms = 0;
    Exit status() const;
};

SyncOptions sync_options(const Arguments& arguments);

// Whether both sides are as the latest sync left them; asks no adapter.
bool idle(Device& device, CloudStore& cloud);

// Enters the run in the log also when it fails.
Outcome run_logged(Device& device, CloudStore& cloud, AdapterSession& session,
                   const SyncOptions& options, const char* trigger);

}  // namespace qor
