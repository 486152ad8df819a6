// SPDX-License-Identifier: Apache-2.0
//
// Reminders: one element of the document's "REMINDERS" array to and from one alarm record. No state
// between calls.
#pragma once

#include <json-glib/json-glib.h>

#include "common/device.h"
#include "common/qor_adapters_json_parser.h"

extern "C" {

// Fills an alarm record from an array element. 0 or -1.
int _qor_calendar_parse_reminder_from_json(qor_adapters_json_parse_buffer* element,
                                           calendar_record_h alarm);

// Fills an object from an alarm record. 0, or -1 (also for an alarm that cannot be told in
// minutes).
int _qor_calendar_parse_make_reminder_to_json(calendar_record_h alarm, JsonObject* object);
}
