// SPDX-License-Identifier: Apache-2.0
//
// What one change of a recurring event means for its occurrences. Writing the event to the device
// drops the list of its cancelled occurrences there, and a cancellation cannot be taken back but by
// writing the event; so these deliveries come together.
#pragma once

#include "host/sync/plan.h"

namespace qor {

// Completes the plan, and puts its deliveries into the order in which they must happen.
void complete_series(SyncContext& context, Plan& plan);

}  // namespace qor
