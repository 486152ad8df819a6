// SPDX-License-Identifier: Apache-2.0
//
// Time zones: wall-clock time to UTC and back, for any Olson zone id.
//
// A wall-clock time is counted as though it were UTC: seconds from 1970-01-01 00:00:00 as the clock
// on the wall shows them. Zones are found once and kept for the life of the process; any thread.
#pragma once

#include <unicode/basictz.h>

#include <cstdint>
#include <optional>
#include <string>

namespace calendar_text {

inline constexpr std::int64_t kDay_s = 86400;

// Times outside these years are moved to the nearest end, so that no arithmetic overflows.
inline constexpr std::int64_t kEarliest_s = -62135596800;  // 0001-01-01 00:00:00 UTC
inline constexpr std::int64_t kLatest_s = 253402300799;    // 9999-12-31 23:59:59 UTC

class Zone {
  public:
    // The zone of an Olson id; UTC for an empty id, nothing for an unknown one.
    static std::optional<Zone> find(const std::string& id);
    static Zone utc();

    // The zone that this machine shows times in: TZ, else the system's setting, else UTC.
    static Zone of_machine();

    // The known id that looks most like the given one.
    static std::string nearest_id(const std::string& id);

    const std::string& id() const { return id_; }

    // A time that a clock change skips is read with the offset before the change; one that it
    // repeats is the first of the two (RFC 5545 3.3.5).
    std::int64_t to_utc(std::int64_t wall_s) const;
    std::int64_t to_wall(std::int64_t utc_s) const;

  private:
    Zone(std::string id, const icu::BasicTimeZone* rules) : id_(std::move(id)), rules_(rules) {}

    std::string id_;
    const icu::BasicTimeZone* rules_;  // kept by the cache; null is UTC
};

}  // namespace calendar_text
