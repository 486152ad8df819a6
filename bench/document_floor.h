// SPDX-License-Identifier: Apache-2.0
//
// Reading and writing one typical event document at its floor: the calls of the JSON library, ICU,
// the C library and the calendar record that this document needs, one after the other and with
// their arguments known beforehand.
#pragma once

#include <cstddef>
#include <cstdint>

#include "common/owned.h"

inline constexpr char kFloorTitle[] = "Weekly planning";
inline constexpr char kFloorLocation[] = "Room 5, second floor";
inline constexpr char kFloorDescription[] =
    "Bring the list of open points and last week's figures.";
inline constexpr char kFloorZone[] = "Asia/Seoul";
inline constexpr char kFloorDays[] = "MO,WE";
inline constexpr char kFloorOrganizer[] = "A. Person";
inline constexpr int64_t kFloorStart = 1394875800;
inline constexpr int64_t kFloorEnd = 1394879400;
inline constexpr int64_t kFloorUntil = 1419951600;  // 2014-12-31 00:00 in the zone
inline constexpr double kFloorLongitude = 126.977969;
inline constexpr double kFloorLatitude = 37.566535;
inline constexpr int kFloorAlarms = 2;
inline constexpr int kFloorMinutes[kFloorAlarms] = {15, 60};

inline constexpr char kFloorDocument[] =
    R"({"EVENT":{"title":"Weekly planning","eventLocation":"Room 5, second floor",)"
    R"("description":"Bring the list of open points and last week's figures.",)"
    R"("eventStatus":"0","dtstart":"1394875800000","dtend":"1394879400000",)"
    R"("eventTimezone":"Asia/Seoul","accessLevel":"0","hasAlarm":"1",)"
    R"("rrule":"FREQ=WEEKLY;INTERVAL=1;BYDAY=MO,WE;WKST=MO;UNTIL=20141231T000000Z",)"
    R"("lastDate":"0","hasAttendeeData":"0","organizer":"A. Person",)"
    R"("longitude":"126977969","latitude":"37566535"},)"
    R"("REMINDERS":[{"method":"1","minutes":"15"},{"method":"1","minutes":"60"}]})";

// Fills a new event record from the document above.
void read_document_floor(calendar_record_h record);

// Writes the document of a record that was filled so.
GText write_document_floor(calendar_record_h record);
