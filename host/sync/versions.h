// SPDX-License-Identifier: Apache-2.0
//
// The calendar service's change version.
#pragma once

namespace qor {

// The current version; throws Failure when the service does not answer.
int calendar_version();

}  // namespace qor
