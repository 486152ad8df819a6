// SPDX-License-Identifier: Apache-2.0
//
// Carries the cloud's changes to the device, in batches: what is about to be written is noted
// first, durably, and the results after the batch, so that the cost of being durable is shared and
// an interrupted batch can be taken up again (see recover.h). An item that fails is put aside; one
// that somebody edits meanwhile is left to the next round, which sees the edit.
#pragma once

#include "host/sync/plan.h"

namespace qor {

// The device's changes were listed up to `listed_version`.
void deliver(SyncContext& context, const std::vector<Delivery>& deliveries, int listed_version);

}  // namespace qor
