// SPDX-License-Identifier: Apache-2.0
//
// Carries the cloud's changes to the device, in batches: what is about to be written is noted
// first, durably, and the results after the batch, so that the cost of being durable is shared and
// an interrupted batch can be taken up again (see recover.h). An item that fails is put aside.
#pragma once

#include "host/sync/plan.h"

namespace qor {

void deliver(SyncContext& context, const std::vector<Delivery>& deliveries);

}  // namespace qor
