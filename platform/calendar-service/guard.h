// SPDX-License-Identifier: Apache-2.0
//
// The border to the C functions: failures inside the service are thrown and become result codes
// there, which no exception leaves. No state.
#pragma once

#include <cstring>
#include <exception>
#include <new>

#include "platform/include/calendar_service.h"

namespace device {

// The bytes of an enumeration that a C caller gave, who can give any value.
template <typename Enumeration>
unsigned int raw_value(const Enumeration& value) {
    unsigned int raw = 0;
    static_assert(sizeof raw == sizeof value);
    std::memcpy(&raw, &value, sizeof raw);
    return raw;
}

struct Failure {
    calendar_error_e code;
};

// The result code of an action that throws Failure or std::bad_alloc when it fails.
template <typename Action>
int guarded(const Action& action) {
    try {
        action();
        return CALENDAR_ERROR_NONE;
    } catch (const Failure& failure) {
        return failure.code;
    } catch (const std::bad_alloc&) {
        return CALENDAR_ERROR_OUT_OF_MEMORY;
    } catch (const std::exception&) {
        return CALENDAR_ERROR_DB_FAILED;
    }
}

}  // namespace device
