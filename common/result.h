// SPDX-License-Identifier: Apache-2.0
//
// Result codes of the adapter. Device services have codes of their own; 0 is success everywhere.
#pragma once

// Entry points, towards the host.
inline constexpr int kSuccess = 0;
inline constexpr int kNoIds = 1;           // a change list is pending but yields no ids
inline constexpr int kNullCallback = 4;    // set_data_changed_cb was given no callback
inline constexpr int kNotInitialized = 5;  // deinitialize without a successful initialize
inline constexpr int kFailure = 6;         // every other failure

// Mapping store and event store operations.
inline constexpr int kError = -1;
inline constexpr int kNoCalendarEvent = -2;  // the item has no calendar-service event

// Translation, recurrence and time.
inline constexpr int kBadArgument = 4;    // the parse's arguments are unusable
inline constexpr int kNotAnEvent = 4;     // the record is not an event record
inline constexpr int kServiceFailed = 6;  // a calendar-service call failed
inline constexpr int kNothing = -1;       // nothing to do, or an ICU failure
