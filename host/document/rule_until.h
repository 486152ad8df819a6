// SPDX-License-Identifier: Apache-2.0
//
// UNTIL in both of its forms. Documents in the cloud hold it in UTC with a Z (RFC 5545 3.3.10), and
// so do documents that a device writes; but a device reads the digits as wall-clock time of the
// event's zone. Handing out the wall-clock form, without a Z, keeps a rule from drifting.
#pragma once

#include <string>
#include <string_view>

namespace qor {

// The document with its UNTIL as a device reads it: "20141231T225959Z" of an event in
// Europe/Berlin becomes "20141231T235959". The zone is "eventTimezone", UTC without one; also moves
// "rrule" behind "dtstart", "eventTimezone" and "allDay", which a device must have read before it.
// All-day events ("20141231T000000Z" is the date 2014-12-31 to both sides), rules without UNTIL,
// UNTIL without a Z, unknown zones and texts that are no document come back as they were.
std::string until_to_wall_clock(std::string_view document);

// The inverse: UNTIL without a Z becomes UTC with a Z. A time that the clock shows twice is its
// second hour, a time that it skips is counted from before the gap, as devices have it; so the pair
// is exact but for an UNTIL in the first of two such hours, which comes back one hour later.
std::string until_to_utc(std::string_view document);

}  // namespace qor
