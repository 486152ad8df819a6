// SPDX-License-Identifier: Apache-2.0
//
// The text that the store keeps for a local date: "YEAR-MONTH-DAY HOUR:MINUTE:SECOND", with " leap"
// after it for a leap month. Every value is kept as it is, possible or not. No state.
#pragma once

#include <string>

#include "platform/include/calendar_service.h"

namespace device {

std::string date_text(const calendar_time_s& date);

// Fields that the text lacks are zero.
calendar_time_s time_of_date_text(const char* text);

}  // namespace device
