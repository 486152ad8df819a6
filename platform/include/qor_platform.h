// SPDX-License-Identifier: Apache-2.0
//
// Everything that a device offers to the adapter. A device build puts a header of this name, which
// includes the device's own declarations, into the include folder given to CMake.
#ifndef QOR_PLATFORM_H
#define QOR_PLATFORM_H

#include "account_service.h"
#include "calendar_service.h"
#include "database_utility.h"
#include "device_log.h"

#endif  // QOR_PLATFORM_H
