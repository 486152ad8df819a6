// SPDX-License-Identifier: Apache-2.0
//
// Recurrence and time: RRULE texts (RFC 5545 3.3.10) in both directions, date-time texts and zones
// through ICU calendars (unicode/ucal.h), durations (RFC 5545 3.3.6) and coordinates. No state
// between calls; any thread that may use the record it is given.
#pragma once

#include <unicode/ucal.h>

#include <cstdint>

#include "common/device.h"

// Record kinds. To-do records count as other records.
inline constexpr int kEventRecord = 0;
inline constexpr int kOtherRecord = 2;

extern "C" {

// ---- Records and calendars
// -------------------------------------------------------------------------

// kEventRecord, or kOtherRecord for anything else. The operations below that take a record return 4
// for anything but an event record, and for a missing text or place of the result.
int __qor_calendar_get_record_type(calendar_record_h record);

// Opens an ICU calendar in an Olson zone ("Etc/GMT" for null). The caller closes it with
// ucal_close(); null on failure. A zone that ICU does not know is reported and taken as UTC.
UCalendar* __qor_calendar_get_ucal(const char* zone);

// ---- Times
// -----------------------------------------------------------------------------------------

// Wall-clock time in a zone (month 1 to 12) to seconds since 1970-01-01 00:00:00 UTC. Fields beyond
// their limits roll over. Taken as UTC, and reported, when no calendar can be opened.
int64_t _qor_calendar_convert_dtol(const char* zone, int year, int month, int mday, int hour,
                                   int minute, int second);

// A date or date-time text read in a zone to seconds since the epoch. A trailing Z is not examined;
// fields that the text lacks are 0.
int64_t _qor_calendar_convert_stol(const char* zone, const char* text);

// Seconds since the epoch to a date text (all_day) or a date-time text in a zone. Owned copy,
// free(); null on failure.
char* _qor_calendar_convert_ltos(const char* zone, int64_t seconds, bool all_day);

// Converts a text of decimal milliseconds since the epoch in place: an all-day value stays an
// all-day date, anything else becomes an instant. `which` (0 start, 1 end) has no effect. Always 0.
int _qor_calendar_parse_caltime(int which, const char* milliseconds, calendar_time_s* value);

// Makes a value the all-day date on which it falls in UTC. 0, or -1 on a calendar failure.
int _qor_calendar_set_allday(int which, calendar_time_s* value);

// Stores the event's end from its start and an RFC 5545 duration. 0, or 6 when the start cannot be
// read. What a duration adds stops at 32 bits, reported.
int __qor_calendar_get_day(const char* duration, calendar_record_h record);

// ---- Recurrence rules
// ------------------------------------------------------------------------------

// Stores the parts of an RRULE text in an event record. 0; -1 without "FREQ="; 4; 6 when a part
// could not be stored or is longer than 103 characters (the parts before it stay).
int _qor_calendar_parse_rrule(const char* text, calendar_record_h record);

// Makes the RRULE text of an event record: owned copy, free(). 0; -1 when the event does not recur;
// 4; 6 when a property could not be read or the rule is longer than 1023 characters. The output is
// written on success only.
int _qor_calendar_make_rrule(calendar_record_h record, char** rule);

// The handlers of the RRULE parts, each given the text after the keyword: 0, 4 or 6.
int __qor_calendar_parse_freq(const char* value, calendar_record_h record);
int __qor_calendar_parse_until(const char* value, calendar_record_h record);
int __qor_calendar_parse_count(const char* value, calendar_record_h record);
int __qor_calendar_parse_interval(const char* value, calendar_record_h record);
int __qor_calendar_parse_bysecond(const char* value, calendar_record_h record);
int __qor_calendar_parse_byminute(const char* value, calendar_record_h record);
int __qor_calendar_parse_byhour(const char* value, calendar_record_h record);
int __qor_calendar_parse_byday(const char* value, calendar_record_h record);
int __qor_calendar_parse_bymonthday(const char* value, calendar_record_h record);
int __qor_calendar_parse_byyearday(const char* value, calendar_record_h record);
int __qor_calendar_parse_byweekno(const char* value, calendar_record_h record);
int __qor_calendar_parse_bymonth(const char* value, calendar_record_h record);
int __qor_calendar_parse_bysetpos(const char* value, calendar_record_h record);
int __qor_calendar_parse_wkst(const char* value, calendar_record_h record);

// ---- Coordinates
// -----------------------------------------------------------------------------------

// A decimal text of micro-degrees into the record's degrees: 0, 4 or 6.
int _qor_calendar_parse_latitude(const char* text, calendar_record_h record);
int _qor_calendar_parse_longitude(const char* text, calendar_record_h record);

// The record's degrees as a text of micro-degrees: owned copy, free(); 0, 4 or 6. No text is made,
// and the output not written, for an event without a place (1000.0) or with one that is no number
// of degrees.
int _qor_calendar_make_latitude(calendar_record_h record, char** text);
int _qor_calendar_make_longitude(calendar_record_h record, char** text);
}
