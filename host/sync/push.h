// SPDX-License-Identifier: Apache-2.0
//
// Carries the device's changes into the cloud, in batches. A write happens only if the cloud's
// document is still the one that was seen; otherwise the next round decides anew.
#pragma once

#include "host/sync/plan.h"

namespace qor {

void push(SyncContext& context, const std::vector<Upload>& uploads);

}  // namespace qor
