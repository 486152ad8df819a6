// SPDX-License-Identifier: Apache-2.0
//
// Moves what the device reports into the host's journal, so that the adapter may forget it. A list
// of deleted items is forgotten as it is told: before it is asked for, the journal says so, and a
// run that was killed in between is found out by reading the items (one that is gone was deleted).
//
// Deleting a series makes the device delete the events that were moved out of it, too, although
// they stand on their own everywhere else. A removal by the host therefore leaves a note (the
// cascade check): what the device then reports as deleted is delivered again instead.
#pragma once

#include "host/sync/context.h"

namespace qor {

// Everything up to the calendar service's version is in the journal when this returns.
void collect_device_changes(SyncContext& context, int calendar_version);

// The device does not have this item any more, but should: it is delivered anew.
void mark_absent(SyncContext& context, Item item);

}  // namespace qor
