// SPDX-License-Identifier: Apache-2.0
//
// The device's logging service: one line per message with time, priority and tag.
#ifndef QOR_PLATFORM_DEVICE_LOG_H
#define QOR_PLATFORM_DEVICE_LOG_H

// NOLINTBEGIN(modernize-use-using, modernize-deprecated-headers): C reads this header too.

#ifdef __cplusplus
extern "C" {
#endif

typedef enum {
    DLOG_INFO = 4,
    DLOG_WARN = 5,
    DLOG_ERROR = 6,
} log_priority;

// Writes one message. log_id names the buffer (2: the system log). Any thread; lines never mix.
//
// The environment variable QOR_LOG names the destination, looked up at each message: "off" (the
// default), "stderr", or the path of a file that is appended to. Colour sequences are kept on a
// terminal and removed elsewhere. Returns the length of the formatted message in bytes, also when
// it is discarded, or a negative code when it could not be written.
int __dlog_print(int log_id, int priority, const char *tag, const char *format, ...)
    __attribute__((format(printf, 4, 5)));

#ifdef __cplusplus
}
#endif

// NOLINTEND(modernize-use-using, modernize-deprecated-headers)

#endif  // QOR_PLATFORM_DEVICE_LOG_H
