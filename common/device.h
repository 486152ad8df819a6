// SPDX-License-Identifier: Apache-2.0
//
// The seam to the device: the only place where the adapter meets the device's services. Which
// declarations are found is decided by the include folder that CMake is given
// (QOR_PLATFORM_INCLUDE_DIRS), so moving to a device never changes adapter code.
#pragma once

#include <qor_platform.h>

// Every fixed path of the adapter stands under this prefix: empty on a device, "." in development,
// where a device is the current directory.
#ifndef QOR_DEVICE_ROOT
#define QOR_DEVICE_ROOT ""
#endif
