// SPDX-License-Identifier: Apache-2.0
//
// The adapter's one log macro. Each message carries the name of the function that logs it, and that
// name is interface: only functions with interface names log.
#pragma once

#include "common/device.h"

// Priority and coloured banner of each level.
#define QOR_LOG_PRIORITY_CRITICAL 6
#define QOR_LOG_BANNER_CRITICAL "\033[0;31m* Critical * "
#define QOR_LOG_PRIORITY_WARNING 5
#define QOR_LOG_BANNER_WARNING "\033[0;34m* Warning * "
#define QOR_LOG_PRIORITY_INFO 4
#define QOR_LOG_BANNER_INFO "\033[0;35m* Info * "

#define QOR_LOG_ID 2
#define QOR_LOG_TAG "CLOUD_QOR_ADAPTERS"

// Logs a printf-style text literal at a level (CRITICAL, WARNING or INFO). Its value is the result
// of the device's logging call: the number of bytes written or a negative error.
#define QOR_LOG(level, text, ...)                                                                 \
    __dlog_print(QOR_LOG_ID, QOR_LOG_PRIORITY_##level, QOR_LOG_TAG,                               \
                 "%s: %s(%d) > " QOR_LOG_BANNER_##level text "\033[0;m", __FILE_NAME__, __func__, \
                 __LINE__ __VA_OPT__(, ) __VA_ARGS__)
