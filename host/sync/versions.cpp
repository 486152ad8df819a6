// SPDX-License-Identifier: Apache-2.0
//
// The calendar service's change version.
#include "host/sync/versions.h"

#include <fmt/format.h>
#include <qor_platform.h>

#include "host/failure.h"

namespace qor {

int calendar_version() {
    int version = 0;
    const int rc = calendar_db_get_current_version(&version);
    if (rc != CALENDAR_ERROR_NONE) {
        throw Failure(fmt::format("the calendar service does not answer (result {})", rc));
    }
    return version;
}

}  // namespace qor
