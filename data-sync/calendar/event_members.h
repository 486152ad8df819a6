// SPDX-License-Identifier: Apache-2.0
//
// Names of the event document's members, shared by reading and writing.
#pragma once

inline constexpr const char* kEventName = "EVENT";          // object: the event
inline constexpr const char* kRemindersName = "REMINDERS";  // array of objects: its alarms
inline constexpr const char* kErrorName = "error";          // the server reports a failure

// The members of "EVENT" in the order in which a name is looked up. Every value is a string.
enum EventKey : int {
    kTitle,
    kEventLocation,
    kDescription,
    kEventStatus,  // "0" ordinary, "2" a cancelled occurrence
    kDtstart,      // milliseconds since 1970-01-01 00:00 UTC
    kDtend,
    kEventTimezone,         // Olson zone id
    kDuration,              // RFC 5545 3.3.6
    kAllDay,                // "1" or absent
    kAccessLevel,           // "0" public
    kHasAlarm,              // count of alarms
    kRrule,                 // RFC 5545 3.3.10
    kOriginalSyncId,        // an exception's parent, by its cloud key
    kOriginalInstanceTime,  // the occurrence that an exception stands for, in milliseconds
    kLastDate,
    kHasAttendeeData,
    kOrganizer,
    kLongitude,  // micro-degrees
    kLatitude,
    kEventKeyCount,
};

inline constexpr const char* kEventKeys[kEventKeyCount] = {
    "title",
    "eventLocation",
    "description",
    "eventStatus",
    "dtstart",
    "dtend",
    "eventTimezone",
    "duration",
    "allDay",
    "accessLevel",
    "hasAlarm",
    "rrule",
    "original_sync_id",
    "originalInstanceTime",
    "lastDate",
    "hasAttendeeData",
    "organizer",
    "longitude",
    "latitude",
};

// calendar_adapter_row.exception_status
inline constexpr int kOrdinaryEvent = 0;
inline constexpr int kChangedInstance = 1;
inline constexpr int kCancelledInstance = 2;  // also the "eventStatus" of its document
