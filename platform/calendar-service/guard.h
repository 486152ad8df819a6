// SPDX-License-Identifier: Apache-2.0
//
// Failures inside the service are thrown and become result codes at the C functions, which no
// exception leaves.
#pragma once

#include <exception>
#include <new>

#include "platform/include/calendar_service.h"

namespace device {

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
