// SPDX-License-Identifier: Apache-2.0
//
// Event document: the JSON object with "EVENT" and "REMINDERS" that the cloud exchanges, to and
// from a calendar event record. No state between calls.
#pragma once

#include <cstddef>

#include "data-sync/calendar/qor_adapter_data_sync_calendar_db.h"

extern "C" {

// Reads a document into row->record and the row's exception fields. The row comes zero-filled but
// for its record. offset is not used; flags only takes part in the argument check. 0; 4 for
// unusable arguments; -1 on any other failure (what was stored before it stays).
int _qor_calendar_parse_event_from_json(const char* text, int offset, size_t length, int flags,
                                        calendar_adapter_row* row);

// Stores one "EVENT" member, given by its row in the key table. 0 or -1.
int __qor_calendar_parser_event_set_value(calendar_adapter_row* row, int key, const char* value);

// Makes the document of an event, or, given the recurrence-id text of one of its occurrences, the
// document that cancels this occurrence. 0 and a new text, released with g_free(), with its length
// in bytes (length may be null); -1 when the record or the text destination is missing; 6 on any
// other failure.
int _qor_calendar_parse_make_event_to_json(calendar_record_h record, const char* exdate,
                                           char** text, size_t* length);
}
