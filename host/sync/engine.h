// SPDX-License-Identifier: Apache-2.0
//
// One sync: finish what an interrupted run left, collect what the device reports, push it, deliver
// what the cloud has, and again, until a round finds nothing more to do. The cloud's revision and
// the calendar's version up to which everything is done are committed last.
#pragma once

#include "host/sync/context.h"
#include "host/sync/versions.h"

namespace qor {

// Neither side has changed since the last sync, and nothing waits to be tried again. Needs no
// adapter; reads two numbers.
bool nothing_to_do(CloudStore& cloud, HostDatabase& database, int calendar_version);

void run_sync(SyncContext& context);

// Forgets what was agreed with the cloud: everything on both sides is compared anew, and what only
// one side has goes to the other.
void start_over(HostDatabase& database);

}  // namespace qor
