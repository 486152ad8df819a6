// SPDX-License-Identifier: Apache-2.0
//
// Reads the items that the journal names from the device, and finds the cloud key of each.
#pragma once

#include <string>
#include <vector>

#include "host/sync/plan.h"

namespace qor {

// New items get their keys here, durably, so that an upload that is interrupted is repeated under
// the same key.
std::vector<KeyChange> read_device_changes(SyncContext& context);

}  // namespace qor
