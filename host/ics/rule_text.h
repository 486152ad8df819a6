// SPDX-License-Identifier: Apache-2.0
//
// RRULE values in the one form that documents hold, which is the form that devices write.
#pragma once

#include <string>

#include "host/ics/event_reader.h"

namespace qor {

// The value of an RRULE property as a document's "rrule": parts in a device's order, INTERVAL
// always there, UNTIL in UTC with a Z ("T000000Z" of its date for an all-day event). What devices
// cannot read of it is counted. Empty when it is no rule.
std::string document_rule(const std::string& value, const IcsTime& start, const std::string& title,
                          IcsReport& report);

// The inverse for a file: the bare date as UNTIL of an all-day event, no empty parts.
std::string ics_rule(const std::string& rule, bool all_day);

}  // namespace qor
