// SPDX-License-Identifier: Apache-2.0
//
// Finishes what an interrupted run left. Items that it had written to the device are found by their
// numbers, which only grow, and by their documents; they are adopted instead of written twice.
// Everything else that it had begun is marked to be done again.
#pragma once

#include "host/sync/context.h"

namespace qor {

// The adapter gives out numbers that it gave before: its database was lost. Everything on the
// device is listed anew and matched with the items by what it says. To be called before anything
// is listed.
void check_device_identity(SyncContext& context);

// After an interrupted batch the adapter may hold an event for its own write that it has no item
// for, and so never tell of it. Makes it list everything. To be called before anything is listed.
void uncover_unfinished(SyncContext& context);

// The calendar was emptied or replaced behind the adapter: items are missing that nobody deleted.
// They are delivered anew. To be called after the device's changes were collected.
void check_calendar(SyncContext& context);

// Pending occurrences that the adapter has applied by itself meanwhile are items like all others.
void note_applied(SyncContext& context);

// To be called after the device's changes were collected.
void recover(SyncContext& context);

}  // namespace qor
